#pragma once

#include "tools/record/SourceClock.h"

#include <mutex>
#include <optional>

namespace qivo::record {

/** What pictures and sound of a source know of each other: how far the sender's clock, by which both are stamped once
 * it has reported it, is from this machine's time line. The pictures tell it, the sound goes by it. Thread: any. */
class CommonClock {
  public:
    /** Pictures that have not come for so long tell nothing any more. */
    static constexpr Nanoseconds lasting = std::chrono::seconds(10);

    void tell(Nanoseconds offset, Nanoseconds now) {
        const std::lock_guard guard(m_mutex);
        m_offset = offset;
        m_told = now;
    }
    /** From stamps to places; empty where it is not known. */
    [[nodiscard]] std::optional<Nanoseconds> offset(Nanoseconds now) const {
        const std::lock_guard guard(m_mutex);
        return now - m_told < lasting ? m_offset : std::nullopt;
    }

  private:
    mutable std::mutex m_mutex; // protects all
    std::optional<Nanoseconds> m_offset;
    Nanoseconds m_told{};
};

} // namespace qivo::record
