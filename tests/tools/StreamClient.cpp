#include "tests/tools/StreamClient.h"

#include <gst/app/gstappsink.h>

#include <cstring>

namespace qivo::test {
namespace {

gboolean isOfMedium(GstElement*, guint, GstCaps* described, gpointer medium) {
    const char* media = gst_structure_get_string(gst_caps_get_structure(described, 0), "media");
    return media != nullptr && std::strcmp(media, static_cast<const char*>(medium)) == 0;
}

} // namespace

// Streams that were set up appear on threads of their own, and a link that waits for one of two that appear at the same
// moment can miss both.
StreamClient::StreamClient(const std::string& address, const std::string& protocol, const char* medium, int latency,
                           const std::string& behind) {
    gst_init(nullptr, nullptr);
    const std::string text =
        "rtspsrc name=in latency=" + std::to_string(latency) + " protocols=" + protocol + " ! " + behind;
    GstElement* parsed = gst_parse_launch(text.c_str(), nullptr);
    m_pipeline.reset(GST_ELEMENT(gst_object_ref_sink(parsed)));
    m_sink = element("out");
    const Object<GstElement> in = element("in");
    g_object_set(in.get(), "location", address.c_str(), "add-reference-timestamp-meta", TRUE, nullptr);
    g_signal_connect_data(
        in.get(), "select-stream", G_CALLBACK(isOfMedium), g_strdup(medium),
        [](gpointer name, GClosure*) { g_free(name); }, static_cast<GConnectFlags>(0));
    gst_element_set_state(parsed, GST_STATE_PLAYING);
}

StreamClient::~StreamClient() {
    gst_element_set_state(m_pipeline.get(), GST_STATE_NULL);
}

Sample StreamClient::next(std::chrono::nanoseconds deadline) {
    return Sample(
        gst_app_sink_try_pull_sample(GST_APP_SINK(m_sink.get()), static_cast<GstClockTime>(deadline.count())));
}

Object<GstElement> StreamClient::element(const char* name) const {
    return Object<GstElement>(gst_bin_get_by_name(GST_BIN(m_pipeline.get()), name));
}

Object<GstBus> StreamClient::bus() const {
    return Object<GstBus>(gst_element_get_bus(m_pipeline.get()));
}

} // namespace qivo::test
