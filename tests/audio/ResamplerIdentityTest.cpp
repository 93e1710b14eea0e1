// The resampler against the slow reference: same output, state, cursors and results to the bit.

#include "tests/audio/ResamplerPair.h"

#include <cfloat>
#include <cmath>
#include <random>
#include <string>
#include <sys/mman.h>
#include <unistd.h>
#include <utility>

namespace {

constexpr float kUntouched = -7.25F;

std::vector<float> untouched(std::size_t slots, int stride) {
    return std::vector<float>(slots * static_cast<std::size_t>(stride), kUntouched);
}

class Random {
  public:
    explicit Random(unsigned seed) : m_engine(seed) {}

    int below(int bound) { return static_cast<int>(m_engine() % static_cast<unsigned>(bound)); }
    int between(int least, int most) { return least + below(most - least + 1); }
    float real(float least, float most) { return std::uniform_real_distribution<float>(least, most)(m_engine); }
    std::vector<float> noise(int count) {
        std::vector<float> values(count);
        for (float& value : values) {
            value = real(-1.0F, 1.0F);
        }
        return values;
    }

  private:
    std::mt19937 m_engine;
};

/// Floats between two pages that can't be touched; they begin right behind the first or end right before the second.
class GuardedFloats {
  public:
    enum class Beside : std::uint8_t { First, Second };

    GuardedFloats(const std::vector<float>& values, Beside guard) {
        const auto page = static_cast<std::size_t>(sysconf(_SC_PAGESIZE));
        const std::size_t bytes = (values.size() * sizeof(float) + page - 1) / page * page;
        m_size = bytes + 2 * page;
        m_memory =
            static_cast<std::byte*>(mmap(nullptr, m_size, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0));
        EXPECT_NE(m_memory, MAP_FAILED);
        EXPECT_EQ(mprotect(m_memory, page, PROT_NONE), 0);
        EXPECT_EQ(mprotect(m_memory + page + bytes, page, PROT_NONE), 0);
        m_floats = guard == Beside::First ? reinterpret_cast<float*>(m_memory + page)
                                          : reinterpret_cast<float*>(m_memory + page + bytes) - values.size();
        m_end = std::copy(values.begin(), values.end(), m_floats);
    }
    ~GuardedFloats() { munmap(m_memory, m_size); }
    GuardedFloats(const GuardedFloats&) = delete;
    GuardedFloats& operator=(const GuardedFloats&) = delete;

    [[nodiscard]] qivo::SampleCursor all() const { return {m_floats, m_end}; }
    [[nodiscard]] bool holds(const std::vector<float>& values) const {
        return std::equal(m_floats, m_end, values.begin(), values.end(), sameFloat);
    }

  private:
    std::byte* m_memory;
    std::size_t m_size;
    float* m_floats;
    float* m_end;
};

/// A stream in frames of the given lengths; each frame is processed until its source is used up.
void expectSameStream(ResamplerPair& pair, Random& random, int frames, int longest, int srcStride, int dstStride) {
    for (int frame = 0; frame < frames && !testing::Test::HasFailure(); ++frame) {
        std::vector<float> src = random.noise(random.between(1, longest) * srcStride);
        for (int call = 0; call < 50 && !src.empty(); ++call) {
            const std::vector<float> dst = untouched(random.between(1, 2 * longest), dstStride);
            const auto outcome = pair.process(src, dst, srcStride, dstStride);
            src.erase(src.begin(), src.begin() + std::min<std::ptrdiff_t>(outcome.taken, std::ssize(src)));
            if (outcome.result == 0 || testing::Test::HasFailure()) {
                break;
            }
        }
    }
}

class EveryRate : public testing::TestWithParam<float> {};

TEST_P(EveryRate, InThePlayersUseIsTheSameToTheBit) {
    ResamplerPair pair;
    Random random(1);
    for (const int frame : {1024, 960, 441, 1600, 64, 1024, 1, 7, 33, 4096}) {
        pair.setRates(GetParam(), 48000.0F);
        const int length = pair.real.getMaxBufferLengthInSamples(frame);
        const auto outcome = pair.process(random.noise(frame), untouched(length, 2), 1, 2);
        EXPECT_EQ(outcome.result, 0);
        EXPECT_EQ(outcome.taken, frame);
    }
}

TEST_P(EveryRate, InFramesAndSpacesOfAnyLengthIsTheSameToTheBit) {
    ResamplerPair pair;
    Random random(2);
    for (const auto& [srcStride, dstStride] : {std::pair(1, 2), {1, 1}, {2, 2}, {1, 3}, {3, 1}, {1, 8}}) {
        pair.reset();
        pair.setRates(GetParam(), 48000.0F);
        expectSameStream(pair, random, 20, 300, srcStride, dstStride);
        expectSameStream(pair, random, 20, 20, srcStride, dstStride);
    }
}

/// One more sample or slot either way than any number of outputs side by side.
TEST_P(EveryRate, InFramesAndSpacesOfEveryLengthIsTheSameToTheBit) {
    Random random(16);
    ResamplerPair pair;
    for (int length = 30; length < 100 && !HasFailure(); length += random.between(1, 3)) {
        pair.setRates(GetParam(), 48000.0F);
        SCOPED_TRACE("length " + std::to_string(length));
        pair.process(random.noise(length), untouched(500, 2), 1, 2);
        pair.process(random.noise(500), untouched(length, 2), 1, 2);
        pair.process(random.noise(length), untouched(500, 3), 1, 3);
        pair.process(random.noise(500), untouched(length, 1), 1, 1);
    }
}

/// Wide loads and stores end where the regions do, also where a page does: the last slot's neighbour may be none.
TEST_P(EveryRate, NothingBeyondTheRegionsIsTouched) {
    using Beside = GuardedFloats::Beside;
    Random random(17);
    for (const qivo::ResamplerLanes lanes : testableLanes()) {
        for (int length = 36; length < 90 && !HasFailure(); length += random.between(1, 3)) {
            SCOPED_TRACE("lanes " + std::to_string(static_cast<int>(lanes)) + ", length " + std::to_string(length));
            const int stride = 1 + length % 3;
            const bool fewSlots = length % 2 == 0;
            const std::vector<float> samples = random.noise(fewSlots ? 512 : length);
            const std::vector<float> slots(((fewSlots ? length : 512) - 1) * stride + 1, kUntouched);
            std::vector<float> expected = slots;
            ReferenceResampler reference;
            reference.delta = GetParam() / 48000.0F;
            std::vector<float> source = samples;
            qivo::SampleCursor src = {source.data(), source.data() + source.size()};
            qivo::SampleCursor dst = {expected.data(), expected.data() + expected.size()};
            const int result = reference.process(&src, &dst, 1, stride);
            for (const auto& [from, into] : {std::pair(Beside::First, Beside::Second),
                                             {Beside::Second, Beside::First},
                                             {Beside::Second, Beside::Second}}) {
                const GuardedFloats guardedSamples(samples, from);
                const GuardedFloats guardedSlots(slots, into);
                qivo::SampleCursor guardedSrc = guardedSamples.all();
                qivo::SampleCursor guardedDst = guardedSlots.all();
                qivo::AudioResampler real;
                real.setSourceSampleRate(GetParam(), 48000.0F);
                EXPECT_EQ(ResamplerPair::State::process(real, guardedSrc, guardedDst, 1, stride, lanes), result);
                EXPECT_TRUE(guardedSlots.holds(expected));
                EXPECT_TRUE(guardedSamples.holds(samples));
            }
        }
    }
}

INSTANTIATE_TEST_SUITE_P(AudioResampler, EveryRate,
                         testing::Values(8000.0F, 11025.0F, 12000.0F, 16000.0F, 22050.0F, 23999.0F, 24000.0F, 24001.0F,
                                         32000.0F, 36000.0F, 44056.0F, 44100.0F, 47999.0F, 48000.0F, 48001.0F, 48048.0F,
                                         50000.0F, 64000.0F, 72000.0F, 88200.0F, 95999.0F, 96000.0F, 96001.0F,
                                         176400.0F, 192000.0F, 384000.0F, 1e6F, 1e8F, 500.0F, 3000.0F),
                         [](const auto& rate) {
                             return std::to_string(static_cast<int>(rate.param)) + "Hz" + std::to_string(rate.index);
                         });

TEST(ResamplerIdentityTest, RandomRatiosStridesPositionsAndSplits) {
    Random random(3);
    for (int stream = 0; stream < 600 && !HasFailure(); ++stream) {
        ResamplerPair pair;
        pair.setDelta(std::exp2(random.real(-6.0F, 6.0F)));
        pair.setPosn(random.real(0.0F, 3.0F));
        pair.setScaling(random.real(-2.0F, 2.0F));
        SCOPED_TRACE("delta " + std::to_string(pair.reference.delta));
        expectSameStream(pair, random, 4, 200, random.below(3) == 0 ? random.between(1, 4) : 1, random.between(1, 4));
    }
}

TEST(ResamplerIdentityTest, RatiosBesideWholeNumbersAndPowersOfTwo) {
    Random random(4);
    for (const float about : {0.25F, 0.5F, 1.0F, 2.0F, 3.0F, 4.0F, 5.0F, 8.0F, 16.0F}) {
        float delta = about;
        for (int below = 0; below < 8; ++below) {
            delta = std::nextafter(delta, 0.0F);
        }
        for (int step = 0; step < 16 && !HasFailure(); ++step) {
            ResamplerPair pair;
            pair.setDelta(delta);
            pair.setPosn(random.real(0.02F, 1.0F));
            SCOPED_TRACE("about " + std::to_string(about) + ", step " + std::to_string(step));
            expectSameStream(pair, random, 3, 600, 1, 2);
            delta = std::nextafter(delta, INFINITY);
        }
    }
}

/// Long enough for every residue and wrap of positions to come by.
TEST(ResamplerIdentityTest, TenSecondsOfSoundAreTheSameToTheBit) {
    Random random(5);
    for (const float rate : {44100.0F, 48001.0F, 96000.0F, 32000.0F}) {
        ResamplerPair pair;
        pair.setRates(rate, 48000.0F);
        for (int frame = 0; frame < static_cast<int>(rate) / 100 && !HasFailure(); ++frame) {
            const auto outcome = pair.process(random.noise(1024), untouched(1700, 2), 1, 2);
            EXPECT_EQ(outcome.result, 0);
        }
    }
}

TEST(ResamplerIdentityTest, PositionsOffTheGridNegativeAndAhead) {
    Random random(6);
    for (const float posn :
         {-0.0F, -1e-30F, 1e-30F, -0.5F, -5.0F, 1.0F, 1.9999999F, 2.0F, 17.5F, 63.25F, 1e6F, 0.3333333F}) {
        for (const float delta :
             {0.0F, 0.1F, 0.3333333F, 0.91875F, 1.0F, 1.00002F, 2.0F, 2.7F, 255.9F, 256.0F, 300.0F}) {
            ResamplerPair pair;
            pair.setDelta(delta);
            pair.setPosn(posn);
            SCOPED_TRACE("posn " + std::to_string(posn) + ", delta " + std::to_string(delta));
            expectSameStream(pair, random, 3, 400, 1, 2);
            if (HasFailure()) {
                return;
            }
        }
    }
}

TEST(ResamplerIdentityTest, RatiosThatAreNoRatiosEndAndAreTheSame) {
    Random random(7);
    for (const float delta : {NAN, INFINITY, -INFINITY, 0.0F, -0.0F, -0.5F, -1.0F, -3.0F, FLT_MAX, -FLT_MAX, FLT_MIN,
                              FLT_TRUE_MIN, 16777216.0F, 16777218.0F, 1e30F, FLT_EPSILON}) {
        ResamplerPair pair;
        expectSameStream(pair, random, 2, 100, 1, 1);
        pair.setDelta(delta);
        SCOPED_TRACE("delta " + std::to_string(delta));
        expectSameStream(pair, random, 3, 200, 1, 2);
        pair.reset();
        pair.setRates(44100.0F, 48000.0F);
        expectSameStream(pair, random, 2, 200, 1, 2);
        EXPECT_TRUE(std::isfinite(ResamplerPair::State::posn(pair.real)));
    }
}

TEST(ResamplerIdentityTest, SamplesThatAreNoNumbersPassOnlyTheirOwnOutputs) {
    Random random(8);
    for (const float odd : {NAN, INFINITY, -INFINITY, FLT_MAX, FLT_TRUE_MIN, -0.0F}) {
        for (const float rate : {44100.0F, 48000.0F, 48001.0F, 96000.0F}) {
            ResamplerPair pair;
            pair.setRates(rate, 48000.0F);
            std::vector<float> samples = random.noise(1024);
            samples[100] = odd;
            samples[500] = odd;
            const auto outcome = pair.process(samples, untouched(1200, 2), 1, 2);
            EXPECT_TRUE(std::isfinite(outcome.dst[0]));
            EXPECT_TRUE(std::isfinite(outcome.dst[outcome.written - 2]));
        }
    }
}

TEST(ResamplerIdentityTest, ConstantPositionsAtRatioOne) {
    Random random(9);
    for (const float posn : {0.02F, 0.25F, 0.99F, 0.99999994F, 1.0F}) {
        ResamplerPair pair;
        pair.setPosn(posn);
        expectSameStream(pair, random, 5, 300, 1, 2);
    }
}

TEST(ResamplerIdentityTest, ZerosKeepTheirSigns) {
    for (const float delta : {1.0F, 2.0F, 3.0F, 4.0F, 0.75F}) {
        for (const float posn : {-0.0F, 0.0F, 0.5F}) {
            ResamplerPair pair;
            pair.process({0.0F}, std::vector<float>(1), 1, 1);
            pair.setDelta(delta);
            pair.setPosn(posn);
            pair.process(std::vector<float>(300, -0.0F), untouched(500, 2), 1, 2);
            pair.setPosn(posn);
            pair.process(std::vector<float>(300, -0.0F), untouched(500, 2), 1, 2);
        }
    }
}

TEST(ResamplerIdentityTest, NearlyEqualRatesChangeBetweenCopyAndSpline) {
    Random random(10);
    for (const float rate : {48001.0F, 48000.5F, 48000.1F, 47999.9F, 47999.0F}) {
        ResamplerPair pair;
        pair.setRates(rate, 48000.0F);
        expectSameStream(pair, random, 60, 700, 1, 2);
    }
}

TEST(ResamplerIdentityTest, RatesThatChangeFromFrameToFrame) {
    Random random(11);
    ResamplerPair pair;
    for (int frame = 0; frame < 300 && !HasFailure(); ++frame) {
        pair.setRates(std::exp2(random.real(13.0F, 18.0F)), 48000.0F);
        expectSameStream(pair, random, 1, 600, 1, 2);
    }
}

TEST(ResamplerIdentityTest, LengthsThatAreNoMultipleOfTheStride) {
    Random random(12);
    for (int round = 0; round < 400 && !HasFailure(); ++round) {
        ResamplerPair pair;
        pair.setRates(round % 2 == 0 ? 44100.0F : 48000.0F, 48000.0F);
        for (int call = 0; call < 4; ++call) {
            pair.process(random.noise(random.between(1, 120)), std::vector<float>(random.between(1, 250), kUntouched),
                         random.between(1, 3), random.between(1, 5));
        }
    }
}

/// Each output is written before the next sample is taken, also where the regions share memory.
TEST(ResamplerIdentityTest, OverlappingRegionsAreWorkedThroughInOrder) {
    Random random(13);
    for (const qivo::ResamplerLanes lanes : testableLanes()) {
        for (const float rate : {44100.0F, 48000.0F, 96000.0F}) {
            for (const int shift : {-40, -9, -1, 0, 1, 2, 9, 40}) {
                qivo::AudioResampler real;
                real.setSourceSampleRate(rate, 48000.0F);
                ResamplerPair pair;
                pair.setRates(rate, 48000.0F);
                const std::vector<float> samples = random.noise(1000);
                ExactBuffer here(samples);
                ExactBuffer expected(samples);
                qivo::SampleCursor src = {here.data() + 50, here.data() + 500};
                qivo::SampleCursor dst = {here.data() + 50 + shift, here.data() + 900};
                ResamplerPair::State::process(real, src, dst, 1, 1, lanes);
                src = {expected.data() + 50, expected.data() + 500};
                dst = {expected.data() + 50 + shift, expected.data() + 900};
                pair.reference.process(&src, &dst, 1, 1);
                EXPECT_TRUE(std::equal(here.begin(), here.end(), expected.begin(), sameFloat)) << rate << ", " << shift;
                pair.expectSameState(real);
            }
        }
    }
}

TEST(ResamplerIdentityTest, TheIndexWrapsAround) {
    Random random(14);
    for (const std::int32_t index : {INT32_MAX - 3, INT32_MAX - 50, INT32_MAX, INT32_MIN, -200, -3, -2}) {
        ResamplerPair pair;
        pair.setRates(44100.0F, 48000.0F);
        expectSameStream(pair, random, 1, 8, 1, 2);
        pair.setIndex(index);
        expectSameStream(pair, random, 3, 300, 1, 2);
    }
}

TEST(ResamplerIdentityTest, TheOtherChannelsSlotsAreNeverTouched) {
    Random random(15);
    for (const float rate : {44100.0F, 48000.0F, 96000.0F, 8000.0F}) {
        ResamplerPair pair;
        pair.setRates(rate, 48000.0F);
        const auto outcome = pair.process(random.noise(1024), untouched(7000, 2), 1, 2);
        for (std::size_t i = 1; i < outcome.dst.size(); i += 2) {
            ASSERT_EQ(outcome.dst[i], kUntouched);
        }
        EXPECT_NE(outcome.dst[outcome.written - 2], kUntouched);
        EXPECT_EQ(outcome.dst[outcome.written], kUntouched);
    }
}

} // namespace
