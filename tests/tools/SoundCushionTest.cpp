#include "tools/publish/SoundCushion.h"

#include <gtest/gtest.h>

#include <numeric>
#include <vector>

namespace qivo {
namespace {

constexpr int rate = 8000;
constexpr int blockLength = rate / 100; // what is taken at a time

/// Brings numbered samples, from 1, and looks at what is taken.
class SoundCushionTest : public testing::Test {
  protected:
    void add(int count) {
        std::vector<float> samples(static_cast<std::size_t>(count));
        std::iota(samples.begin(), samples.end(), static_cast<float>(m_added + 1));
        m_cushion.add(samples.data(), samples.size());
        m_added += count;
    }

    std::vector<float> take(int count = blockLength) {
        std::vector<float> samples(static_cast<std::size_t>(count), -1.0F);
        m_cushion.take(samples.data(), samples.size());
        return samples;
    }

    /// Samples that were brought after this one.
    [[nodiscard]] int ageOf(float sample) const { return m_added - static_cast<int>(sample); }

    SoundCushion m_cushion{{rate, 1}};
    int m_added = 0;
};

TEST_F(SoundCushionTest, soundBeginsOnceACushionIsThereAndGoesOnWithoutAGap) {
    float last = 0.0F;
    for (int block = 0; block < 1000; ++block) {
        if (block % 2 == 0) {
            add(2 * blockLength);
        }
        const auto taken = take();
        if (block < 4) {
            EXPECT_EQ(taken, std::vector<float>(blockLength, 0.0F)) << block;
            continue;
        }
        for (const float sample : taken) {
            ASSERT_EQ(sample, last + 1) << block;
            last = sample;
        }
    }
}

TEST_F(SoundCushionTest, whatCameBeforeAnybodyListenedIsNotHeardLate) {
    for (int i = 0; i < 30; ++i) {
        add(blockLength);
    }
    EXPECT_EQ(ageOf(take().front()), rate * SoundCushion::held.count() / 1000 - 1);
}

TEST_F(SoundCushionTest, soundOfAFasterClockDoesNotGrowOld) {
    constexpr int limit = rate * 90 / 1000; // the cushion, a piece, and what is not worth a click
    int oldest = 0;
    int leaps = 0;
    float last = 0.0F;
    // Ten minutes at 500 parts in a million: in all 300 milliseconds too much.
    for (int block = 0; block < 60000; ++block) {
        if (block % 2 == 0) {
            add(2 * blockLength + (block % 25 == 0 ? 2 : 0));
        }
        const auto taken = take();
        if (taken.front() == 0.0F) {
            ASSERT_LT(block, 10) << "silence";
            continue;
        }
        leaps += taken.front() == last + 1 ? 0 : 1;
        last = taken.back();
        oldest = std::max(oldest, ageOf(taken.front()));
    }
    EXPECT_LE(oldest, limit);
    EXPECT_LE(leaps, 40) << "it is cut more often than needed";
}

TEST_F(SoundCushionTest, largePiecesAreHeardWhole) {
    float last = 0.0F;
    for (int block = 0; block < 2000; ++block) {
        if (block % 20 == 0) {
            add(20 * blockLength);
        }
        for (const float sample : take()) {
            ASSERT_EQ(sample, last + 1) << block;
            last = sample;
        }
    }
}

TEST_F(SoundCushionTest, soundThatRanDryIsSilentUntilACushionIsThereAgain) {
    add(6 * blockLength);
    for (int block = 0; block < 6; ++block) {
        EXPECT_NE(take().back(), 0.0F);
    }
    EXPECT_EQ(take().front(), 0.0F);
    add(5 * blockLength);
    EXPECT_EQ(take().front(), 0.0F);
    add(blockLength);
    EXPECT_EQ(take().front(), 6.0F * blockLength + 1);
}

} // namespace
} // namespace qivo
