// What the blocks make and what they leave to their caller; that their outputs are right is seen through the resampler.

#include "audio/ResamplerBlocks.h"

#include <cmath>
#include <gtest/gtest.h>
#include <vector>

namespace {

using qivo::ResamplerLanes;
using qivo::ResamplerRun;

class ResamplerBlocksTest : public testing::TestWithParam<ResamplerLanes> {
  protected:
    void SetUp() override {
        if (qivo::widestResamplerLanes() < GetParam()) {
            GTEST_SKIP() << "not on this processor";
        }
    }

    ResamplerRun run(float delta, float position, int samples, int slots) {
        m_src.assign(samples, 0.5F);
        m_dst.assign(slots + 32, 0.0F);
        return {{0.5F, 0.5F, 0.5F, 0.5F}, m_src.data(), samples, m_dst.data(), slots, 1, position, 1.0F, delta};
    }

    std::vector<float> m_src;
    std::vector<float> m_dst;
};

TEST_P(ResamplerBlocksTest, MakeAllOutputsOfAFrame) {
    for (const float delta : {0.1666667F, 0.4F, 0.5F, 0.91875F, 1.0000208F, 1.7F, 2.0F, 4.0F, 8.0F, 255.0F}) {
        ResamplerRun at = run(delta, 0.25F, 1024, 8000);
        qivo::resampleBlocks(at, GetParam());
        const auto made = 8000 - at.dstSlots;
        EXPECT_NEAR(static_cast<double>(made), 1024 / delta, 1.0) << "delta " << delta;
        EXPECT_GE(at.srcLeft, 1);
        EXPECT_GE(at.position, static_cast<float>(at.srcLeft)) << "the next output would use up the source";
        EXPECT_LT(at.position, 1.0F + delta);
        EXPECT_EQ(at.src, m_src.data() + 1024 - at.srcLeft);
        EXPECT_EQ(at.dst, m_dst.data() + made);
        EXPECT_EQ(m_dst[made - 1], 0.5F);
        EXPECT_EQ(m_dst[made], 0.0F);
    }
}

TEST_P(ResamplerBlocksTest, StopAtTheLastSlotOfTheDestination) {
    for (const int slots : {1, 7, 8, 9, 15, 16, 17, 43, 512, 513}) {
        ResamplerRun at = run(0.91875F, 0.0F, 1024, slots);
        qivo::resampleBlocks(at, GetParam());
        EXPECT_EQ(at.dstSlots, 0);
        EXPECT_GT(at.srcLeft, 1024 - slots);
        EXPECT_EQ(m_dst[slots - 1], 0.5F);
        EXPECT_EQ(m_dst[slots], 0.0F);
    }
}

TEST_P(ResamplerBlocksTest, LeaveWhatTheyCannotDo) {
    const auto doesNothing = [&](float delta, float position, int samples, int slots) {
        ResamplerRun at = run(delta, position, samples, slots);
        qivo::resampleBlocks(at, GetParam());
        return at.dstSlots == slots && at.srcLeft == samples && at.src == m_src.data() && at.dst == m_dst.data() &&
               m_dst[0] == 0.0F;
    };
    EXPECT_FALSE(doesNothing(1.5F, 0.5F, 100, 100));
    EXPECT_FALSE(doesNothing(1.5F, 0.5F, 36, 1));
    EXPECT_TRUE(doesNothing(1.5F, 0.5F, 100, 0));
    EXPECT_TRUE(doesNothing(1.5F, 0.5F, 35, 100));
    EXPECT_TRUE(doesNothing(NAN, 0.5F, 100, 100));
    EXPECT_TRUE(doesNothing(INFINITY, 0.5F, 100, 100));
    EXPECT_TRUE(doesNothing(-0.5F, 0.5F, 100, 100));
    EXPECT_TRUE(doesNothing(0.0F, 0.5F, 100, 100));
    EXPECT_TRUE(doesNothing(-0.0F, 0.5F, 100, 100));
    EXPECT_TRUE(doesNothing(256.0F, 0.5F, 100000, 100));
    EXPECT_TRUE(doesNothing(1.5F, NAN, 100, 100));
    EXPECT_TRUE(doesNothing(1.5F, -0.25F, 100, 100));
    EXPECT_TRUE(doesNothing(1.5F, 1.0F, 100, 100)) << "samples are to be taken first";
}

INSTANTIATE_TEST_SUITE_P(Resampler, ResamplerBlocksTest,
                         testing::Values(ResamplerLanes::Eight, ResamplerLanes::Sixteen),
                         [](const auto& lanes) { return lanes.param == ResamplerLanes::Eight ? "Eight" : "Sixteen"; });

TEST(ResamplerLanesTest, OneLeavesEverythingToTheCaller) {
    std::vector<float> src(100, 0.5F);
    std::vector<float> dst(100, 0.0F);
    ResamplerRun at = {{}, src.data(), 100, dst.data(), 100, 1, 0.5F, 1.0F, 1.5F};
    qivo::resampleBlocks(at, ResamplerLanes::One);
    EXPECT_EQ(at.src, src.data());
    EXPECT_EQ(at.dst, dst.data());
    EXPECT_EQ(dst, std::vector<float>(100, 0.0F));
}

} // namespace
