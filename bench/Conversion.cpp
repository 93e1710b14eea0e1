// A decoded picture of 1920 x 1080 turned to RGBA as receivers do it, against GStreamer's own conversion and against
// one memcpy of the result's size, turn by turn in the same run, each in one thread.
//
//   bench-conversion [ROUNDS]
#include "bench/Timing.h"
#include "runtime/RgbaRow.h"

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <gst/video/video.h>
#include <random>
#include <vector>

namespace {

constexpr int kWidth = 1920;
constexpr int kHeight = 1080;
constexpr int kDefaultRounds = 200;
constexpr double kRed = 0.2126; // ITU-R BT.709-6, 3.2
constexpr double kBlue = 0.0722;

} // namespace

int main(int argc, char** argv) {
    const int rounds = argc > 1 ? std::max(1, std::atoi(argv[1])) : kDefaultRounds;
    gst_init(nullptr, nullptr);
    if (!qivo::runtime::hasRgbaRow()) {
        std::puts("bench-conversion: this processor has no AVX2; receivers leave the conversion to GStreamer");
        return 0;
    }
    GstVideoInfo in;
    GstVideoInfo out;
    gst_video_info_set_format(&in, GST_VIDEO_FORMAT_I420, kWidth, kHeight);
    gst_video_info_set_format(&out, GST_VIDEO_FORMAT_RGBA, kWidth, kHeight);
    gst_video_colorimetry_from_string(&in.colorimetry, GST_VIDEO_COLORIMETRY_BT709);
    std::vector<std::uint8_t> planes(in.size);
    std::mt19937 random(1);
    std::generate(planes.begin(), planes.end(), [&] { return static_cast<std::uint8_t>(random()); });
    std::vector<std::uint8_t> pixels(out.size);
    const std::vector<std::uint8_t> others(out.size, 7);
    GstBuffer* inBuffer = gst_buffer_new_wrapped_full(GST_MEMORY_FLAG_READONLY, planes.data(), planes.size(), 0,
                                                      planes.size(), nullptr, nullptr);
    GstBuffer* outBuffer = gst_buffer_new_wrapped_full(static_cast<GstMemoryFlags>(0), pixels.data(), pixels.size(), 0,
                                                       pixels.size(), nullptr, nullptr);
    GstVideoFrame inFrame;
    GstVideoFrame outFrame;
    gst_video_frame_map(&inFrame, &in, inBuffer, GST_MAP_READ);
    gst_video_frame_map(&outFrame, &out, outBuffer, GST_MAP_WRITE);
    GstVideoConverter* converter = gst_video_converter_new(&in, &out, gst_structure_new_empty("options"));

    const auto colours = qivo::runtime::RgbaColours::of(kRed, kBlue, false);
    const std::uint8_t* const u = planes.data() + GST_VIDEO_INFO_PLANE_OFFSET(&in, 1);
    const std::uint8_t* const v = planes.data() + GST_VIDEO_INFO_PLANE_OFFSET(&in, 2);
    const auto own = [&] {
        for (std::ptrdiff_t y = 0; y < kHeight; ++y) {
            qivo::runtime::rgbaRow(colours, planes.data() + y * kWidth, u + y / 2 * (kWidth / 2),
                                   v + y / 2 * (kWidth / 2), pixels.data() + y * kWidth * 4, kWidth);
        }
    };
    std::vector<double> owns;
    std::vector<double> converters;
    std::vector<double> copies;
    for (int i = 0; i < rounds; ++i) {
        owns.push_back(microseconds(own));
        converters.push_back(microseconds([&] { gst_video_converter_frame(converter, &inFrame, &outFrame); }));
        copies.push_back(microseconds([&] { std::memcpy(pixels.data(), others.data(), pixels.size()); }));
    }
    gst_video_converter_free(converter);
    gst_video_frame_unmap(&inFrame);
    gst_video_frame_unmap(&outFrame);
    gst_buffer_unref(inBuffer);
    gst_buffer_unref(outBuffer);
    std::printf("I420 to RGBA, %d x %d: %.0f us; %.2f times GStreamer's %.0f us, %.2f times a memcpy's %.0f us\n",
                kWidth, kHeight, median(owns), medianRatio(owns, converters), median(converters),
                medianRatio(owns, copies), median(copies));
    return 0;
}
