#pragma once

#include "runtime/Sound.h"

#include <chrono>
#include <cstddef>
#include <deque>
#include <memory>
#include <vector>

namespace qivo::runtime {

/// The frames of sound of one receiver: those that wait, oldest first, and those that were captured and not given back.
///
/// What waits never lasts longer than kHeld: beyond that the oldest goes, so that a source whose clock is faster than
/// the listener's cannot make him fall further and further behind.
///
/// Thread: one at a time; the owner locks.
class SoundQueue {
  public:
    /// Sound that waits for one receiver.
    static constexpr std::chrono::milliseconds kHeld{250};
    /// Frames that can be out at a time.
    static constexpr std::size_t kOut = 16;

    using Frames = std::vector<std::unique_ptr<Sound>>;

    /// Returns the frames that had to go, so that they end where no lock is held.
    [[nodiscard]] Frames push(std::unique_ptr<Sound> sound);
    /// Whether `take` has something to give.
    bool ready() const { return !m_waiting.empty() && m_out.size() < kOut; }
    /// The oldest frame, which is out from now on. Only when ready.
    QIVOlib_audio_frame_v2_t take();
    /// A frame that was out; null if there is none with this `p_data`.
    [[nodiscard]] std::unique_ptr<Sound> giveBack(const void* data);
    std::size_t waiting() const { return m_waiting.size(); }
    std::chrono::nanoseconds held() const { return m_held; }

    /// What waited.
    [[nodiscard]] Frames dropWaiting();
    /// What waited and what was out.
    [[nodiscard]] Frames dropAll();

  private:
    std::unique_ptr<Sound> pop();

    std::deque<std::unique_ptr<Sound>> m_waiting;
    std::chrono::nanoseconds m_held{}; // of what waits
    Frames m_out;
};

} // namespace qivo::runtime
