#include "tools/publish/Input.h"

#include <gtest/gtest.h>

namespace qivo {
namespace {

TEST(InputPlace, kindFollowsFromTheText) {
    EXPECT_EQ(placeOf("rtsp://h/x").kind, InputKind::stream);
    EXPECT_EQ(placeOf("/dev/video0").kind, InputKind::device);
    EXPECT_EQ(placeOf("film.mp4").kind, InputKind::file);
    EXPECT_EQ(placeOf("dir/odd://name").kind, InputKind::file);
}

TEST(InputPlace, passwordsAreNotShown) {
    EXPECT_EQ(placeOf("rtsp://user:secret@h:554/x").shown(), "rtsp://h:554/x");
    EXPECT_EQ(placeOf("rtsp://h/x@y").shown(), "rtsp://h/x@y");
    EXPECT_EQ(placeOf("a@b.mp4").shown(), "a@b.mp4");
}

// What the filter leaves of what a device says that it can do.
std::string firstOf(const char* device, const PictureFormat& wanted) {
    gst_init(nullptr, nullptr);
    const Caps can(gst_caps_from_string(device));
    const Caps asked(gst_caps_from_string(captureCaps(wanted).c_str()));
    const Caps both(gst_caps_intersect_full(asked.get(), can.get(), GST_CAPS_INTERSECT_FIRST));
    if (!both || gst_caps_is_empty(both.get())) {
        return "nothing";
    }
    const Caps first(gst_caps_copy_nth(both.get(), 0));
    const Text text(gst_caps_to_string(first.get()));
    return text.get();
}

TEST(InputPlace, deviceIsAskedForTheSizeAndRateThatWereWanted) {
    const PictureFormat wanted{{1280, 720}, {30, 1}};
    const char* camera = "video/x-raw,format=YUY2,width=640,height=480,framerate={30/1,15/1};"
                         "video/x-raw,format=YUY2,width=1280,height=720,framerate={10/1,5/1};"
                         "image/jpeg,width=1280,height=720,framerate={30/1,60/1};"
                         "image/jpeg,width=1920,height=1080,framerate=60/1";
    EXPECT_EQ(firstOf(camera, wanted), "image/jpeg, width=(int)1280, height=(int)720, framerate=(fraction)30/1");
    EXPECT_EQ(firstOf(camera, {{640, 480}, {30, 1}}), "video/x-raw, width=(int)640, height=(int)480, "
                                                      "framerate=(fraction)30/1, format=(string)YUY2");
    EXPECT_EQ(firstOf(camera, {{1280, 720}, {50, 1}}),
              "image/jpeg, width=(int)1280, height=(int)720, framerate=(fraction)60/1");
    EXPECT_EQ(firstOf(camera, {{800, 600}, {60, 1}}),
              "image/jpeg, framerate=(fraction)60/1, width=(int)1280, height=(int)720");
    EXPECT_EQ(firstOf("video/x-raw,format=YUY2,width=320,height=240,framerate=5/1", wanted),
              "video/x-raw, format=(string)YUY2, width=(int)320, height=(int)240, framerate=(fraction)5/1");
    EXPECT_EQ(firstOf("video/x-h264,width=640,height=480,framerate=15/1;"
                      "video/x-raw,format=YUY2,width=320,height=240,framerate=5/1",
                      wanted),
              "video/x-raw, format=(string)YUY2, width=(int)320, height=(int)240, framerate=(fraction)5/1");
    EXPECT_EQ(firstOf("video/x-h264,width=640,height=480,framerate=15/1", wanted),
              "video/x-h264, width=(int)640, height=(int)480, framerate=(fraction)15/1");
    EXPECT_EQ(firstOf("video/x-h265", wanted), "video/x-h265");
    EXPECT_EQ(firstOf("video/mpegts,systemstream=true", wanted), "video/mpegts, systemstream=(boolean)true");
    EXPECT_EQ(firstOf("video/x-dv,systemstream=true", wanted), "video/x-dv, systemstream=(boolean)true");
    EXPECT_EQ(firstOf("audio/x-raw", wanted), "nothing");
}

TEST(InputPlace, missingDevicesAndThingsThatAreNoneAreNamed) {
    InputPlace missing = placeOf("/dev/video-that-is-not-there");
    EXPECT_EQ(inputProblem(missing), "--input \"/dev/video-that-is-not-there\": No such file or directory; check that "
                                     "the capture device is plugged in");
    InputPlace folder = placeOf("/dev/fd");
    EXPECT_EQ(inputProblem(folder), "--input \"/dev/fd\": not a capture device; give /dev/videoN");
}

} // namespace
} // namespace qivo
