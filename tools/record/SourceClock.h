#pragma once

#include <chrono>
#include <cstdint>

namespace qivo::record {

using Nanoseconds = std::chrono::nanoseconds;

/** Puts a stream's frames on this machine's time line by the source's own time stamps.
 *
 *  Arrival is when a frame could have been shown, and jitters; the source's stamps do not, but count from nowhere in
 *  particular, anew with each connection. The distance between the two is followed along its lower edge, the frames
 * that came with the least delay: at once in the first seconds, then so slowly that the source's spacing is kept. A
 * stamp that does not fit its arrival by half a second begins anew, as after a break.
 *
 * A stream whose stamps are of the same clock as another's follows that one's distance instead, so that both are
 * together as they were taken. */
class SourceClock {
  public:
    static constexpr Nanoseconds jump = std::chrono::milliseconds(500);
    static constexpr Nanoseconds settling = std::chrono::seconds(2);
    static constexpr std::int64_t slowestEarlier = 1000; ///< 1/n of the time since the last frame
    static constexpr std::int64_t slowestLater = 10000;

    /** The place of a frame with this stamp that arrived then; later than that of the frame before. */
    [[nodiscard]] Nanoseconds place(Nanoseconds stamp, Nanoseconds arrival);
    /** The same by the distance of another stream; by its own as above where the two do not fit by half a second. */
    [[nodiscard]] Nanoseconds place(Nanoseconds stamp, Nanoseconds arrival, Nanoseconds offset);
    /** From stamps to places, as the last frame was placed. */
    [[nodiscard]] Nanoseconds offset() const { return m_offset; }

  private:
    [[nodiscard]] Nanoseconds placed(Nanoseconds stamp, Nanoseconds arrival);
    void follow(Nanoseconds deviation, Nanoseconds arrival);
    void begin(Nanoseconds stamp, Nanoseconds arrival);

    bool m_begun = false;
    Nanoseconds m_offset{};  // from stamps to places
    Nanoseconds m_began{};   // the arrival that the offset was first taken from
    Nanoseconds m_arrival{}; // of the last frame, as the next two
    Nanoseconds m_stamp{};
    Nanoseconds m_place{};
};

} // namespace qivo::record
