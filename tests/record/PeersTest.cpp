// Movies of the recorder in the hands of programs that others wrote.
#include "tests/record/RecorderProcess.h"

#include <cmath>
#include <csignal>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <iterator>
#include <sstream>
#include <vector>

namespace qivo::test {
namespace {

using std::chrono::milliseconds;
using testing::HasSubstr;

struct Outcome {
    std::optional<int> code;
    std::string output;
};

Outcome shell(const std::string& command) {
    const auto process = Process::start({"/bin/sh", "-c", command + " 2>&1 </dev/null"});
    const auto code = process->wait(std::chrono::seconds(40));
    return {code, process->output()};
}

/// Some two seconds of a movie, finished or cut off.
std::string record(RecorderProcess& recorder, bool kill) {
    EXPECT_TRUE(recorder.waitForLength(milliseconds(1800))) << recorder.process().errors();
    if (kill) {
        recorder.process().signal(SIGKILL);
        recorder.process().wait(std::chrono::seconds(10));
    } else {
        EXPECT_EQ(recorder.interrupt(), 0);
    }
    return "'" + recorder.moviePath() + "'";
}

class RecorderPeers : public testing::TestWithParam<bool> {};

TEST_P(RecorderPeers, FfprobeFfmpegAndMpvReadTheMovieWithoutAComplaint) {
    RecorderProcess recorder("picture=320x180@30 sound=48000x2");
    const std::string movie = record(recorder, GetParam());
    const Outcome streams = shell("ffprobe -v error -show_entries "
                                  "format=format_name:stream=codec_name,width,height,color_space,sample_rate,channels "
                                  "-of compact=nk=1 " +
                                  movie);
    EXPECT_EQ(streams.output,
              "stream|h264|320|180|smpte170m\nstream|pcm_s24be|48000|2\nformat|mov,mp4,m4a,3gp,3g2,mj2\n");
    const Outcome length = shell("ffprobe -v error -show_entries format=duration -of csv=p=0 " + movie);
    EXPECT_NEAR(std::atof(length.output.c_str()), 1.9, 0.9);
    EXPECT_EQ(shell("ffmpeg -v error -i " + movie + " -f null -").output, "");
    const Outcome played =
        shell("mpv --no-config --vo=null --ao=null --untimed --msg-level=all=warn --term-status-msg= " + movie);
    EXPECT_EQ(played.code, 0) << played.output;
    EXPECT_THAT(played.output, testing::Not(HasSubstr("rror")));
    const Outcome seeked = shell(
        "ffprobe -v error -read_intervals 1%+0.2 -select_streams v -show_entries packet=pts_time -of csv=p=0 " + movie);
    EXPECT_NE(seeked.output, "") << "pictures are found from the middle on";
}

/// Numbers, one a line.
std::vector<double> numbersIn(const std::string& text) {
    std::vector<double> numbers;
    std::istringstream lines(text);
    for (std::string line; std::getline(lines, line);) {
        numbers.push_back(std::atof(line.c_str()));
    }
    return numbers;
}

TEST_P(RecorderPeers, PicturesHaveTheTimesOfTheClockInThem) {
    RecorderProcess recorder("picture=320x180@30 sound=48000x2 gone=800-1300");
    const std::string movie = record(recorder, GetParam());
    const DecodedMovie decoded = recorder.movie();
    ASSERT_TRUE(decoded.readable) << decoded.error;
    const auto times = numbersIn(
        shell("ffprobe -v error -select_streams v -show_entries packet=pts_time -of csv=p=0 " + movie).output);
    ASSERT_EQ(times.size(), decoded.pictures.size());
    ASSERT_GE(times.size(), 25U);
    for (std::size_t i = 0; i < times.size(); ++i) {
        ASSERT_TRUE(decoded.pictures[i].published && decoded.pictures[0].published);
        EXPECT_NEAR(times[i] - times[0],
                    static_cast<double>(*decoded.pictures[i].published - *decoded.pictures[0].published) * 1e-3, 0.040);
    }
    const auto length = numbersIn(shell("ffprobe -v error -show_entries format=duration -of csv=p=0 " + movie).output);
    ASSERT_EQ(length.size(), 1U);
    EXPECT_GE(length[0], times.back());
    EXPECT_LE(length[0], times.back() + 0.25);
}

TEST_P(RecorderPeers, SoundOfAHighRateIsReadWholeAndAtItsRate) {
    RecorderProcess recorder("picture=320x180@30 sound=96000x2");
    const std::string movie = record(recorder, GetParam());
    const Outcome stream = shell("ffprobe -v error -select_streams a -show_entries "
                                 "stream=codec_name,sample_rate,channels -of csv=p=0 " +
                                 movie);
    EXPECT_EQ(stream.output, "pcm_s24be,96000,2\n");
    const std::string samples = recorder.folder().path("samples");
    EXPECT_EQ(shell("ffmpeg -v error -i " + movie + " -vn -f f32le -ac 1 " + samples).output, "");
    std::ifstream file(samples, std::ios::binary);
    const std::string bytes(std::istreambuf_iterator<char>(file), {});
    const std::size_t count = bytes.size() / sizeof(float);
    EXPECT_GE(count, std::size_t{96000} * 12 / 10);
    EXPECT_LE(count, std::size_t{96000} * 3);
    // In the first tenth of each second a tone of 1000 Hz: from silence to silence.
    std::vector<float> values(count);
    std::memcpy(values.data(), bytes.data(), count * sizeof(float));
    std::size_t begin = count / 4;
    while (begin < count && std::abs(values[begin]) < 0.01F) {
        ++begin;
    }
    ASSERT_LT(begin + 9600, count);
    int rising = 0;
    for (std::size_t i = begin; i < begin + 9600; ++i) {
        rising += values[i - 1] <= 0 && values[i] > 0 ? 1 : 0;
    }
    EXPECT_NEAR(rising, 100, 1);
}

INSTANTIATE_TEST_SUITE_P(FinishedAndKilled, RecorderPeers, testing::Bool());

TEST(RecorderPeersOnTheNetwork, PictureAndSoundOfASourceOnTheNetworkAreTogether) {
    const TemporaryDirectory folder;
    const std::string clip = folder.path("clip.mov");
    // In the first tenth of each second white pictures and a tone.
    const Outcome made =
        shell("ffmpeg -v error -f lavfi -i \"color=c=0x303030:s=320x180:r=30:d=4,drawbox=c=white:t=fill:"
              "enable='lt(mod(t,1),0.0999)'\" -f lavfi -i \"aevalsrc='if(lt(mod(t,1),0.1),"
              "0.5*sin(2*PI*1000*t),0)':s=48000:d=4\" -c:v libx264 -preset ultrafast -bf 0 -g 30 -pix_fmt "
              "yuv420p -c:a pcm_s16le " +
              clip);
    ASSERT_EQ(made.code, 0) << made.output;
    const auto publisher = Process::start({PUBLISH, "--loopback-only", "--port", "0", "--machine", "STUDIO", "--source",
                                           "Cam 1", "--size", "320x180", "--input", clip});
    ASSERT_TRUE(publisher && publisher->waitForOutput("(Cam 1)"));
    RecorderProcess recorder("", "STUDIO (Cam 1)", "exec \"$@\"", "");
    ASSERT_TRUE(recorder.waitForLength(milliseconds(4500))) << recorder.process().errors();
    EXPECT_EQ(recorder.interrupt(), 0);
    const DecodedMovie movie = recorder.movie();
    ASSERT_TRUE(movie.readable) << movie.error;
    // The sender reports its clock within a second. Before that the two are together as they arrive, and pictures are
    // decoded, which takes a busy machine longer.
    constexpr double reported = 1.5;
    auto seen = flashes(movie);
    std::erase_if(seen, [](double flash) { return flash < reported; });
    const auto heard = tones(movie);
    ASSERT_GE(seen.size(), 2U);
    for (const double flash : seen) {
        double nearest = 1e9;
        for (const double tone : heard) {
            nearest = std::abs(tone - flash) < std::abs(nearest) ? tone - flash : nearest;
        }
        EXPECT_NEAR(nearest, 0, 0.040) << "the tone after the flash at " << flash << " s";
        RecordProperty("offset_us", static_cast<int>(nearest * 1e6));
    }
}

} // namespace
} // namespace qivo::test
