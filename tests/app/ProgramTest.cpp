// The program itself, as a user starts and ends it.

#include "tests/platform/TemporaryDirectory.h"
#include "tests/support/Process.h"
#include "tests/support/Screen.h"

#include <csignal>
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <iterator>

namespace qivo {
namespace {

using test::eventually;
using test::Process;
using test::Screen;
using testing::AllOf;
using testing::HasSubstr;
using testing::Not;

constexpr auto kSoon = std::chrono::seconds(20);

class ProgramTest : public testing::Test {
  protected:
    void SetUp() override {
        // Alone in its folder, so that no libqivo is beside it; the dynamic linker finds one only where a test says.
        std::filesystem::create_directory(folder.path("bin"));
        std::filesystem::copy_file(VIEWER, viewer());
        screen = Screen::open();
        ASSERT_TRUE(screen);
    }

    std::string viewer() const { return folder.path("bin/qivo-viewer"); }
    std::string preferences() const { return folder.path("Orvane/QIVO Viewer.conf"); }

    std::unique_ptr<Process> start(std::vector<std::string> environment = {}) const {
        environment.push_back("XDG_CONFIG_HOME=" + folder.path());
        environment.emplace_back("HOME=" + folder.path());
        return Process::start({viewer()}, environment);
    }

    std::unique_ptr<Process> startWithLibrary() const {
        return start({std::string("LD_LIBRARY_PATH=") + STAND_INS + "/complete"});
    }

    bool waitForWindow() const {
        return eventually([&] { return screen->findWindow("QIVO Viewer").has_value(); });
    }

    /// How many texts of the driver's, about shaders and programs, it has logged.
    static int errorsOfGL(const Process& program) {
        const std::string errors = program.errors();
        int count = 0;
        for (auto at = errors.find(">> ERROR: {"); at != std::string::npos; at = errors.find(">> ERROR: {", at + 1)) {
            ++count;
        }
        return count;
    }

    /// Its menus and shortcuts do, and it ends as it should.
    void expectThatItWorks(Process& program) const {
        screen->activate(screen->findWindow("QIVO Viewer").value());
        EXPECT_TRUE(eventually([&] { return screen->key("Control+q") && !program.running(); }));
        EXPECT_EQ(program.wait(kSoon), 0);
        EXPECT_THAT(saved(), HasSubstr("ORVQIVOViewer_mute=false"));
    }

    std::string saved() const {
        std::ifstream file(preferences());
        return {std::istreambuf_iterator<char>(file), {}};
    }

    TemporaryDirectory folder;
    std::unique_ptr<Screen> screen;
};

TEST_F(ProgramTest, ClosingTheWindowEndsItAndSavesTheSettings) {
    std::filesystem::create_directory(folder.path("Orvane"));
    folder.write("Orvane/QIVO Viewer.conf", "[General]\nORVQIVOViewer_isLowBandwith=true\n");
    const auto program = startWithLibrary();
    ASSERT_TRUE(waitForWindow());
    EXPECT_TRUE(program->waitForOutput("stand-in: initialize\n"));
    screen->close(screen->findWindow("QIVO Viewer").value());
    EXPECT_EQ(program->wait(kSoon), 0);
    EXPECT_EQ(program->output(), "stand-in: initialize\nstand-in: destroy\n");
    EXPECT_EQ(saved(), "[General]\nORVQIVOViewer_isLowBandwith=true\nORVQIVOViewer_mute=false\n"
                       "ORVQIVOViewer_recordFolder=" +
                           folder.path() + "\n");
}

TEST_F(ProgramTest, QuitByKeyEndsItWithSuccess) {
    const auto program = startWithLibrary();
    ASSERT_TRUE(waitForWindow());
    screen->activate(screen->findWindow("QIVO Viewer").value());
    EXPECT_TRUE(eventually([&] { return screen->key("Control+q") && !program->running(); }));
    EXPECT_EQ(program->wait(kSoon), 0);
    EXPECT_THAT(saved(), HasSubstr("ORVQIVOViewer_mute=false"));
}

TEST_F(ProgramTest, SignalEndsItInItsUsualOrder) {
    for (const int signal : {SIGTERM, SIGINT, SIGHUP}) {
        std::filesystem::remove(preferences());
        const auto program = startWithLibrary();
        ASSERT_TRUE(waitForWindow());
        program->signal(signal);
        EXPECT_EQ(program->wait(kSoon), 0);
        EXPECT_THAT(saved(), HasSubstr("ORVQIVOViewer_recordFolder=" + folder.path()));
    }
}

TEST_F(ProgramTest, TerminationEndsThePlayerThenTheFinderThenTheRecorderThenSavesTheSettings) {
    const std::string notes = folder.path("notes");
    const std::string recorder = "/usr/local/bin/Application.Mac.QIVO.Recording"; // in a folder of this test's own
    std::ofstream(recorder) << "#!/bin/sh\n"
                            << "trap 'test -e \"" << preferences() << "\" && saved=saved || saved=unsaved\n"
                            << "      echo \"recorder goes, $saved\" >>\"" << notes << "\"; exit 0' INT\n"
                            << "echo recorder comes >>\"" << notes << "\"\n"
                            << "while echo; do sleep 0.05; done\n";
    std::filesystem::permissions(recorder, std::filesystem::perms::owner_all);
    const auto noted = [&] {
        std::ifstream file(notes);
        return std::string(std::istreambuf_iterator<char>(file), {});
    };
    const auto program = start({std::string("LD_LIBRARY_PATH=") + STAND_INS + "/complete", "STAND_IN_NOTES=" + notes});
    ASSERT_TRUE(waitForWindow());
    screen->activate(screen->findWindow("QIVO Viewer").value());
    ASSERT_TRUE(eventually([&] {
        for (const char* key : {"Alt+s", "Right", "Return"}) {
            screen->key(key);
        }
        return eventually([&] { return screen->findWindow("STUDIO (Cam 1)").has_value(); }, std::chrono::seconds(1));
    }));
    ASSERT_TRUE(eventually([&] { return noted().find("sound comes\n") != std::string::npos; })) << noted();
    screen->key("Control+r");
    ASSERT_TRUE(eventually([&] { return noted().find("recorder comes\n") != std::string::npos; })) << noted();
    const std::size_t before = noted().size();
    program->signal(SIGTERM);
    EXPECT_EQ(program->wait(kSoon), 0);
    EXPECT_EQ(noted().substr(before), "sound goes\nfinder goes\nrecorder goes, unsaved\nvideo goes\n");
    EXPECT_THAT(saved(), HasSubstr("ORVQIVOViewer_mute=false"));
}

TEST_F(ProgramTest, FolderForRecordingsIsChosenInASheetThatDoesNotKeepASignalFromEndingIt) {
    std::filesystem::create_directory(folder.path("takes"));
    const auto program = startWithLibrary();
    ASSERT_TRUE(waitForWindow());
    screen->activate(screen->findWindow("QIVO Viewer").value());
    const auto sheet = [&] { return screen->findWindow("Choose the directory for recordings."); };
    const auto openSheet = [&] {
        return eventually([&] {
            screen->key("Alt+r");
            screen->key("Return");
            return eventually([&] { return sheet().has_value(); }, std::chrono::seconds(1));
        });
    };
    ASSERT_TRUE(openSheet());
    EXPECT_TRUE(eventually([&] { return screen->isActive(sheet().value()); }));
    for (const char* key : {"t", "a", "k", "e", "s", "Return"}) {
        screen->key(key);
    }
    EXPECT_TRUE(eventually([&] { return !sheet(); }));
    ASSERT_TRUE(openSheet());
    program->signal(SIGTERM);
    EXPECT_EQ(program->wait(kSoon), 0);
    EXPECT_THAT(saved(), HasSubstr("ORVQIVOViewer_recordFolder=" + folder.path("takes") + "\n"));
}

TEST_F(ProgramTest, WithoutLibqivoItSaysSoAndShowsItsWindow) {
    const auto program = start();
    ASSERT_TRUE(waitForWindow());
    EXPECT_EQ(program->output(), "Cannot run QIVO.");
    EXPECT_TRUE(eventually([&] { return !program->errors().empty(); }));
    EXPECT_THAT(program->errors(),
                AllOf(HasSubstr("libqivo cannot be used: libqivo.so: cannot open"), HasSubstr("qivo-viewer[")));
    program->signal(SIGTERM);
    EXPECT_EQ(program->wait(kSoon), 0);
}

TEST_F(ProgramTest, LibqivoThatLacksAnOperationIsNamed) {
    const auto program = start({std::string("LD_LIBRARY_PATH=") + STAND_INS + "/incomplete"});
    ASSERT_TRUE(waitForWindow());
    EXPECT_EQ(program->output(), "Cannot run QIVO.");
    EXPECT_TRUE(eventually([&] { return program->errors().find("lacks the operation QIVOlib_") != std::string::npos; }))
        << program->errors();
    program->signal(SIGTERM);
    EXPECT_EQ(program->wait(kSoon), 0);
}

TEST_F(ProgramTest, LibqivoThatRefusesToStartIsNamed) {
    const auto program = start({std::string("LD_LIBRARY_PATH=") + STAND_INS + "/refusing"});
    ASSERT_TRUE(waitForWindow());
    EXPECT_TRUE(program->waitForOutput("Cannot run QIVO."));
    EXPECT_TRUE(eventually([&] { return program->errors().find('\n') != std::string::npos; }));
    EXPECT_THAT(program->errors(), HasSubstr("libqivo cannot be used: libqivo.so refused to start\n"));
    program->signal(SIGTERM);
    EXPECT_EQ(program->wait(kSoon), 0);
}

TEST_F(ProgramTest, WithoutShadersItNamesThemAndItsWindowWorks) {
    ASSERT_FALSE(std::filesystem::exists(folder.path("share")));
    const auto program = startWithLibrary();
    ASSERT_TRUE(waitForWindow());
    ASSERT_TRUE(eventually([&] { return errorsOfGL(*program) == 1; })) << program->errors();
    for (const std::string shader : {"Quad2D.vs", "Quad2D.fs"}) {
        EXPECT_THAT(program->errors(),
                    AllOf(HasSubstr(">> " + folder.path("share/qivo-viewer/" + shader) + ": No such file or directory"),
                          HasSubstr(">> ERROR: Failed acquiring sources from the \"" + shader + "'")));
    }
    expectThatItWorks(*program);
}

TEST_F(ProgramTest, WithBrokenShadersItShowsWhatIsWrongAndItsWindowWorks) {
    std::filesystem::create_directories(folder.path("share/qivo-viewer"));
    for (const auto& entry : std::filesystem::directory_iterator(SHADERS)) {
        folder.write("share/qivo-viewer/" + entry.path().filename().string(), "nonsense\n");
    }
    const auto program = startWithLibrary();
    ASSERT_TRUE(waitForWindow());
    EXPECT_TRUE(eventually([&] { return errorsOfGL(*program) == 3; })) << program->errors();
    EXPECT_THAT(program->errors(), Not(HasSubstr("Failed acquiring")));
    expectThatItWorks(*program);
}

TEST_F(ProgramTest, WithoutDisplayItEndsWithOneLine) {
    for (const auto& [variable, said] : std::vector<std::pair<std::string, std::string>>{
             {"DISPLAY=", "neither DISPLAY nor WAYLAND_DISPLAY is set"},
             {"DISPLAY=:4711", "DISPLAY is \":4711\""},
             {"QT_QPA_PLATFORM=nonsense", "QT_QPA_PLATFORM is \"nonsense\""}}) {
        std::vector<std::string> environment{variable};
        if (variable.rfind("QT_", 0) != 0) {
            environment.emplace_back("QT_QPA_PLATFORM=");
        }
        const auto program = start(environment);
        EXPECT_EQ(program->wait(kSoon), 1);
        EXPECT_TRUE(eventually([&] { return !program->errors().empty(); }));
        EXPECT_EQ(program->errors(), "QIVO Viewer cannot open a display: " + said + ".\n");
        EXPECT_EQ(program->output(), "");
    }
}

TEST_F(ProgramTest, DamagedPreferencesAreReportedAndKept) {
    std::filesystem::create_directory(folder.path("Orvane"));
    const std::string damaged = "[General]\nORVQIVOViewer_mute=true\n\x01\xff\n";
    folder.write("Orvane/QIVO Viewer.conf", damaged);
    const auto program = startWithLibrary();
    ASSERT_TRUE(waitForWindow());
    EXPECT_THAT(program->errors(), HasSubstr("is damaged"));
    program->signal(SIGTERM);
    EXPECT_EQ(program->wait(kSoon), 0);
    EXPECT_THAT(saved(), HasSubstr("ORVQIVOViewer_mute=true"));
    std::ifstream copy(preferences() + ".damaged", std::ios::binary);
    EXPECT_EQ(std::string(std::istreambuf_iterator<char>(copy), {}), damaged);
}

TEST_F(ProgramTest, KnowsOfTheNetworkOnlyThroughLibqivo) {
    const auto program = startWithLibrary();
    ASSERT_TRUE(waitForWindow());
    std::ifstream maps("/proc/" + std::to_string(program->pid()) + "/maps");
    const std::string mapped(std::istreambuf_iterator<char>(maps), {});
    EXPECT_THAT(mapped, AllOf(HasSubstr("libqivo.so"), Not(HasSubstr("libgstreamer")), Not(HasSubstr("libavahi"))));
    program->signal(SIGTERM);
    EXPECT_EQ(program->wait(kSoon), 0);
}

} // namespace
} // namespace qivo
