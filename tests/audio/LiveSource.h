#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <vector>

namespace qivo::test {

/// A libqivo of its own whose one source sends packets of sound in the test's time, not faster than a live source does.
/// What becomes of them is the open runtime's: its frames, its queue, its bound. It defines the operations that the
/// player calls; link it in the place of another libqivo.
///
/// Thread: the player's.
class LiveSource {
  public:
    struct Script {
        int rate = 48000;                 ///< samples a second, as the frames say
        std::size_t packet = 480;         ///< samples of each channel
        std::int64_t partsPerMillion = 0; ///< by how much the source's clock is faster than the test's
        std::vector<float> sound;         ///< interleaved stereo, sent over and over
        std::function<std::chrono::nanoseconds()> now;
        /// Lets time pass while the player waits for a frame.
        std::function<void(std::chrono::milliseconds)> pass;
    };
    static void set(Script script);

    /// Samples of each channel that have been sent by now, and those that had to go because they waited too long.
    static std::int64_t sent();
    static std::int64_t dropped();
    /// What waits to be captured.
    static std::chrono::nanoseconds waiting();
    static std::size_t framesWaiting();
    static int receiversOpen();
};

} // namespace qivo::test
