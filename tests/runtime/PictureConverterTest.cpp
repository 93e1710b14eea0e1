#include "runtime/PictureConverter.h"

#include "runtime/GstHandles.h"
#include "runtime/RgbaRow.h"

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <gst/app/gstappsink.h>
#include <gst/app/gstappsrc.h>
#include <gst/video/video.h>
#include <gtest/gtest.h>
#include <optional>
#include <random>
#include <string>
#include <vector>

namespace qivo::test {
namespace {

using runtime::GstOwned;

struct Look {
    const char* name = "";
    std::string format;
    std::string colorimetry;
    int width = 0;
    int height = 0;
    std::string more; // of the caps
};

void PrintTo(const Look& look, std::ostream* out) {
    *out << look.name;
}

GstOwned<GstCaps> capsOf(const Look& look) {
    const std::string text = "video/x-raw,format=" + look.format + ",width=" + std::to_string(look.width) +
                             ",height=" + std::to_string(look.height) +
                             ",framerate=25/1,colorimetry=" + look.colorimetry + look.more;
    return GstOwned<GstCaps>(gst_caps_from_string(text.c_str()));
}

GstVideoInfo infoOf(const Look& look) {
    GstVideoInfo info;
    gst_video_info_from_caps(&info, capsOf(look).get());
    return info;
}

/// Anything that a coder may bring, values outside the nominal range included.
std::vector<std::uint8_t> anything(const Look& look) {
    const GstVideoInfo info = infoOf(look);
    std::vector<std::uint8_t> bytes(GST_VIDEO_INFO_SIZE(&info));
    std::mt19937 random(7);
    std::generate(bytes.begin(), bytes.end(), [&] { return static_cast<std::uint8_t>(random()); });
    return bytes;
}

/// A picture as RGBA by an element, rows without padding. Empty if it does not come out.
std::vector<std::uint8_t> convert(GstElement* converter, const Look& look, const std::vector<std::uint8_t>& bytes) {
    g_object_set(converter, "n-threads", 1, nullptr);
    gst_util_set_object_arg(G_OBJECT(converter), "dither", "none");
    const GstOwned<GstElement> pipeline(GST_ELEMENT(gst_object_ref_sink(gst_pipeline_new(nullptr))));
    GstElement* source = gst_element_factory_make("appsrc", nullptr);
    GstElement* sink = gst_element_factory_make("appsink", nullptr);
    const GstOwned<GstCaps> in = capsOf(look);
    const GstOwned<GstCaps> out(gst_caps_from_string("video/x-raw,format=RGBA"));
    g_object_set(source, "caps", in.get(), "format", GST_FORMAT_TIME, nullptr);
    g_object_set(sink, "caps", out.get(), "sync", FALSE, nullptr);
    gst_bin_add_many(GST_BIN(pipeline.get()), source, converter, sink, nullptr);
    gst_element_link_many(source, converter, sink, nullptr);
    gst_element_set_state(pipeline.get(), GST_STATE_PLAYING);
    GstBuffer* buffer = gst_buffer_new_memdup(bytes.data(), bytes.size());
    GST_BUFFER_PTS(buffer) = 0;
    gst_app_src_push_buffer(GST_APP_SRC(source), buffer);
    gst_app_src_end_of_stream(GST_APP_SRC(source));
    std::vector<std::uint8_t> pixels;
    if (const GstOwned<GstSample> sample{gst_app_sink_try_pull_sample(GST_APP_SINK(sink), 10 * GST_SECOND)}) {
        GstVideoInfo info;
        GstVideoFrame frame;
        gst_video_info_from_caps(&info, gst_sample_get_caps(sample.get()));
        if (gst_video_frame_map(&frame, &info, gst_sample_get_buffer(sample.get()), GST_MAP_READ)) {
            for (int row = 0; row < look.height; ++row) {
                const auto* first = static_cast<const std::uint8_t*>(GST_VIDEO_FRAME_PLANE_DATA(&frame, 0)) +
                                    static_cast<std::ptrdiff_t>(row) * GST_VIDEO_FRAME_PLANE_STRIDE(&frame, 0);
                pixels.insert(pixels.end(), first, first + static_cast<std::ptrdiff_t>(4) * look.width);
            }
            gst_video_frame_unmap(&frame);
        }
    }
    gst_element_set_state(pipeline.get(), GST_STATE_NULL);
    return pixels;
}

class PictureConverter : public testing::TestWithParam<Look> {
  protected:
    static void SetUpTestSuite() { gst_init(nullptr, nullptr); }
};

/// R, G, B and A of one pixel by the definition of its colours. Chroma is that of the pixel's block.
std::vector<double> defined(const Look& look, const std::vector<std::uint8_t>& bytes, int x, int y) {
    const GstVideoInfo info = infoOf(look);
    const auto component = [&](int index) {
        const int column = x >> GST_VIDEO_FORMAT_INFO_W_SUB(info.finfo, index);
        const int row = y >> GST_VIDEO_FORMAT_INFO_H_SUB(info.finfo, index);
        return static_cast<double>(bytes[GST_VIDEO_INFO_COMP_OFFSET(&info, index) +
                                         static_cast<std::size_t>(row) * GST_VIDEO_INFO_COMP_STRIDE(&info, index) +
                                         static_cast<std::size_t>(column)]);
    };
    double kr = 0;
    double kb = 0;
    gst_video_color_matrix_get_Kr_Kb(info.colorimetry.matrix, &kr, &kb);
    const bool full = info.colorimetry.range == GST_VIDEO_COLOR_RANGE_0_255;
    const double luma = full ? component(0) : (component(0) - 16) * 255 / 219;
    const double scale = full ? 1 : 255.0 / 224;
    const double blue = (component(1) - 128) * scale;
    const double red = (component(2) - 128) * scale;
    const auto level = [](double value) { return std::clamp(value, 0.0, 255.0); };
    return {level(luma + 2 * (1 - kr) * red),
            level(luma - (2 * (1 - kb) * kb * blue + 2 * (1 - kr) * kr * red) / (1 - kr - kb)),
            level(luma + 2 * (1 - kb) * blue), 255};
}

class PlanesOfEightBits : public PictureConverter {};

TEST_P(PlanesOfEightBits, AreTheColoursThatTheStandardsDefine) {
    if (!runtime::hasRgbaRow()) {
        GTEST_SKIP() << "this processor leaves them to videoconvert";
    }
    const auto bytes = anything(GetParam());
    const auto seen = convert(runtime::makePictureConverter(), GetParam(), bytes);
    ASSERT_EQ(seen.size(), 4U * GetParam().width * GetParam().height);
    double worst = 0;
    for (int y = 0; y < GetParam().height; ++y) {
        for (int x = 0; x < GetParam().width; ++x) {
            const auto wanted = defined(GetParam(), bytes, x, y);
            for (std::size_t i = 0; i < 4; ++i) {
                const std::size_t at = 4 * (static_cast<std::size_t>(y) * GetParam().width + x) + i;
                worst = std::max(worst, std::abs(seen[at] - wanted[i]));
            }
        }
    }
    EXPECT_LT(worst, 2.5);
    RecordProperty("worst", std::to_string(worst));
}

INSTANTIATE_TEST_SUITE_P(
    Converter, PlanesOfEightBits,
    testing::Values(
        Look{"Bt601", "I420", "bt601", 320, 240, ""}, Look{"Bt709", "I420", "bt709", 320, 240, ""},
        Look{"Bt2020", "I420", "bt2020", 320, 240, ""}, Look{"Smpte240", "I420", "smpte240m", 320, 240, ""},
        Look{"FullBt601", "I420", "1:4:0:0", 320, 240, ""}, Look{"FullBt709", "I420", "1:3:5:1", 320, 240, ""},
        Look{"FullBt2020", "I420", "1:6:13:7", 320, 240, ""}, Look{"HalfChroma", "Y42B", "bt709", 320, 240, ""},
        Look{"JpegOfHalfChroma", "Y42B", "1:4:0:0", 320, 240, ""}, Look{"OddSize", "I420", "bt709", 321, 243, ""},
        Look{"Smallest", "I420", "bt709", 1, 1, ""}, Look{"Narrow", "Y42B", "bt601", 3, 17, ""}),
    [](const auto& test) { return std::string(test.param.name); });

class OtherPictures : public PictureConverter {};

TEST_P(OtherPictures, AreWhatVideoconvertMakesOfThem) {
    const auto bytes = anything(GetParam());
    const auto seen = convert(runtime::makePictureConverter(), GetParam(), bytes);
    ASSERT_FALSE(seen.empty());
    EXPECT_EQ(seen, convert(gst_element_factory_make("videoconvert", nullptr), GetParam(), bytes));
}

INSTANTIATE_TEST_SUITE_P(Converter, OtherPictures,
                         testing::Values(Look{"TenBits", "I420_10LE", "bt709", 320, 240, ""},
                                         Look{"TwoPlanes", "NV12", "bt709", 320, 240, ""},
                                         Look{"WholeChroma", "Y444", "bt709", 320, 240, ""},
                                         Look{"Grey", "GRAY8", "1:1:0:0", 320, 240, ""},
                                         Look{"Rgb", "GBR", "sRGB", 320, 240, ""},
                                         Look{"Interlaced", "I420", "bt709", 320, 240, ",interlace-mode=interleaved"}),
                         [](const auto& test) { return std::string(test.param.name); });

TEST_F(PictureConverter, IsNotVideoconvertItself) {
    const GstOwned<GstElement> own(GST_ELEMENT(gst_object_ref_sink(runtime::makePictureConverter())));
    const GstOwned<GstElement> plain(
        GST_ELEMENT(gst_object_ref_sink(gst_element_factory_make("videoconvert", nullptr))));
    EXPECT_NE(G_OBJECT_TYPE(own.get()), G_OBJECT_TYPE(plain.get()));
    EXPECT_TRUE(g_type_is_a(G_OBJECT_TYPE(own.get()), G_OBJECT_TYPE(plain.get())));
}

} // namespace
} // namespace qivo::test
