#include "tools/publish/Colour.h"

#include <gmock/gmock.h>

namespace qivo {
namespace {

using testing::ElementsAre;

// The figures of 75 % bars as broadcasters' tables give them.
TEST(Colour, barsHaveTheLevelsOfTheirStandards) {
    EXPECT_THAT(toYCbCr({0.75, 0.75, 0.75}, bt709), ElementsAre(180, 128, 128));
    EXPECT_THAT(toYCbCr({0.75, 0.75, 0}, bt709), ElementsAre(168, 44, 136));
    EXPECT_THAT(toYCbCr({0, 0, 0.75}, bt709), ElementsAre(28, 212, 120));
    EXPECT_THAT(toYCbCr({0.75, 0.75, 0}, bt601), ElementsAre(162, 44, 142));
    EXPECT_THAT(toYCbCr({0.75, 0, 0}, bt601), ElementsAre(65, 100, 212));
}

TEST(Colour, fullRangeUsesEveryLevel) {
    EXPECT_THAT(toYCbCr({0, 0, 0}, jpegColours), ElementsAre(0, 128, 128));
    EXPECT_THAT(toYCbCr({1, 1, 1}, jpegColours), ElementsAre(255, 128, 128));
    EXPECT_THAT(toYCbCr({1, 0, 0}, jpegColours), ElementsAre(76, 85, 255));
}

TEST(Colour, highPicturesUseBt709) {
    EXPECT_STREQ(colourSpaceFor(576).colorimetry, "bt601");
    EXPECT_STREQ(colourSpaceFor(578).colorimetry, "bt709");
}

TEST(Colour, huesGoAroundTheCircle) {
    const auto is = [](const Colour& colour, double red, double green, double blue) {
        EXPECT_NEAR(colour.red, red, 1e-9);
        EXPECT_NEAR(colour.green, green, 1e-9);
        EXPECT_NEAR(colour.blue, blue, 1e-9);
    };
    is(fromHue(0, 1, 1), 1, 0, 0);
    is(fromHue(1.0 / 3, 1, 1), 0, 1, 0);
    is(fromHue(5.0 / 3, 1, 0.5), 0, 0, 0.5);
    is(fromHue(0.5, 0.5, 1), 0.5, 1, 1);
}

} // namespace
} // namespace qivo
