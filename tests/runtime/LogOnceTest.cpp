#include "runtime/LogOnce.h"

#include <gtest/gtest.h>

namespace {

using qivo::runtime::kLogOnceLines;
using qivo::runtime::kLogOncePeriod;
using qivo::runtime::LogOnce;

TEST(LogOnceTest, TheSameLineIsWrittenOnceAPeriod) {
    LogOnce lines;
    const auto start = LogOnce::Clock::time_point(std::chrono::hours(9));
    EXPECT_TRUE(lines.admits("a", start));
    EXPECT_FALSE(lines.admits("a", start + kLogOncePeriod - std::chrono::seconds(1)));
    EXPECT_TRUE(lines.admits("a", start + kLogOncePeriod));
}

TEST(LogOnceTest, DifferentLinesHaveABound) {
    LogOnce lines;
    const auto start = LogOnce::Clock::time_point(std::chrono::hours(9));
    for (std::size_t i = 0; i < kLogOnceLines; ++i) {
        EXPECT_TRUE(lines.admits(std::to_string(i), start));
    }
    EXPECT_FALSE(lines.admits("more", start));
    EXPECT_TRUE(lines.admits("more", start + kLogOncePeriod));
}

} // namespace
