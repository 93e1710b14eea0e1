#include "tools/record/MoviePlace.h"

#include "tests/platform/TemporaryDirectory.h"

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <iterator>
#include <sys/resource.h>
#include <sys/stat.h>
#include <utime.h>

namespace qivo::record {
namespace {

namespace fs = std::filesystem;
using testing::HasSubstr;

std::string contentOf(const std::string& path) {
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
}

std::vector<std::string> namesIn(const std::string& folder) {
    std::vector<std::string> names;
    for (const auto& entry : fs::directory_iterator(folder)) {
        names.push_back(entry.path().filename().string());
    }
    std::sort(names.begin(), names.end());
    return names;
}

class MoviePlaceTest : public testing::Test {
  protected:
    MoviePlace place(const std::string& source) const {
        return MoviePlace(source, m_folder.path() + "/" + source + ".mov");
    }
    /// Makes the movie's file with that content.
    static void record(MoviePlace place, const std::string& content) {
        ASSERT_EQ(place.problem(), "");
        std::string problem;
        const FileHandle file = place.create(problem);
        ASSERT_TRUE(file) << problem;
        ASSERT_EQ(write(file.get(), content.data(), content.size()), static_cast<ssize_t>(content.size()));
    }

    TemporaryDirectory m_folder;
};

TEST_F(MoviePlaceTest, NamesAreTakenAsTheyStand) {
    const std::string longest = "LONGNAME (" + std::string(52, 'x') + ")";
    ASSERT_EQ(longest.size(), 63U);
    for (const std::string& name :
         {std::string("STUDIO (Cam 1)"), std::string("it's \"quoted\" `here`"), std::string("100% %s %n %@"),
          std::string("Kamera 😀 北"), std::string("a\\b;c&d|e$f*?"), std::string("-i"),
          std::string(" leading and trailing "), longest}) {
        record(place(name), name);
        EXPECT_EQ(contentOf(m_folder.path(name + ".mov")), name);
    }
    EXPECT_EQ(namesIn(m_folder.path()).size(), 8U) << "nothing else is left in the folder";
}

TEST_F(MoviePlaceTest, FoldersOfTheSameNamesAreTakenAsTheyStand) {
    const std::string folder = m_folder.path("Filme (neu) 100% 'ja' 😀");
    ASSERT_TRUE(fs::create_directory(folder));
    record(MoviePlace("A (b)", folder + "/A (b).mov"), "x");
    EXPECT_EQ(contentOf(folder + "/A (b).mov"), "x");
}

TEST_F(MoviePlaceTest, ASlashInANameMakesAFolder) {
    record(place("STUDIO (Cam 1/wide/2)"), "x");
    EXPECT_EQ(contentOf(m_folder.path("STUDIO (Cam 1/wide/2).mov")), "x");
    record(place("STUDIO (Cam 1/wide/2)"), "y");
    EXPECT_EQ(namesIn(m_folder.path("STUDIO (Cam 1/wide")).size(), 2U);
}

TEST_F(MoviePlaceTest, NoFolderIsMadeBeforeThereIsAMovie) {
    EXPECT_EQ(place("a/b").problem(), "");
    EXPECT_TRUE(fs::is_empty(m_folder.path()));
}

TEST_F(MoviePlaceTest, ThePathThatTheNameDoesNotEndNeedsItsFolder) {
    const MoviePlace other("A", m_folder.path("missing/B.mov"));
    EXPECT_EQ(other.problem(),
              "cannot record into the folder \"" + m_folder.path("missing") + "\": No such file or directory");
}

TEST_F(MoviePlaceTest, AMissingFolderIsToldAndNotMade) {
    const MoviePlace gone("A", m_folder.path("gone/A.mov"));
    EXPECT_EQ(gone.problem(),
              "cannot record into the folder \"" + m_folder.path("gone") + "\": No such file or directory");
    EXPECT_FALSE(fs::exists(m_folder.path("gone")));
}

TEST_F(MoviePlaceTest, AFileInTheFoldersPlaceIsTold) {
    m_folder.write("file", "x");
    const MoviePlace place("A", m_folder.path("file/A.mov"));
    EXPECT_THAT(place.problem(), HasSubstr("Not a directory"));
}

TEST_F(MoviePlaceTest, ANameThatIsTooLongIsToldBeforeRecording) {
    EXPECT_THAT(place(std::string(252, 'x')).problem(), HasSubstr("File name too long"));
    EXPECT_EQ(place(std::string(251, 'x')).problem(), "");
}

TEST_F(MoviePlaceTest, ClimbingOutOfTheFolderIsRefused) {
    for (const std::string name : {"../A", "a/../../A", "a/../b", "../../../../etc/A"}) {
        EXPECT_THAT(place(name).problem(), HasSubstr("lead out")) << name;
    }
    EXPECT_THAT(MoviePlace("A", m_folder.path() + "/../A.mov").problem(),
                HasSubstr("\"..\" would lead out of the folder"));
    EXPECT_THAT(MoviePlace("A", "../A.mov").problem(), HasSubstr("lead out"));
    EXPECT_THAT(MoviePlace("A", m_folder.path() + "/..").problem(), HasSubstr("lead out"));
    EXPECT_EQ(place("A..B").problem(), "") << "dots alone are no climbing";
    EXPECT_EQ(place("..").problem(), "") << "the ending makes it a name like others";
}

TEST_F(MoviePlaceTest, APathWithoutAFilesNameIsRefused) {
    EXPECT_THAT(MoviePlace("A", m_folder.path() + "/").problem(), HasSubstr("that is no file's name"));
    EXPECT_THAT(MoviePlace("A", m_folder.path() + "/.").problem(), HasSubstr("that is no file's name"));
}

TEST_F(MoviePlaceTest, AnExistingMovieIsKeptUnderItsTime) {
    setenv("TZ", "UTC", 1);
    tzset();
    const std::string movie = m_folder.write("STUDIO (Cam 1).mov", "first");
    const utimbuf written = {1'700'000'000, 1'700'000'000};
    ASSERT_EQ(utime(movie.c_str(), &written), 0);
    record(place("STUDIO (Cam 1)"), "second");
    EXPECT_EQ(contentOf(m_folder.path("STUDIO (Cam 1) 2023-11-14 22.13.20.mov")), "first");
    EXPECT_EQ(contentOf(movie), "second");
}

TEST_F(MoviePlaceTest, WhereNoFileCanBeMadeTheExistingMovieHasItsNameAgain) {
    const std::string movie = m_folder.write("A.mov", "first");
    rlimit files{};
    ASSERT_EQ(getrlimit(RLIMIT_NOFILE, &files), 0);
    const rlimit none{0, files.rlim_max};
    ASSERT_EQ(setrlimit(RLIMIT_NOFILE, &none), 0);
    std::string problem;
    EXPECT_FALSE(place("A").create(problem));
    ASSERT_EQ(setrlimit(RLIMIT_NOFILE, &files), 0);
    EXPECT_EQ(problem, "cannot record to \"" + movie + "\": Too many open files");
    EXPECT_EQ(namesIn(m_folder.path()), std::vector<std::string>{"A.mov"});
    EXPECT_EQ(contentOf(movie), "first");
}

TEST_F(MoviePlaceTest, ManyOfTheSameSecondAreAllKept) {
    setenv("TZ", "UTC", 1);
    tzset();
    const utimbuf written = {1'700'000'000, 1'700'000'000};
    for (const std::string content : {"1", "2", "3", "4"}) {
        record(place("A"), content);
        ASSERT_EQ(utime(m_folder.path("A.mov").c_str(), &written), 0);
    }
    EXPECT_EQ(contentOf(m_folder.path("A 2023-11-14 22.13.20.mov")), "1");
    EXPECT_EQ(contentOf(m_folder.path("A 2023-11-14 22.13.20 (2).mov")), "2");
    EXPECT_EQ(contentOf(m_folder.path("A 2023-11-14 22.13.20 (3).mov")), "3");
    EXPECT_EQ(contentOf(m_folder.path("A.mov")), "4");
}

TEST_F(MoviePlaceTest, AFolderAndALinkOfTheMoviesNameAreKeptToo) {
    fs::create_directory(m_folder.path("A.mov"));
    record(place("A"), "x");
    fs::remove(m_folder.path("A.mov"));
    const std::string elsewhere = m_folder.write("elsewhere", "kept");
    fs::create_symlink(elsewhere, m_folder.path("A.mov"));
    record(place("A"), "y");
    EXPECT_EQ(contentOf(elsewhere), "kept") << "what a link leads to is not written to";
    EXPECT_EQ(contentOf(m_folder.path("A.mov")), "y");
    EXPECT_EQ(namesIn(m_folder.path()).size(), 4U);
}

TEST(KeptName, IsCutBetweenCharactersWhereItWouldBeTooLong) {
    setenv("TZ", "UTC", 1);
    tzset();
    std::string stem;
    for (int i = 0; i < 62; ++i) {
        stem += "😀"; // 248 bytes
    }
    const std::string kept = keptName(stem + ".mov", 0, 1);
    EXPECT_EQ(kept.size(), 57 * 4 + std::string(" 1970-01-01 00.00.00.mov").size());
    EXPECT_THAT(kept, testing::EndsWith("😀 1970-01-01 00.00.00.mov"));
    EXPECT_EQ(keptName("A", 0, 2), "A 1970-01-01 00.00.00 (2)") << "without an extension";
    EXPECT_EQ(keptName(".mov", 0, 1), ".mov 1970-01-01 00.00.00") << "a hidden file has none";
}

} // namespace
} // namespace qivo::record
