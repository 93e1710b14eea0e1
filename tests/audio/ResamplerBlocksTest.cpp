// What the blocks leave to their caller; that their outputs are right is seen through the resampler.

#include "audio/ResamplerBlocks.h"

#include <cmath>
#include <gtest/gtest.h>
#include <vector>

namespace {

using qivo::ResamplerRun;

class ResamplerBlocksTest : public testing::Test {
  protected:
    void SetUp() override {
#ifdef __x86_64__
        const bool wide = __builtin_cpu_supports("avx2") != 0;
#else
        const bool wide = false;
#endif
        if (!wide) {
            GTEST_SKIP() << "no blocks on this processor";
        }
    }

    ResamplerRun run(float delta, float position, int samples, int slots) {
        m_src.assign(4 + samples, 0.5F);
        m_dst.assign(slots, 0.0F);
        return {m_src.data() + 4, samples, m_dst.data(), slots, 1, position, 1.0F, delta};
    }

    std::vector<float> m_src;
    std::vector<float> m_dst;
};

TEST_F(ResamplerBlocksTest, MakeAllButTheLastFewOutputsOfAFrame) {
    for (const float delta : {0.1666667F, 0.4F, 0.5F, 0.91875F, 1.0000208F, 2.0F, 4.0F}) {
        ResamplerRun at = run(delta, delta, 1024, 8000);
        qivo::resampleBlocks(at);
        const auto made = 8000 - at.dstSlots;
        EXPECT_EQ(made % 8, 0);
        EXPECT_LE(made, std::ceil(1024 / delta));
        EXPECT_GT(made, 1024 / delta - 24 - 8 / delta) << "delta " << delta;
        EXPECT_GE(at.srcLeft, 1);
        EXPECT_EQ(at.src, m_src.data() + 4 + 1024 - at.srcLeft);
        EXPECT_EQ(at.dst, m_dst.data() + made);
        EXPECT_GE(at.position, delta);
        EXPECT_LT(at.position, 1.0F + delta);
    }
}

TEST_F(ResamplerBlocksTest, StopAtTheLastWholeEightOfTheDestination) {
    ResamplerRun at = run(0.91875F, 1.0F, 1024, 43);
    qivo::resampleBlocks(at);
    EXPECT_EQ(at.dstSlots, 3);
    EXPECT_EQ(m_dst[39], 0.5F);
    EXPECT_EQ(m_dst[40], 0.0F);
}

TEST_F(ResamplerBlocksTest, LeaveWhatTheyCannotDo) {
    const auto doesNothing = [&](float delta, float position, int samples, int slots) {
        ResamplerRun at = run(delta, position, samples, slots);
        qivo::resampleBlocks(at);
        return at.dstSlots == slots && at.srcLeft == samples && at.dst == m_dst.data();
    };
    EXPECT_FALSE(doesNothing(1.5F, 1.5F, 100, 100));
    EXPECT_TRUE(doesNothing(1.5F, 1.5F, 100, 7));
    EXPECT_TRUE(doesNothing(1.5F, 1.5F, 8, 100));
    EXPECT_TRUE(doesNothing(NAN, 1.5F, 100, 100));
    EXPECT_TRUE(doesNothing(INFINITY, 1.5F, 100, 100));
    EXPECT_TRUE(doesNothing(-0.5F, 1.5F, 100, 100));
    EXPECT_TRUE(doesNothing(256.0F, 256.0F, 100000, 100));
    EXPECT_TRUE(doesNothing(1.5F, NAN, 100, 100));
    EXPECT_TRUE(doesNothing(1.5F, 1.25F, 100, 100)) << "the last position would be negative";
    EXPECT_TRUE(doesNothing(1.5F, 3.0F, 100, 100)) << "or above 1";
}

} // namespace
