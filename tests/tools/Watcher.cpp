#include "tests/tools/Watcher.h"

#include "tools/publish/TimeCode.h"

#include <gst/video/video.h>
#include <gtest/gtest.h>

#include <cstring>

namespace qivo::test {

using namespace std::chrono;

std::optional<std::int64_t> Frame::timeCode() const {
    return readTimeCode(pixels.data(), width, height, static_cast<std::ptrdiff_t>(4) * width);
}

std::optional<std::int64_t> Frame::latency() const {
    const auto code = timeCode();
    return code ? std::optional(duration_cast<milliseconds>(received.time_since_epoch()).count() - *code)
                : std::nullopt;
}

namespace {

std::optional<std::int64_t> reportedTime(GstBuffer* buffer) {
    constexpr std::int64_t unixInNtp = 2'208'988'800'000;
    const Caps ntp(gst_caps_new_empty_simple("timestamp/x-ntp"));
    const auto* meta = gst_buffer_get_reference_timestamp_meta(buffer, ntp.get());
    return meta != nullptr
               ? std::optional(duration_cast<milliseconds>(nanoseconds(meta->timestamp)).count() - unixInNtp)
               : std::nullopt;
}

} // namespace

Watcher::Watcher(const std::string& address, const std::string& protocol)
    : m_stream(address, protocol, "video", 0,
               "decodebin ! videoconvert name=convert ! video/x-raw,format=RGBA ! "
               "appsink name=out sync=false wait-on-eos=false max-buffers=4 drop=true") {}

std::optional<Frame> Watcher::next(milliseconds deadline) {
    const Sample sample = m_stream.next(deadline);
    if (!sample) {
        return std::nullopt;
    }
    Frame frame;
    frame.received = system_clock::now();
    frame.reported = reportedTime(gst_sample_get_buffer(sample.get()));
    GstVideoInfo info;
    gst_video_info_from_caps(&info, gst_sample_get_caps(sample.get()));
    GstVideoFrame mapped;
    if (gst_video_frame_map(&mapped, &info, gst_sample_get_buffer(sample.get()), GST_MAP_READ) == FALSE) {
        return std::nullopt;
    }
    frame.width = info.width;
    frame.height = info.height;
    frame.pixels.resize(static_cast<std::size_t>(4) * info.width * info.height);
    for (int y = 0; y < info.height; ++y) {
        std::memcpy(&frame.pixels[static_cast<std::size_t>(4) * y * info.width],
                    static_cast<const std::uint8_t*>(GST_VIDEO_FRAME_PLANE_DATA(&mapped, 0)) +
                        static_cast<std::ptrdiff_t>(y) * GST_VIDEO_FRAME_PLANE_STRIDE(&mapped, 0),
                    static_cast<std::size_t>(4) * info.width);
    }
    gst_video_frame_unmap(&mapped);
    return frame;
}

std::string Watcher::colorimetry() const {
    const Object<GstElement> convert = m_stream.element("convert");
    const Object<GstPad> pad(gst_element_get_static_pad(convert.get(), "sink"));
    const Caps caps(gst_pad_get_current_caps(pad.get()));
    const char* text = caps ? gst_structure_get_string(gst_caps_get_structure(caps.get(), 0), "colorimetry") : nullptr;
    return text != nullptr ? text : "";
}

bool Watcher::waitForEnd(milliseconds deadline) {
    const Message message(gst_bus_timed_pop_filtered(m_stream.bus().get(), nanoseconds(deadline).count(),
                                                     static_cast<GstMessageType>(GST_MESSAGE_EOS | GST_MESSAGE_ERROR)));
    return message != nullptr;
}

} // namespace qivo::test
