#include "app/AppData.h"

#include "tests/app/RecorderScript.h"

#include <atomic>
#include <csignal>
#include <fcntl.h>
#include <gmock/gmock.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

namespace qivo {
namespace {

using std::chrono::milliseconds;
using test::eventually;
using test::RecorderScript;
using testing::ElementsAre;
using testing::HasSubstr;

int openDescriptors() {
    const std::filesystem::directory_iterator all("/proc/self/fd");
    return static_cast<int>(std::distance(begin(all), end(all)));
}

bool hasChildren() {
    return waitpid(-1, nullptr, WNOHANG) >= 0 || errno != ECHILD;
}

/// A model with a recorder that is a script, a source and a folder.
class RecordingTest : public testing::Test {
  protected:
    void SetUp() override {
        model.setRecordingFolder("/Users/u/Movies");
        model.setQIVOSourceInfoNamed("STUDIO (Cam 1)", "fake://1");
    }

    void TearDown() override {
        script.release();
        model.setIsRecording(false);
        EXPECT_FALSE(hasChildren()) << "a recorder was left behind";
    }

    void use(const std::string& name) { model.setRecorderPath(QString::fromStdString(script.program(name))); }

    void record() {
        const int before = script.starts();
        model.setIsRecording(true);
        ASSERT_TRUE(script.waitForStarts(before + 1));
    }

    std::vector<std::string> argumentsFor(const std::string& name, const std::string& folder) {
        model.setIsRecording(false);
        model.setRecordingFolder(QString::fromStdString(folder));
        model.setQIVOSourceInfoNamed(QString::fromStdString(name), "u");
        record();
        return script.arguments();
    }

    RecorderScript script;
    AppData model{std::make_unique<Preferences>(QString::fromStdString(script.path("app.conf")))};
};

TEST_F(RecordingTest, RecorderHasItsFixedPath) {
    EXPECT_STREQ(AppData::kRecorderPath, "/usr/local/bin/Application.Mac.QIVO.Recording");
}

TEST_F(RecordingTest, LooksEveryFiveMillisecondsWhetherTheRecorderHasEnded) {
    EXPECT_EQ(AppData::kRecordingPollMs, 5);
}

TEST_F(RecordingTest, RecorderIsStartedWithTheSixArgumentsInOrder) {
    use("chatty");
    record();
    EXPECT_THAT(script.arguments(), ElementsAre("-i", "STUDIO (Cam 1)", "-o", "/Users/u/Movies/STUDIO (Cam 1).mov",
                                                "-orvane", "-nothumbnail"));
}

TEST_F(RecordingTest, NamesAndFoldersAreUsedUnchanged) {
    use("chatty");
    const std::string longest = std::string(63 - 3, 'x') + "\xe2\x82\xac"; // bytes, the last of them one character
    const std::vector<std::string> texts{"ÉCRAN (Caméra n° 1)",
                                         "two  blanks ",
                                         "it's \"quoted\" `so`",
                                         "$HOME; rm *",
                                         "100 % %1 %2 %@ %s",
                                         "back\\slash",
                                         "STAGE (A/B)",
                                         "../up",
                                         "-o",
                                         "\xf0\x9f\x8e\xa5 (\xf0\x9f\x91\xa9\xe2\x80\x8d\xf0\x9f\x8e\xa4)",
                                         "line\nbreak",
                                         longest};
    for (const std::string& text : texts) {
        EXPECT_THAT(argumentsFor(text, "/f"),
                    ElementsAre("-i", text, "-o", "/f/" + text + ".mov", "-orvane", "-nothumbnail"));
        EXPECT_THAT(argumentsFor("n", "/in/" + text),
                    ElementsAre("-i", "n", "-o", "/in/" + text + "/n.mov", "-orvane", "-nothumbnail"));
    }
}

TEST_F(RecordingTest, FolderThatHasGoneIsTheRecordersBusiness) {
    use("brief");
    EXPECT_THAT(argumentsFor("n", script.path("gone")),
                ElementsAre("-i", "n", "-o", script.path("gone") + "/n.mov", "-orvane", "-nothumbnail"));
    EXPECT_FALSE(std::filesystem::exists(script.path("gone")));
}

TEST_F(RecordingTest, SwitchingOffInterruptsTheRecorderAndWaitsForItsEnd) {
    use("chatty");
    record();
    EXPECT_EQ(script.ends(), 0);
    model.setIsRecording(false);
    EXPECT_EQ(script.ends(), 1) << "the call returned before the recorder had ended";
    EXPECT_FALSE(hasChildren());
}

TEST_F(RecordingTest, InterruptIsRepeatedUntilTheRecorderExits) {
    use("stubborn");
    record();
    model.setIsRecording(false);
    EXPECT_THAT(script.noted("end "), ElementsAre(HasSubstr("interrupts=6")));
}

TEST_F(RecordingTest, StopOfARecorderThatNeverWritesWaitsUntilItExitsOnItsOwn) {
    use("silent");
    record();
    std::atomic<bool> released = false;
    std::thread someone([&] {
        std::this_thread::sleep_for(milliseconds(150));
        released = true;
        script.release();
    });
    model.setIsRecording(false);
    EXPECT_TRUE(released);
    someone.join();
    EXPECT_THAT(script.noted("end "), ElementsAre(HasSubstr("interrupts=0")));
}

TEST_F(RecordingTest, RecorderThatHasClosedItsOutputIsInterruptedAllTheSame) {
    use("closing");
    record();
    model.setIsRecording(false);
    EXPECT_EQ(script.ends(), 1);
}

TEST_F(RecordingTest, OutputIsTakenHoweverMuchItIsAndWhateverItSays) {
    use("torrent");
    testing::internal::CaptureStdout();
    record();
    EXPECT_TRUE(eventually([&] { return script.noted("poured").size() == 1; }));
    model.setIsRecording(false);
    EXPECT_EQ(testing::internal::GetCapturedStdout(), "") << "it is not shown";
}

TEST_F(RecordingTest, InputStaysOpenAndEmptyForTheWholeRecording) {
    use("chatty");
    record();
    model.setIsRecording(false);
    EXPECT_THAT(script.noted("end "), ElementsAre(HasSubstr("input=open")));
}

TEST_F(RecordingTest, ErrorsOfTheRecorderGoWhereTheApplicationsGo) {
    use("brief");
    record();
    struct stat own {};
    ASSERT_EQ(fstat(STDERR_FILENO, &own), 0);
    EXPECT_THAT(script.noted("errors "), ElementsAre(std::to_string(own.st_dev) + ":" + std::to_string(own.st_ino)));
}

TEST_F(RecordingTest, RecorderInheritsNeitherDescriptorsNorSignals) {
    use("brief");
    const int inheritable = open("/dev/null", O_RDONLY); // NOLINT: not marked, on purpose
    struct sigaction before {};
    struct sigaction ignore {};
    ignore.sa_handler = SIG_IGN;
    sigaction(SIGPIPE, &ignore, &before);
    sigset_t blocked;
    sigemptyset(&blocked);
    sigaddset(&blocked, SIGINT);
    sigaddset(&blocked, SIGTERM);
    pthread_sigmask(SIG_BLOCK, &blocked, nullptr);
    record();
    pthread_sigmask(SIG_UNBLOCK, &blocked, nullptr);
    sigaction(SIGPIPE, &before, nullptr);
    close(inheritable);
    EXPECT_THAT(script.noted("descriptors"), ElementsAre(" 0 1 2"));
    EXPECT_THAT(script.noted("signals"), ElementsAre(""));
}

TEST_F(RecordingTest, NothingStaysOpenAfterRecordings) {
    const int before = openDescriptors();
    for (const char* name : {"chatty", "brief", "closing", "no program"}) {
        if (name != std::string("no program")) {
            use(name);
            record();
        } else {
            model.setRecorderPath(QString::fromStdString(script.path(name)));
            model.setIsRecording(true);
        }
        model.setIsRecording(false);
        EXPECT_EQ(openDescriptors(), before) << name;
    }
}

TEST_F(RecordingTest, RecorderThatCannotBeLaunchedIsIgnoredAndTheSwitchStaysOn) {
    const std::string notExecutable = script.folder().write("plain", "#!/bin/sh\n");
    const std::string noProgram = script.folder().write("text", "This is no program.");
    std::filesystem::permissions(noProgram, std::filesystem::perms::owner_all);
    for (const std::string& path :
         {std::string("/nowhere/recorder"), notExecutable, noProgram, script.folder().path(), std::string()}) {
        model.setRecorderPath(QString::fromStdString(path));
        testing::internal::CaptureStderr();
        testing::internal::CaptureStdout();
        model.setIsRecording(true);
        EXPECT_TRUE(model.isRecording()) << path;
        model.setIsRecording(false);
        EXPECT_EQ(testing::internal::GetCapturedStdout() + testing::internal::GetCapturedStderr(), "") << path;
        EXPECT_FALSE(model.isRecording()) << path;
    }
}

TEST_F(RecordingTest, RecorderThatExitsByItselfLeavesTheSwitchOnUntilItIsTurnedOffAndOnAgain) {
    use("brief");
    record();
    ASSERT_TRUE(eventually([&] { return script.ends() == 1 && !hasChildren(); }));
    EXPECT_TRUE(model.isRecording());
    model.setIsRecording(true);
    EXPECT_EQ(script.starts(), 1) << "switching on what is on does nothing";
    model.setIsRecording(false);
    record();
    EXPECT_EQ(script.starts(), 2);
}

TEST_F(RecordingTest, SwitchingOnWhatIsOnDoesNotDisturbTheRecorder) {
    use("chatty");
    record();
    model.setIsRecording(true);
    EXPECT_EQ(script.starts(), 1);
    EXPECT_EQ(script.ends(), 0);
}

TEST_F(RecordingTest, SwitchingOnBeforeAnySourceWasSelectedStartsNothingAndShowsOn) {
    AppData fresh(std::make_unique<Preferences>(QString::fromStdString(script.path("fresh.conf"))));
    fresh.setRecorderPath(QString::fromStdString(script.program("chatty")));
    fresh.setIsRecording(true);
    EXPECT_TRUE(fresh.isRecording());
    fresh.setIsRecording(false);
    EXPECT_FALSE(fresh.isRecording());
    EXPECT_EQ(script.starts(), 0);
}

TEST_F(RecordingTest, WithoutNameOrFolderNothingStarts) {
    use("chatty");
    model.setQIVOSourceInfoNamed("", "fake://1");
    model.setIsRecording(true);
    EXPECT_TRUE(model.isRecording());
    model.setQIVOSourceInfoNamed("STUDIO (Cam 1)", "fake://1");
    model.setRecordingFolder("");
    model.setIsRecording(true);
    EXPECT_TRUE(model.isRecording());
    model.setIsRecording(false); // has waited for a recorder, had there been one
    EXPECT_EQ(script.starts(), 0);
}

TEST_F(RecordingTest, SelectingAnotherSourceStopsTheRecordingWhichIsNotRestarted) {
    use("chatty");
    record();
    model.setQIVOSourceInfoNamed("STUDIO (Cam 2)", "fake://2");
    EXPECT_EQ(script.ends(), 1);
    EXPECT_FALSE(model.isRecording());
    EXPECT_EQ(script.starts(), 1);
}

TEST_F(RecordingTest, TwoSelectionsOfTheSameSourceEachStopARunningRecording) {
    use("chatty");
    for (int selection = 1; selection <= 2; ++selection) {
        record();
        model.setQIVOSourceInfoNamed("STUDIO (Cam 1)", "fake://1");
        EXPECT_EQ(script.ends(), selection);
        EXPECT_FALSE(model.isRecording());
    }
}

TEST_F(RecordingTest, ChosenFolderCountsFromTheNextRecordingOn) {
    use("chatty");
    model.setIsRecording(true);
    model.setRecordingFolder("/other");
    ASSERT_TRUE(script.waitForStarts(1));
    EXPECT_EQ(script.arguments().at(3), "/Users/u/Movies/STUDIO (Cam 1).mov");
    EXPECT_EQ(script.ends(), 0);
    model.setIsRecording(false);
    record();
    EXPECT_EQ(script.arguments().at(3), "/other/STUDIO (Cam 1).mov");
}

TEST_F(RecordingTest, StartingAgainStopsTheRecorderThatRunsFirst) {
    use("chatty");
    record();
    model.startRecording();
    EXPECT_EQ(script.ends(), 1);
    EXPECT_TRUE(script.waitForStarts(2));
    model.stopRecording();
    EXPECT_EQ(script.ends(), 2);
    model.stopRecording(); // with none
}

TEST_F(RecordingTest, ChangeIsAnnouncedOnceTheRecorderHasEnded) {
    use("chatty");
    record();
    std::vector<int> endsWhenAnnounced;
    QObject observer;
    QObject::connect(&model, &AppData::isRecordingChanged, &observer,
                     [&] { endsWhenAnnounced.push_back(script.ends()); });
    model.setIsRecording(false);
    EXPECT_THAT(endsWhenAnnounced, ElementsAre(1));
}

TEST_F(RecordingTest, ModelThatGoesStopsItsRecorder) {
    auto passing =
        std::make_unique<AppData>(std::make_unique<Preferences>(QString::fromStdString(script.path("passing.conf"))));
    passing->setRecorderPath(QString::fromStdString(script.program("chatty")));
    passing->setQIVOSourceInfoNamed("n", "u");
    passing->setIsRecording(true);
    ASSERT_TRUE(script.waitForStarts(1));
    passing.reset();
    EXPECT_EQ(script.ends(), 1);
}

TEST_F(RecordingTest, SwitchingOnAndOffInQuickSuccessionLeavesNothingBehind) {
    use("chatty");
    for (int i = 0; i < 20; ++i) {
        model.setIsRecording(true);
        model.setIsRecording(false);
        EXPECT_FALSE(hasChildren());
    }
}

TEST_F(RecordingTest, RecordThreadProcRunsOnTheCallersThreadUntilTheRecorderExits) {
    use("chatty");
    std::stop_source cancel;
    std::thread thread([&] { model.recordThreadProc({"a", "/b"}, cancel.get_token()); });
    EXPECT_TRUE(script.waitForStarts(1));
    EXPECT_THAT(script.arguments(), ElementsAre("-i", "a", "-o", "/b/a.mov", "-orvane", "-nothumbnail"));
    cancel.request_stop();
    thread.join();
    EXPECT_EQ(script.ends(), 1);
}

} // namespace
} // namespace qivo
