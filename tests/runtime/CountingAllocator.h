#pragma once

#include <cstddef>

namespace qivo::test {

/// For as long as it lives, counts the blocks of at least a size that GStreamer has in memory at a time.
class CountingAllocator {
  public:
    explicit CountingAllocator(std::size_t size);
    CountingAllocator(const CountingAllocator&) = delete;
    CountingAllocator& operator=(const CountingAllocator&) = delete;
    ~CountingAllocator();

    /// The most that there were at once.
    int most() const;
};

} // namespace qivo::test
