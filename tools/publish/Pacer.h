#pragma once

#include "tools/publish/Options.h"

#include <chrono>
#include <cstdint>

namespace qivo {

/** The moments at which pictures are due. They lie on a grid that starts at construction, so that nothing drifts; a
 *  moment that was missed is skipped, never made up for. */
class Pacer {
  public:
    using Time = std::chrono::steady_clock::time_point;

    Pacer(PictureRate rate, Time start) : m_rate(rate), m_start(start) {}

    /** The moment of the next picture, asked at `now`: the one after the last answer, or, where that is past, the
     * newest that is due. */
    [[nodiscard]] Time next(Time now);

  private:
    [[nodiscard]] std::chrono::nanoseconds offset(std::int64_t number) const;

    PictureRate m_rate;
    Time m_start;
    std::int64_t m_next = 0;
};

} // namespace qivo
