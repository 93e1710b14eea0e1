#pragma once

#include <cstdint>

namespace qivo::test {

/// The disk that the recorder writes to in this process: a program that links this has an fdatasync of its own, which
/// is counted and can be held up. Thread: any.
class SlowDisk {
  public:
    /// How often something was handed to the disk since the program began.
    static std::int64_t times();

    /// While it lives, the disk does not come back.
    SlowDisk();
    ~SlowDisk();
    SlowDisk(const SlowDisk&) = delete;
    SlowDisk& operator=(const SlowDisk&) = delete;
};

} // namespace qivo::test
