// The recorder with the libqivo that ships and a source on the network.
#include "tests/record/RecorderProcess.h"
#include "tests/support/Tone.h"

#include <cmath>
#include <csignal>
#include <gtest/gtest.h>

namespace qivo::test {
namespace {

using std::chrono::milliseconds;

TEST(RecorderOnTheNetwork, ThePublishedClockAndToneRunThroughTheMovie) {
    const auto publisher = Process::start(
        {PUBLISH, "--loopback-only", "--port", "0", "--machine", "STÜDIO 😀", "--source", "Cam 1", "--size", "640x360"});
    ASSERT_TRUE(publisher && publisher->waitForOutput("(Cam 1)"));
    RecorderProcess recorder("", "STÜDIO 😀 (Cam 1)", "exec \"$@\"", "");
    ASSERT_TRUE(recorder.waitForLength(milliseconds(2500))) << recorder.process().errors();
    EXPECT_EQ(recorder.interrupt(), 0) << recorder.process().errors();
    EXPECT_LT(recorder.ending(), milliseconds(1000));
    const DecodedMovie movie = recorder.movie();
    ASSERT_TRUE(movie.readable) << movie.error;
    EXPECT_EQ(movie.width, 640);
    EXPECT_EQ(movie.height, 360);
    ASSERT_GE(movie.pictures.size(), 30U);
    const auto& middle = movie.pictures[movie.pictures.size() / 2];
    std::int64_t last = 0;
    for (const auto& picture : movie.pictures) {
        ASSERT_TRUE(picture.published && middle.published) << picture.time;
        EXPECT_GT(*picture.published, last);
        last = *picture.published;
        EXPECT_NEAR(picture.time - middle.time, static_cast<double>(*picture.published - *middle.published) * 1e-3,
                    0.040);
    }
    // The publisher draws thirty a second, and what it draws is there. On a busy machine one may be replaced by the
    // next before it is taken, or drawn a tick late.
    const auto span = *movie.pictures.back().published - *movie.pictures.front().published;
    EXPECT_NEAR(static_cast<double>(movie.pictures.size()), std::round(static_cast<double>(span) * 30e-3) + 1, 1);
    EXPECT_LT(movie.soundJump, 0.001);
    EXPECT_NEAR(movie.soundEnd(), movie.pictures.back().time, 0.3);
    // Its first channel, without a break once the first packets have come. Where the machine is busy single samples are
    // left out to keep it in place, which makes a step twice as high.
    ASSERT_GE(movie.sound.size(), static_cast<std::size_t>(movie.rate));
    const std::vector<float> tone(movie.sound.end() - movie.rate, movie.sound.end());
    EXPECT_NEAR(frequencyOf(tone, movie.rate), 440, 1);
    EXPECT_LT(largestStep(tone), 2 * std::sin(M_PI * 440 / movie.rate) * 0.1 * 2.2);
}

TEST(RecorderOnTheNetwork, APublisherThatIsStartedAgainGoesOnInTheSameMovie) {
    const std::vector<std::string> command = {PUBLISH,  "--loopback-only", "--port", "0",      "--machine",
                                              "STUDIO", "--source",        "Cam 1",  "--size", "320x180"};
    auto publisher = Process::start(command);
    ASSERT_TRUE(publisher && publisher->waitForOutput("(Cam 1)"));
    RecorderProcess recorder("", "STUDIO (Cam 1)", "exec \"$@\"", "");
    ASSERT_TRUE(recorder.waitForLength(milliseconds(1000))) << recorder.process().errors();
    publisher->signal(SIGTERM);
    EXPECT_EQ(publisher->wait(std::chrono::seconds(10)), 0);
    ASSERT_TRUE(recorder.process().waitForOutput("waiting for the source to come back"));
    publisher = Process::start(command);
    ASSERT_TRUE(publisher && publisher->waitForOutput("(Cam 1)"));
    const auto before = recorder.length();
    ASSERT_TRUE(recorder.waitForLength(before + milliseconds(2500))) << recorder.process().errors();
    EXPECT_EQ(recorder.interrupt(), 0) << recorder.process().errors();
    const DecodedMovie movie = recorder.movie();
    ASSERT_TRUE(movie.readable) << movie.error;
    double longest = 0;
    std::size_t after = 0; // the first picture after the gap
    for (std::size_t i = 1; i < movie.pictures.size(); ++i) {
        if (movie.pictures[i].time - movie.pictures[i - 1].time > longest) {
            longest = movie.pictures[i].time - movie.pictures[i - 1].time;
            after = i;
        }
    }
    EXPECT_GE(longest, 1.0) << "the gap that was told";
    EXPECT_GE(after, 15U) << "pictures before it";
    ASSERT_GE(movie.pictures.size() - after, 10U) << "and behind it";
    const auto& first = movie.pictures.at(after / 2);
    for (const auto& picture : movie.pictures) {
        ASSERT_TRUE(picture.published && first.published) << picture.time;
        EXPECT_NEAR(picture.time - first.time, static_cast<double>(*picture.published - *first.published) * 1e-3, 0.1)
            << "across the gap";
    }
    EXPECT_LT(movie.soundJump, 0.001);
}

} // namespace
} // namespace qivo::test
