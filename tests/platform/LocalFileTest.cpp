#include "platform/LocalFile.h"

#include "tests/platform/TemporaryDirectory.h"

#include <gtest/gtest.h>

#include <optional>
#include <string>
#include <sys/stat.h>

namespace qivo {
namespace {

constexpr std::size_t limit = 100000;

struct Outcome {
    std::optional<std::string> value;
    std::string error;
};

Outcome reading(const char* path) {
    Outcome outcome;
    outcome.value = readFile(path, limit, outcome.error);
    return outcome;
}

Outcome resolving(const char* url) {
    Outcome outcome;
    outcome.value = localPath(url, outcome.error);
    return outcome;
}

class ReadFile : public testing::Test {
  protected:
    TemporaryDirectory directory;

    void expectFailure(const std::string& path, const std::string& reason) {
        const Outcome outcome = reading(path.c_str());
        EXPECT_FALSE(outcome.value);
        EXPECT_EQ(outcome.error, path + ": " + reason);
    }
};

TEST_F(ReadFile, GivesAllBytes) {
    const std::string bytes("a\0b\r\n\xFF", 6);
    const Outcome outcome = reading(directory.write("file", bytes).c_str());
    EXPECT_EQ(outcome.value, bytes);
    EXPECT_EQ(outcome.error, "");
}

TEST_F(ReadFile, GivesNothingOfAnEmptyFile) {
    EXPECT_EQ(reading(directory.write("file", "").c_str()).value, "");
}

TEST_F(ReadFile, ReadsUpToTheLimit) {
    const std::string bytes(limit, 'x');
    EXPECT_EQ(reading(directory.write("file", bytes).c_str()).value, bytes);
}

TEST_F(ReadFile, RefusesAByteMoreThanTheLimit) {
    expectFailure(directory.write("file", std::string(limit + 1, 'x')), "Larger than 100000 bytes");
}

TEST_F(ReadFile, RefusesAMissingFile) {
    expectFailure(directory.path("none"), "No such file or directory");
}

TEST_F(ReadFile, RefusesADirectory) {
    expectFailure(directory.path(), "Is a directory");
}

TEST_F(ReadFile, DoesNotWaitForTheWriterOfAPipe) {
    const std::string pipe = directory.path("pipe");
    ASSERT_EQ(::mkfifo(pipe.c_str(), 0600), 0);
    expectFailure(pipe, "Not a regular file");
}

TEST_F(ReadFile, RefusesADevice) {
    expectFailure("/dev/zero", "Not a regular file");
}

TEST_F(ReadFile, RefusesNull) {
    const Outcome outcome = reading(nullptr);
    EXPECT_FALSE(outcome.value);
    EXPECT_EQ(outcome.error, "No file name was given");
}

TEST(LocalPath, IsThePathOfAFileUrl) {
    EXPECT_EQ(resolving("file:///a/b.txt").value, "/a/b.txt");
    EXPECT_EQ(resolving("file://localhost/a/b.txt").value, "/a/b.txt");
    EXPECT_EQ(resolving("file:/a/b.txt").value, "/a/b.txt");
    EXPECT_EQ(resolving("FILE://LocalHost/a/B.txt").value, "/a/B.txt");
}

TEST(LocalPath, ResolvesPercentEncoding) {
    EXPECT_EQ(resolving("file:///a%20b%2Fc%c3%A9%25").value, "/a b/c\xC3\xA9%");
}

TEST(LocalPath, LeavesOutQueryAndFragment) {
    EXPECT_EQ(resolving("file:///a?b").value, "/a");
    EXPECT_EQ(resolving("file:///a#b?c").value, "/a");
    EXPECT_EQ(resolving("file:///a%3Fb").value, "/a?b");
}

TEST(LocalPath, RefusesOtherSchemes) {
    for (const std::string url : {"http://host/a", "rtsp://host/a", "/a/b", "a", "", "filer:///a"}) {
        const Outcome outcome = resolving(url.c_str());
        EXPECT_FALSE(outcome.value) << url;
        EXPECT_EQ(outcome.error, url + ": Only file URLs can be read");
    }
}

TEST(LocalPath, RefusesOtherMachinesAndWhatIsNoPath) {
    for (const std::string url : {"file://host/a", "file:a", "file:", "file://", "file:///a%", "file:///a%2",
                                  "file:///a%2x", "file:///a%x2", "file:///a%00b"}) {
        const Outcome outcome = resolving(url.c_str());
        EXPECT_FALSE(outcome.value) << url;
        EXPECT_EQ(outcome.error, url + ": Not the URL of a file on this machine");
    }
}

TEST(LocalPath, RefusesNull) {
    const Outcome outcome = resolving(nullptr);
    EXPECT_FALSE(outcome.value);
    EXPECT_EQ(outcome.error, "No URL was given");
}

} // namespace
} // namespace qivo
