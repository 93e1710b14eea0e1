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

TEST(InputPlace, missingDevicesAndThingsThatAreNoneAreNamed) {
    InputPlace missing = placeOf("/dev/video-that-is-not-there");
    EXPECT_EQ(inputProblem(missing), "--input \"/dev/video-that-is-not-there\": No such file or directory; check that "
                                     "the capture device is plugged in");
    InputPlace folder = placeOf("/dev/fd");
    EXPECT_EQ(inputProblem(folder), "--input \"/dev/fd\": not a capture device; give /dev/videoN");
}

} // namespace
} // namespace qivo
