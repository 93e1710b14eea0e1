#pragma once

#include <algorithm>
#include <chrono>

namespace qivo {

/// Decides when the next refresh pass begins.
///
/// A pass normally ends in a buffer swap. Where swaps wait for the vertical retrace, they pace the passes and the clock
/// must stay out of it: two clocks of nearly the same rate would drop or double a picture whenever they slip past each
/// other. Where swaps return at once (a software renderer, a virtual or hidden display), nothing but the clock paces.
/// Which of the two holds shows in the passes themselves: a loop that the display holds back can be ahead of the
/// display's refresh by no more than the pictures that fit into its queue.
///
/// Where the clock paces, each pass is followed by a short pause at least. There the processor draws, and passes that
/// take longer than a period would otherwise follow each other without end, and keep it from those who make the
/// pictures.
///
/// Pure: it is told the time. Thread: one.
class RefreshPacer {
  public:
    using Duration = std::chrono::nanoseconds;
    using Time = std::chrono::time_point<std::chrono::steady_clock, Duration>;

    static constexpr double kSlowestRate = 1;      ///< refreshes a second; lower rates count as this one
    static constexpr double kFastestRate = 1000;   ///< higher rates count as this one
    static constexpr double kDefaultRate = 60;     ///< for rates that say nothing: 0, negative, NaN
    static constexpr int kSwapQueue = 4;           ///< passes that a display may swallow before it makes one wait
    static constexpr double kRateTolerance = 1.15; ///< how much faster than reported a display may really be
    static constexpr int kPause = 5;               ///< a pause is this part of a period

    /// The period of a reported rate, whatever was reported.
    static Duration periodOfRate(double refreshesPerSecond);

    explicit RefreshPacer(Duration period);
    /// Takes effect with the next pass.
    void setPeriod(Duration period);
    Duration period() const { return m_period; }
    /// Looks afresh whether swaps wait.
    void restart();
    /// When the next pass is due; a time that has passed means at once.
    Time due() const { return std::max(m_due, m_paused); }
    /// A pass begins now.
    void begin(Time now);
    /// It has ended now.
    void end(Time now);
    /// True once swaps have turned out not to wait.
    bool pacedByClock() const { return m_pacedByClock; }

  private:
    void followSwaps(Time now);
    void followClock(Time now);

    Duration m_period;
    bool m_pacedByClock = false;
    bool m_begun = false;
    Time
        m_earliest{}; // by the swaps: before this time, less the queue, a display that holds back would not let us pass
    Time m_due{};
    Time m_paused{}; // the end of the pause
};

} // namespace qivo
