#include "runtime/Backoff.h"

#include <algorithm>

namespace qivo::runtime {

Backoff::Clock::time_point Backoff::attemptEnded(Clock::duration connected) {
    if (connected >= kProof) {
        m_pause = kFirst;
    }
    const Clock::time_point next = m_began + m_pause;
    m_pause = std::min(m_pause * 2, kLongest);
    return next;
}

Backoff::Clock::time_point Backoff::hurry() {
    m_pause = kFirst;
    return m_began + kFirst;
}

} // namespace qivo::runtime
