#include "tools/record/PictureFitter.h"
#include "tools/record/PlanarRows.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdint>
#include <gst/gst.h>
#include <gtest/gtest.h>
#include <random>
#include <string>
#include <utility>
#include <vector>

namespace qivo::record {
namespace {

constexpr double nearest = 0.52; // levels: half of one by rounding, the rest by coefficients of 16 bits
constexpr std::pair<double, double> bt601{0.299, 0.114};
constexpr std::pair<double, double> bt709{0.2126, 0.0722};

/// Pixels of four bytes, the last of which is noise; the last row ends with its last pixel.
struct Picture {
    int width = 0;
    int height = 0;
    std::ptrdiff_t stride = 0;
    std::vector<std::uint8_t> bytes;

    Picture(int theWidth, int theHeight, int padding = 0)
        : width(theWidth), height(theHeight), stride(4 * theWidth + padding),
          bytes(static_cast<std::size_t>(stride * height - padding)) {
        std::mt19937 random(7);
        std::generate(bytes.begin(), bytes.end(), [&] { return static_cast<std::uint8_t>(random()); });
    }

    [[nodiscard]] std::uint8_t* at(int x, int y) {
        return bytes.data() + y * stride + 4 * static_cast<std::ptrdiff_t>(x);
    }
    /// Red, green or blue; beyond an edge that at the edge.
    [[nodiscard]] double level(int x, int y, int component) {
        return at(std::clamp(x, 0, width - 1), std::clamp(y, 0, height - 1))[component];
    }

    void paint(const std::array<std::uint8_t, 3>& colour) {
        for (int y = 0; y < height; ++y) {
            for (int x = 0; x < width; ++x) {
                std::copy(colour.begin(), colour.end(), at(x, y));
            }
        }
    }

    [[nodiscard]] QIVOlib_video_frame_v2_t frame() {
        QIVOlib_video_frame_v2_t frame{};
        frame.xres = width;
        frame.yres = height;
        frame.FourCC = 'R' | 'G' << 8 | 'B' << 16 | static_cast<std::uint32_t>('A') << 24;
        frame.p_data = bytes.data();
        frame.line_stride_in_bytes = static_cast<int>(stride);
        return frame;
    }
};

struct Planes {
    int width = 0;
    int height = 0;
    std::vector<std::uint8_t> y;
    std::vector<std::uint8_t> u;
    std::vector<std::uint8_t> v;

    Planes(int theWidth, int theHeight)
        : width(theWidth), height(theHeight), y(static_cast<std::size_t>(theWidth) * theHeight),
          u(static_cast<std::size_t>((theWidth + 1) / 2) * ((theHeight + 1) / 2)), v(u.size()) {}

    [[nodiscard]] int halfWidth() const { return (width + 1) / 2; }
};

/// Luma and both differences of a colour, by the definition.
std::array<double, 3> defined(const std::array<double, 3>& rgb, const std::pair<double, double>& parts) {
    const auto [red, blue] = parts;
    const double luma = red * rgb[0] + (1 - red - blue) * rgb[1] + blue * rgb[2];
    return {16 + luma * 219 / 255, 128 + (rgb[2] - luma) / (2 * (1 - blue)) * 224 / 255,
            128 + (rgb[0] - luma) / (2 * (1 - red)) * 224 / 255};
}

/// How far from the definition planes are at most.
double farthest(Picture& picture, const Planes& planes, const std::pair<double, double>& parts) {
    double worst = 0;
    for (int y = 0; y < picture.height; ++y) {
        for (int x = 0; x < picture.width; ++x) {
            const std::array<double, 3> rgb{picture.level(x, y, 0), picture.level(x, y, 1), picture.level(x, y, 2)};
            const auto at = static_cast<std::size_t>(y) * picture.width + x;
            worst = std::max(worst, std::abs(planes.y[at] - defined(rgb, parts)[0]));
        }
    }
    for (int y = 0; y < picture.height; y += 2) {
        for (int x = 0; x < picture.width; x += 2) {
            std::array<double, 3> rgb{};
            for (int i = 0; i < 3; ++i) {
                for (const int row : {y, y + 1}) {
                    rgb[static_cast<std::size_t>(i)] +=
                        (picture.level(x - 1, row, i) + 2 * picture.level(x, row, i) + picture.level(x + 1, row, i)) /
                        8;
                }
            }
            const auto wanted = defined(rgb, parts);
            const auto at = static_cast<std::size_t>(y / 2) * planes.halfWidth() + x / 2;
            worst = std::max({worst, std::abs(planes.u[at] - wanted[1]), std::abs(planes.v[at] - wanted[2])});
        }
    }
    return worst;
}

/// Of a picture of one or two rows.
Planes convertedRows(Picture& picture, const std::pair<double, double>& parts) {
    Planes planes(picture.width, picture.height);
    const int last = picture.height - 1;
    planarRows(PlanarColours::of(parts.first, parts.second), picture.at(0, 0), picture.at(0, last),
               {planes.y.data(), planes.y.data() + static_cast<std::ptrdiff_t>(last) * picture.width, planes.u.data(),
                planes.v.data()},
               picture.width);
    return planes;
}

class PlanarRows : public testing::Test {
  protected:
    void SetUp() override {
        if (!hasPlanarRows()) {
            GTEST_SKIP() << "this processor leaves it to GStreamer";
        }
    }
};

TEST_F(PlanarRows, AreWhatTheStandardsDefineInEveryWidth) {
    for (const auto& parts : {bt601, bt709}) {
        for (int width = 1; width <= 70; ++width) {
            for (const int height : {1, 2}) {
                Picture picture(width, height);
                const Planes planes = convertedRows(picture, parts);
                EXPECT_LT(farthest(picture, planes, parts), nearest) << width << " x " << height;
            }
        }
    }
}

TEST_F(PlanarRows, EndWithTheirLastPixel) {
    constexpr std::uint8_t untouched = 7; // no luma and no difference
    for (int width = 1; width <= 40; ++width) {
        Picture picture(width, 2);
        std::vector<std::uint8_t> top(48, untouched);
        auto bottom = top;
        auto u = top;
        auto v = top;
        planarRows(PlanarColours::of(bt709.first, bt709.second), picture.at(0, 0), picture.at(0, 1),
                   {top.data(), bottom.data(), u.data(), v.data()}, width);
        for (const auto* row : {&top, &bottom}) {
            EXPECT_EQ(std::count(row->begin(), row->end(), untouched), 48 - width) << width;
        }
        for (const auto* row : {&u, &v}) {
            EXPECT_EQ(std::count(row->begin(), row->end(), untouched), 48 - (width + 1) / 2) << width;
        }
    }
}

TEST_F(PlanarRows, GreysHaveNoColour) {
    for (const auto& parts : {bt601, bt709}) {
        for (int grey = 0; grey < 256; ++grey) {
            const auto level = static_cast<std::uint8_t>(grey);
            Picture picture(19, 2);
            picture.paint({level, level, level});
            const Planes planes = convertedRows(picture, parts);
            EXPECT_EQ(planes.y,
                      std::vector<std::uint8_t>(38, static_cast<std::uint8_t>(std::lround(16 + grey * 219 / 255.0))));
            EXPECT_EQ(planes.u, std::vector<std::uint8_t>(10, 128)) << grey;
            EXPECT_EQ(planes.v, std::vector<std::uint8_t>(10, 128)) << grey;
        }
    }
}

TEST_F(PlanarRows, PureColoursReachTheEndsOfTheRange) {
    for (const auto& parts : {bt601, bt709}) {
        Picture picture(2, 2);
        picture.paint({0, 0, 255});
        EXPECT_EQ(convertedRows(picture, parts).u[0], 240);
        picture.paint({255, 255, 0});
        EXPECT_EQ(convertedRows(picture, parts).u[0], 16);
        picture.paint({255, 0, 0});
        EXPECT_EQ(convertedRows(picture, parts).v[0], 240);
        picture.paint({0, 255, 255});
        EXPECT_EQ(convertedRows(picture, parts).v[0], 16);
    }
}

/// What a fitter made, without what its rows are padded with. Empty if there is nothing.
Planes fitted(PictureFitter& fitter, Picture& picture) {
    const Media<GstBuffer> buffer = fitter.fit(picture.frame());
    GstVideoFrame frame;
    if (!buffer || !gst_video_frame_map(&frame, &fitter.format(), buffer.get(), GST_MAP_READ)) {
        ADD_FAILURE() << "nothing came out";
        return {0, 0};
    }
    Planes planes(GST_VIDEO_FRAME_WIDTH(&frame), GST_VIDEO_FRAME_HEIGHT(&frame));
    int component = 0;
    for (auto* plane : {&planes.y, &planes.u, &planes.v}) {
        const int width = GST_VIDEO_FRAME_COMP_WIDTH(&frame, component);
        for (int y = 0; y < GST_VIDEO_FRAME_COMP_HEIGHT(&frame, component); ++y) {
            std::copy_n(static_cast<const std::uint8_t*>(GST_VIDEO_FRAME_COMP_DATA(&frame, component)) +
                            static_cast<std::ptrdiff_t>(y) * GST_VIDEO_FRAME_COMP_STRIDE(&frame, component),
                        width, plane->begin() + static_cast<std::ptrdiff_t>(y) * width);
        }
        ++component;
    }
    gst_video_frame_unmap(&frame);
    return planes;
}

class PictureFitting : public testing::Test {
  protected:
    static void SetUpTestSuite() { gst_init(nullptr, nullptr); }
};

TEST_F(PictureFitting, PicturesOfTheMoviesSizeAreWhatTheStandardsDefine) {
    if (!hasPlanarRows()) {
        GTEST_SKIP() << "this processor leaves them to GStreamer";
    }
    for (const int padding : {0, 4, 60}) {
        for (const auto& [width, height] : {std::pair{160, 720}, {90, 576}, {16, 16}, {50, 18}, {33, 21}}) {
            PictureFitter fitter({width, height, 1, 1, 30, 1});
            Picture picture(width, height, padding);
            const Planes planes = fitted(fitter, picture);
            EXPECT_LT(farthest(picture, planes, height == 720 ? bt709 : bt601), nearest) << width << " x " << height;
        }
    }
}

/// GStreamer's converter is within two levels.
TEST_F(PictureFitting, PicturesOfOtherSizesAreOfTheSameColours) {
    for (const int height : {720, 576}) {
        PictureFitter fitter({64, height, 1, 1, 30, 1});
        for (const auto& colour : std::vector<std::array<std::uint8_t, 3>>{
                 {0, 0, 0}, {255, 255, 255}, {255, 0, 0}, {0, 255, 0}, {0, 0, 255}, {90, 160, 20}}) {
            Picture whole(64, height);
            Picture half(32, height / 2);
            whole.paint(colour);
            half.paint(colour);
            const Planes one = fitted(fitter, whole);
            const Planes other = fitted(fitter, half);
            ASSERT_EQ(one.y.size(), other.y.size());
            const std::size_t middle = one.u.size() / 2;
            EXPECT_NEAR(one.y[4 * middle], other.y[4 * middle], 2);
            EXPECT_NEAR(one.u[middle], other.u[middle], 2);
            EXPECT_NEAR(one.v[middle], other.v[middle], 2);
        }
    }
}

TEST_F(PictureFitting, PicturesOfAnotherAspectStandBetweenBarsAlsoInTheMoviesSize) {
    PictureFitter fitter({640, 480, 1, 1, 30, 1});
    Picture picture(640, 480);
    picture.paint({255, 255, 255});
    QIVOlib_video_frame_v2_t frame = picture.frame();
    frame.picture_aspect_ratio = 16.0F / 9;
    const Media<GstBuffer> buffer = fitter.fit(frame);
    ASSERT_TRUE(buffer);
    std::vector<std::uint8_t> luma(std::size_t{640} * 480);
    gst_buffer_extract(buffer.get(), 0, luma.data(), luma.size());
    EXPECT_EQ(luma[640 * 10 + 320], 16);
    EXPECT_EQ(luma[640 * 240 + 320], 235);
}

TEST(PictureFitter, NoMoreThanPartOfASecondWaitsForTheEncoder) {
    EXPECT_EQ(PictureFitter::mostWaiting({160, 90, 1, 1, 30, 1}), 12U);
    EXPECT_EQ(PictureFitter::mostWaiting({1920, 1080, 1, 1, 30, 1}), 12U);
    EXPECT_EQ(PictureFitter::mostWaiting({1920, 1080, 1, 1, 60000, 1001}), 24U);
    EXPECT_EQ(PictureFitter::mostWaiting({3840, 2160, 1, 1, 60, 1}), 8U) << "as many as the memory holds";
    EXPECT_EQ(PictureFitter::mostWaiting({320, 180, 1, 1, 1000, 1}), 24U);
    EXPECT_EQ(PictureFitter::mostWaiting({320, 180, 1, 1, 1, 1}), 6U);
    EXPECT_EQ(PictureFitter::mostWaiting({8192, 8192, 1, 1, 30, 1}), 6U);
}

} // namespace
} // namespace qivo::record
