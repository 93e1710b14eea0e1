#pragma once

#include <cstdint>

namespace qivo::test {

/// Counts the calls of a thread that may wait for another one: taking a lock, also where it happens to be free, waiting
/// for a condition, a semaphore or a futex. It stands before the C library's functions in the whole program that links
/// it, and so before std::mutex and its kin.
///
/// Thread: each call concerns the thread that makes it.
std::uint64_t waitsOfThisThread();

} // namespace qivo::test
