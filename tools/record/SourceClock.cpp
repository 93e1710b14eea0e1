#include "tools/record/SourceClock.h"

#include <algorithm>

namespace qivo::record {
namespace {

constexpr Nanoseconds shortestStep = std::chrono::milliseconds(1);

} // namespace

Nanoseconds SourceClock::place(Nanoseconds stamp, Nanoseconds arrival) {
    if (!m_begun) {
        m_begun = true;
        m_place = arrival - shortestStep;
        begin(stamp, arrival);
    } else {
        const Nanoseconds deviation = arrival - (stamp + m_offset);
        if (stamp <= m_stamp || deviation > jump || deviation < -jump) {
            begin(stamp, arrival);
        } else {
            follow(deviation, arrival);
        }
    }
    return placed(stamp, arrival);
}

Nanoseconds SourceClock::place(Nanoseconds stamp, Nanoseconds arrival, Nanoseconds offset) {
    if (!m_begun || std::chrono::abs(arrival - (stamp + offset)) > jump) {
        return place(stamp, arrival);
    }
    m_offset = offset;
    return placed(stamp, arrival);
}

Nanoseconds SourceClock::placed(Nanoseconds stamp, Nanoseconds arrival) {
    m_arrival = arrival;
    m_stamp = stamp;
    m_place = std::max(stamp + m_offset, m_place + shortestStep);
    return m_place;
}

void SourceClock::begin(Nanoseconds stamp, Nanoseconds arrival) {
    m_offset = arrival - stamp;
    m_began = arrival;
}

/// `deviation` is how much later the frame arrived than the offset has it.
void SourceClock::follow(Nanoseconds deviation, Nanoseconds arrival) {
    const Nanoseconds passed = std::max(arrival - m_arrival, Nanoseconds(0));
    if (deviation > Nanoseconds(0)) {
        m_offset += std::min(deviation, passed / slowestLater);
    } else if (arrival - m_began < settling) {
        m_offset += deviation;
    } else {
        m_offset += std::max(deviation, -passed / slowestEarlier);
    }
}

} // namespace qivo::record
