#pragma once

#include <chrono>
#include <cstdint>
#include <optional>

namespace qivo::record {

/** Keeps a movie's sound without a break and in its place: a gap becomes silence, what would overlap is left out, and
 *  clocks that differ are made up for by single samples. Positions count samples of one channel since the movie began.
 */
class SoundPlacer {
  public:
    /** From here on a difference is a gap or an overlap. */
    static constexpr std::chrono::milliseconds gap{20};
    /** From here on a piece of sound is made a sample longer or shorter. */
    static constexpr std::chrono::milliseconds drift{5};

    explicit SoundPlacer(int rate) : m_rate(rate) {}

    /** What becomes of a piece of sound. */
    struct Placed {
        std::int64_t silence = 0; ///< samples of silence before it
        std::int64_t skip = 0;    ///< samples of its beginning that are left out
        bool repeatFirst = false; ///< its first sample comes twice
    };

    /** Places `count` samples that belong at a time since the movie's beginning, negative before it. Nothing is put
     * before the very first piece, with which the sound begins. */
    [[nodiscard]] Placed place(std::chrono::nanoseconds time, std::int64_t count);
    /** Samples of silence that lead up to that time where no sound has come for so long; they count as placed. 0 where
     *  the sound has not begun or reaches so far. */
    [[nodiscard]] std::int64_t fillTo(std::chrono::nanoseconds time);

    [[nodiscard]] bool begun() const { return m_next.has_value(); }
    /** Where the next sample goes. */
    [[nodiscard]] std::int64_t next() const { return m_next.value_or(0); }

  private:
    [[nodiscard]] std::int64_t samplesIn(std::chrono::nanoseconds time) const;
    [[nodiscard]] Placed placeFirst(std::int64_t position, std::int64_t count);

    int m_rate;
    std::optional<std::int64_t> m_next;
};

} // namespace qivo::record
