#include "tools/publish/TextMask.h"

#include <gtest/gtest.h>

#include <algorithm>

namespace qivo {
namespace {

int ink(const TextMask& mask) {
    return static_cast<int>(
        std::count_if(mask.coverage.begin(), mask.coverage.end(), [](int value) { return value > 128; }));
}

TEST(TextMask, textIsDrawnInTheHeightAskedFor) {
    const TextMask mask = renderText("Cam 1", 1000, 60);
    EXPECT_EQ(mask.height, 60);
    EXPECT_EQ(mask.coverage.size(), static_cast<std::size_t>(mask.width) * 60);
    EXPECT_GT(ink(mask), 500);
}

TEST(TextMask, longTextIsShrunkThenCut) {
    const TextMask wide = renderText("A long name", 10000, 60);
    const TextMask shrunk = renderText("A long name", wide.width * 2 / 3, 60);
    EXPECT_LE(shrunk.width, wide.width * 2 / 3);
    EXPECT_GT(ink(shrunk), 200);
    EXPECT_LE(renderText(std::string(63, 'W'), 200, 60).width, 200);
}

TEST(TextMask, emptyTextAndTinyRoomsAreNoTrouble) {
    EXPECT_EQ(ink(renderText("", 100, 20)), 0);
    EXPECT_LE(renderText("Cam", 1, 1).width, 1);
}

} // namespace
} // namespace qivo
