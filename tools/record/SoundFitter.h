#pragma once

#include "sdk/qivo.h"
#include "tools/record/MovieFormat.h"

#include <gst/audio/audio.h>

#include <memory>
#include <vector>

namespace qivo::record {

/** Brings received sound into the movie's format: that of the first frame. Later ones of another rate are resampled; of
 *  other channels those that the movie has are taken, one alone goes to all, and what is missing is silent. Thread:
 * one. */
class SoundFitter {
  public:
    static constexpr int highestRate = 384000;
    static constexpr int mostChannels = 16;

    /** Interleaved samples as the movie has them; empty if the frame cannot be read. */
    [[nodiscard]] std::vector<std::uint8_t> fit(const QIVOlib_audio_frame_v2_t& frame);
    /** Known after the first frame. */
    [[nodiscard]] const SoundFormat& format() const { return m_format; }

  private:
    struct Release {
        void operator()(GstAudioConverter* converter) const { gst_audio_converter_free(converter); }
    };

    [[nodiscard]] bool prepare(int rate);

    SoundFormat m_format;
    int m_rate = 0; ///< of the last frame
    std::unique_ptr<GstAudioConverter, Release> m_converter;
};

} // namespace qivo::record
