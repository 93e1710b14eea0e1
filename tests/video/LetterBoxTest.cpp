#include "video/LetterBox.h"

#include <gtest/gtest.h>
#include <limits>

namespace qivo {

void PrintTo(const Viewport& v, std::ostream* out) {
    *out << v.x << ", " << v.y << ", " << v.width << " x " << v.height;
}

namespace test {
namespace {

constexpr float kWide = 16.0F / 9.0F;
constexpr float kNaN = std::numeric_limits<float>::quiet_NaN();
constexpr float kInfinity = std::numeric_limits<float>::infinity();
constexpr std::int32_t kSmallest = std::numeric_limits<std::int32_t>::min();
constexpr std::int32_t kLargest = std::numeric_limits<std::int32_t>::max();

TEST(LetterBoxTest, AnAreaOfThePicturesShapeIsUsedWhole) {
    EXPECT_EQ(letterBox({1920, 1080}, kWide), (Viewport{0, 0, 1920, 1080}));
}

TEST(LetterBoxTest, ASquareAreaHasBarsAboveAndBelow) {
    EXPECT_EQ(letterBox({1000, 1000}, kWide), (Viewport{0, 218, 1000, 563}));
}

TEST(LetterBoxTest, AFlatAreaHasBarsAtTheSides) {
    EXPECT_EQ(letterBox({1000, 400}, kWide), (Viewport{144, 0, 711, 400}));
}

TEST(LetterBoxTest, AnAspectOfZeroShowsNothingInTheMiddle) {
    EXPECT_EQ(letterBox({1000, 400}, 0), (Viewport{500, 0, 0, 400}));
}

TEST(LetterBoxTest, AnAreaWithoutHeightShowsNothing) {
    EXPECT_EQ(letterBox({1000, 0}, kWide), (Viewport{500, 0, 0, 0}));
}

TEST(LetterBoxTest, AnAreaWithoutWidthShowsNothing) {
    EXPECT_EQ(letterBox({0, 1000}, kWide), (Viewport{0, 500, 0, 0}));
}

TEST(LetterBoxTest, AnEmptyAreaHasNoAspectAndIsUsedWhole) {
    EXPECT_EQ(letterBox({0, 0}, kWide), (Viewport{0, 0, 0, 0}));
}

TEST(LetterBoxTest, AnAspectThatIsNoNumberUsesTheWholeArea) {
    EXPECT_EQ(letterBox({1000, 400}, kNaN), (Viewport{0, 0, 1000, 400}));
}

TEST(LetterBoxTest, AnInfiniteAspectLeavesNoHeight) {
    EXPECT_EQ(letterBox({1000, 401}, kInfinity), (Viewport{0, 200, 1000, 0}));
}

TEST(LetterBoxTest, TwoInfiniteAspectsAreEqual) {
    EXPECT_EQ(letterBox({1000, 0}, kInfinity), (Viewport{0, 0, 1000, 0}));
}

TEST(LetterBoxTest, ANegativeAspectGivesANegativeSize) {
    EXPECT_EQ(letterBox({100, 50}, -1), (Viewport{74, 0, -49, 50}));
}

TEST(LetterBoxTest, FractionsOfPixelsAreCutOff) {
    EXPECT_EQ(letterBox({1920.9, 1080.9}, kWide), (Viewport{0, 0, 1920, 1080}));
    EXPECT_EQ(letterBox({-0.9, 0.9}, kNaN), (Viewport{0, 0, 0, 0}));
}

TEST(LetterBoxTest, BarsThatCannotBeEqualDifferByOnePixel) {
    EXPECT_EQ(letterBox({101, 100}, 1), (Viewport{0, 0, 100, 100}));
    EXPECT_EQ(letterBox({100, 103}, 1), (Viewport{0, 1, 100, 100}));
}

TEST(LetterBoxTest, WhatDoesNotFitIsTakenAsTheNearestThatDoes) {
    EXPECT_EQ(letterBox({1e300, -1e300}, kNaN), (Viewport{0, 0, kLargest, kSmallest}));
    EXPECT_EQ(letterBox({std::numeric_limits<double>::quiet_NaN(), 10}, kNaN), (Viewport{0, 0, 0, 10}));
    EXPECT_EQ(letterBox({100, 50}, -kInfinity), (Viewport{1073741874, 0, kSmallest, 50}));
}

} // namespace
} // namespace test
} // namespace qivo
