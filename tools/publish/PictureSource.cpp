#include "tools/publish/PictureSource.h"

namespace qivo {
namespace {

PicturePlanes planesOf(GstVideoFrame& frame) {
    PicturePlanes planes;
    for (int plane = 0; plane < 3; ++plane) {
        planes.data[plane] = static_cast<std::uint8_t*>(GST_VIDEO_FRAME_PLANE_DATA(&frame, plane));
        planes.stride[plane] = GST_VIDEO_FRAME_PLANE_STRIDE(&frame, plane);
    }
    return planes;
}

} // namespace

Caps PictureFormat::caps() const {
    return Caps(gst_caps_new_simple("video/x-raw", "format", G_TYPE_STRING, "I420", "width", G_TYPE_INT, size.width,
                                    "height", G_TYPE_INT, size.height, "framerate", GST_TYPE_FRACTION, rate.numerator,
                                    rate.denominator, "pixel-aspect-ratio", GST_TYPE_FRACTION, 1, 1, "interlace-mode",
                                    G_TYPE_STRING, "progressive", "colorimetry", G_TYPE_STRING, space.colorimetry,
                                    nullptr));
}

DrawPicture drawTestPicture(const PictureFormat& format, TestPictureLook look) {
    look.space = format.space;
    const auto picture = std::make_shared<TestPicture>(format.size, look);
    return [picture](const PicturePlanes& planes, std::chrono::system_clock::time_point time) {
        picture->draw(planes, time);
    };
}

PicturePainter::PicturePainter(const PictureFormat& format, DrawPicture draw)
    : m_draw(std::move(draw)), m_pool(gst_buffer_pool_new()) {
    const Caps caps = format.caps();
    gst_video_info_from_caps(&m_info, caps.get());
    GstStructure* config = gst_buffer_pool_get_config(m_pool.get());
    gst_buffer_pool_config_set_params(config, caps.get(), static_cast<guint>(m_info.size), 2, 0);
    gst_buffer_pool_set_config(m_pool.get(), config);
    gst_buffer_pool_set_active(m_pool.get(), TRUE);
}

PicturePainter::~PicturePainter() {
    gst_buffer_pool_set_active(m_pool.get(), FALSE);
}

Buffer PicturePainter::paint(std::chrono::steady_clock::time_point moment) {
    GstBuffer* buffer = nullptr;
    if (gst_buffer_pool_acquire_buffer(m_pool.get(), &buffer, nullptr) != GST_FLOW_OK) {
        return nullptr;
    }
    Buffer owned(buffer);
    GstVideoFrame frame;
    if (gst_video_frame_map(&frame, &m_info, buffer, GST_MAP_WRITE) == FALSE) {
        return nullptr;
    }
    const auto age = std::chrono::steady_clock::now() - moment;
    m_draw(planesOf(frame), std::chrono::system_clock::now() - age);
    gst_video_frame_unmap(&frame);
    return owned;
}

DrawnPictureSource::DrawnPictureSource(const PictureFormat& format, DrawPicture draw)
    : m_painter(format, std::move(draw)), m_pacer(format.rate, std::chrono::steady_clock::now()) {}

Picture DrawnPictureSource::next() {
    const auto due = m_pacer.next(std::chrono::steady_clock::now());
    {
        std::unique_lock lock(m_mutex);
        if (m_changed.wait_until(lock, due, [this] { return m_stopped; })) {
            return {};
        }
    }
    return {m_painter.paint(due), due};
}

void DrawnPictureSource::stop() {
    {
        const std::lock_guard lock(m_mutex);
        m_stopped = true;
    }
    m_changed.notify_all();
}

} // namespace qivo
