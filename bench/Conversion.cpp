// A decoded picture of 1920 x 1080 turned to RGBA as receivers do it, and a received one back as the recorder does it,
// each against GStreamer's own conversion and against one memcpy of the RGBA picture's size, turn by turn in the same
// run, each in one thread.
//
//   bench-conversion [ROUNDS]
#include "bench/Timing.h"
#include "runtime/RgbaRow.h"
#include "tools/record/PlanarRows.h"

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <gst/video/video.h>
#include <random>
#include <vector>

namespace {

constexpr int kWidth = 1920;
constexpr int kHeight = 1080;
constexpr int kDefaultRounds = 200;
constexpr double kRed = 0.2126; // ITU-R BT.709-6, 3.2
constexpr double kBlue = 0.0722;

/// A picture in memory that GStreamer knows, with noise in it.
class Picture {
  public:
    explicit Picture(GstVideoFormat format) {
        gst_video_info_set_format(&m_info, format, kWidth, kHeight);
        if (format == GST_VIDEO_FORMAT_I420) {
            gst_video_colorimetry_from_string(&m_info.colorimetry, GST_VIDEO_COLORIMETRY_BT709);
            m_info.chroma_site = GST_VIDEO_CHROMA_SITE_MPEG2;
        }
        m_bytes.resize(m_info.size);
        std::mt19937 random(1);
        std::generate(m_bytes.begin(), m_bytes.end(), [&] { return static_cast<std::uint8_t>(random()); });
        m_buffer = gst_buffer_new_wrapped_full(static_cast<GstMemoryFlags>(0), m_bytes.data(), m_bytes.size(), 0,
                                               m_bytes.size(), nullptr, nullptr);
        gst_video_frame_map(&m_frame, &m_info, m_buffer, GST_MAP_READWRITE);
    }
    ~Picture() {
        gst_video_frame_unmap(&m_frame);
        gst_buffer_unref(m_buffer);
    }
    Picture(const Picture&) = delete;
    Picture& operator=(const Picture&) = delete;

    [[nodiscard]] const GstVideoInfo& info() const { return m_info; }
    [[nodiscard]] GstVideoFrame& frame() { return m_frame; }
    [[nodiscard]] std::uint8_t* row(int plane, std::ptrdiff_t y) {
        return m_bytes.data() + GST_VIDEO_INFO_PLANE_OFFSET(&m_info, plane) +
               y * GST_VIDEO_INFO_PLANE_STRIDE(&m_info, plane);
    }

  private:
    GstVideoInfo m_info{};
    std::vector<std::uint8_t> m_bytes;
    GstBuffer* m_buffer = nullptr;
    GstVideoFrame m_frame{};
};

void measure(const char* name, const std::function<void()>& own, Picture& in, Picture& out, int rounds) {
    const std::vector<std::uint8_t> pixels(std::size_t{4} * kWidth * kHeight, 7);
    std::vector<std::uint8_t> copied(pixels.size());
    GstVideoConverter* converter = gst_video_converter_new(&in.info(), &out.info(), gst_structure_new_empty("options"));
    std::vector<double> owns;
    std::vector<double> converters;
    std::vector<double> copies;
    for (int i = 0; i < rounds; ++i) {
        owns.push_back(microseconds(own));
        converters.push_back(microseconds([&] { gst_video_converter_frame(converter, &in.frame(), &out.frame()); }));
        copies.push_back(microseconds([&] { std::memcpy(copied.data(), pixels.data(), pixels.size()); }));
    }
    gst_video_converter_free(converter);
    std::printf("%s, %d x %d: %.0f us; %.2f times GStreamer's %.0f us, %.2f times a memcpy's %.0f us\n", name, kWidth,
                kHeight, median(owns), medianRatio(owns, converters), median(converters), medianRatio(owns, copies),
                median(copies));
}

} // namespace

int main(int argc, char** argv) {
    const int rounds = argc > 1 ? std::max(1, std::atoi(argv[1])) : kDefaultRounds;
    gst_init(nullptr, nullptr);
    if (!qivo::runtime::hasRgbaRow() || !qivo::record::hasPlanarRows()) {
        std::puts("bench-conversion: this processor has no AVX2; conversions are left to GStreamer");
        return 0;
    }
    Picture planes(GST_VIDEO_FORMAT_I420);
    Picture pixels(GST_VIDEO_FORMAT_RGBA);
    const auto toRgba = qivo::runtime::RgbaColours::of(kRed, kBlue, false);
    measure(
        "I420 to RGBA",
        [&] {
            for (std::ptrdiff_t y = 0; y < kHeight; ++y) {
                qivo::runtime::rgbaRow(toRgba, planes.row(0, y), planes.row(1, y / 2), planes.row(2, y / 2),
                                       pixels.row(0, y), kWidth);
            }
        },
        planes, pixels, rounds);
    const auto toPlanes = qivo::record::PlanarColours::of(kRed, kBlue);
    measure(
        "RGBA to I420",
        [&] {
            for (std::ptrdiff_t y = 0; y < kHeight; y += 2) {
                qivo::record::planarRows(
                    toPlanes, pixels.row(0, y), pixels.row(0, y + 1),
                    {planes.row(0, y), planes.row(0, y + 1), planes.row(1, y / 2), planes.row(2, y / 2)}, kWidth);
            }
        },
        pixels, planes, rounds);
    return 0;
}
