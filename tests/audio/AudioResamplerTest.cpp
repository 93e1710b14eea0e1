#include "tests/audio/ResamplerPair.h"

#include <array>
#include <climits>
#include <cmath>
#include <type_traits>

namespace {

using qivo::AudioResampler;
using qivo::SampleCursor;
using State = qivo::AudioResamplerState;

SampleCursor over(std::vector<float>& floats) {
    return {floats.data(), floats.data() + floats.size()};
}

std::vector<float> ramp(int count) {
    std::vector<float> values(count);
    for (int i = 0; i < count; ++i) {
        values[i] = static_cast<float>(i + 1);
    }
    return values;
}

void expectState(AudioResampler& resampler, int index, const std::array<float, 4>& samples, float posn, float delta) {
    EXPECT_EQ(State::index(resampler), index);
    EXPECT_EQ((std::array<float, 4>{State::samples(resampler)[0], State::samples(resampler)[1],
                                    State::samples(resampler)[2], State::samples(resampler)[3]}),
              samples);
    EXPECT_EQ(State::posn(resampler), posn);
    EXPECT_EQ(State::delta(resampler), delta);
}

TEST(AudioResamplerTest, StartsWithoutASampleAtRatioOne) {
    AudioResampler resampler;
    expectState(resampler, -1, {0, 0, 0, 0}, 0.0F, 1.0F);
    EXPECT_EQ(State::scaling(resampler), 1.0F);
}

TEST(AudioResamplerTest, TheFieldsLieInTheirOrder) {
    AudioResampler resampler;
    const auto at = [&](const void* field) {
        return static_cast<const char*>(field) - reinterpret_cast<const char*>(&resampler);
    };
    EXPECT_EQ(at(&State::index(resampler)), 0);
    EXPECT_EQ(at(State::samples(resampler)), 4);
    EXPECT_EQ(at(&State::posn(resampler)), 20);
    EXPECT_EQ(at(&State::delta(resampler)), 24);
    EXPECT_EQ(at(&State::scaling(resampler)), 28);
    EXPECT_EQ(sizeof resampler, 32U);
    EXPECT_TRUE(std::is_trivially_copyable_v<AudioResampler>);
}

TEST(AudioResamplerTest, SettingTheRatesChangesNothingElse) {
    AudioResampler resampler;
    std::vector<float> src = {1, 2, 3, 4, 5, 6};
    std::vector<float> dst(3);
    resampler.setSourceSampleRate(96000.0F, 48000.0F);
    SampleCursor from = over(src);
    SampleCursor to = over(dst);
    resampler.processSrc(&from, &to, 1, 1);
    const AudioResampler before = resampler;
    resampler.setSourceSampleRate(44100.0F, 48000.0F);
    EXPECT_EQ(State::delta(resampler), 44100.0F / 48000.0F);
    State::delta(resampler) = 2.0F;
    EXPECT_PRED2(sameState, resampler, before);
}

TEST(AudioResamplerTest, AfterResetTheRatioIsOneUntilTheRatesAreSetAgain) {
    AudioResampler resampler;
    std::vector<float> src = {1, 2, 3, 4, 5, 6};
    std::vector<float> dst(2);
    SampleCursor from = over(src);
    SampleCursor to = over(dst);
    resampler.setSourceSampleRate(96000.0F, 48000.0F);
    State::scaling(resampler) = 0.5F;
    resampler.processSrc(&from, &to, 1, 1);
    expectState(resampler, 2, {1, 2, 1, 1}, 2.0F, 2.0F);
    resampler.reset();
    expectState(resampler, -1, {1, 2, 1, 1}, 0.0F, 1.0F);
    EXPECT_EQ(State::scaling(resampler), 0.5F);
    resampler.setSourceSampleRate(96000.0F, 48000.0F);
    EXPECT_EQ(State::delta(resampler), 2.0F);
}

TEST(AudioResamplerTest, TheMostThatAFrameCanYield) {
    AudioResampler resampler;
    const auto most = [&](float rate, int n) {
        resampler.setSourceSampleRate(rate, 48000.0F);
        return resampler.getMaxBufferLengthInSamples(n);
    };
    EXPECT_EQ(resampler.getMaxBufferLengthInSamples(1024), 1026);
    EXPECT_EQ(resampler.getMaxBufferLengthInSamples(1600), 1602);
    EXPECT_EQ(most(48000.0F, 1024), 1026);
    EXPECT_EQ(most(44100.0F, 1024), 1117);
    EXPECT_EQ(most(96000.0F, 1024), 514);
    EXPECT_EQ(most(32000.0F, 1024), 1538);
    EXPECT_EQ(most(44100.0F, 0), 2);
    EXPECT_EQ(most(96000.0F, -3), 1);
    EXPECT_EQ(most(48000.0F, 16777217), 16777218) << "n is rounded to single precision";
}

TEST(AudioResamplerTest, AbsurdRatesYieldALengthWithoutOverflow) {
    AudioResampler resampler;
    const auto most = [&](float delta, int n) {
        State::delta(resampler) = delta;
        return resampler.getMaxBufferLengthInSamples(n);
    };
    EXPECT_EQ(most(0.0F, 1024), INT_MAX);
    EXPECT_EQ(most(1e-30F, 1024), INT_MAX);
    EXPECT_EQ(most(1.0F, INT_MAX), INT_MAX);
    EXPECT_EQ(most(1.0F, 2147483520), 2147483522);
    EXPECT_EQ(most(-0.0F, 1024), INT_MIN + 2);
    EXPECT_EQ(most(-1e-30F, 1024), INT_MIN + 2);
    EXPECT_EQ(most(1.0F, INT_MIN), INT_MIN + 2);
    EXPECT_EQ(most(-1.0F, 1024), -1022);
    EXPECT_EQ(most(0.0F, 0), 2);
    EXPECT_EQ(most(NAN, 1024), 2);
    EXPECT_EQ(most(INFINITY, 1024), 2);
}

TEST(AudioResamplerTest, SilenceFillsEveryStridethFloatAndLeavesTheState) {
    AudioResampler resampler;
    const AudioResampler before = resampler;
    std::vector<float> dst(7, 9.0F);
    SampleCursor to = {dst.data() + 1, dst.data() + 6};
    EXPECT_EQ(resampler.processDst(&to, 2), 1);
    EXPECT_EQ(dst, (std::vector<float>{9, 0, 9, 0, 9, 0, 9}));
    EXPECT_EQ(to.position - dst.data(), 7) << "the first slot at or past the end";
    EXPECT_EQ(resampler.processDst(&to, 2), 1);
    EXPECT_EQ(to.position - dst.data(), 7);
    EXPECT_PRED2(sameState, resampler, before);
}

TEST(AudioResamplerTest, ANullSourceIsSilenceInTheRemainingSlots) {
    AudioResampler resampler;
    resampler.setSourceSampleRate(44100.0F, 48000.0F);
    const AudioResampler before = resampler;
    std::vector<float> dst(6, 9.0F);
    SampleCursor from = {nullptr, nullptr};
    SampleCursor to = {dst.data() + 2, dst.data() + 6};
    EXPECT_EQ(resampler.processSrc(&from, &to, 1, 2), 1);
    EXPECT_EQ(dst, (std::vector<float>{9, 9, 0, 9, 0, 9}));
    EXPECT_EQ(to.position, to.end);
    EXPECT_EQ(from.position, nullptr);
    EXPECT_EQ(resampler.processSrc(&from, &to, 1, 2), 1) << "also if there are none";
    SampleCursor nothing = {nullptr, nullptr};
    EXPECT_EQ(resampler.processSrc(&from, &nothing, 1, 2), 1);
    EXPECT_PRED2(sameState, resampler, before);
}

TEST(AudioResamplerTest, AnExhaustedSourceLeavesTheDestination) {
    AudioResampler resampler;
    const AudioResampler before = resampler;
    std::vector<float> src(4, 1.0F);
    std::vector<float> dst(4, 9.0F);
    SampleCursor from = {src.data() + 4, src.data() + 4};
    SampleCursor to = over(dst);
    EXPECT_EQ(resampler.processSrc(&from, &to, 1, 2), 0);
    EXPECT_EQ(dst, std::vector<float>(4, 9.0F));
    EXPECT_EQ(to.position, dst.data());
    EXPECT_EQ(from.position, from.end);
    SampleCursor full = {dst.data() + 4, dst.data() + 4};
    EXPECT_EQ(resampler.processSrc(&from, &full, 1, 2), 0) << "the source is looked at first";
    EXPECT_PRED2(sameState, resampler, before);
}

TEST(AudioResamplerTest, AFullDestinationLeavesSourceAndHistory) {
    AudioResampler resampler;
    const AudioResampler before = resampler;
    std::vector<float> src(4, 1.0F);
    SampleCursor from = over(src);
    SampleCursor to = {nullptr, nullptr};
    EXPECT_EQ(resampler.processSrc(&from, &to, 1, 2), 1);
    EXPECT_EQ(from.position, src.data());
    EXPECT_PRED2(sameState, resampler, before);
}

TEST(AudioResamplerTest, EqualRatesCopyTheInputTimesTheScaling) {
    AudioResampler resampler;
    State::scaling(resampler) = 0.3F;
    resampler.setSourceSampleRate(48000.0F, 48000.0F);
    std::vector<float> src = ramp(100);
    for (int call = 0; call < 3; ++call) {
        std::vector<float> dst(220, 9.0F);
        SampleCursor from = over(src);
        SampleCursor to = over(dst);
        EXPECT_EQ(resampler.processSrc(&from, &to, 1, 2), 0);
        EXPECT_EQ(from.position, from.end);
        EXPECT_EQ(to.position - dst.data(), 200);
        for (std::size_t i = 0; i < 100; ++i) {
            ASSERT_EQ(dst[2 * i], src[i] * 0.3F);
            ASSERT_EQ(dst[2 * i + 1], 9.0F);
        }
        EXPECT_EQ(dst[200], 9.0F);
        expectState(resampler, 0, {1, 1, 1, 1}, 0.0F, 1.0F);
    }
}

TEST(AudioResamplerTest, ACopyReturnsOneOnlyIfSourceSamplesRemain) {
    AudioResampler resampler;
    std::vector<float> src = ramp(5);
    std::vector<float> dst(5);
    SampleCursor from = over(src);
    SampleCursor to = {dst.data(), dst.data() + 3};
    EXPECT_EQ(resampler.processSrc(&from, &to, 1, 1), 1);
    EXPECT_EQ(from.position - src.data(), 3);
    to.end = dst.data() + 5;
    EXPECT_EQ(resampler.processSrc(&from, &to, 1, 1), 0) << "both are used up";
    EXPECT_EQ(to.position, to.end);
    EXPECT_EQ(dst, src);
}

TEST(AudioResamplerTest, ACopyLeavesTheHistoryForALaterSpline) {
    ResamplerPair pair;
    pair.process({5, 6, 7, 8}, std::vector<float>(4), 1, 1);
    expectState(pair.real, 0, {5, 5, 5, 5}, 0.0F, 1.0F);
    pair.setRates(96000.0F, 48000.0F);
    const auto outcome = pair.process({10, 20, 30, 40, 50}, std::vector<float>(2), 1, 1);
    EXPECT_EQ(outcome.result, 1);
    EXPECT_EQ(outcome.dst, (std::vector<float>{5, 5})) << "5 5 5 5, then 5 5 10 20 at 0";
    expectState(pair.real, 2, {10, 20, 5, 5}, 2.0F, 2.0F);
}

TEST(AudioResamplerTest, ADriftWithinAHundredthOfASampleStaysACopy) {
    ResamplerPair pair;
    pair.setDelta(1.0F + 1.0F / 65536.0F);
    auto outcome = pair.process(ramp(400), std::vector<float>(400), 1, 1);
    EXPECT_EQ(outcome.dst, ramp(400));
    expectState(pair.real, 0, {1, 1, 1, 1}, 400.0F / 65536.0F, 1.0F + 1.0F / 65536.0F);
    outcome = pair.process(ramp(400), std::vector<float>(400), 1, 1);
    EXPECT_NE(outcome.dst, ramp(400)) << "800 / 65536 is more";
    EXPECT_GT(State::index(pair.real), 0);
}

TEST(AudioResamplerTest, ADriftBackwardsOrAPositionAheadIsNoCopy) {
    ResamplerPair backwards;
    backwards.setDelta(std::nextafter(1.0F, 0.0F));
    backwards.process(ramp(20), std::vector<float>(10), 1, 1);
    EXPECT_GT(State::index(backwards.real), 0);
    ResamplerPair ahead;
    ahead.setPosn(0.01F);
    ahead.process(ramp(20), std::vector<float>(10), 1, 1);
    EXPECT_GT(State::index(ahead.real), 0);
    ResamplerPair returning;
    returning.setPosn(0.5F);
    returning.setDelta(0.95F);
    returning.process(ramp(10), std::vector<float>(10), 1, 1);
    EXPECT_GT(State::index(returning.real), 0) << "the end alone is near a whole sample";
}

TEST(AudioResamplerTest, TheFirstOutputIsTheFirstSample) {
    for (const float delta : {1.5F, 2.0F, 1.02F, 7.0F}) {
        ResamplerPair pair;
        pair.setDelta(delta);
        auto outcome = pair.process({0.1F, 3, -4, 5, 6, 7, 8, 9, 10, 11, 12}, {0}, 1, 1);
        EXPECT_EQ(outcome.dst[0], 0.1F);
        EXPECT_EQ(outcome.taken, 0) << "the sample that fills the history is taken again later";
        expectState(pair.real, 0, {0.1F, 0.1F, 0.1F, 0.1F}, delta, delta);
        pair.reset();
        pair.setDelta(delta);
        outcome = pair.process({0.7F, 3, -4, 5}, {0}, 1, 1);
        EXPECT_EQ(outcome.dst[0], 0.7F);
    }
}

TEST(AudioResamplerTest, TheSplineOfFourSamples) {
    AudioResampler resampler;
    State::index(resampler) = 6; // slot 2 is the oldest
    float* samples = State::samples(resampler);
    samples[2] = 1.0F;
    samples[3] = 2.0F;
    samples[0] = 4.0F;
    samples[1] = 3.0F;
    State::posn(resampler) = 0.5F;
    State::delta(resampler) = 0.25F;
    std::vector<float> src = {100};
    std::vector<float> dst(2);
    SampleCursor from = over(src);
    SampleCursor to = over(dst);
    EXPECT_EQ(resampler.processSrc(&from, &to, 1, 1), 1);
    // a = -2, b = 2.5, c = 1.5: 2 + 1.5 t + 2.5 t^2 - 2 t^3
    EXPECT_EQ(dst[0], 3.125F);
    EXPECT_EQ(dst[1], 3.6875F);
    EXPECT_EQ(from.position, src.data());
    expectState(resampler, 6, {4, 3, 1, 2}, 1.0F, 0.25F);
}

TEST(AudioResamplerTest, AFullDestinationIsReportedEvenIfTheSourceIsUsedUp) {
    ResamplerPair pair;
    pair.setDelta(2.0F);
    auto outcome = pair.process({1, 2, 3}, std::vector<float>(2), 1, 1);
    EXPECT_EQ(outcome.result, 1);
    EXPECT_EQ(outcome.taken, 2);
    outcome = pair.process({3}, std::vector<float>(1), 1, 1);
    EXPECT_EQ(outcome.result, 0) << "the sample is taken, its position kept";
    EXPECT_EQ(outcome.written, 0);
    expectState(pair.real, 3, {1, 2, 3, 1}, 1.0F, 2.0F);
}

TEST(AudioResamplerTest, AFrameBoundaryInsideTheCatchUpChangesNothing) {
    const std::vector<float> whole = ramp(50);
    for (const float delta : {0.4F, 0.91875F, 1.7F, 2.0F, 5.5F}) {
        ResamplerPair atOnce;
        atOnce.setDelta(delta);
        const auto expected = atOnce.process(whole, std::vector<float>(200), 1, 1);
        for (int split = 1; split < 50; ++split) {
            ResamplerPair pair;
            pair.setDelta(delta);
            auto first = pair.process({whole.begin(), whole.begin() + split}, std::vector<float>(200), 1, 1);
            const auto second = pair.process({whole.begin() + split, whole.end()}, std::vector<float>(200), 1, 1);
            EXPECT_EQ(first.taken, split);
            first.dst.resize(first.written);
            first.dst.insert(first.dst.end(), second.dst.begin(), second.dst.begin() + second.written);
            first.dst.resize(200);
            ASSERT_EQ(first.dst, expected.dst) << "delta " << delta << ", split at " << split;
            EXPECT_PRED2(sameState, pair.real, atOnce.real);
        }
    }
}

TEST(AudioResamplerTest, UpsamplingYieldsSeveralOutputsPerSample) {
    ResamplerPair pair;
    pair.setRates(8000.0F, 48000.0F);
    const auto outcome = pair.process(ramp(100), std::vector<float>(700), 1, 1);
    EXPECT_EQ(outcome.result, 0);
    EXPECT_EQ(outcome.taken, 100);
    EXPECT_NEAR(static_cast<double>(outcome.written), 600, 1);
    EXPECT_NEAR(outcome.dst[590], outcome.dst[584] + 1.0F, 1e-3) << "a ramp stays a ramp";
}

TEST(AudioResamplerTest, DownsamplingSkipsSamples) {
    ResamplerPair pair;
    pair.setRates(192000.0F, 48000.0F);
    const auto outcome = pair.process(ramp(100), std::vector<float>(700), 1, 1);
    EXPECT_EQ(outcome.result, 0);
    EXPECT_EQ(outcome.taken, 100);
    EXPECT_EQ(outcome.written, 25);
    // After 4 k samples the second-oldest of the last four is sample 4 k - 2.
    for (int k = 1; k < 25; ++k) {
        EXPECT_EQ(outcome.dst[k], static_cast<float>(4 * k - 2));
    }
}

TEST(AudioResamplerTest, AFrameOf44100HzYieldsAbout1115Samples) {
    ResamplerPair pair;
    pair.setRates(44100.0F, 48000.0F);
    for (int frame = 0; frame < 5; ++frame) {
        const auto outcome = pair.process(ramp(1024), std::vector<float>(2234), 1, 2);
        EXPECT_EQ(outcome.result, 0);
        EXPECT_NEAR(static_cast<double>(outcome.written) / 2, 1115, 1);
    }
}

TEST(AudioResamplerTest, ASpaceShorterThanTheStrideIsOneSlotToTheSplineAndNoneToTheCopy) {
    ResamplerPair spline;
    spline.setPosn(0.5F);
    auto outcome = spline.process({1, 2, 3}, {9}, 1, 2);
    EXPECT_EQ(outcome.result, 1);
    EXPECT_EQ(outcome.written, 2);
    EXPECT_EQ(outcome.dst[0], 1.0F);
    ResamplerPair copy;
    outcome = copy.process({1, 2, 3}, {9}, 1, 2);
    EXPECT_EQ(outcome.result, 1);
    EXPECT_EQ(outcome.written, 0);
    EXPECT_EQ(outcome.taken, 0);
    EXPECT_EQ(outcome.dst[0], 9.0F);
}

} // namespace
