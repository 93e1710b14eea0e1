#include "tools/record/MovieFile.h"

#include "tests/platform/TemporaryDirectory.h"
#include "tests/record/MovieReader.h"
#include "tools/record/MovieAtoms.h"

#include <csignal>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <sys/resource.h>

namespace qivo::record {
namespace {

constexpr SoundFormat kSound{8000, 2};

FileHandle openFile(const std::string& path) {
    return FileHandle(open(path.c_str(), O_RDWR | O_CREAT | O_EXCL | O_CLOEXEC, 0644));
}

/// A tenth of a second of sound, each sample with its own value.
Fragment soundFragment(int number) {
    Fragment fragment;
    fragment.soundStart = number * 800;
    for (int frame = 0; frame < 800; ++frame) {
        for (int channel = 0; channel < kSound.channels; ++channel) {
            const int value = (number * 800 + frame) * 100;
            fragment.sound.push_back(static_cast<std::uint8_t>(value >> 16));
            fragment.sound.push_back(static_cast<std::uint8_t>(value >> 8));
            fragment.sound.push_back(static_cast<std::uint8_t>(value));
        }
    }
    return fragment;
}

void expectSound(const test::DecodedMovie& movie, std::size_t fragments) {
    ASSERT_TRUE(movie.readable) << movie.error;
    EXPECT_EQ(movie.rate, kSound.rate);
    EXPECT_EQ(movie.channels, kSound.channels);
    ASSERT_EQ(movie.sound.size(), fragments * 800);
    for (std::size_t i = 0; i < movie.sound.size(); ++i) {
        ASSERT_EQ(movie.sound[i], static_cast<float>(i * 100) / 8388608.0F) << i;
    }
}

class MovieFileTest : public testing::Test {
  protected:
    TemporaryDirectory m_folder;
    std::string m_path = m_folder.path("movie.mov");
};

TEST_F(MovieFileTest, IsPlayableAfterEveryFragment) {
    MovieFile movie(openFile(m_path));
    movie.setSound(kSound);
    for (int i = 0; i < 3; ++i) {
        ASSERT_TRUE(movie.append(soundFragment(i)));
        EXPECT_EQ(movie.size(), std::filesystem::file_size(m_path));
        expectSound(test::decodeMovie(m_path), static_cast<std::size_t>(i) + 1);
    }
}

TEST_F(MovieFileTest, GoesOnWhereTheFileSystemNeverTellsANumberOfNames) {
    FileHandle file = openFile(m_path);
    std::filesystem::remove(m_path); // tells 0 names from the beginning, as theirs do
    MovieFile movie(std::move(file));
    movie.setSound(kSound);
    EXPECT_TRUE(movie.append(soundFragment(0))) << movie.error();
    EXPECT_TRUE(movie.finish()) << movie.error();
}

TEST_F(MovieFileTest, AFinishedMovieHasOneDataAtomAndAnIndexBehindIt) {
    MovieFile movie(openFile(m_path));
    movie.setSound(kSound);
    for (int i = 0; i < 3; ++i) {
        ASSERT_TRUE(movie.append(soundFragment(i)));
    }
    const std::uint64_t dataEnd = movie.size();
    ASSERT_TRUE(movie.finish());
    EXPECT_EQ(movie.size(), std::filesystem::file_size(m_path));
    expectSound(test::decodeMovie(m_path), 3);
    std::ifstream file(m_path, std::ios::binary);
    const std::string content(std::istreambuf_iterator<char>(file), {});
    EXPECT_EQ(content.substr(4, 8), "ftypqt  ");
    EXPECT_EQ(content.substr(24, 4), "mdat");
    EXPECT_EQ(content.substr(dataEnd + 4, 4), "moov");
}

TEST_F(MovieFileTest, NothingInNothingOut) {
    MovieFile movie(openFile(m_path));
    EXPECT_TRUE(movie.append({}));
    EXPECT_TRUE(movie.finish());
    EXPECT_EQ(std::filesystem::file_size(m_path), 0U);
}

/// What is cut off anywhere inside the last fragment costs that fragment alone.
TEST_F(MovieFileTest, ATornEndCostsTheLastFragmentAlone) {
    std::uint64_t whole = 0;
    std::uint64_t all = 0;
    {
        MovieFile movie(openFile(m_path));
        movie.setSound(kSound);
        for (int i = 0; i < 3; ++i) {
            whole = movie.size();
            ASSERT_TRUE(movie.append(soundFragment(i)));
        }
        all = movie.size();
    }
    for (const std::uint64_t end : {whole + 1, whole + 60, (whole + all) / 2, all - 1}) {
        const std::string torn = m_folder.path("torn.mov");
        std::filesystem::copy_file(m_path, torn, std::filesystem::copy_options::overwrite_existing);
        std::filesystem::resize_file(torn, end);
        const auto decoded = test::decodeMovie(torn);
        EXPECT_GE(decoded.sound.size(), 1600U) << end - whole << " bytes of the last fragment; " << decoded.error;
    }
}

/// A file may not grow beyond a limit: the same as a full disk, for the writer.
TEST_F(MovieFileTest, WhatDoesNotFitIsTakenBackAndTheRestStaysPlayable) {
    std::signal(SIGXFSZ, SIG_IGN);
    rlimit before{};
    ASSERT_EQ(getrlimit(RLIMIT_FSIZE, &before), 0);
    MovieFile movie(openFile(m_path));
    movie.setSound(kSound);
    ASSERT_TRUE(movie.append(soundFragment(0)));
    ASSERT_TRUE(movie.append(soundFragment(1)));
    const rlimit limit{movie.size() + 2000, before.rlim_max};
    ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &limit), 0);
    const std::uint64_t size = movie.size();
    EXPECT_FALSE(movie.append(soundFragment(2)));
    EXPECT_EQ(movie.error(), "File too large");
    EXPECT_EQ(std::filesystem::file_size(m_path), size);
    ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &before), 0);
    expectSound(test::decodeMovie(m_path), 2);
}

TEST(MovieAtoms, TheHeadKeepsItsLengthWhateverTheMovieHas) {
    MovieInfo info;
    EXPECT_EQ(headOf(info, {}).size(), headBytes);
    info.sound = {192000, 8};
    EXPECT_EQ(headOf(info, {}).size(), headBytes);
    info.picture.emplace();
    info.picture->width = 8192;
    info.picture->height = 8192;
    info.picture->decoderSetup.resize(1000);
    EXPECT_EQ(headOf(info, {}).size(), headBytes);
}

TEST(MovieAtoms, LengthsBeyond32BitsAreWritten) {
    const auto header = dataHeader(0x1'2345'6789);
    ASSERT_EQ(header.size(), dataHeaderBytes);
    EXPECT_EQ(header[3], 1) << "the length follows the type";
    EXPECT_EQ(header[11], 1);
    EXPECT_EQ(header[15], 0x89 - dataHeaderOffset);
}

TEST(SampleTables, APictureLastsUntilTheNextOverFragmentsAndGaps) {
    SampleTables tables;
    Fragment fragment;
    fragment.pictures = {{{1}, 0, 3000, true}, {{1, 2}, 90000, 3000, false}};
    tables.add(fragment, 100, 6);
    fragment.pictures = {{{1, 2, 3}, 400000, 3000, false}};
    tables.add(fragment, 200, 6);
    ASSERT_EQ(tables.pictures.size(), 3U);
    EXPECT_EQ(tables.pictures[0].duration, 90000U) << "until the next";
    EXPECT_EQ(tables.pictures[1].duration, 310000U) << "over a gap as well";
    EXPECT_EQ(tables.pictureEnd(), 403000);
    EXPECT_EQ(tables.pictureChunks[1].offset, 200U);
}

TEST(SampleTables, WhatAnIndexHasNoNumbersForDoesNotFit) {
    SampleTables tables;
    Fragment fragment;
    fragment.pictures = {{{1}, 0, 3000, true}};
    tables.add(fragment, 100, 6);
    tables.soundFrames = 0xFFFFFFFF; // 24 h 51 min at 48000 Hz
    EXPECT_TRUE(tables.fitsIndex());
    ++tables.soundFrames;
    EXPECT_FALSE(tables.fitsIndex());
    tables.soundFrames = 0;
    fragment.pictures = {{{1}, 0x7FFFFFFE, 3000, true}};
    tables.add(fragment, 200, 6);
    EXPECT_TRUE(tables.fitsIndex());
    EXPECT_EQ(tables.pictures[0].duration, 0x7FFFFFFEU);
    fragment.pictures = {{{1}, 0x7FFFFFFELL + 0x1'0000'0010, 3000, true}};
    tables.add(fragment, 300, 6);
    EXPECT_FALSE(tables.fitsIndex()) << "and not the 16 units that 32 bits would leave of it";
    EXPECT_EQ(tables.pictureEnd(), 0x7FFFFFFELL + 0x1'0000'0010 + 3000);
}

/// What the index of a day costs: it is written when the recording ends, which is to take less than a second.
TEST(MovieAtoms, TheIndexOfADayIsAsLongAsItsPicturesNeed) {
    constexpr std::uint32_t pictures = 24 * 60 * 60 * 30;
    MovieInfo info;
    info.picture.emplace();
    info.picture->width = 16;
    info.picture->height = 16;
    SampleTables tables;
    for (std::uint32_t i = 0; i < pictures; ++i) {
        tables.pictures.push_back({i * 3000LL, 3000, 1000, i % 60 == 0});
        if (i % 12 == 0) {
            tables.pictureChunks.push_back({i * 1000ULL, 12});
        }
    }
    const std::size_t size = indexOf(info, tables).size();
    EXPECT_GE(size, 4ULL * pictures) << "the size of each";
    EXPECT_LE(size, 5ULL * pictures);
}

} // namespace
} // namespace qivo::record
