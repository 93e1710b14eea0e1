#pragma once

#include <chrono>

namespace qivo::runtime {

/// How long to wait between attempts to connect: short at first, doubling to a cap, for ever.
///
/// The pause is counted from the beginning of an attempt, so that one which waited for an answer in vain is followed by
/// the next without further delay. Time is given by the caller; the class reads no clock.
class Backoff {
  public:
    using Clock = std::chrono::steady_clock;
    using Milliseconds = std::chrono::milliseconds;

    static constexpr Milliseconds kFirst{100};
    /// Together with a handshake this keeps the picture's return within two seconds of the source's, where the server
    /// answers and sends at once.
    static constexpr Milliseconds kLongest{800};
    /// A connection that lasted this long counts as good; a shorter one does not reset the pause, or a source that
    /// accepts and closes would be tried without end at the shortest one.
    static constexpr Milliseconds kProof{2000};

    void attemptBegan(Clock::time_point now) { m_began = now; }

    /// The attempt failed, or its connection ended after `connected`. The result is when the next may begin.
    Clock::time_point attemptEnded(Clock::duration connected);

    /// There is news of the source, so that the next attempt is worth making early. The result is when it may begin.
    Clock::time_point hurry();

  private:
    Clock::time_point m_began{};
    Milliseconds m_pause = kFirst;
};

} // namespace qivo::runtime
