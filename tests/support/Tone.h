#pragma once

#include <vector>

namespace qivo::test {

/// The frequency of a tone, from the moments at which it rises through zero, which lie between samples; 0 if there is
/// no tone. A few hundred of its periods are known to much better than 1 Hz.
double frequencyOf(const std::vector<float>& samples, int rate);

/// The amplitude of a sine of the samples' power.
double amplitudeOf(const std::vector<float>& samples);

/// The amplitude of the sine at this frequency alone.
double amplitudeAt(const std::vector<float>& samples, int rate, double frequency);

/// The largest difference between neighbours.
double largestStep(const std::vector<float>& samples);

} // namespace qivo::test
