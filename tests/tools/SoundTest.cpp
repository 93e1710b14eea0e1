#include "tools/publish/Sound.h"

#include "tests/support/Tone.h"

#include <gtest/gtest.h>

#include <cmath>
#include <set>
#include <vector>

namespace qivo {
namespace {

std::vector<float> planeOf(const std::vector<float>& interleaved, int channels, int channel) {
    std::vector<float> plane;
    for (std::size_t i = static_cast<std::size_t>(channel); i < interleaved.size();
         i += static_cast<std::size_t>(channels)) {
        plane.push_back(interleaved[i]);
    }
    return plane;
}

TEST(Tone, everySourceAndChannelHasItsOwnWithinATelephonesReach) {
    std::set<int> frequencies;
    for (std::size_t source = 0; source < maximumSources; ++source) {
        for (int channel = 0; channel < maximumAudioChannels; ++channel) {
            const int frequency = toneFrequency(source, channel);
            EXPECT_GE(frequency, 300);
            EXPECT_LE(frequency, 3400);
            frequencies.insert(frequency);
        }
    }
    EXPECT_EQ(frequencies.size(), maximumSources * maximumAudioChannels);
}

TEST(Tone, firstSourcesAreAsDocumented) {
    EXPECT_EQ(toneFrequency(0, 0), 440);
    EXPECT_EQ(toneFrequency(0, 1), 696);
    EXPECT_EQ(toneFrequency(1, 0), 456);
    EXPECT_EQ(toneFrequency(1, 1), 712);
    EXPECT_EQ(toneFrequency(16, 0), 441);
}

TEST(Tone, hasItsFrequencyAndLevelOnEachChannelWhateverTheRate) {
    for (const int rate : {8000, 44100, 48000, 192000, 8001}) {
        const SoundFormat format{rate, 8};
        ToneSource source(format, 3);
        std::vector<float> samples(static_cast<std::size_t>(rate) * 8);
        source.fill(samples.data(), static_cast<std::size_t>(rate), {});
        for (int channel = 0; channel < 8; ++channel) {
            const auto plane = planeOf(samples, 8, channel);
            EXPECT_NEAR(test::frequencyOf(plane, rate), toneFrequency(3, channel), 0.1) << rate << " " << channel;
            EXPECT_NEAR(test::amplitudeAt(plane, rate, toneFrequency(3, channel)), toneAmplitude, 0.0005);
        }
    }
}

TEST(Tone, goesOnWithoutABreakFromFillToFillForAnHour) {
    const SoundFormat format{44100, 1};
    ToneSource one(format, 0);
    ToneSource other(format, 0);
    std::vector<float> second(44100);
    std::vector<float> pieces(44100);
    for (int i = 0; i < 3; ++i) {
        one.fill(second.data(), second.size(), {});
        for (std::size_t at = 0; at < pieces.size(); at += 441) {
            other.fill(&pieces[at], 441, {});
        }
        EXPECT_EQ(second, pieces);
    }
    const double step = toneAmplitude * 2.0 * std::acos(-1.0) * toneFrequency(0, 0) / 44100;
    second.insert(second.end(), pieces.begin(), pieces.end());
    EXPECT_LE(test::largestStep(second), step * 1.0001);
}

TEST(SoundCodec, everyPipelineConsistsOfTheElementsThatItNeeds) {
    for (const SoundCodec codec :
         {SoundCodec::l16, SoundCodec::l24, SoundCodec::aac, SoundCodec::opus, SoundCodec::pcmu}) {
        const std::string pipeline = soundPipeline(codec);
        EXPECT_NE(pipeline.find("name=pay1"), std::string::npos);
        for (const NeededElement& element : elementsFor(codec)) {
            EXPECT_NE(pipeline.find(element.name), std::string::npos) << element.name;
        }
    }
}

} // namespace
} // namespace qivo
