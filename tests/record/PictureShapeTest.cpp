#include "tools/record/PictureShape.h"
#include "tools/record/EncoderChoice.h"
#include "tools/record/Handles.h"

#include <cmath>
#include <gmock/gmock.h>
#include <gst/gst.h>
#include <gtest/gtest.h>

namespace qivo::record {
namespace {

using testing::MatchesRegex;

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

const PictureShape kSmall{320, 180, 1, 1, 30, 1};
const std::atomic<bool> kGoesOn = false;
// Nothing comes out of it, not even an end.
const EncoderCandidate kHangs{"x264enc", "! valve drop=true", true};

TEST(EncoderChoice, TheFirstThatWorksIsTaken) {
    gst_init(nullptr, nullptr);
    const std::vector<EncoderCandidate> candidates = {
        {"no-such-encoder", "", true},
        {"identity", "", true},             // there, but encodes nothing
        {"x264enc", "no-such=1", true},     // cannot be given its properties
        {"x264enc", "key-int-max=7", true}, // tried like hardware
        {"x264enc", "", false},
    };
    const EncoderChoice choice = chooseEncoder(candidates, kSmall, kGoesOn);
    ASSERT_TRUE(choice.encoder);
    EXPECT_EQ(choice.encoder->properties, "key-int-max=7");
    EXPECT_THAT(choice.passedOver, MatchesRegex("identity \\(.+\\), x264enc \\(no property \"no-such\" in .*\\)"))
        << "and nothing of what is not installed";
    EXPECT_FALSE(chooseEncoder({candidates[0], candidates[1]}, kSmall, kGoesOn).encoder);
}

TEST(EncoderChoice, OneThatFailsOrSwallowsPicturesIsPassedOverAtOnce) {
    gst_init(nullptr, nullptr);
    const auto began = std::chrono::steady_clock::now();
    const EncoderChoice choice = chooseEncoder(
        {{"x264enc", "! identity error-after=2", true}, {"x264enc", "! identity drop-probability=1", true}}, kSmall,
        kGoesOn);
    EXPECT_LT(std::chrono::steady_clock::now() - began, trialLimit);
    EXPECT_FALSE(choice.encoder);
    EXPECT_THAT(choice.passedOver, MatchesRegex("x264enc \\(Failed after .*\\), x264enc \\(swallows pictures\\)"));
}

TEST(EncoderChoice, AllThatHangTakeNoLongerThanOne) {
    gst_init(nullptr, nullptr);
    const auto began = std::chrono::steady_clock::now();
    const EncoderChoice choice = chooseEncoder({kHangs, kHangs, kHangs, {"x264enc", "", false}}, kSmall, kGoesOn);
    EXPECT_LT(std::chrono::steady_clock::now() - began, 2 * trialLimit);
    ASSERT_TRUE(choice.encoder);
    EXPECT_FALSE(choice.encoder->hardware);
    EXPECT_EQ(choice.passedOver, "x264enc (takes too long), x264enc (takes too long), x264enc (takes too long)");
}

TEST(EncoderChoice, ATrialEndsWhenItIsNotWantedAnyMore) {
    gst_init(nullptr, nullptr);
    const std::atomic<bool> stopped = true;
    const auto began = std::chrono::steady_clock::now();
    EXPECT_FALSE(chooseEncoder({kHangs}, kSmall, stopped).encoder);
    EXPECT_LT(std::chrono::steady_clock::now() - began, trialLimit / 2);
}

TEST(EncoderChoice, ThereIsOneOnThisMachine) {
    gst_init(nullptr, nullptr);
    const PictureShape shape{1920, 1080, 1, 1, 30, 1};
    EXPECT_TRUE(chooseEncoder(encoderCandidates(shape, 2), shape, kGoesOn).encoder);
}

/// Those of hardware exist only where the hardware does.
TEST(EncoderChoice, EveryElementTakesItsProperties) {
    gst_init(nullptr, nullptr);
    int parsed = 0;
    for (const unsigned processors : {1U, 2U, 16U}) {
        for (const EncoderCandidate& candidate : encoderCandidates(kSmall, processors)) {
            const Media<GstElementFactory> factory(gst_element_factory_find(candidate.element.c_str()));
            if (!factory) {
                continue;
            }
            GError* error = nullptr;
            const Media<GstElement> pipeline(gst_parse_launch(encoderPipeline(candidate).c_str(), &error));
            const Media<GError> owned(error);
            EXPECT_FALSE(owned) << candidate.element << ": " << owned->message;
            ++parsed;
        }
    }
    EXPECT_GE(parsed, 3);
}

} // namespace
} // namespace qivo::record
