#include "tools/record/SoundPlacer.h"

#include <algorithm>

namespace qivo::record {

std::int64_t SoundPlacer::samplesIn(std::chrono::nanoseconds time) const {
    const std::int64_t second = std::nano::den;
    return time.count() / second * m_rate + time.count() % second * m_rate / second;
}

SoundPlacer::Placed SoundPlacer::placeFirst(std::int64_t position, std::int64_t count) {
    Placed placed;
    placed.skip = std::clamp<std::int64_t>(-position, 0, count);
    if (placed.skip < count) {
        m_next = std::max<std::int64_t>(position, 0) + count - placed.skip;
    }
    return placed;
}

SoundPlacer::Placed SoundPlacer::place(std::chrono::nanoseconds time, std::int64_t count) {
    const std::int64_t position = samplesIn(time);
    if (!m_next) {
        return placeFirst(position, count);
    }
    Placed placed;
    const std::int64_t ahead = position - *m_next;
    if (ahead > samplesIn(gap)) {
        placed.silence = ahead;
    } else if (ahead < -samplesIn(gap)) {
        placed.skip = std::min(-ahead, count);
    } else if (ahead > samplesIn(drift)) {
        placed.repeatFirst = true;
    } else if (ahead < -samplesIn(drift)) {
        placed.skip = std::min<std::int64_t>(1, count);
    }
    *m_next += placed.silence + (placed.repeatFirst ? 1 : 0) + count - placed.skip;
    return placed;
}

std::int64_t SoundPlacer::fillTo(std::chrono::nanoseconds time) {
    const std::int64_t silence = m_next ? std::max<std::int64_t>(samplesIn(time) - *m_next, 0) : 0;
    if (m_next) {
        *m_next += silence;
    }
    return silence;
}

} // namespace qivo::record
