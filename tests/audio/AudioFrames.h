#pragma once

#include "tests/fake/FakeQivo.h"

#include <cmath>
#include <cstddef>
#include <cstdint>
#include <vector>

namespace qivo::test {

/// A scripted frame of planar samples; every channel has as many as the first.
inline FakeQivo::Capture audioFrame(std::int32_t rate, const std::vector<std::vector<float>>& channels) {
    FakeQivo::Capture capture;
    capture.type = QIVOlib_frame_type_audio;
    capture.audio.sample_rate = rate;
    capture.audio.no_channels = static_cast<std::int32_t>(channels.size());
    capture.audio.no_samples = channels.empty() ? 0 : static_cast<std::int32_t>(channels[0].size());
    // A stride that is wrong shows whoever relies on it.
    capture.audio.channel_stride_in_bytes = 7;
    for (const auto& channel : channels) {
        capture.samples.insert(capture.samples.end(), channel.begin(), channel.end());
    }
    return capture;
}

/// Samples first, first + step, ...
inline std::vector<float> ramp(std::size_t count, float first, float step = 1.0F / 4096) {
    std::vector<float> samples(count);
    for (std::size_t i = 0; i < count; ++i) {
        samples[i] = first + step * static_cast<float>(i);
    }
    return samples;
}

/// A sine that goes on from frame to frame.
class Tone {
  public:
    Tone(double frequency, double rate, double amplitude = 0.5)
        : m_step(2 * M_PI * frequency / rate), m_amplitude(amplitude) {}
    std::vector<float> next(std::size_t count) {
        std::vector<float> samples(count);
        for (float& sample : samples) {
            sample = static_cast<float>(m_amplitude * std::sin(m_phase));
            m_phase = std::fmod(m_phase + m_step, 2 * M_PI);
        }
        return samples;
    }

  private:
    double m_step;
    double m_amplitude;
    double m_phase = 0.0;
};

} // namespace qivo::test
