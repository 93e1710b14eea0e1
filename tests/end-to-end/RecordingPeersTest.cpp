// What players that others wrote make of a recording.
#include "tests/end-to-end/RecordingFixture.h"

#include <csignal>
#include <cstdlib>

namespace qivo::test {
namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;

class RecordingPeersTest : public RecordingViewerTest {
  protected:
    /// What a program says on standard output; it must say nothing on standard error and end with success.
    static std::string said(const std::vector<std::string>& command) {
        const auto program = Process::start(command);
        EXPECT_EQ(program->wait(seconds(40)), 0);
        EXPECT_EQ(program->errors(), "") << command.front();
        return program->output();
    }

    static double lengthOf(const std::filesystem::path& movie) {
        return std::atof(
            said({"/usr/bin/ffprobe", "-v", "error", "-show_entries", "format=duration", "-of", "csv=p=0", movie})
                .c_str());
    }

    static void expectToPlay(const std::filesystem::path& movie) {
        EXPECT_EQ(said({"/usr/bin/ffprobe", "-v", "error", "-show_entries", "stream=codec_name,width,height,channels",
                        "-of", "csv=p=0", movie}),
                  "h264,640,360\npcm_s24be,2\n");
        said({"/usr/bin/ffmpeg", "-v", "error", "-i", movie, "-fps_mode", "passthrough", "-enc_time_base", "-1", "-f",
              "null", "-"});
        said({"/usr/bin/mpv", "--no-config", "--no-terminal", "--msg-level=all=error", "--vo=null", "--ao=null",
              "--untimed", movie});
    }
};

TEST_F(RecordingPeersTest, FinishedMovieAndOneWhoseRecorderWasKilledPlay) {
    const auto publisher = publishAndShow("STUDIO", {"Cam 1"});
    startRecording();
    recordFor(milliseconds(1500));
    clickRecordSwitch();
    expectToPlay(movie());
    EXPECT_GE(lengthOf(movie()), 1.4);
    startRecording();
    recordFor(milliseconds(1200));
    const auto killed = recorder();
    ASSERT_TRUE(killed);
    kill(*killed, SIGKILL);
    ASSERT_TRUE(eventually([&] { return !recorder(); }));
    ASSERT_FALSE(isFinished(movie()));
    expectToPlay(movie());
}

} // namespace
} // namespace qivo::test
