// A recording in this process, so that its time is the test's.
#include "tests/platform/TemporaryDirectory.h"
#include "tests/record/MovieReader.h"
#include "tests/record/SlowDisk.h"
#include "tests/support/Screen.h"
#include "tools/record/Recorder.h"

#include <csignal>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <thread>
#include <unistd.h>

namespace qivo::record {
namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;

class SessionTest : public testing::Test {
  protected:
    /// These encoders are there in the place of all others.
    void start(const std::string& script, const std::vector<EncoderCandidate>& encoders) {
        m_encoders = encoders;
        start(script);
    }
    void start(const std::string& script) {
        setenv("QIVO_STAND_IN", script.c_str(), 1);
        gst_init(nullptr, nullptr);
        Recorder::Settings settings{"A"};
        if (!m_encoders.empty()) {
            settings.encoders = [this](const PictureShape&, unsigned) { return m_encoders; };
        }
        m_recorder.emplace(settings, MoviePlace("A", m_path));
    }
    bool waitsFor(const std::string& what) {
        return test::eventually([&] { return m_recorder->progress(steadyNow()).waiting == what; });
    }

    TemporaryDirectory m_folder;
    std::string m_path = m_folder.path("A.mov");
    std::vector<EncoderCandidate> m_encoders;
    std::optional<Recorder> m_recorder;
};

TEST_F(SessionTest, ASourceThatIsGoneForAMinuteEndsTheRecording) {
    start("picture=160x90@30 sound=8000x1 until=400");
    ASSERT_TRUE(test::eventually([&] { return m_recorder->progress(steadyNow()).pictures >= 12; }));
    const Nanoseconds now = steadyNow();
    EXPECT_EQ(m_recorder->state(now), Recorder::State::running);
    EXPECT_EQ(m_recorder->progress(now).waiting, "");
    EXPECT_EQ(m_recorder->state(now + seconds(58)), Recorder::State::running);
    EXPECT_EQ(m_recorder->progress(now + seconds(58)).waiting, "the source to come back");
    EXPECT_EQ(m_recorder->state(now + seconds(60)), Recorder::State::sourceGone);
    m_recorder->finish();
    EXPECT_EQ(m_recorder->problem(), "");
    const auto movie = test::decodeMovie(m_path);
    EXPECT_TRUE(movie.readable) << movie.error;
    EXPECT_EQ(movie.pictures.size(), 12U);
}

TEST_F(SessionTest, ASourceThatHasNotComeIsWaitedForWithoutEnd) {
    start("");
    const Nanoseconds later = steadyNow() + std::chrono::hours(24);
    EXPECT_EQ(m_recorder->state(later), Recorder::State::running);
    EXPECT_EQ(m_recorder->progress(later).waiting, "the source");
    m_recorder->finish();
    EXPECT_FALSE(std::filesystem::exists(m_path));
}

TEST_F(SessionTest, AFolderThatGoesBeforeTheFirstPictureIsAFailure) {
    m_path = m_folder.path("gone/A.mov");
    start("picture=160x90@30 sound=8000x1");
    EXPECT_TRUE(test::eventually([&] { return m_recorder->state(steadyNow()) == Recorder::State::failed; }));
    EXPECT_EQ(m_recorder->problem(), "cannot record to \"" + m_path + "\": No such file or directory");
    std::this_thread::sleep_for(milliseconds(100)); // in which sound goes on coming
    EXPECT_EQ(m_recorder->progress(steadyNow()).soundLost, Nanoseconds(0)) << "the disk is not slow";
    EXPECT_NE(m_recorder->progress(steadyNow()).waiting, "the disk");
}

TEST_F(SessionTest, AnEncoderThatFailsEndsTheRecordingAndTheMoviePlaysUpToThere) {
    start("picture=160x90@30",
          {{"x264enc", "speed-preset=ultrafast tune=zerolatency ! identity error-after=21", false}});
    EXPECT_TRUE(test::eventually([&] { return m_recorder->state(steadyNow()) == Recorder::State::failed; }));
    const std::string problem = m_recorder->problem();
    EXPECT_THAT(problem, testing::StartsWith("the encoder x264enc has failed: "));
    m_recorder->finish();
    EXPECT_EQ(m_recorder->problem(), problem) << "however often it is asked for";
    const auto movie = test::decodeMovie(m_path);
    EXPECT_TRUE(movie.readable) << movie.error;
    EXPECT_NEAR(static_cast<double>(movie.pictures.size()), 20, 1);
}

TEST_F(SessionTest, AnEncoderThatIsBehindIsToldAndEveryPictureThatItCostsIsCounted) {
    // It takes a fifth of a second each, and half a second for the rest when it is to end.
    start("picture=160x90@30 until=1000",
          {{"x264enc", "speed-preset=ultrafast tune=zerolatency ! identity sleep-time=200000", false}});
    EXPECT_TRUE(waitsFor("the encoder"));
    EXPECT_TRUE(waitsFor("the source to come back"));
    const auto began = std::chrono::steady_clock::now();
    m_recorder->finish();
    EXPECT_LT(std::chrono::steady_clock::now() - began, seconds(1));
    EXPECT_EQ(m_recorder->problem(), "");
    const Progress progress = m_recorder->progress(steadyNow());
    EXPECT_GE(progress.dropped, 10U);
    EXPECT_EQ(progress.pictures + progress.dropped, 30U);
    const auto movie = test::decodeMovie(m_path);
    EXPECT_TRUE(movie.readable) << movie.error;
    EXPECT_EQ(movie.pictures.size(), progress.pictures);
}

TEST_F(SessionTest, HardwareThatHangsIsPassedOverAndNamed) {
    start("picture=160x90@30", {{"x264enc", "! valve drop=true", true}, {"x264enc", "speed-preset=ultrafast", false}});
    EXPECT_TRUE(test::eventually([&] { return m_recorder->progress(steadyNow()).pictures > 10; }));
    EXPECT_EQ(m_recorder->encoder(), "encoding with x264enc; not with x264enc (takes too long)");
    m_recorder->finish();
    EXPECT_EQ(m_recorder->problem(), "");
}

/// Its start waits for somebody to read a pipe, as a driver may wait for ever.
class HangingHardware {
  public:
    explicit HangingHardware(const std::string& pipe) : m_pipe(pipe) {
        std::signal(SIGPIPE, SIG_IGN);
        EXPECT_EQ(mkfifo(pipe.c_str(), 0600), 0);
    }
    /// It comes back after all.
    void release() const { close(open(m_pipe.c_str(), O_RDONLY | O_NONBLOCK)); }

    EncoderCandidate candidate() const {
        return {"x264enc", "! tee name=t ! queue ! filesink location=" + m_pipe + " t. ! queue", true};
    }

  private:
    const std::string m_pipe;
};

TEST_F(SessionTest, HardwareWhoseDriverHangsIsPassedOverAndHoldsNoEndUp) {
    const HangingHardware hardware(m_folder.path("pipe"));
    start("picture=160x90@30", {hardware.candidate(), {"x264enc", "speed-preset=ultrafast", false}});
    EXPECT_TRUE(test::eventually([&] { return m_recorder->progress(steadyNow()).pictures > 10; }));
    EXPECT_EQ(m_recorder->encoder(), "encoding with x264enc; not with hardware (its driver hangs)");
    m_recorder->finish();
    EXPECT_EQ(m_recorder->problem(), "");
    EXPECT_TRUE(test::decodeMovie(m_path).readable);
    EXPECT_TRUE(m_recorder->isTrying());
    hardware.release();
    EXPECT_TRUE(test::eventually([&] { return !m_recorder->isTrying(); }));
}

TEST_F(SessionTest, HardwareWhoseDriverHangsDoesNotHoldTheEndUpBeforeItsLimitEither) {
    const HangingHardware hardware(m_folder.path("pipe"));
    start("picture=160x90@30", {hardware.candidate()});
    EXPECT_TRUE(waitsFor("")); // the first picture has come
    const auto began = std::chrono::steady_clock::now();
    m_recorder->finish();
    EXPECT_LT(std::chrono::steady_clock::now() - began, trialLimit);
    EXPECT_TRUE(m_recorder->isTrying());
    hardware.release();
    EXPECT_TRUE(test::eventually([&] { return !m_recorder->isTrying(); }));
}

TEST_F(SessionTest, HardwareOnTrialDoesNotHoldTheEndUp) {
    start("picture=160x90@30", {{"x264enc", "! valve drop=true", true}});
    EXPECT_TRUE(waitsFor("")); // the first picture has come
    const auto began = std::chrono::steady_clock::now();
    m_recorder->finish();
    EXPECT_LT(std::chrono::steady_clock::now() - began, trialLimit / 2);
    EXPECT_EQ(m_recorder->problem(), "") << "who knows whether it would have encoded";
    EXPECT_EQ(m_recorder->encoder(), "not with x264enc (takes too long)");
}

TEST_F(SessionTest, ASlowDiskIsToldAndTheSoundThatItCostsIsCounted) {
    start("sound=384000x16");
    ASSERT_TRUE(test::eventually([&] { return m_recorder->progress(steadyNow()).bytes > 0; }));
    EXPECT_EQ(m_recorder->progress(steadyNow()).soundLost, Nanoseconds(0));
    {
        const test::SlowDisk disk;
        EXPECT_TRUE(waitsFor("the disk"));
        // 64 MB are three and a half seconds of it.
        EXPECT_TRUE(test::eventually([&] { return m_recorder->progress(steadyNow()).soundLost > milliseconds(50); }));
    }
    m_recorder->finish();
    EXPECT_EQ(m_recorder->problem(), "");
}

TEST_F(SessionTest, PicturesThatStopWhileTheSoundGoesOnAreWaitedFor) {
    start("picture=160x90@30 sound=8000x1 gone=500-9000 sound-stays");
    ASSERT_TRUE(test::eventually([&] { return m_recorder->progress(steadyNow()).pictures > 0; }));
    EXPECT_EQ(m_recorder->progress(steadyNow()).waiting, "");
    EXPECT_TRUE(waitsFor("a picture"));
    m_recorder->finish();
}

TEST_F(SessionTest, PicturesThatCannotBeReadAreCountedAndNamed) {
    start("picture=160x90@30 unreadable=500 until=1000");
    EXPECT_TRUE(waitsFor("a picture that can be read"));
    EXPECT_TRUE(waitsFor("the source to come back"));
    m_recorder->finish();
    // Fifteen of thirty can be read; of these some may be left out where the encoder was slow to start.
    const Progress progress = m_recorder->progress(steadyNow());
    EXPECT_EQ(progress.pictures + progress.dropped, 30U);
    EXPECT_GE(progress.dropped, 15U);
    EXPECT_GE(progress.pictures, 8U);
    EXPECT_EQ(test::decodeMovie(m_path).pictures.size(), progress.pictures);
}

} // namespace
} // namespace qivo::record
