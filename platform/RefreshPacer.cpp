#include "platform/RefreshPacer.h"

#include <algorithm>
#include <cmath>

namespace qivo {

RefreshPacer::Duration RefreshPacer::periodOfRate(double refreshesPerSecond) {
    const bool saysNothing = !(refreshesPerSecond > 0);
    const double rate = saysNothing ? kDefaultRate : std::clamp(refreshesPerSecond, kSlowestRate, kFastestRate);
    return Duration(std::llround(1e9 / rate));
}

RefreshPacer::RefreshPacer(Duration period) : m_period(period) {}

void RefreshPacer::setPeriod(Duration period) {
    m_period = period;
}

void RefreshPacer::restart() {
    m_pacedByClock = false;
    m_begun = false;
    m_due = m_paused = Time{};
}

void RefreshPacer::begin(Time now) {
    if (!m_pacedByClock) {
        followSwaps(now);
    }
    if (m_pacedByClock) {
        followClock(now);
    }
}

void RefreshPacer::end(Time now) {
    if (m_pacedByClock) {
        m_paused = now + m_period / kPause;
    }
}

void RefreshPacer::followSwaps(Time now) {
    const auto shortest = std::chrono::duration_cast<Duration>(m_period / kRateTolerance);
    // A stall earns no credit: the account begins again at the present.
    m_earliest = m_begun ? std::max(now, m_earliest + shortest) : now;
    m_begun = true;
    if (m_earliest - now > kSwapQueue * shortest) {
        m_pacedByClock = true;
        m_due = now;
    }
}

void RefreshPacer::followClock(Time now) {
    // A pass that is late by less than a period keeps the grid, so that lateness never adds up to a slower rate. After
    // a longer stall the grid begins anew, so that nothing is made up for in a burst.
    m_due = now - m_due < m_period ? m_due + m_period : now + m_period;
}

} // namespace qivo
