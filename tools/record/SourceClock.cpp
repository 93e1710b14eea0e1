#include "tools/record/SourceClock.h"

#include <algorithm>

namespace qivo::record {
namespace {

constexpr Nanoseconds shortestStep = std::chrono::milliseconds(1);

} // namespace

Nanoseconds SourceClock::place(Nanoseconds stamp, Nanoseconds arrival) {
    if (!m_state) {
        m_state.emplace();
        m_state->place = arrival - shortestStep;
        begin(stamp, arrival);
    } else {
        const Nanoseconds deviation = arrival - (stamp + m_state->offset);
        if (stamp <= m_state->stamp || deviation > jump || deviation < -jump) {
            begin(stamp, arrival);
        } else {
            follow(deviation, arrival);
        }
    }
    m_state->arrival = arrival;
    m_state->stamp = stamp;
    m_state->place = std::max(stamp + m_state->offset, m_state->place + shortestStep);
    return m_state->place;
}

void SourceClock::begin(Nanoseconds stamp, Nanoseconds arrival) {
    m_state->offset = arrival - stamp;
    m_state->began = arrival;
}

/// `deviation` is how much later the frame arrived than the offset has it.
void SourceClock::follow(Nanoseconds deviation, Nanoseconds arrival) {
    const Nanoseconds passed = std::max(arrival - m_state->arrival, Nanoseconds(0));
    if (deviation > Nanoseconds(0)) {
        m_state->offset += std::min(deviation, passed / slowestLater);
    } else if (arrival - m_state->began < settling) {
        m_state->offset += deviation;
    } else {
        m_state->offset += std::max(deviation, -passed / slowestEarlier);
    }
}

} // namespace qivo::record
