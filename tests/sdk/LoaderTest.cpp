#include <array>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <iterator>
#include <memory>
#include <string>

namespace {

using testing::HasSubstr;
using testing::Not;

/// Runs a copy of the probe in a folder of its own, so that what lies beside it is the test's choice.
class LoaderTest : public testing::Test {
  protected:
    void SetUp() override {
        std::string pattern = (std::filesystem::temp_directory_path() / "loader-XXXXXX").string();
        ASSERT_NE(mkdtemp(pattern.data()), nullptr);
        m_folder = pattern;
        std::filesystem::create_directories(m_folder / "bin");
        std::filesystem::create_directories(m_folder / "lib");
        std::filesystem::copy(PROBE, m_folder / "bin" / "probe");
    }

    void TearDown() override { std::filesystem::remove_all(m_folder); }

    void ship(const std::string& kind) {
        std::filesystem::copy(std::filesystem::path(STAND_INS) / kind / "libqivo.so", m_folder / "lib" / "libqivo.so");
    }

    /// Puts a file into a folder of its own, for the dynamic linker to find.
    std::string install(const std::string& content) const {
        std::filesystem::create_directories(m_folder / "installed");
        std::ofstream(m_folder / "installed" / "libqivo.so", std::ios::binary) << content;
        return m_folder / "installed";
    }

    static std::string contentOf(const std::string& kind) {
        std::ifstream file(std::string(STAND_INS) + "/" + kind + "/libqivo.so", std::ios::binary);
        return {std::istreambuf_iterator<char>(file), {}};
    }

    std::string run(const std::string& installedKind = "") {
        return runWith(installedKind.empty() ? "/nonexistent" : std::string(STAND_INS) + "/" + installedKind);
    }

    std::string runWith(const std::string& path) {
        const std::string command = "LD_LIBRARY_PATH='" + path + "' '" + (m_folder / "bin" / "probe").string() + "'";
        const std::unique_ptr<FILE, int (*)(FILE*)> pipe(popen(command.c_str(), "r"), pclose);
        std::string output;
        std::array<char, 512> buffer{};
        while (fgets(buffer.data(), static_cast<int>(buffer.size()), pipe.get()) != nullptr) {
            output += buffer.data();
        }
        return output;
    }

    std::filesystem::path m_folder;
};

TEST_F(LoaderTest, WithoutALibraryInitialisingFailsAndEveryOperationAnswersNothing) {
    const std::string output = run();
    EXPECT_THAT(output, HasSubstr("initialize: 0\n"));
    EXPECT_THAT(output, HasSubstr("error: libqivo.so: cannot open shared object file"));
    EXPECT_THAT(output, HasSubstr("sources: 0 0\nqueue: 0 0 0\ncapture: 0\nrecall: 0\n"));
}

TEST_F(LoaderTest, AnInstalledLibraryIsPreferredToTheOneThatShips) {
    ship("complete");
    const std::string output = run("complete");
    EXPECT_THAT(output, HasSubstr("stand-in: initialize\ninitialize: 1\nerror: \n"));
    EXPECT_THAT(output, HasSubstr("path: libqivo.so\n"));
    EXPECT_THAT(output, HasSubstr("capture: 5\nrecall: 1\n"));
    EXPECT_THAT(output, HasSubstr("stand-in: destroy\n"));
}

TEST_F(LoaderTest, TheLibraryThatShipsIsUsedWhereNoneIsInstalled) {
    ship("complete");
    const std::string output = run();
    EXPECT_THAT(output, HasSubstr("initialize: 1\n"));
    EXPECT_THAT(output, HasSubstr("path: " + (m_folder / "bin/../lib/libqivo.so").string() + "\n"));
}

TEST_F(LoaderTest, ALibraryThatLacksAnOperationIsRefusedByName) {
    ship("complete");
    const std::string output = run("incomplete");
    EXPECT_THAT(output, HasSubstr("initialize: 0\n"));
    EXPECT_THAT(output, HasSubstr("error: libqivo.so lacks the operation QIVOlib_recv_ptz_recall_preset\n"));
    EXPECT_THAT(output, Not(HasSubstr("stand-in: initialize")));
}

TEST_F(LoaderTest, AnInstalledLibraryThatCannotBeLoadedIsNotPassedOver) {
    ship("complete");
    for (const std::string& damaged : {std::string(), contentOf("complete").substr(0, 100)}) {
        const std::string folder = install(damaged);
        const std::string output = runWith(folder);
        EXPECT_THAT(output, HasSubstr("initialize: 0\nerror: " + folder + "/libqivo.so: "));
        EXPECT_THAT(output, Not(HasSubstr("stand-in: initialize")));
    }
}

TEST_F(LoaderTest, AnInstalledLibraryThatLacksOneThatItNeedsIsNotPassedOver) {
    ship("complete");
    std::string library = contentOf("complete");
    const std::string needed = "libc.so.6";
    const std::size_t name = library.find(needed);
    ASSERT_NE(name, std::string::npos);
    library.replace(name, needed.size(), "no-c.so.6");
    const std::string output = runWith(install(library));
    EXPECT_THAT(output, HasSubstr("initialize: 0\nerror: no-c.so.6: "));
    EXPECT_THAT(output, Not(HasSubstr("stand-in: initialize")));
}

TEST_F(LoaderTest, ALibraryThatRefusesToStartIsNamed) {
    ship("refusing");
    const std::string output = run();
    EXPECT_THAT(output, HasSubstr("stand-in: initialize\ninitialize: 0\nerror: " +
                                  (m_folder / "bin/../lib/libqivo.so").string() + " refused to start\n"));
}

TEST_F(LoaderTest, ADamagedLibraryIsAnErrorAndNotACrash) {
    std::FILE* file = std::fopen((m_folder / "lib" / "libqivo.so").c_str(), "w");
    ASSERT_NE(file, nullptr);
    std::fputs("not a library", file);
    std::fclose(file);
    const std::string output = run();
    EXPECT_THAT(output, HasSubstr("initialize: 0\n"));
    EXPECT_THAT(output, HasSubstr("libqivo.so: file too short"));
    EXPECT_THAT(output, HasSubstr("recall: 0\n"));
}

} // namespace
