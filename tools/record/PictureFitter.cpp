#include "tools/record/PictureFitter.h"

#include "tools/record/SampleDescription.h"

#include <algorithm>
#include <cmath>

namespace qivo::record {
namespace {

constexpr std::uint32_t rgba = 'R' | 'G' << 8 | 'B' << 16 | static_cast<std::uint32_t>('A') << 24;
constexpr guint opaqueBlack = 0xFF000000U;
constexpr guint conversionThreads = 2; // of large pictures; it keeps the next one from being captured

GstVideoInfo movieFormat(const PictureShape& shape) {
    GstVideoInfo info;
    gst_video_info_set_format(&info, GST_VIDEO_FORMAT_I420, static_cast<guint>(shape.width),
                              static_cast<guint>(shape.height));
    gst_video_colorimetry_from_string(&info.colorimetry, isHighDefinition(shape.height) ? GST_VIDEO_COLORIMETRY_BT709
                                                                                        : GST_VIDEO_COLORIMETRY_BT601);
    info.chroma_site = GST_VIDEO_CHROMA_SITE_MPEG2;
    info.par_n = shape.pixelAspectN;
    info.par_d = shape.pixelAspectD;
    info.fps_n = shape.rateN;
    info.fps_d = shape.rateD;
    return info;
}

PlanarColours coloursFor(const GstVideoInfo& info) {
    double red = 0;
    double blue = 0;
    gst_video_color_matrix_get_Kr_Kb(info.colorimetry.matrix, &red, &blue);
    return PlanarColours::of(red, blue);
}

Media<GstBufferPool> poolFor(const GstVideoInfo& info, std::size_t most) {
    const std::size_t size = GST_VIDEO_INFO_SIZE(&info);
    Media<GstBufferPool> pool(gst_buffer_pool_new());
    const Media<GstCaps> caps(gst_video_info_to_caps(&info));
    GstStructure* settings = gst_buffer_pool_get_config(pool.get());
    gst_buffer_pool_config_set_params(settings, caps.get(), static_cast<guint>(size), 0, static_cast<guint>(most));
    if (!gst_buffer_pool_set_config(pool.get(), settings) || !gst_buffer_pool_set_active(pool.get(), TRUE)) {
        return nullptr;
    }
    return pool;
}

} // namespace

PictureFitter::PictureFitter(const PictureShape& shape)
    : m_shape(shape), m_format(movieFormat(shape)), m_colours(coloursFor(m_format)),
      m_pool(poolFor(m_format, mostWaiting(shape))) {}

PictureFitter::~PictureFitter() {
    if (m_pool) {
        gst_buffer_pool_set_active(m_pool.get(), FALSE);
    }
}

/// Whether only the colours are to be converted, in a way that this processor has a fast one for.
bool PictureFitter::fits(const QIVOlib_video_frame_v2_t& frame) const {
    return frame.xres == m_shape.width && frame.yres == m_shape.height &&
           areaFor(aspectOf(frame), m_shape) == PictureArea{0, 0, m_shape.width, m_shape.height} && hasPlanarRows();
}

void PictureFitter::convertColours(const QIVOlib_video_frame_v2_t& frame, GstVideoFrame& out) const {
    const auto row = [&out](int component, std::ptrdiff_t y) {
        return static_cast<std::uint8_t*>(GST_VIDEO_FRAME_COMP_DATA(&out, component)) +
               y * GST_VIDEO_FRAME_COMP_STRIDE(&out, component);
    };
    for (std::ptrdiff_t y = 0; y < frame.yres; y += 2) {
        const std::ptrdiff_t next = std::min<std::ptrdiff_t>(y + 1, frame.yres - 1);
        planarRows(m_colours, frame.p_data + y * frame.line_stride_in_bytes,
                   frame.p_data + next * frame.line_stride_in_bytes,
                   {row(GST_VIDEO_COMP_Y, y), row(GST_VIDEO_COMP_Y, next), row(GST_VIDEO_COMP_U, y / 2),
                    row(GST_VIDEO_COMP_V, y / 2)},
                   frame.xres);
    }
}

/// Makes the converter anew where the frame's form differs from that of the one before.
bool PictureFitter::prepare(const QIVOlib_video_frame_v2_t& frame) {
    const Input input{frame.xres, frame.yres, frame.line_stride_in_bytes, areaFor(aspectOf(frame), m_shape)};
    if (m_converter && input == m_input) {
        return true;
    }
    m_converter.reset();
    m_input = input;
    if (!gst_video_info_set_format(&m_inputFormat, GST_VIDEO_FORMAT_RGBA, static_cast<guint>(frame.xres),
                                   static_cast<guint>(frame.yres))) {
        return false;
    }
    m_inputFormat.fps_n = m_format.fps_n; // the converter refuses others
    m_inputFormat.fps_d = m_format.fps_d;
    m_inputFormat.stride[0] = frame.line_stride_in_bytes;
    m_inputFormat.size = static_cast<gsize>(frame.line_stride_in_bytes) * static_cast<gsize>(frame.yres);
    GstStructure* settings = gst_structure_new(
        "settings", GST_VIDEO_CONVERTER_OPT_DEST_X, G_TYPE_INT, input.area.x, GST_VIDEO_CONVERTER_OPT_DEST_Y,
        G_TYPE_INT, input.area.y, GST_VIDEO_CONVERTER_OPT_DEST_WIDTH, G_TYPE_INT, input.area.width,
        GST_VIDEO_CONVERTER_OPT_DEST_HEIGHT, G_TYPE_INT, input.area.height, GST_VIDEO_CONVERTER_OPT_FILL_BORDER,
        G_TYPE_BOOLEAN, TRUE, GST_VIDEO_CONVERTER_OPT_BORDER_ARGB, G_TYPE_UINT, opaqueBlack,
        GST_VIDEO_CONVERTER_OPT_THREADS, G_TYPE_UINT, conversionThreads, nullptr);
    m_converter.reset(gst_video_converter_new(&m_inputFormat, &m_format, settings));
    return m_converter != nullptr;
}

std::size_t PictureFitter::mostWaiting(const PictureShape& shape) {
    const double rate = static_cast<double>(shape.rateN) / shape.rateD;
    const auto timely = static_cast<std::size_t>(std::ceil(rate * mostSeconds));
    const GstVideoInfo info = movieFormat(shape);
    return std::clamp(std::min(timely, mostBytes / GST_VIDEO_INFO_SIZE(&info)), fewestPictures, mostPictures);
}

bool PictureFitter::isReadable(const QIVOlib_video_frame_v2_t& frame) {
    return frame.p_data != nullptr && frame.FourCC == rgba && frame.xres > 0 && frame.yres > 0 &&
           frame.line_stride_in_bytes / 4 >= frame.xres;
}

bool PictureFitter::convert(const QIVOlib_video_frame_v2_t& frame, GstVideoFrame& out) {
    if (fits(frame)) {
        convertColours(frame, out);
        return true;
    }
    if (!prepare(frame)) {
        return false;
    }
    const Media<GstBuffer> received(gst_buffer_new_wrapped_full(
        GST_MEMORY_FLAG_READONLY, frame.p_data, m_inputFormat.size, 0, m_inputFormat.size, nullptr, nullptr));
    GstVideoFrame in;
    if (!gst_video_frame_map(&in, &m_inputFormat, received.get(), GST_MAP_READ)) {
        return false;
    }
    gst_video_converter_frame(m_converter.get(), &in, &out);
    gst_video_frame_unmap(&in);
    return true;
}

Media<GstBuffer> PictureFitter::fit(const QIVOlib_video_frame_v2_t& frame) {
    if (!isReadable(frame) || !m_pool) {
        return nullptr;
    }
    GstBufferPoolAcquireParams parameters{};
    parameters.flags = GST_BUFFER_POOL_ACQUIRE_FLAG_DONTWAIT;
    GstBuffer* taken = nullptr;
    if (gst_buffer_pool_acquire_buffer(m_pool.get(), &taken, &parameters) != GST_FLOW_OK) {
        return nullptr;
    }
    Media<GstBuffer> picture(taken);
    GstVideoFrame out;
    if (!gst_video_frame_map(&out, &m_format, picture.get(), GST_MAP_WRITE)) {
        return nullptr;
    }
    const bool converted = convert(frame, out);
    gst_video_frame_unmap(&out);
    return converted ? std::move(picture) : nullptr;
}

} // namespace qivo::record
