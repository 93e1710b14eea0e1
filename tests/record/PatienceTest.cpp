// The recorder as a process, for as long as it waits for a source that was there.
#include "tests/record/RecorderProcess.h"

#include <cstdio>
#include <gtest/gtest.h>

namespace qivo::test {
namespace {

using std::chrono::seconds;

TEST(RecorderPatience, EndsByItselfWithAFinishedMovieAMinuteAfterTheSourceHasGone) {
    RecorderProcess recorder("picture=160x90@30 sound=8000x1 until=400");
    ASSERT_TRUE(recorder.process().waitForOutput("waiting for the source to come back")) << recorder.process().errors();
    EXPECT_EQ(recorder.process().wait(seconds(55)), std::nullopt);
    EXPECT_EQ(recorder.process().wait(seconds(10)), 0);
    EXPECT_EQ(recorder.complaints(),
              "Application.Mac.QIVO.Recording: \"STUDIO (Cam 1)\" has gone: the movie is finished\n");
    const DecodedMovie movie = recorder.movie();
    EXPECT_TRUE(movie.readable) << movie.error;
    // The source makes twelve. Those that come at once because the encoder was slow to start may be left out, and are
    // told.
    unsigned pictures = 0;
    unsigned dropped = 0;
    ASSERT_EQ(std::sscanf(recorder.lastProgress().c_str(), "time %*s pictures %u dropped %u", &pictures, &dropped), 2);
    EXPECT_EQ(pictures + dropped, 12U);
    EXPECT_GE(pictures, 6U);
    EXPECT_EQ(movie.pictures.size(), pictures);
}

} // namespace
} // namespace qivo::test
