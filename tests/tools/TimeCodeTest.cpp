#include "tools/publish/TimeCode.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <random>
#include <vector>

namespace qivo {
namespace {

constexpr std::int64_t someTime = 1795230154682;

struct Plane {
    int width = 0;
    int height = 0;
    std::vector<std::uint8_t> samples;

    [[nodiscard]] std::optional<std::int64_t> read() const {
        return readTimeCode(samples.data(), width, height, width, 1);
    }
};

Plane plain(int width, int height, std::uint8_t level) {
    return {width, height, std::vector<std::uint8_t>(static_cast<std::size_t>(width) * height, level)};
}

Plane coded(int width, int height, std::int64_t time) {
    Plane plane = plain(width, height, 120);
    writeTimeCode(plane.samples.data(), width, height, width, time);
    return plane;
}

// Bilinear, as a texture is drawn.
Plane scaled(const Plane& from, int width, int height) {
    Plane to = plain(width, height, 0);
    const auto at = [&](int x, int y) {
        return from.samples[static_cast<std::size_t>(std::clamp(y, 0, from.height - 1)) * from.width +
                            std::clamp(x, 0, from.width - 1)];
    };
    for (int y = 0; y < height; ++y) {
        for (int x = 0; x < width; ++x) {
            const double u = (x + 0.5) * from.width / width - 0.5;
            const double v = (y + 0.5) * from.height / height - 0.5;
            const int left = static_cast<int>(std::floor(u));
            const int top = static_cast<int>(std::floor(v));
            const double a = u - left;
            const double b = v - top;
            to.samples[static_cast<std::size_t>(y) * width + x] =
                static_cast<std::uint8_t>((1 - b) * ((1 - a) * at(left, top) + a * at(left + 1, top)) +
                                          b * ((1 - a) * at(left, top + 1) + a * at(left + 1, top + 1)));
        }
    }
    return to;
}

TEST(TimeCode, whatIsWrittenIsRead) {
    for (const std::int64_t time :
         {std::int64_t{0}, std::int64_t{1}, someTime, (std::int64_t{1} << timeCodeBits) - 1}) {
        for (const int width : {timeCodeMinimumWidth, 320, 1280, 1366, 1920}) {
            EXPECT_EQ(coded(width, width * 9 / 16, time).read(), time) << width;
        }
    }
}

TEST(TimeCode, onlyTheStripIsTouched) {
    const Plane plane = coded(320, 180, someTime);
    const auto above = plane.samples.begin() + static_cast<std::ptrdiff_t>(320) * timeCodeTop(180);
    EXPECT_TRUE(std::all_of(plane.samples.begin(), above, [](int level) { return level == 120; }));
    EXPECT_TRUE(std::all_of(above, plane.samples.end(), [](int level) { return level == 16 || level == 235; }));
}

TEST(TimeCode, layoutIsAsDocumented) {
    const Plane plane = coded(64 * 4, 144, 0);
    std::string cells;
    for (int cell = 0; cell < timeCodeCells; ++cell) {
        cells += plane.samples[static_cast<std::size_t>(143) * 256 + cell * 4] == 235 ? '1' : '0';
    }
    // What another implementation (Python's binascii.crc_hqx) gives for six zero bytes.
    EXPECT_EQ(cells.substr(0, 48), "1010" + std::string(44, '0'));
    EXPECT_EQ(cells.substr(48), "0000111000010000");
}

TEST(TimeCode, survivesScaling) {
    const Plane plane = coded(1280, 720, someTime);
    for (const int width : {2560, 1920, 1000, 640, 333, 256}) {
        EXPECT_EQ(scaled(plane, width, width * 9 / 16).read(), someTime) << width;
    }
    EXPECT_EQ(scaled(coded(160, 90, someTime), 1280, 720).read(), someTime);
}

TEST(TimeCode, survivesNoiseAndLowContrast) {
    Plane plane = coded(1280, 720, someTime);
    std::mt19937 random(1);
    std::normal_distribution<double> noise(0, 25);
    for (std::uint8_t& sample : plane.samples) {
        sample = static_cast<std::uint8_t>(std::clamp(90 + sample * 0.3 + noise(random), 0.0, 255.0));
    }
    EXPECT_EQ(plane.read(), someTime);
}

TEST(TimeCode, readsPixelsOfAnyOrderStrideAndDirection) {
    const Plane plane = coded(640, 360, someTime);
    constexpr int padding = 24;
    for (const int bytes : {3, 4}) {
        const std::ptrdiff_t stride = 640 * bytes + padding;
        std::vector<std::uint8_t> pixels(stride * 360, 7);
        for (int y = 0; y < 360; ++y) {
            for (int x = 0; x < 640; ++x) {
                std::fill_n(&pixels[(359 - y) * stride + static_cast<std::ptrdiff_t>(x) * bytes], 3,
                            plane.samples[static_cast<std::size_t>(y) * 640 + x]);
            }
        }
        EXPECT_EQ(readTimeCode(pixels.data() + 359 * stride, 640, 360, -stride, bytes), someTime);
        EXPECT_EQ(readTimeCode(pixels.data(), 640, 360, stride, bytes), std::nullopt);
    }
}

TEST(TimeCode, everySingleWrongCellIsNoticed) {
    for (int cell = 4; cell < timeCodeCells; ++cell) {
        Plane plane = coded(640, 360, someTime);
        for (int y = timeCodeTop(360); y < 360; ++y) {
            for (int x = cell * 10; x < cell * 10 + 10; ++x) {
                std::uint8_t& sample = plane.samples[static_cast<std::size_t>(y) * 640 + x];
                sample = sample == 16 ? 235 : 16;
            }
        }
        EXPECT_EQ(plane.read(), std::nullopt) << cell;
    }
}

TEST(TimeCode, nothingIsReadWhereNothingIsWritten) {
    EXPECT_EQ(plain(640, 360, 0).read(), std::nullopt);
    EXPECT_EQ(plain(640, 360, 255).read(), std::nullopt);
    EXPECT_EQ(coded(timeCodeMinimumWidth - 2, 72, someTime).read(), std::nullopt);
    EXPECT_EQ(readTimeCode(nullptr, 640, 360, 640, 1), std::nullopt);
    EXPECT_EQ(plain(640, 4, 0).read(), std::nullopt);
}

} // namespace
} // namespace qivo
