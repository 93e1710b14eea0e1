#include "tests/audio/SoundAnalysis.h"

#include "tests/audio/AudioFrames.h"

#include <gtest/gtest.h>

using namespace qivo::test;

namespace {

std::vector<float> stereo(const std::vector<float>& samples) {
    std::vector<float> both;
    for (const float sample : samples) {
        both.insert(both.end(), {sample, sample});
    }
    return both;
}

} // namespace

TEST(SoundAnalysisTest, FrequencyAndAmplitudeOfATone) {
    const auto samples = Tone(440.3, 48000, 0.5).next(24000);
    EXPECT_NEAR(frequencyOf(samples, 48000), 440.3, 0.01);
    EXPECT_NEAR(peak(samples), 0.5, 0.001);
    EXPECT_NEAR(amplitudeAt(440.3, samples, 48000), 0.5, 0.01);
    EXPECT_LT(amplitudeAt(1000, samples, 48000), 0.01);
}

TEST(SoundAnalysisTest, AClickBreaksAStretch) {
    auto samples = Tone(440, 48000, 0.5).next(10000);
    const double step = stepOf(440, 0.5, 48000) * 1.02;
    EXPECT_EQ(longestUnbroken(stereo(samples), step, step).size(), 20000U);
    samples.erase(samples.begin() + 6000, samples.begin() + 6020); // twenty samples are lost
    EXPECT_EQ(longestUnbroken(stereo(samples), step, step).size(), 12000U);
}

TEST(SoundAnalysisTest, AGapBreaksAStretch) {
    auto samples = Tone(480, 48000, 0.5).next(10000);
    samples.insert(samples.begin() + 7000, 480, 0.0F); // at a passage through zero, so that no step tells
    const double step = stepOf(480, 0.5, 48000) * 1.02;
    EXPECT_NEAR(longestUnbroken(stereo(samples), step, step).size(), 14000U, 20);
}

TEST(SoundAnalysisTest, SilenceIsNoStretch) {
    EXPECT_LE(longestUnbroken(std::vector<float>(2000, 0.0F), 1, 1).size(), 20U);
}
