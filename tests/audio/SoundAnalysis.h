#pragma once

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <vector>

namespace qivo::test {

/// One channel of interleaved stereo.
inline std::vector<float> channelOf(const std::vector<float>& stereo, std::size_t channel) {
    std::vector<float> samples;
    samples.reserve(stereo.size() / 2);
    for (std::size_t i = channel; i < stereo.size(); i += 2) {
        samples.push_back(stereo[i]);
    }
    return samples;
}

/// The last so many frames of interleaved stereo; nothing if there are fewer.
inline std::vector<float> lastFrames(const std::vector<float>& stereo, std::size_t frames) {
    if (stereo.size() < 2 * frames) {
        return {};
    }
    return {stereo.end() - static_cast<std::ptrdiff_t>(2 * frames), stereo.end()};
}

inline float peak(const std::vector<float>& samples) {
    float largest = 0.0F;
    for (const float sample : samples) {
        largest = std::max(largest, std::abs(sample));
    }
    return largest;
}

/// The longest stretch of interleaved stereo in which neighbouring samples differ by no more than so much and which is
/// nowhere silent for longer than a tone is when it passes through zero.
inline std::vector<float> longestUnbroken(const std::vector<float>& stereo, double leftStep, double rightStep) {
    constexpr int kZeros = 8;
    std::size_t begin = 0;
    std::size_t bestBegin = 0;
    std::size_t bestEnd = 0;
    int zeros = 0;
    for (std::size_t i = 0; i + 1 < stereo.size(); i += 2) {
        zeros = stereo[i] == 0.0F && stereo[i + 1] == 0.0F ? zeros + 1 : 0;
        const bool broken = i > begin && (std::abs(stereo[i] - stereo[i - 2]) > leftStep ||
                                          std::abs(stereo[i + 1] - stereo[i - 1]) > rightStep);
        if (broken || zeros > kZeros) {
            begin = i;
        }
        if (i + 2 - begin > bestEnd - bestBegin) {
            bestBegin = begin;
            bestEnd = i + 2;
        }
    }
    return {stereo.begin() + static_cast<std::ptrdiff_t>(bestBegin),
            stereo.begin() + static_cast<std::ptrdiff_t>(bestEnd)};
}

/// The frequency of a pure tone in Hz, from its rising passages through zero, between samples.
inline double frequencyOf(const std::vector<float>& samples, double rate) {
    double first = -1;
    double last = -1;
    int periods = -1;
    for (std::size_t i = 1; i < samples.size(); ++i) {
        if (samples[i - 1] < 0.0F && samples[i] >= 0.0F) {
            last = static_cast<double>(i - 1) + samples[i - 1] / (samples[i - 1] - samples[i]);
            first = periods < 0 ? last : first;
            ++periods;
        }
    }
    return periods > 0 ? periods * rate / (last - first) : 0.0;
}

/// How strongly a frequency is in the samples: the amplitude of that sine.
inline double amplitudeAt(double frequency, const std::vector<float>& samples, double rate) {
    double real = 0;
    double imaginary = 0;
    for (std::size_t i = 0; i < samples.size(); ++i) {
        const double angle = 2 * M_PI * frequency * static_cast<double>(i) / rate;
        real += samples[i] * std::cos(angle);
        imaginary += samples[i] * std::sin(angle);
    }
    return 2 * std::hypot(real, imaginary) / static_cast<double>(samples.size());
}

/// The largest difference of neighbouring samples that a sine has.
inline double stepOf(double frequency, double amplitude, double rate) {
    return 2 * amplitude * std::sin(M_PI * frequency / rate);
}

} // namespace qivo::test
