#include "tools/publish/Pacer.h"

#include <gtest/gtest.h>

namespace qivo {
namespace {

using namespace std::chrono_literals;

const Pacer::Time start{5s};

TEST(Pacer, picturesAreDueAtTheRate) {
    Pacer pacer({25, 1}, start);
    EXPECT_EQ(pacer.next(start) - start, 0ms);
    EXPECT_EQ(pacer.next(start + 1ms) - start, 40ms);
    EXPECT_EQ(pacer.next(start + 41ms) - start, 80ms);
}

TEST(Pacer, lateAnswersDoNotShiftTheGrid) {
    Pacer pacer({30000, 1001}, start);
    Pacer::Time due = start;
    for (int i = 0; i <= 30000; ++i) {
        due = pacer.next(due + 3ms);
    }
    EXPECT_EQ(due - start, 1001s);
}

TEST(Pacer, missedPicturesAreSkippedNotQueued) {
    Pacer pacer({25, 1}, start);
    EXPECT_EQ(pacer.next(start) - start, 0ms);
    EXPECT_EQ(pacer.next(start + 205ms) - start, 200ms);
    EXPECT_EQ(pacer.next(start + 206ms) - start, 240ms);
}

TEST(Pacer, doesNotOverflowWithinYears) {
    Pacer pacer({240000, 1001}, start);
    const auto years = std::chrono::hours(24 * 365 * 20);
    const auto due = pacer.next(start + years);
    EXPECT_LE(due - start, years);
    EXPECT_GT(due - start, years - 5ms);
}

} // namespace
} // namespace qivo
