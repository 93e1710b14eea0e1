#pragma once

#include <chrono>

namespace qivo::test {

/// Measures how long this process takes for something, on a machine that may be busy with other things: time for which
/// its threads were ready to run and others had the processors is not counted. What waits for anything else, such as a
/// timer, an answer or a lock, is charged in full, and on an idle machine this is simply the time.
///
/// The times of all threads are added up, so that more may be forgiven than was lost, but only where processors are
/// short. Where the system does not tell, nothing is forgiven.
class Stopwatch {
  public:
    using Clock = std::chrono::steady_clock;

    Stopwatch();
    Clock::time_point began() const { return m_began; }
    /// From the beginning to that time, which has come.
    Clock::duration until(Clock::time_point end) const;
    Clock::duration passed() const { return until(Clock::now()); }

  private:
    Clock::duration m_waited;
    Clock::time_point m_began;
};

} // namespace qivo::test
