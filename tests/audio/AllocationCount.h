#pragma once

#include <cstdint>

namespace qivo::test {

/// Counts what a thread allocates. It stands before malloc and its kin, and so before operator new, in the whole
/// program that links it; in builds with a sanitizer it listens to that instead.
///
/// Thread: each call concerns the thread that makes it, and allocates nothing.
std::uint64_t allocationsOfThisThread();

/// How many allocations happened on this thread in its lifetime.
class AllocationCount {
  public:
    std::uint64_t soFar() const { return allocationsOfThisThread() - m_before; }

  private:
    std::uint64_t m_before = allocationsOfThisThread();
};

} // namespace qivo::test
