// What installing leaves behind, started from there.
#include "tests/end-to-end/ViewerFixture.h"

#include "tests/record/MovieReader.h"

#include <csignal>
#include <cstdlib>
#include <dlfcn.h>
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <iterator>

namespace qivo::test {
namespace {

namespace fs = std::filesystem;
using testing::HasSubstr;

const fs::path kPrefix = PREFIX;
const fs::path kRecorder = kPrefix / "bin" / "Application.Mac.QIVO.Recording";

std::string contentOf(const fs::path& path) {
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
}

/// The process has mapped the library that was installed, unless the machine has another one for all programs.
bool usesInstalledLibrary(const Process& process) {
    const bool another = dlopen("libqivo.so", RTLD_LAZY) != nullptr;
    return another ||
           contentOf("/proc/" + std::to_string(process.pid()) + "/maps").find(kPrefix / "lib") != std::string::npos;
}

class InstallTest : public ViewerTest {
  protected:
    void SetUp() override {
        ViewerTest::SetUp();
        fs::remove_all(kPrefix);
        fs::create_directories(kRecorder.parent_path());
    }
    void TearDown() override {
        ViewerTest::TearDown();
        m_viewer.reset();
        fs::remove_all(kPrefix);
    }
    static bool install() {
        unsetenv("DESTDIR");
        const auto process = Process::start({CMAKE, "--install", BUILD, "--prefix", kPrefix});
        const bool installed = process && process->wait(std::chrono::seconds(60)) == 0;
        EXPECT_TRUE(installed) << (process ? process->output() + process->errors() : "");
        return installed;
    }
};

TEST_F(InstallTest, WhatIsInstalledShowsAndRecordsWhatItPublishes) {
    fs::create_symlink(RECORDER, kRecorder);
    ASSERT_TRUE(install());
    EXPECT_FALSE(fs::is_symlink(kRecorder)) << "a link to the built recorder gives way to the recorder";
    EXPECT_TRUE(fs::is_regular_file(RECORDER)) << "which stays";
    EXPECT_EQ(contentOf(kRecorder), contentOf(RECORDER));
    ASSERT_TRUE(install()) << "a second time";
    const auto publisher = publish("STUDIO", {"Cam 1"}, {"--size", "640x360"});
    startViewer();
    choose(0, 0, "STUDIO (Cam 1)");
    // Drawn by shaders that lie beside the program, for it looks nowhere else.
    EXPECT_TRUE(picturesArrive());
    EXPECT_TRUE(usesInstalledLibrary(*m_viewer));
    for (const std::string page : {"home.html", "qivo.html", "page.css"}) {
        EXPECT_FALSE(contentOf(kPrefix / "share" / "qivo-viewer" / "pages" / page).empty()) << page;
    }
    const fs::path movie = kPrefix / "movie.mov";
    const auto recorder = Process::start({kRecorder, "-i", "STUDIO (Cam 1)", "-o", movie, "-orvane", "-nothumbnail"});
    ASSERT_TRUE(recorder);
    EXPECT_TRUE(recorder->waitForOutput("time 00:00:01")) << recorder->errors();
    EXPECT_TRUE(usesInstalledLibrary(*recorder));
    recorder->signal(SIGINT);
    EXPECT_EQ(recorder->wait(std::chrono::seconds(10)), 0) << recorder->errors();
    EXPECT_TRUE(decodeMovie(movie).readable);
}

} // namespace
} // namespace qivo::test
