// A recording in this process, so that its time is the test's.
#include "tests/platform/TemporaryDirectory.h"
#include "tests/record/MovieReader.h"
#include "tests/support/Screen.h"
#include "tools/record/Recorder.h"

#include <cstdlib>
#include <filesystem>
#include <gtest/gtest.h>

namespace qivo::record {
namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;

class SessionTest : public testing::Test {
  protected:
    void start(const std::string& script) {
        setenv("QIVO_STAND_IN", script.c_str(), 1);
        gst_init(nullptr, nullptr);
        m_recorder.emplace(Recorder::Settings{"A"}, MoviePlace("A", m_path));
    }

    TemporaryDirectory m_folder;
    std::string m_path = m_folder.path("A.mov");
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
    start("picture=160x90@30");
    EXPECT_TRUE(test::eventually([&] { return m_recorder->state(steadyNow()) == Recorder::State::failed; }));
    EXPECT_EQ(m_recorder->problem(), "cannot record to \"" + m_path + "\": No such file or directory");
}

} // namespace
} // namespace qivo::record
