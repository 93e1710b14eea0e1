#include "tests/tools/Listener.h"

#include <gst/audio/audio.h>
#include <gst/rtsp/gstrtspconnection.h>

namespace qivo::test {

using namespace std::chrono;

namespace {

/// `add` is called with what has come, as it comes, until it is long enough.
template <typename Add>
Heard hearFrom(StreamClient& stream, milliseconds length, milliseconds deadline, const Add& add) {
    const auto end = steady_clock::now() + deadline;
    Heard heard;
    while (heard.seconds() < duration<double>(length).count() && steady_clock::now() < end) {
        const Sample sample = stream.next(milliseconds(100));
        GstMapInfo map;
        if (sample && gst_buffer_map(gst_sample_get_buffer(sample.get()), &map, GST_MAP_READ)) {
            add(heard, gst_sample_get_caps(sample.get()), map);
            gst_buffer_unmap(gst_sample_get_buffer(sample.get()), &map);
        }
    }
    return heard;
}

} // namespace

Listener::Listener(const std::string& address, const std::string& protocol)
    : m_stream(address, protocol, "audio", 40,
               "decodebin ! audioconvert ! audio/x-raw,format=F32LE,layout=interleaved ! "
               "appsink name=out sync=false max-buffers=0") {}

Heard Listener::hear(milliseconds length, milliseconds deadline) {
    return hearFrom(m_stream, length, deadline, [](Heard& heard, const GstCaps* caps, const GstMapInfo& bytes) {
        GstAudioInfo info;
        if (!gst_audio_info_from_caps(&info, caps)) {
            return;
        }
        heard.rate = info.rate;
        heard.planes.resize(static_cast<std::size_t>(info.channels));
        const auto* samples = reinterpret_cast<const float*>(bytes.data);
        for (std::size_t i = 0; i < bytes.size / sizeof(float); ++i) {
            heard.planes[i % heard.planes.size()].push_back(samples[i]);
        }
    });
}

PacketListener::PacketListener(const std::string& address, const std::string& protocol)
    : m_stream(address, protocol, "audio", 40, "appsink name=out sync=false max-buffers=0") {}

Heard PacketListener::hear(milliseconds length, milliseconds deadline) {
    return hearFrom(m_stream, length, deadline, [](Heard& heard, const GstCaps* caps, const GstMapInfo& packet) {
        constexpr std::size_t header = 12;
        const GstStructure* description = gst_caps_get_structure(caps, 0);
        const std::string encoding = gst_structure_get_string(description, "encoding-name");
        const char* channels = gst_structure_get_string(description, "encoding-params");
        const std::size_t width = encoding == "L24" ? 3 : 2;
        gst_structure_get_int(description, "clock-rate", &heard.rate);
        heard.planes.resize(channels != nullptr ? std::stoul(channels) : 1);
        for (std::size_t i = 0; header + (i + 1) * width <= packet.size; ++i) {
            const std::uint8_t* bytes = packet.data + header + i * width;
            const auto sample = static_cast<std::int16_t>(bytes[0] << 8U | bytes[1]);
            heard.planes[i % heard.planes.size()].push_back(static_cast<float>(sample) / 32768.0F);
        }
    });
}

std::string descriptionOf(const std::string& address) {
    gst_init(nullptr, nullptr);
    GstRTSPUrl* url = nullptr;
    GstRTSPConnection* connection = nullptr;
    gst_rtsp_url_parse(address.c_str(), &url);
    gst_rtsp_connection_create(url, &connection);
    constexpr gint64 limit = 5 * G_USEC_PER_SEC;
    std::string text;
    GstRTSPMessage request{};
    GstRTSPMessage answer{};
    gst_rtsp_message_init_request(&request, GST_RTSP_DESCRIBE, address.c_str());
    gst_rtsp_message_add_header(&request, GST_RTSP_HDR_ACCEPT, "application/sdp");
    if (gst_rtsp_connection_connect_usec(connection, limit) == GST_RTSP_OK &&
        gst_rtsp_connection_send_usec(connection, &request, limit) == GST_RTSP_OK &&
        gst_rtsp_connection_receive_usec(connection, &answer, limit) == GST_RTSP_OK) {
        guint8* body = nullptr;
        guint size = 0;
        gst_rtsp_message_get_body(&answer, &body, &size);
        text.assign(reinterpret_cast<const char*>(body), body != nullptr ? size : 0);
    }
    gst_rtsp_message_unset(&request);
    gst_rtsp_message_unset(&answer);
    gst_rtsp_connection_free(connection);
    gst_rtsp_url_free(url);
    return text;
}

} // namespace qivo::test
