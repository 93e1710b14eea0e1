#include "tests/tools/Publisher.h"
#include "tests/tools/Watcher.h"

#include "tools/publish/TestPicture.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <csignal>

namespace qivo::test {
namespace {

using namespace std::chrono_literals;

// Drawn at 30 pictures a second and sent at once, a picture is a few hundredths of a second old. A busy machine delays
// some, so the best of a series counts: a queue on the way would delay them all.
constexpr std::int64_t saneLatency = 150;
constexpr int series = 60;

void expectColours(const Frame& frame, int tolerance) {
    constexpr std::array<std::array<int, 3>, 7> bars{
        {{191, 191, 191}, {191, 191, 0}, {0, 191, 191}, {0, 191, 0}, {191, 0, 191}, {191, 0, 0}, {0, 0, 191}}};
    for (int bar = 0; bar < 7; ++bar) {
        const std::uint8_t* pixel = frame.at(frame.width * (2 * bar + 1) / 14, frame.height / 4);
        for (int channel = 0; channel < 3; ++channel) {
            EXPECT_NEAR(pixel[channel], bars[bar][channel], tolerance) << "bar " << bar << " channel " << channel;
        }
    }
}

TEST(Serving, addressesArePrintedFirstInTheirLines) {
    const PublishProcess publisher({"--machine", "STUDIO", "--source", "Cam 1", "--source", "Cam 2"}, 4);
    const auto lines = publisher.lines();
    ASSERT_EQ(lines.size(), 4U);
    EXPECT_THAT(lines[0], testing::MatchesRegex("rtsp://127\\.0\\.0\\.1:[0-9]+/source-1  STUDIO \\(Cam 1\\)"));
    EXPECT_THAT(lines[1],
                testing::MatchesRegex("rtsp://127\\.0\\.0\\.1:[0-9]+/source-1/low  STUDIO \\(Cam 1\\), low bandwidth"));
    EXPECT_THAT(lines[2], testing::MatchesRegex("rtsp://127\\.0\\.0\\.1:[0-9]+/source-2  STUDIO \\(Cam 2\\)"));
}

TEST(Serving, fullStreamHasItsSizeColoursAndACurrentClockOverUdpAndTcp) {
    const PublishProcess publisher({});
    for (const char* protocol : {"udp", "tcp"}) {
        Watcher watcher(publisher.address(0), protocol);
        std::optional<Frame> frame;
        std::vector<std::int64_t> latencies;
        for (int i = 0; i < series; ++i) {
            frame = watcher.next();
            ASSERT_TRUE(frame) << protocol;
            if (frame->latency()) {
                latencies.push_back(*frame->latency());
            }
        }
        EXPECT_EQ(frame->width, 1280);
        EXPECT_EQ(frame->height, 720);
        expectColours(*frame, 6);
        EXPECT_EQ(watcher.colorimetry(), "bt709");
        ASSERT_GT(latencies.size(), series / 2U);
        std::sort(latencies.begin(), latencies.end());
        EXPECT_GE(latencies.front(), 0);
        EXPECT_LT(latencies.front(), saneLatency) << protocol;
        RecordProperty(std::string("latency_ms_") + protocol, static_cast<int>(latencies[latencies.size() / 2]));
    }
}

TEST(Serving, lateViewerIsToldSoonWhenEachPictureWasTaken) {
    const PublishProcess publisher({});
    Watcher first(publisher.address(0));
    ASSERT_TRUE(first.next());
    Watcher watcher(publisher.address(0));
    std::optional<Frame> frame = watcher.next();
    for (int i = 0; i < 40 && frame && !frame->reported; ++i) {
        frame = watcher.next();
    }
    for (int i = 0; i < 20; ++i, frame = watcher.next()) {
        ASSERT_TRUE(frame && frame->reported);
        ASSERT_TRUE(frame->timeCode());
        EXPECT_NEAR(static_cast<double>(*frame->reported - *frame->timeCode()), 0, 20) << "milliseconds";
    }
}

TEST(Serving, lowStreamIsAQuarterOfTheSizeAtHalfTheRateWithTheSameColours) {
    const PublishProcess publisher({});
    Watcher watcher(publisher.address(1));
    const auto first = watcher.next();
    ASSERT_TRUE(first && first->timeCode());
    std::optional<Frame> frame;
    for (int i = 0; i < 15; ++i) {
        frame = watcher.next();
        ASSERT_TRUE(frame && frame->timeCode());
    }
    EXPECT_EQ(frame->width, 320);
    EXPECT_EQ(frame->height, 180);
    expectColours(*frame, 6);
    EXPECT_GT(*frame->timeCode() - *first->timeCode(), 700); // pictures lost on a busy machine only add
}

TEST(Serving, smallestPictureCarriesAReadableTimeCode) {
    const PublishProcess publisher({"--size", "512x288"});
    Watcher watcher(publisher.address(1));
    int read = 0;
    for (int i = 0; i < 20; ++i) {
        const auto frame = watcher.next();
        ASSERT_TRUE(frame);
        EXPECT_EQ(frame->width, 128);
        EXPECT_EQ(frame->height, 72);
        read += frame->timeCode() ? 1 : 0;
    }
    EXPECT_EQ(read, 20);
}

TEST(Serving, everyCodecShowsTheColoursAndTheClock) {
    const PublishProcess publisher({"--source", "H", "--codec", "h265", "--source", "J", "--codec", "mjpeg"}, 4);
    for (const std::size_t line : {0U, 2U}) {
        Watcher watcher(publisher.address(line));
        const auto frame = watcher.next();
        ASSERT_TRUE(frame);
        expectColours(*frame, 6);
        EXPECT_TRUE(frame->latency()) << line;
    }
}

TEST(Serving, picturesComeAtTheRateAndMove) {
    const PublishProcess publisher({"--rate", "25", "--size", "640x360"});
    Watcher watcher(publisher.address(0));
    const auto first = watcher.next();
    ASSERT_TRUE(first && first->timeCode());
    std::int64_t last = *first->timeCode();
    bool moved = false;
    for (int i = 0; i < 50; ++i) {
        const auto frame = watcher.next();
        ASSERT_TRUE(frame && frame->timeCode());
        EXPECT_GT(*frame->timeCode(), last);
        last = *frame->timeCode();
        const int row = frame->height * TestPicture::runnerTop / TestPicture::areaDivisor + 8;
        for (int x = 0; x < frame->width; x += 8) {
            moved = moved || std::abs(frame->at(x, row)[0] - first->at(x, row)[0]) > 100;
        }
    }
    EXPECT_TRUE(moved);
    EXPECT_GT(last - *first->timeCode(), 1700); // pictures lost on a busy machine only add
}

TEST(Serving, lateViewerSeesAPictureAtOnce) {
    // Key pictures come by themselves only once a second: whoever had to wait for those would see 15 broken pictures on
    // the average, so that six times next to none are no chance.
    constexpr int fewPictures = 5;
    const PublishProcess publisher({});
    Watcher early(publisher.address(0));
    for (int viewer = 0; viewer < 6; ++viewer) {
        ASSERT_TRUE(early.next());
        Watcher late(publisher.address(0));
        int broken = 0;
        for (auto frame = late.next(); frame && !frame->timeCode(); frame = late.next()) {
            ++broken;
        }
        EXPECT_LE(broken, fewPictures);
    }
}

TEST(Serving, twoSourcesLookDifferent) {
    const PublishProcess publisher({"--source", "A", "--source", "B"}, 4);
    Watcher a(publisher.address(0));
    Watcher b(publisher.address(2));
    const auto one = a.next();
    const auto two = b.next();
    ASSERT_TRUE(one && two);
    const std::uint8_t* left = one->at(8, one->height * 12 / 18);
    const std::uint8_t* right = two->at(8, two->height * 12 / 18);
    EXPECT_GT(std::abs(left[0] - right[0]) + std::abs(left[1] - right[1]) + std::abs(left[2] - right[2]), 60);
}

TEST(Serving, interruptTakesLeaveOfViewersAndEndsWithinASecond) {
    for (const char* protocol : {"udp", "tcp"}) {
        PublishProcess publisher({});
        Watcher watcher(publisher.address(0), protocol);
        ASSERT_TRUE(watcher.next());
        publisher.process().signal(SIGINT);
        EXPECT_EQ(publisher.process().wait(1s), 0);
        EXPECT_TRUE(watcher.waitForEnd(5s)) << protocol;
        EXPECT_EQ(publisher.process().errors(), "");
    }
}

TEST(Serving, standardOutputThatIsClosedDoesNotEndIt) {
    const auto process = Process::start(
        {"/bin/sh", "-c", "exec " + std::string(PUBLISH) + " --loopback-only --port 8777 >&-"}, {withoutLeakCheck});
    const auto deadline = std::chrono::steady_clock::now() + 10s;
    std::optional<Frame> frame;
    while (!frame && std::chrono::steady_clock::now() < deadline) {
        frame = Watcher("rtsp://127.0.0.1:8777/source-1").next(500ms);
    }
    EXPECT_TRUE(frame);
    EXPECT_TRUE(process->running());
    process->signal(SIGTERM);
    EXPECT_EQ(process->wait(2s), 0);
}

TEST(Serving, viewersThatComeAndGoLeaveItServing) {
    const PublishProcess publisher({"--size", "640x360"});
    for (int i = 0; i < 8; ++i) {
        Watcher watcher(publisher.address(i % 2), i % 3 == 0 ? "tcp" : "udp");
        ASSERT_TRUE(watcher.next()) << i;
    }
}

} // namespace
} // namespace qivo::test
