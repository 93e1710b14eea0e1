#include "tools/record/PictureShape.h"
#include "tools/record/EncoderChoice.h"

#include <cmath>
#include <gst/gst.h>
#include <gtest/gtest.h>

namespace qivo::record {
namespace {

QIVOlib_video_frame_v2_t frame(int width, int height, float aspect = 0) {
    QIVOlib_video_frame_v2_t frame{};
    frame.xres = width;
    frame.yres = height;
    frame.picture_aspect_ratio = aspect;
    frame.frame_rate_D = 1;
    return frame;
}

TEST(PictureShape, IsThatOfTheFirstPicture) {
    const PictureShape shape = shapeFor(frame(1920, 1080, 16.0F / 9));
    EXPECT_EQ(shape, (PictureShape{1920, 1080, 1, 1, 30, 1}));
}

TEST(PictureShape, HasEvenSidesThatAnEncoderTakes) {
    EXPECT_EQ(shapeFor(frame(641, 361)).width, 640);
    EXPECT_EQ(shapeFor(frame(641, 361)).height, 360);
    EXPECT_EQ(shapeFor(frame(1, 3)).width, 16);
    EXPECT_EQ(shapeFor(frame(1, 3)).height, 16);
    EXPECT_EQ(shapeFor(frame(20000, 9000)).width, 8192);
}

TEST(PictureShape, PixelsThatAreNotSquareStaySo) {
    const PictureShape shape = shapeFor(frame(720, 576, 16.0F / 9));
    EXPECT_NEAR(shape.aspect(), 16.0 / 9, 0.002);
    EXPECT_NE(shape.pixelAspectN, shape.pixelAspectD);
}

TEST(PictureShape, ANonsensicalAspectOrRateIsNotBelieved) {
    for (const float aspect : {0.0F, -1.0F, 1e9F, NAN, INFINITY}) {
        EXPECT_EQ(shapeFor(frame(640, 480, aspect)).pixelAspectN, 1) << aspect;
    }
    QIVOlib_video_frame_v2_t fast = frame(640, 480);
    fast.frame_rate_N = 2'000'000'000;
    EXPECT_EQ(shapeFor(fast).rateN, 30);
    fast.frame_rate_N = -5;
    EXPECT_EQ(shapeFor(fast).rateN, 30);
}

TEST(PictureArea, OtherAspectsStandBetweenBars) {
    const PictureShape wide{1920, 1080, 1, 1, 30, 1};
    EXPECT_EQ(areaFor(16.0 / 9, wide), (PictureArea{0, 0, 1920, 1080}));
    EXPECT_EQ(areaFor(4.0 / 3, wide), (PictureArea{240, 0, 1440, 1080}));
    EXPECT_EQ(areaFor(32.0 / 9, wide), (PictureArea{0, 270, 1920, 540}));
    EXPECT_EQ(areaFor(0.1, wide).width, 108);
    EXPECT_EQ(areaFor(20, {16, 16, 1, 1, 30, 1}).height, 2) << "never nothing";
}

TEST(EncoderChoice, TheFirstThatWorksIsTaken) {
    gst_init(nullptr, nullptr);
    const PictureShape shape{320, 180, 1, 1, 30, 1};
    const std::vector<EncoderCandidate> candidates = {
        {"no-such-encoder", "", true},
        {"identity", "", true},             // there, but encodes nothing
        {"x264enc", "no-such=1", true},     // cannot be given its properties
        {"x264enc", "key-int-max=7", true}, // tried like hardware
        {"x264enc", "", false},
    };
    EXPECT_EQ(chooseEncoder(candidates, shape), &candidates[3]);
    EXPECT_EQ(chooseEncoder({candidates[0], candidates[1]}, shape), nullptr);
}

TEST(EncoderChoice, ThereIsOneOnThisMachine) {
    gst_init(nullptr, nullptr);
    const PictureShape shape{1920, 1080, 1, 1, 30, 1};
    const auto candidates = encoderCandidates(shape, 2);
    EXPECT_NE(chooseEncoder(candidates, shape), nullptr);
}

} // namespace
} // namespace qivo::record
