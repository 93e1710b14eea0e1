#include "tools/publish/Stream.h"

#include <gtest/gtest.h>

namespace qivo {
namespace {

TEST(Stream, keyPicturesComeEverySecond) {
    const std::string pipeline = encoderPipeline({{1280, 720}, {30000, 1001}, bt709}, Codec::h264);
    EXPECT_NE(pipeline.find(" key-int-max=29 "), std::string::npos) << pipeline;
    EXPECT_NE(encoderPipeline({{1280, 720}, {1, 1}, bt709}, Codec::h264).find(" key-int-max=1 "), std::string::npos);
}

TEST(Stream, bitRateFollowsTheSizeAndRateWithAFloor) {
    EXPECT_EQ(bitRateFor({{1920, 1080}, {30, 1}, bt709}), 7465);
    EXPECT_EQ(bitRateFor({{1920, 1080}, {60, 1}, bt709}), 14930);
    EXPECT_EQ(bitRateFor({{128, 72}, {15, 1}, bt601}), 400);
}

TEST(Stream, everyPipelineConsistsOfTheElementsThatItNeeds) {
    for (const Codec codec : {Codec::h264, Codec::h265, Codec::mjpeg}) {
        const std::string pipeline = encoderPipeline({{1280, 720}, {30, 1}, bt709}, codec);
        for (const NeededElement& element : elementsFor(codec)) {
            const bool servers = std::string(element.name) == "rtpbin" || std::string(element.name) == "udpsink";
            EXPECT_TRUE(servers || pipeline.find(element.name) != std::string::npos) << element.name;
        }
    }
}

TEST(Stream, soundIsInThePipelineWhereItIsWanted) {
    const PictureFormat format{{1280, 720}, {30, 1}, bt709};
    EXPECT_EQ(encoderPipeline(format, Codec::h264).find("pay1"), std::string::npos);
    EXPECT_NE(encoderPipeline(format, Codec::h264, SoundCodec::opus).find("opusenc"), std::string::npos);
}

} // namespace
} // namespace qivo
