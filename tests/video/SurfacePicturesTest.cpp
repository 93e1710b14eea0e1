// Surfaces of picture files against what the formats' own libraries read from them, byte by byte.
#include "video/IOSurface2D.h"

#include "tests/platform/LogCapture.h"
#include "tests/platform/TemporaryDirectory.h"
#include "tests/video/PictureFiles.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <fstream>
#include <iterator>

namespace qivo {
namespace {

using Bytes = std::vector<std::uint8_t>;

void append(Bytes& bytes, std::uint64_t value, int bits) {
    bytes.push_back(static_cast<std::uint8_t>(value));
    if (bits == 16) {
        bytes.push_back(static_cast<std::uint8_t>(value >> 8));
    }
}

/// To the nearest.
std::uint64_t multiplied(std::uint64_t colour, std::uint64_t alpha, std::uint64_t one) {
    return (2 * colour * alpha + one) / (2 * one);
}

/// What the surface of a picture must hold.
Bytes expected(const RawPicture& picture) {
    const std::uint64_t one = picture.bits == 16 ? 0xFFFF : 0xFF;
    Bytes bytes;
    for (std::size_t at = 0; at < picture.values.size(); at += static_cast<std::size_t>(picture.samples)) {
        const std::uint16_t* pixel = &picture.values[at];
        if (picture.samples == 3 && picture.bits == 8) {
            for (const std::uint64_t value :
                 {one, std::uint64_t{pixel[2]}, std::uint64_t{pixel[1]}, std::uint64_t{pixel[0]}}) {
                append(bytes, value, 8);
            }
            continue;
        }
        const std::uint64_t alpha = picture.samples == 4 ? pixel[3] : one;
        for (int colour = 0; colour < 3; ++colour) {
            append(bytes, picture.multiplied ? pixel[colour] : multiplied(pixel[colour], alpha, one), picture.bits);
        }
        append(bytes, alpha, picture.bits);
    }
    return bytes;
}

class SurfacePictures : public testing::Test {
  protected:
    TemporaryDirectory directory;
    LogCapture log;

    void SetUp() override { silenceTiff(); }
    void TearDown() override { EXPECT_THAT(log.take(), testing::IsEmpty()); }

    static void expectSurfaceOf(const RawPicture& picture, const std::string& path) {
        const auto surface = IOSurface2D::initWithFile(path.c_str());
        ASSERT_TRUE(surface->surface()) << path;
        EXPECT_EQ(surface->width(), picture.width);
        EXPECT_EQ(surface->height(), picture.height);
        EXPECT_EQ(surface->bitsPerPixel(), static_cast<std::uint64_t>(4 * picture.bits));
        EXPECT_EQ(surface->format(), picture.bits == 8 ? 0x52474241U : 0x52476841U);
        EXPECT_EQ(surface->alphaInfo(),
                  picture.samples == 4 ? kCGImageAlphaPremultipliedLast : kCGImageAlphaNoneSkipLast);
        Bytes bytes(surface->size());
        ASSERT_TRUE(surface->lock(true));
        std::memcpy(bytes.data(), surface->map(), bytes.size());
        ASSERT_TRUE(surface->unlock());
        EXPECT_EQ(bytes, expected(picture)) << path;
    }

    std::string read(const std::string& path) const {
        std::ifstream file(path, std::ios::binary);
        return {std::istreambuf_iterator<char>(file), {}};
    }
};

constexpr std::uint32_t width = 37;
constexpr std::uint32_t height = 23;

TEST_F(SurfacePictures, ShowEveryBitOfAPng) {
    for (const int bits : {8, 16}) {
        for (const int samples : {3, 4}) {
            const auto picture = RawPicture::patterned(width, height, bits, samples);
            const std::string path = directory.path("picture.png");
            writePng(path, picture);
            ASSERT_EQ(readPng(path), picture) << "the libraries' own word";
            expectSurfaceOf(readPng(path), path);
        }
    }
}

TEST_F(SurfacePictures, ShowEveryBitOfATiffOfEitherByteOrder) {
    for (const char* order : {"l", "b"}) {
        for (const int bits : {8, 16}) {
            for (const int samples : {3, 4}) {
                const auto picture = RawPicture::patterned(width, height, bits, samples);
                const std::string path = directory.path("picture.tiff");
                writeTiff(path, picture, order);
                ASSERT_EQ(readTiff(path), picture) << "the libraries' own word";
                expectSurfaceOf(readTiff(path), path);
            }
        }
    }
}

TEST_F(SurfacePictures, KeepAlphaThatIsMultipliedInAlready) {
    for (const int bits : {8, 16}) {
        auto picture = RawPicture::patterned(width, height, bits, 4);
        picture.multiplied = true;
        for (std::size_t at = 0; at < picture.values.size(); ++at) {
            picture.values[at] = std::min(picture.values[at], picture.values[at / 4 * 4 + 3]);
        }
        const std::string path = directory.path("picture.tiff");
        writeTiff(path, picture, "l");
        ASSERT_EQ(readTiff(path), picture);
        expectSurfaceOf(readTiff(path), path);
    }
}

TEST_F(SurfacePictures, ShowEveryBitOfAJpeg) {
    const std::string path = directory.path("picture.jpg");
    writeJpeg(path, RawPicture::patterned(width, height, 8, 3));
    expectSurfaceOf(readJpeg(path), path);
}

TEST_F(SurfacePictures, OfGreyAreRefused) {
    const std::string path = directory.path("grey.jpg");
    writeJpeg(path, RawPicture::patterned(width, height, 8, 1));
    ASSERT_EQ(readJpeg(path).samples, 1);
    EXPECT_EQ(IOSurface2D::initWithFile(path.c_str())->surface(), nullptr);
}

TEST_F(SurfacePictures, ThatAreCutShortAreRefusedOrFilledUp) {
    const std::string paths[] = {directory.path("a.png"), directory.path("a.tiff"), directory.path("a.jpg")};
    writePng(paths[0], RawPicture::patterned(width, height, 8, 4));
    writeTiff(paths[1], RawPicture::patterned(width, height, 16, 3), "b");
    writeJpeg(paths[2], RawPicture::patterned(width, height, 8, 3));
    for (const auto& path : paths) {
        const std::string whole = read(path);
        // A PNG that lacks nothing but its last 12 bytes, which mark its end, has all of its pixels.
        for (std::size_t length = 0; length + 12 < whole.size(); length += 1 + whole.size() / 60) {
            const auto cut = directory.write("cut", whole.substr(0, length));
            const auto surface = IOSurface2D::initWithFile(cut.c_str());
            // Readers of JPEG, here as elsewhere, go on with grey where the data end.
            if (surface->surface()) {
                EXPECT_EQ(path, paths[2]) << length;
                EXPECT_EQ(surface->size(), 4U * width * height);
            }
        }
    }
}

TEST_F(SurfacePictures, ThatAreDamagedDoNoHarm) {
    const std::string path = directory.path("a.tiff");
    writeTiff(path, RawPicture::patterned(width, height, 16, 4), "l");
    const std::string whole = read(path);
    int refused = 0;
    for (std::size_t at = 0; at < whole.size(); at += at < 16 || at + 200 > whole.size() ? 1 : 97) {
        std::string damaged = whole;
        damaged[at] = static_cast<char>(~damaged[at]);
        const auto surface = IOSurface2D::initWithFile(directory.write("damaged", damaged).c_str());
        refused += surface->surface() ? 0 : 1;
        EXPECT_TRUE(!surface->surface() || surface->lock(true));
    }
    EXPECT_GT(refused, 0);
}

TEST_F(SurfacePictures, ThatClaimToBeHugeAreRefused) {
    auto picture = RawPicture::patterned(width, height, 8, 3);
    const std::string path = directory.path("huge.png");
    writePng(path, picture);
    std::string bytes = read(path);
    // The header's size, with the checksum that belongs to it.
    const std::string header("IHDR\x7F\xFF\xFF\xFF\x7F\xFF\xFF\xFF\x08\x02\0\0\0", 17);
    std::uint32_t checksum = ~0U;
    for (const char byte : header) {
        checksum ^= static_cast<std::uint8_t>(byte);
        for (int bit = 0; bit < 8; ++bit) {
            checksum = checksum >> 1 ^ (checksum & 1 ? 0xEDB88320U : 0);
        }
    }
    checksum = ~checksum;
    bytes.replace(12, header.size(), header);
    for (std::size_t at = 0; at < 4; ++at) {
        bytes[29 + at] = static_cast<char>(checksum >> (24 - 8 * at));
    }
    EXPECT_EQ(IOSurface2D::initWithFile(directory.write("huge.png", bytes).c_str())->surface(), nullptr);
    EXPECT_EQ(IOSurface2D::initWithFile(directory.write("huge.ppm", "P6\n100000 100000\n255\n").c_str())->surface(),
              nullptr);
}

} // namespace
} // namespace qivo
