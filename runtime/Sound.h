#pragma once

#include "sdk/qivo.h"

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <vector>

namespace qivo::runtime {

/// What sound is received; everything else is refused.
inline constexpr int kLowestSoundRate = 8000;
inline constexpr int kHighestSoundRate = 192000;
inline constexpr int kMostSoundChannels = 8;

/// How sound is to be read.
struct SoundFormat {
    int rate = 0; ///< samples a second
    int channels = 0;

    bool isReceived() const {
        return rate >= kLowestSoundRate && rate <= kHighestSoundRate && channels >= 1 && channels <= kMostSoundChannels;
    }
    friend bool operator==(const SoundFormat&, const SoundFormat&) = default;
};

/// A frame of sound as it is handed out: one plane after the other, without gaps.
class Sound {
  public:
    /// Times are in units of 100 ns: `timecode` the source's, `arrived` since the Unix epoch. `planes` holds the
    /// format's number of planes, all of the same length, at least one sample.
    Sound(SoundFormat format, std::vector<float> planes, std::int64_t timecode, std::int64_t arrived);

    /// Describes the frame. `p_data` identifies it.
    QIVOlib_audio_frame_v2_t record();
    const void* identity() const { return m_planes.data(); }
    /// How long it lasts, rounded down.
    std::chrono::nanoseconds length() const;

  private:
    const SoundFormat m_format;
    std::vector<float> m_planes;
    const std::int64_t m_timecode;
    const std::int64_t m_arrived;
};

} // namespace qivo::runtime
