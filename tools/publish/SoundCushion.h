#pragma once

#include "tools/publish/Sound.h"

#include <chrono>
#include <cstddef>
#include <deque>

namespace qivo {

/** Sound between one who brings it in pieces, by a clock of his own, and one who takes it at a steady pace: a little of
 *  it is held so that it does not stutter. What is taken came in about `held` ago, also where the one who brings it is
 *  the faster: what stands longer than needed is left out. Threads must take turns. */
class SoundCushion {
  public:
    /** What is there before anything is given away, and again after it has run dry. */
    static constexpr std::chrono::milliseconds held{60};

    /** What is kept at most, for those who bring much at a time; beyond it the oldest goes. */
    static constexpr std::chrono::milliseconds most{250};

    explicit SoundCushion(const SoundFormat& format) : m_format(format) {}

    /** Counts are of samples in all channels together, interleaved. */
    void add(const float* samples, std::size_t count);

    /** Where there is not enough the rest is silence. */
    void take(float* samples, std::size_t count);

    void clear();

  private:
    [[nodiscard]] std::size_t samplesIn(std::chrono::milliseconds time) const;
    void shortenTo(std::size_t count);
    void look(std::size_t taken);

    SoundFormat m_format;
    std::deque<float> m_sound;
    bool m_flowing = false;

    // Of the time since it was last looked whether too much is held.
    std::size_t m_taken = 0;
    std::size_t m_least = 0; // what was left, at the least
    std::size_t m_piece = 0; // what was brought at a time, at the most
};

} // namespace qivo
