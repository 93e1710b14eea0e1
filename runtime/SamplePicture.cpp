#include "runtime/SamplePicture.h"

#include "runtime/GstChain.h"

#include <utility>

namespace qivo::runtime {
namespace {

constexpr std::uint32_t kFourCC = 'R' | 'G' << 8 | 'B' << 16 | static_cast<std::uint32_t>('A') << 24;
constexpr std::int32_t kProgressive = 1;

float aspectOf(const GstVideoInfo& info) {
    const double width = static_cast<double>(GST_VIDEO_INFO_WIDTH(&info)) * GST_VIDEO_INFO_PAR_N(&info);
    const double height = static_cast<double>(GST_VIDEO_INFO_HEIGHT(&info)) * GST_VIDEO_INFO_PAR_D(&info);
    return width > 0 && height > 0 ? static_cast<float>(width / height) : 0.0F;
}

} // namespace

std::unique_ptr<Picture> SamplePicture::map(GstOwned<GstSample> sample, std::optional<std::int64_t> taken,
                                            std::int64_t arrived) {
    GstVideoInfo info;
    GstCaps* caps = sample ? gst_sample_get_caps(sample.get()) : nullptr;
    GstBuffer* buffer = sample ? gst_sample_get_buffer(sample.get()) : nullptr;
    if (caps == nullptr || buffer == nullptr || !gst_video_info_from_caps(&info, caps) ||
        GST_VIDEO_INFO_FORMAT(&info) != GST_VIDEO_FORMAT_RGBA) {
        return nullptr;
    }
    std::unique_ptr<SamplePicture> picture(new SamplePicture);
    if (!gst_video_frame_map(&picture->m_frame, &info, buffer, GST_MAP_READ)) {
        return nullptr;
    }
    QIVOlib_video_frame_v2_t& record = picture->m_record;
    record.xres = GST_VIDEO_INFO_WIDTH(&info);
    record.yres = GST_VIDEO_INFO_HEIGHT(&info);
    record.FourCC = kFourCC;
    record.frame_rate_N = GST_VIDEO_INFO_FPS_N(&info);
    record.frame_rate_D = GST_VIDEO_INFO_FPS_D(&info) > 0 ? GST_VIDEO_INFO_FPS_D(&info) : 1;
    record.picture_aspect_ratio = aspectOf(info);
    record.frame_format_type = kProgressive;
    record.timecode = taken.value_or(timecodeOf(buffer, gst_sample_get_segment(sample.get())));
    record.p_data = static_cast<std::uint8_t*>(GST_VIDEO_FRAME_PLANE_DATA(&picture->m_frame, 0));
    record.line_stride_in_bytes = GST_VIDEO_FRAME_PLANE_STRIDE(&picture->m_frame, 0);
    record.timestamp = arrived;
    picture->m_sample = std::move(sample);
    return picture;
}

SamplePicture::~SamplePicture() {
    if (m_sample) {
        gst_video_frame_unmap(&m_frame);
    }
}

} // namespace qivo::runtime
