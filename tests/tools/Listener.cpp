#include "tests/tools/Listener.h"

#include <gst/audio/audio.h>
#include <gst/rtsp/gstrtspconnection.h>

namespace qivo::test {

using namespace std::chrono;

Listener::Listener(const std::string& address, const std::string& protocol)
    : m_stream(
          address, protocol, "audio", 40,
          "audioconvert ! audio/x-raw,format=F32LE,layout=interleaved ! appsink name=out sync=false max-buffers=0") {}

Heard Listener::hear(milliseconds length, milliseconds deadline) {
    const auto end = steady_clock::now() + deadline;
    Heard heard;
    while (heard.seconds() < duration<double>(length).count() && steady_clock::now() < end) {
        const Sample sample = m_stream.next(milliseconds(100));
        GstAudioInfo info;
        GstMapInfo map;
        if (!sample || !gst_audio_info_from_caps(&info, gst_sample_get_caps(sample.get())) ||
            !gst_buffer_map(gst_sample_get_buffer(sample.get()), &map, GST_MAP_READ)) {
            continue;
        }
        heard.rate = info.rate;
        heard.planes.resize(static_cast<std::size_t>(info.channels));
        const auto* samples = reinterpret_cast<const float*>(map.data);
        for (std::size_t i = 0; i < map.size / sizeof(float); ++i) {
            heard.planes[i % heard.planes.size()].push_back(samples[i]);
        }
        gst_buffer_unmap(gst_sample_get_buffer(sample.get()), &map);
    }
    return heard;
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
