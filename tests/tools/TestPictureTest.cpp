#include "tools/publish/TestPicture.h"
#include "tests/tools/Canvas.h"

#include "tools/publish/PictureSource.h"
#include "tools/publish/TimeCode.h"

#include <gtest/gtest.h>

#include <chrono>
#include <cstdlib>
#include <numeric>
#include <thread>

namespace qivo {
namespace {

using namespace std::chrono_literals;
using test::Canvas;
using Moment = std::chrono::system_clock::time_point;

const Moment noon{std::chrono::milliseconds(1795230154682)};

Canvas drawn(PictureSize size, const TestPictureLook& look, Moment time = noon) {
    Canvas canvas(size);
    TestPicture(size, look).draw(canvas.planes(), time);
    return canvas;
}

TEST(TestPicture, barsAreTheStandardOnesInBothColourSpaces) {
    const std::array<Colour, 7> colours{{{0.75, 0.75, 0.75},
                                         {0.75, 0.75, 0},
                                         {0, 0.75, 0.75},
                                         {0, 0.75, 0},
                                         {0.75, 0, 0.75},
                                         {0.75, 0, 0},
                                         {0, 0, 0.75}}};
    for (const ColourSpace& space : {bt709, bt601, jpegColours}) {
        const Canvas canvas = drawn({1280, 720}, {"Cam", "", 0, space});
        for (int bar = 0; bar < 7; ++bar) {
            EXPECT_EQ(canvas.at(1280 * (2 * bar + 1) / 14, 180), toYCbCr(colours[bar], space)) << bar;
        }
    }
}

TEST(TestPicture, everySampleIsWrittenAndNoPadding) {
    for (const PictureSize size : {PictureSize{128, 72}, PictureSize{322, 182}, PictureSize{1280, 720}}) {
        const Canvas canvas = drawn(size, {"Cam", "", 3, bt709});
        for (int plane = 0; plane < 3; ++plane) {
            const int width = plane == 0 ? size.width : size.width / 2;
            for (std::size_t i = 0; i < canvas.samples[plane].size(); ++i) {
                const bool isPadding = static_cast<std::ptrdiff_t>(i) % canvas.stride(plane) >= width;
                ASSERT_EQ(canvas.samples[plane][i] == 1, isPadding) << plane << " " << i;
            }
        }
    }
}

TEST(TestPicture, timeCodeTellsTheMomentOfDrawing) {
    for (const PictureSize size : {PictureSize{128, 72}, PictureSize{320, 180}, PictureSize{1920, 1080}}) {
        const Canvas canvas = drawn(size, {"Cam", "", 0, bt709});
        EXPECT_EQ(readTimeCode(canvas.samples[0].data(), size.width, size.height, canvas.stride(0), 1), 1795230154682);
    }
}

TEST(TestPicture, runnerMovesSmoothly) {
    const PictureSize size{1280, 720};
    TestPicture picture(size, {"Cam", "", 0, bt709});
    const auto centre = [&](std::chrono::milliseconds since) {
        Canvas canvas(size);
        picture.draw(canvas.planes(), Moment(since));
        double sum = 0;
        double weight = 0;
        for (int x = 0; x < size.width; ++x) {
            const double light = canvas.at(x, picture.areaTop(10))[0] - canvas.at(0, 719)[0] * 0.0 - 38;
            sum += light * x;
            weight += light;
        }
        return sum / weight;
    };
    const double step = (1280 + 1280 / 24.0) * 33 / 4000;
    double last = centre(1000ms);
    for (int i = 1; i < 50; ++i) {
        const double now = centre(1000ms + i * 33ms);
        EXPECT_NEAR(now - last, step, 0.1) << i;
        last = now;
    }
}

TEST(TestPicture, sourcesAreToldApartByTheirBands) {
    const PictureSize size{320, 180};
    std::vector<std::array<std::uint8_t, 3>> bands;
    for (std::size_t number = 0; number < 6; ++number) {
        const Canvas canvas = drawn(size, {"Cam", "", number, bt601});
        const auto band = canvas.at(4, size.height * 12 / 18);
        for (const auto& other : bands) {
            EXPECT_GT(std::abs(band[1] - other[1]) + std::abs(band[2] - other[2]), 20) << number;
        }
        bands.push_back(band);
    }
}

TEST(TestPicture, nameAndClockAreWritten) {
    const PictureSize size{640, 360};
    const TestPicture areas(size, {});
    const auto rows = [&](const Canvas& canvas, int from, int to) {
        return canvas.luma(areas.areaTop(from), areas.areaTop(to));
    };
    const Canvas one = drawn(size, {"Cam 1", "", 0, bt601});
    const Canvas two = drawn(size, {"Cam 2", "", 0, bt601});
    EXPECT_NE(rows(one, 11, 14), rows(two, 11, 14));
    EXPECT_EQ(rows(one, 0, 11), rows(two, 0, 11));
    EXPECT_EQ(rows(one, 14, 17), rows(two, 14, 17));
    const Canvas later = drawn(size, {"Cam 1", "", 0, bt601}, noon + 1ms);
    EXPECT_NE(rows(one, 14, 17), rows(later, 14, 17));
    EXPECT_EQ(rows(one, 11, 14), rows(later, 11, 14));
}

TEST(TestPicture, noteTakesThePlaceOfTheBars) {
    const Canvas canvas = drawn({640, 360}, {"Cam", "No picture", 0, bt601});
    EXPECT_EQ(canvas.at(10, 10), toYCbCr({0.1, 0.1, 0.1}, bt601));
    const auto area = canvas.luma(0, 170);
    EXPECT_GT(*std::max_element(area.begin(), area.end()), 200);
}

TEST(TestPicture, clockTextIsTheLocalTimeOfDay) {
    setenv("TZ", "UTC-2", 1);
    tzset();
    EXPECT_EQ(clockText(std::chrono::hours(24) + 3h + 4min + 5s + 67ms), "05:04:05.067");
    EXPECT_EQ(clockText(0ms), "02:00:00.000");
    unsetenv("TZ");
    tzset();
}

TEST(DrawnPictures, showWhenTheyWereDueHoweverLateTheyArePainted) {
    gst_init(nullptr, nullptr);
    PictureFormat format;
    format.size = {64, 36};
    format.rate = {1, 1};
    Moment shown;
    DrawnPictureSource source(format, [&shown](const PicturePlanes&, Moment time) { shown = time; });
    std::this_thread::sleep_for(500ms); // into the middle of an interval
    const Picture picture = source.next();
    using Milliseconds = std::chrono::duration<double, std::milli>;
    const Milliseconds age = std::chrono::steady_clock::now() - picture.taken;
    const Milliseconds shownAge = std::chrono::system_clock::now() - shown;
    EXPECT_GE(age.count(), 400);
    EXPECT_NEAR(shownAge.count(), age.count(), 20);
}

} // namespace
} // namespace qivo
