#pragma once

#include "tools/publish/Sound.h"

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <optional>

namespace qivo {

/** Sound that is due at known moments, between one who brings it in pieces, each when its first sample is due or later,
 *  and one who takes it a little after that, by the same clock. How large the pieces are does not move
 *  it, nor how late they come as long as they come before they are taken. Threads must take turns. */
class DueSound {
  public:
    using Time = std::chrono::steady_clock::time_point;

    /** What is kept at most of what is not taken; beyond it the oldest goes. */
    static constexpr std::chrono::milliseconds most{2000};

    explicit DueSound(const SoundFormat& format) : m_format(format) {}

    /** A piece whose first sample is due at `due`. It goes on where the last one ended if that is about then; else
     *  there is silence between them, or what they overlap is left out. A piece whose beginning would have been taken
     *  already is given next, all of it: where the machine is too slow, sound is late rather than in pieces, until one
     *  comes in time. `count` is of samples in all channels together, interleaved. */
    void add(const float* samples, std::size_t count, Time due);

    /** What is due from `due` on, or goes on from what was taken last if that ended about there. Silence where there is
     *  nothing. What is due before goes. */
    void take(float* samples, std::size_t count, Time due);

    void clear();

  private:
    // Samples are numbered, the same in all channels, from the beginning of the clock.
    [[nodiscard]] std::int64_t numberAt(Time time) const;
    [[nodiscard]] std::int64_t samplesIn(std::chrono::milliseconds time) const;
    [[nodiscard]] std::int64_t end() const;
    [[nodiscard]] bool near(std::int64_t one, std::int64_t other) const;
    void dropBefore(std::int64_t number);

    SoundFormat m_format;
    std::deque<float> m_sound;
    std::int64_t m_first = 0;            // the number of the first of them
    std::optional<std::int64_t> m_taken; // the number behind what was taken last
};

} // namespace qivo
