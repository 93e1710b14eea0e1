#include "tests/support/Tone.h"

#include <algorithm>
#include <cmath>
#include <complex>

namespace qivo::test {

double amplitudeOf(const std::vector<float>& samples) {
    double power = 0.0;
    for (const float sample : samples) {
        power += static_cast<double>(sample) * sample;
    }
    return samples.empty() ? 0.0 : std::sqrt(2.0 * power / static_cast<double>(samples.size()));
}

double frequencyOf(const std::vector<float>& samples, int rate) {
    // Noise around zero is not counted: between two rises the tone has been well below.
    const double low = -amplitudeOf(samples) / 2;
    bool armed = false;
    double first = 0.0;
    double last = 0.0;
    int rises = 0;
    for (std::size_t i = 1; i < samples.size(); ++i) {
        armed = armed || samples[i] < low;
        if (armed && samples[i - 1] < 0.0F && samples[i] >= 0.0F) {
            const double part = -samples[i - 1] / (static_cast<double>(samples[i]) - samples[i - 1]);
            last = static_cast<double>(i - 1) + part;
            first = rises == 0 ? last : first;
            ++rises;
            armed = false;
        }
    }
    return rises < 2 ? 0.0 : (rises - 1) * rate / (last - first);
}

double amplitudeAt(const std::vector<float>& samples, int rate, double frequency) {
    std::complex<double> sum;
    double weights = 0.0;
    const double turn = 2.0 * std::acos(-1.0);
    for (std::size_t i = 0; i < samples.size(); ++i) {
        // A window without edges, so that what is near does not count.
        const double weight =
            1.0 - std::cos(turn * (static_cast<double>(i) + 0.5) / static_cast<double>(samples.size()));
        sum += std::polar(weight * samples[i], -turn * frequency * static_cast<double>(i) / rate);
        weights += weight;
    }
    return samples.empty() ? 0.0 : 2.0 * std::abs(sum) / weights;
}

double largestStep(const std::vector<float>& samples) {
    double largest = 0.0;
    for (std::size_t i = 1; i < samples.size(); ++i) {
        largest = std::max(largest, std::abs(static_cast<double>(samples[i]) - samples[i - 1]));
    }
    return largest;
}

} // namespace qivo::test
