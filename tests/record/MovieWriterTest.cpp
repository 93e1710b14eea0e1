// The writer with its thread, without GStreamer.
#include "tools/record/MovieWriter.h"

#include "tests/platform/TemporaryDirectory.h"
#include "tests/record/SlowDisk.h"

#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <iterator>
#include <thread>

namespace qivo::record {
namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;
using testing::ElementsAre;
using testing::EndsWith;

constexpr SoundFormat kSound{8000, 1};

std::string contentOf(const std::string& path) {
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
}

bool eventually(const std::function<bool()>& condition) {
    const auto end = std::chrono::steady_clock::now() + seconds(20);
    while (!condition() && std::chrono::steady_clock::now() < end) {
        std::this_thread::sleep_for(milliseconds(5));
    }
    return condition();
}

class MovieWriterTest : public testing::Test {
  protected:
    MovieWriterTest() { m_writer.emplace(MoviePlace("A", m_path)); }

    void picture(int number) {
        m_writer->add(CodedPicture{std::vector<std::uint8_t>(100, static_cast<std::uint8_t>(number)),
                                   seconds(50) + number * milliseconds(40), number == 0});
    }
    /// 10 ms.
    bool sound(int number) {
        return m_writer->add(SoundPiece{std::vector<std::uint8_t>(80 * 3, 7), seconds(50) + number * milliseconds(10)},
                             kSound);
    }
    std::vector<std::string> names() const {
        std::vector<std::string> names;
        for (const auto& entry : std::filesystem::directory_iterator(m_folder.path())) {
            names.push_back(entry.path().filename());
        }
        return names;
    }

    TemporaryDirectory m_folder;
    std::string m_path = m_folder.path("A.mov");
    std::optional<MovieWriter> m_writer;
};

TEST_F(MovieWriterTest, PicturesAndSoundOfTwoThreadsAreWrittenWhileAThirdLooksOn) {
    m_writer->setPicture({16, 16, 1, 1, {1, 2, 3}});
    std::thread pictures([this] {
        for (int i = 0; i < 100; ++i) {
            picture(i);
            std::this_thread::sleep_for(milliseconds(20));
        }
    });
    std::thread sounds([this] {
        for (int i = 0; i < 400; ++i) {
            EXPECT_TRUE(sound(i));
            std::this_thread::sleep_for(milliseconds(5));
        }
    });
    EXPECT_TRUE(eventually([this] { return m_writer->status().pictures > 50; }));
    const std::uint64_t told = m_writer->status().bytes;
    EXPECT_LE(told, std::filesystem::file_size(m_path)) << "which grows meanwhile";
    pictures.join();
    sounds.join();
    m_writer->finish();
    const MovieWriter::Status status = m_writer->status();
    EXPECT_EQ(status.problem, "");
    EXPECT_EQ(status.remark, "");
    EXPECT_EQ(status.pictures, 100U);
    EXPECT_EQ(status.bytes, std::filesystem::file_size(m_path));
    EXPECT_EQ(status.length, seconds(4));
    const std::string content = contentOf(m_path);
    EXPECT_EQ(content.substr(24, 4), "mdat") << "a plain movie";
    for (int i = 0; i < 100; ++i) {
        EXPECT_NE(content.find(std::string(100, static_cast<char>(i))), std::string::npos) << i;
    }
}

TEST_F(MovieWriterTest, EachFragmentIsHandedToTheDiskAndSoIsTheIndex) {
    const std::int64_t before = test::SlowDisk::times();
    picture(0);
    ASSERT_TRUE(eventually([this] { return m_writer->status().pictures == 1; }));
    EXPECT_EQ(test::SlowDisk::times(), before + 1);
    picture(1);
    ASSERT_TRUE(eventually([this] { return m_writer->status().pictures == 2; }));
    EXPECT_EQ(test::SlowDisk::times(), before + 2);
    m_writer->finish();
    EXPECT_EQ(test::SlowDisk::times(), before + 3);
}

TEST_F(MovieWriterTest, ADiskThatDoesNotComeBackIsToldAndWhatGoesBeyondTheBoundIsRefused) {
    {
        const test::SlowDisk disk;
        picture(0);
        EXPECT_TRUE(eventually([this] { return m_writer->status().diskIsSlow; }));
        const std::vector<std::uint8_t> large(std::size_t{3} << 20U);
        std::size_t taken = 0;
        while (taken < 100 && m_writer->add(SoundPiece{large, seconds(50)}, kSound)) {
            ++taken;
        }
        EXPECT_EQ(taken, (MovieWriter::mostWaiting + large.size() - 1) / large.size());
    }
    EXPECT_TRUE(eventually([this] { return !m_writer->status().diskIsSlow && sound(0); }));
}

TEST_F(MovieWriterTest, AMovieThatIsDeletedIsToldSoon) {
    picture(0);
    ASSERT_TRUE(eventually([this] { return m_writer->status().pictures == 1; }));
    std::filesystem::remove(m_path);
    picture(1);
    EXPECT_TRUE(eventually([this] { return !m_writer->status().problem.empty(); }));
    EXPECT_EQ(m_writer->status().problem, "the movie \"" + m_path + "\" ends here: it has been deleted");
    m_writer->finish();
    EXPECT_EQ(names(), std::vector<std::string>());
}

TEST_F(MovieWriterTest, AMovieThatIsMovedGoesOn) {
    picture(0);
    ASSERT_TRUE(eventually([this] { return m_writer->status().pictures == 1; }));
    std::filesystem::rename(m_path, m_folder.path("B.mov"));
    picture(1);
    m_writer->finish();
    EXPECT_EQ(m_writer->status().problem, "");
    EXPECT_EQ(contentOf(m_folder.path("B.mov")).substr(24, 4), "mdat");
}

TEST_F(MovieWriterTest, AMovieThatIsTooLongForAnIndexStaysInFragmentsAndIsToldSo) {
    picture(0);
    m_writer->add(CodedPicture{{1, 2, 3}, seconds(50) + std::chrono::hours(7), false});
    m_writer->add(CodedPicture{{1, 2, 3}, seconds(50) + std::chrono::hours(7) + seconds(1), false});
    m_writer->finish();
    EXPECT_EQ(m_writer->status().problem, "");
    EXPECT_THAT(m_writer->status().remark, EndsWith("A.mov\" is too long for an index and stays in fragments"));
    const std::string content = contentOf(m_path);
    EXPECT_EQ(content.substr(24, 4), "free");
    EXPECT_NE(content.find("moof"), std::string::npos);
    EXPECT_EQ(m_writer->status().bytes, content.size());
}

} // namespace
} // namespace qivo::record
