#pragma once

#include <cstdint>

namespace qivo::test {

/// A libqivo of its own for measurements: every receiver always has the next frame of the same tones ready, and no
/// operation allocates. It defines the operations that the player calls; link it in the place of another libqivo.
struct SteadySource {
    static constexpr int kLongestFrame = 4096;
    /// Frames from now on; up to 8 channels of at most `kLongestFrame` samples.
    static void set(std::int32_t rate, std::int32_t channels, std::int32_t samples);
    static std::int64_t framesTaken();
    static int receiversOpen();
};

} // namespace qivo::test
