#include "tests/tools/MediaFile.h"
#include "tests/tools/Publisher.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <fstream>
#include <sstream>

namespace qivo::test {
namespace {

using namespace std::chrono_literals;

struct Outcome {
    std::optional<int> code;
    std::string output;
};

Outcome play(const std::string& command) {
    const auto process = Process::start({"/bin/sh", "-c", command + " 2>&1 </dev/null"});
    const auto code = process->wait(40s);
    return {code, process->output()};
}

/// Packets of this network namespace that the system threw away because nobody had read those before them.
long unreadPackets() {
    std::ifstream file("/proc/self/net/snmp");
    std::string names;
    std::string values;
    while (std::getline(file, names) && std::getline(file, values)) {
        std::istringstream name(names);
        std::istringstream value(values);
        std::string key;
        std::string number;
        while (name >> key && value >> number) {
            if (key == "RcvbufErrors" && names.rfind("Udp:", 0) == 0) {
                return std::stol(number);
            }
        }
    }
    ADD_FAILURE() << "the system does not count its packets";
    return 0;
}

/// Plays again where a busy machine kept the player from reading: what it then complains of never reached it.
Outcome playUndisturbed(const std::string& command) {
    constexpr int tries = 8;
    Outcome outcome;
    for (int i = 0; i < tries; ++i) {
        const long before = unreadPackets();
        outcome = play(command);
        if (unreadPackets() == before) {
            break;
        }
    }
    return outcome;
}

TEST(Peers, ffprobeReadsTheStreamsSizeRateAndColours) {
    const PublishProcess publisher({});
    const Outcome result =
        play("ffprobe -v error -select_streams v -show_entries stream=codec_name,width,height,color_space,has_b_frames "
             "-of csv=p=0 " +
             publisher.address(0));
    EXPECT_EQ(result.code, 0) << result.output;
    EXPECT_EQ(result.output, "h264,1280,720,0,bt709\n");
}

TEST(Peers, ffmpegDecodesEveryCodecOverUdpAndTcpWithoutAComplaint) {
    const PublishProcess publisher(
        {"--source", "A", "--source", "B", "--codec", "h265", "--source", "C", "--codec", "mjpeg"}, 6);
    // With the first report of the sender's clock the player moves the sound to where it belongs beside the pictures,
    // and would complain of its own times if that is back: its samples are counted anew.
    for (const std::size_t line : {0U, 1U, 2U, 4U}) {
        for (const char* transport : {"udp", "tcp"}) {
            const Outcome result =
                playUndisturbed(std::string("ffmpeg -v error -buffer_size 4000000 -rtsp_transport ") + transport +
                                " -i " + publisher.address(line) + " -frames:v 30 -af asetpts=N/SR/TB -f null -");
            EXPECT_EQ(result.code, 0) << result.output;
            EXPECT_EQ(result.output, "") << line << transport;
        }
    }
}

TEST(Peers, mpvPlaysFullAndLowStream) {
    const PublishProcess publisher({});
    for (const std::size_t line : {0U, 1U}) {
        const Outcome result =
            play("mpv --no-config --vo=null --ao=null --frames=30 --msg-level=all=warn --no-terminal " +
                 publisher.address(line));
        EXPECT_EQ(result.code, 0) << result.output;
    }
}

TEST(Peers, ffplayAsksForARangeAndIsServed) {
    const PublishProcess publisher({});
    const Outcome result =
        play("SDL_VIDEODRIVER=dummy timeout 8 ffplay -hide_banner -nostats -an -v verbose " + publisher.address(0));
    constexpr int endedByTimeout = 124;
    EXPECT_EQ(result.code, endedByTimeout) << result.output;
    EXPECT_THAT(result.output, testing::HasSubstr("Created 1280x720 texture"));
    EXPECT_THAT(result.output, testing::Not(testing::ContainsRegex("method [A-Z]+ failed")));
}

TEST(Peers, mpvPlaysALoopedFileAsALiveStream) {
    const MediaFile film("videotestsrc num-buffers=25 ! video/x-raw,format=I420,width=320,height=240,framerate=25/1 ! "
                         "x264enc ! mp4mux",
                         ".mp4");
    const PublishProcess publisher({"--input", film.path(), "--size", "320x240", "--rate", "25"});
    const Outcome result =
        play("mpv --no-config --vo=null --ao=null --frames=60 --no-terminal " + publisher.address(0));
    EXPECT_EQ(result.code, 0) << result.output;
}

} // namespace
} // namespace qivo::test
