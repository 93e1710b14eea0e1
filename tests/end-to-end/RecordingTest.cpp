// Recording as the user does it: publisher, viewer and recorder as processes, the switch clicked with the mouse, and
// the movies read back.
#include "tests/end-to-end/RecordingFixture.h"

#include "tests/record/MovieReader.h"

#include <csignal>
#include <gmock/gmock.h>
#include <sys/mount.h>
#include <utility>

namespace qivo::test {
namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::SizeIs;
using testing::UnorderedElementsAre;

class RecordingTest : public RecordingViewerTest {};

TEST_F(RecordingTest, SwitchClickedOnAndOffLeavesAMovieOfWhatWasShown) {
    const auto publisher = publishAndShow("STÜDIO", {"Cam \"1\" 100 % 🎥"});
    startRecording();
    EXPECT_TRUE(recorder());
    recordFor(milliseconds(2000));
    clickRecordSwitch();
    EXPECT_FALSE(recordSwitchShowsOn());
    EXPECT_FALSE(recorder()) << "the switch is off once the recorder has ended";
    EXPECT_THAT(recorded(), ElementsAre("STÜDIO (Cam \"1\" 100 % 🎥).mov"));
    EXPECT_TRUE(isFinished(movie()));
    expectWholeRecording(movie(), 1.9);
    EXPECT_TRUE(picturesArrive(now()));
}

TEST_F(RecordingTest, NamesWithSlashesAndOfTheGreatestLengthAreRecordedAsTheyStand) {
    const std::string longest(54, 'x');
    const auto publisher = publishAndShow("STUDIO", {"a/b", longest}, {"--no-audio"});
    for (const auto& [place, source] :
         {std::pair(0, std::string("STUDIO (a/b)")), std::pair(1, "STUDIO (" + longest + ")")}) {
        choose(0, place, source);
        ASSERT_TRUE(picturesArrive(now()));
        clickRecordSwitch();
        EXPECT_TRUE(eventually([&] { return std::filesystem::exists(movie()); })) << m_viewer->errors();
        recordFor(milliseconds(700));
        clickRecordSwitch();
        EXPECT_TRUE(isFinished(movie())) << source;
        expectWholeRecording(movie(), 0.6, false);
    }
    EXPECT_EQ(m_title.size(), 63U);
    EXPECT_THAT(recorded(), UnorderedElementsAre("STUDIO (a", m_title + ".mov")) << "a slash leads through a folder";
}

TEST_F(RecordingTest, ChoosingAnotherSourceFinishesTheMovieAndClosingTheWindowTheNext) {
    const auto publisher = publishAndShow("STUDIO", {"Cam 1", "Cam 2"}, {"--no-audio"});
    startRecording();
    recordFor(milliseconds(700));
    choose(0, 1, "STUDIO (Cam 2)");
    EXPECT_TRUE(eventually([this] { return !recorder(); }));
    EXPECT_TRUE(isFinished(movie("STUDIO (Cam 1)")));
    EXPECT_TRUE(eventually([this] { return !recordSwitchShowsOn(); }));
    ASSERT_TRUE(picturesArrive(now()));
    EXPECT_THAT(recorded(), SizeIs(1)) << "recording does not carry over to the new source";
    startRecording();
    recordFor(milliseconds(700));
    ASSERT_TRUE(closeWindow());
    EXPECT_EQ(m_viewer->wait(seconds(10)), 0) << m_viewer->errors();
    EXPECT_TRUE(isFinished(movie("STUDIO (Cam 2)")));
    expectWholeRecording(movie("STUDIO (Cam 1)"), 0.6, false);
    expectWholeRecording(movie("STUDIO (Cam 2)"), 0.6, false);
}

TEST_F(RecordingTest, TerminationFinishesTheMovie) {
    const auto publisher = publishAndShow("STUDIO", {"Cam 1"});
    startRecording();
    recordFor(milliseconds(700));
    m_viewer->signal(SIGTERM);
    EXPECT_EQ(m_viewer->wait(seconds(10)), 0) << m_viewer->errors();
    EXPECT_TRUE(isFinished(movie()));
    expectWholeRecording(movie(), 0.6);
}

TEST_F(RecordingTest, KilledRecorderLeavesAMovieThatPlaysAndTheNextIsMadeBesideIt) {
    const auto publisher = publishAndShow("STUDIO", {"Cam 1"});
    startRecording();
    recordFor(milliseconds(1300));
    const auto first = recorder();
    ASSERT_TRUE(first);
    const std::int64_t killed = now();
    kill(*first, SIGKILL);
    ASSERT_TRUE(eventually([&] { return !recorder(); }));
    EXPECT_TRUE(recordSwitchShowsOn()) << "nothing resets the switch";
    const DecodedMovie decoded = decodeMovie(movie());
    ASSERT_TRUE(decoded.readable) << decoded.error;
    ASSERT_FALSE(decoded.pictures.empty());
    EXPECT_GE(decoded.pictures.back().published.value_or(0), killed - 1000);
    clickRecordSwitch();
    startRecording();
    EXPECT_THAT(recorded(), SizeIs(2)) << "nothing is overwritten";
    clickRecordSwitch();
    EXPECT_TRUE(isFinished(movie()));
}

TEST_F(RecordingTest, KilledViewerLeavesAFinishedMovieAndNoRecorder) {
    const auto publisher = publishAndShow("STUDIO", {"Cam 1"});
    startRecording();
    recordFor(milliseconds(700));
    const auto left = recorder();
    ASSERT_TRUE(left);
    m_viewer->signal(SIGKILL);
    EXPECT_TRUE(eventually([&] { return hasEnded(*left); }));
    EXPECT_TRUE(isFinished(movie()));
    expectWholeRecording(movie(), 0.6);
}

TEST_F(RecordingTest, FullDiskEndsTheRecorderWithAMovieThatPlays) {
    ASSERT_EQ(mount("none", m_folder.c_str(), "tmpfs", 0, "size=400k"), 0);
    const auto publisher = publishAndShow("STUDIO", {"Cam 1"});
    startRecording();
    EXPECT_TRUE(eventually([&] { return !recorder(); }));
    EXPECT_THAT(m_viewer->errors(), HasSubstr("No space left on device")) << "the recorder's own words";
    EXPECT_TRUE(recordSwitchShowsOn());
    EXPECT_TRUE(picturesArrive(now())) << "the viewer goes on";
    expectWholeRecording(movie(), 0.6);
    clickRecordSwitch();
    EXPECT_FALSE(recordSwitchShowsOn());
}

TEST_F(RecordingTest, WithoutTheRecorderTheSwitchTurnsAndNothingHappens) {
    std::filesystem::remove("/usr/local/bin/Application.Mac.QIVO.Recording");
    const auto publisher = publishAndShow("STUDIO", {"Cam 1"}, {"--no-audio"});
    clickRecordSwitch();
    EXPECT_TRUE(recordSwitchShowsOn());
    EXPECT_TRUE(picturesArrive(now()));
    clickRecordSwitch();
    EXPECT_FALSE(recordSwitchShowsOn());
    EXPECT_THAT(recorded(), IsEmpty());
}

} // namespace
} // namespace qivo::test
