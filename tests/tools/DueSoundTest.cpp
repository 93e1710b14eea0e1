#include "tools/publish/DueSound.h"

#include <gtest/gtest.h>

#include <array>
#include <numeric>
#include <vector>

namespace qivo {
namespace {

using namespace std::chrono_literals;

constexpr int rate = 8000;
constexpr int blockLength = rate / 100; // what is taken at a time
const DueSound::Time start{100h};

/// Brings samples that tell when they are due: numbered from `start`, whose number is one. And looks at what is taken.
class DueSoundTest : public testing::Test {
  protected:
    static int numberOf(std::chrono::microseconds due) { return static_cast<int>(due.count() * rate / 1'000'000); }

    /// Brings what is due from `due` on; told as due `wrong` later.
    void add(std::chrono::microseconds due, int count, std::chrono::microseconds wrong = 0us) {
        std::vector<float> samples(static_cast<std::size_t>(count));
        std::iota(samples.begin(), samples.end(), static_cast<float>(numberOf(due) + 1));
        m_sound.add(samples.data(), samples.size(), start + due + wrong);
    }

    std::vector<float> take(std::chrono::microseconds due, int count = blockLength) {
        std::vector<float> samples(static_cast<std::size_t>(count), -1.0F);
        m_sound.take(samples.data(), samples.size(), start + due);
        return samples;
    }

    static std::vector<float> from(std::chrono::microseconds due, int count = blockLength) {
        std::vector<float> samples(static_cast<std::size_t>(count));
        std::iota(samples.begin(), samples.end(), static_cast<float>(numberOf(due) + 1));
        return samples;
    }

    const std::vector<float> m_silence = std::vector<float>(blockLength, 0.0F);
    DueSound m_sound{{rate, 1}};
};

TEST_F(DueSoundTest, piecesOfAnyLengthAreTakenWhenTheyAreDue) {
    constexpr std::array<int, 5> pieces{341, 171, 7, 1600, 13};
    int added = 0;
    std::size_t piece = 0;
    for (int block = 0; block < 60000; ++block) {
        for (; added < (block + 1) * blockLength; added += pieces.at(piece++ % pieces.size())) {
            add(std::chrono::microseconds(added * std::int64_t{125}), pieces.at(piece % pieces.size()));
        }
        ASSERT_EQ(take(block * 10ms), from(block * 10ms)) << block;
    }
}

TEST_F(DueSoundTest, whatCameBeforeAnybodyTookIsLeftOut) {
    for (int block = 0; block < 30; ++block) {
        add(block * 10ms, blockLength);
    }
    EXPECT_EQ(take(200ms), from(200ms));
}

TEST_F(DueSoundTest, silenceUntilTheFirstIsDue) {
    add(25ms, 2 * blockLength);
    EXPECT_EQ(take(0ms), m_silence);
    EXPECT_EQ(take(10ms), m_silence);
    const auto first = take(20ms);
    EXPECT_EQ(first[blockLength / 2 - 1], 0.0F);
    EXPECT_EQ(first[blockLength / 2], static_cast<float>(numberOf(25ms) + 1));
    EXPECT_EQ(take(30ms), from(30ms));
}

TEST_F(DueSoundTest, betweenTwoRoundsOfALoopThereIsSilenceAndNothingMoves) {
    add(0ms, 4 * blockLength);
    EXPECT_EQ(take(0ms), from(0ms));
    add(90ms, 4 * blockLength); // while the end of the last round is held
    for (const auto due : {10ms, 20ms, 30ms}) {
        EXPECT_EQ(take(due), from(due));
    }
    for (int block = 4; block < 9; ++block) {
        EXPECT_EQ(take(block * 10ms), m_silence) << block;
    }
    EXPECT_EQ(take(90ms), from(90ms));
}

TEST_F(DueSoundTest, timesThatAreToldRoughlyMakeNoBreak) {
    for (int block = 0; block < 100; ++block) {
        add(block * 10ms, blockLength, (block % 3 - 1) * 700us + (block == 0 ? 700us : 0us));
        EXPECT_EQ(take(block * 10ms), from(block * 10ms)) << block;
    }
}

TEST_F(DueSoundTest, whatOverlapsIsGivenOnce) {
    add(0ms, 4 * blockLength);
    add(20ms, 4 * blockLength);
    for (int block = 0; block < 6; ++block) {
        EXPECT_EQ(take(block * 10ms), from(block * 10ms)) << block;
    }
    EXPECT_EQ(take(60ms), m_silence);
}

TEST_F(DueSoundTest, pieceThatComesTooLateIsHeardLateUntilOneComesInTime) {
    EXPECT_EQ(take(0ms), m_silence);
    EXPECT_EQ(take(10ms), m_silence);
    add(0ms, 4 * blockLength);
    EXPECT_EQ(take(20ms), from(0ms));
    add(40ms, 4 * blockLength);
    EXPECT_EQ(take(30ms), from(10ms));
    EXPECT_EQ(take(40ms), from(20ms));
    EXPECT_EQ(take(50ms), from(30ms));
    EXPECT_EQ(take(60ms), from(60ms));
}

TEST_F(DueSoundTest, piecesThatAllComeTooLateAreHeardWithoutGaps) {
    for (const auto delay : {15ms, 35ms, 90ms}) {
        m_sound.clear();
        auto now = 1s + 0ms;
        take(now);
        now += 10ms;
        auto due = now - delay;
        auto heard = due;
        for (int piece = 0; piece < 20; ++piece, due += 20ms) {
            add(due, 2 * blockLength);
            for (int block = 0; block < 2; ++block, now += 10ms, heard += 10ms) {
                EXPECT_EQ(take(now), from(heard)) << delay.count() << ", " << piece;
            }
        }
    }
}

TEST_F(DueSoundTest, takerWhoMissedSomeGoesOnWithWhatIsDue) {
    add(0ms, 60 * blockLength);
    EXPECT_EQ(take(0ms), from(0ms));
    EXPECT_EQ(take(12ms), from(10ms)) << "about there";
    EXPECT_EQ(take(300ms), from(300ms));
    EXPECT_EQ(take(100ms), m_silence) << "that is gone";
    EXPECT_EQ(take(310ms), from(310ms));
}

TEST_F(DueSoundTest, whatNobodyTakesDoesNotGrow) {
    const auto all = std::chrono::milliseconds(DueSound::most);
    add(0ms, rate);
    add(1s, rate);
    add(2s, rate);
    EXPECT_EQ(take(3s - all - 10ms), m_silence);
    EXPECT_EQ(take(3s - all), from(3s - all));
    add(100h, blockLength);
    EXPECT_EQ(take(100h), from(100h));
}

TEST_F(DueSoundTest, channelsStayTogether) {
    DueSound sound({rate, 2});
    const std::vector<float> pairs{1, -1, 2, -2, 3, -3, 4, -4};
    sound.add(pairs.data(), pairs.size(), start);
    std::vector<float> taken(6);
    sound.take(taken.data(), taken.size(), start - 125us);
    EXPECT_EQ(taken, (std::vector<float>{0, 0, 1, -1, 2, -2}));
    sound.take(taken.data(), taken.size(), start + 250us);
    EXPECT_EQ(taken, (std::vector<float>{3, -3, 4, -4, 0, 0}));
}

} // namespace
} // namespace qivo
