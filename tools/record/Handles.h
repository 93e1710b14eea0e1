#pragma once

#include <gst/gst.h>
#include <gst/video/video.h>

#include <memory>
#include <string>

namespace qivo::record {

struct MediaRelease {
    void operator()(GstElement* element) const { gst_object_unref(element); }
    void operator()(GstElementFactory* factory) const { gst_object_unref(factory); }
    void operator()(GstBus* bus) const { gst_object_unref(bus); }
    void operator()(GstBufferPool* pool) const { gst_object_unref(pool); }
    void operator()(GstCaps* caps) const { gst_caps_unref(caps); }
    void operator()(GstBuffer* buffer) const { gst_buffer_unref(buffer); }
    void operator()(GstSample* sample) const { gst_sample_unref(sample); }
    void operator()(GstMessage* message) const { gst_message_unref(message); }
    void operator()(GstVideoConverter* converter) const { gst_video_converter_free(converter); }
    void operator()(GError* error) const { g_error_free(error); }
};

/** One reference to, or the only owner of, something of GStreamer's. */
template <typename T>
using Media = std::unique_ptr<T, MediaRelease>;

/** What an error message says. */
[[nodiscard]] inline std::string errorText(GstMessage* message) {
    GError* error = nullptr;
    gst_message_parse_error(message, &error, nullptr);
    const Media<GError> owned(error);
    return owned->message;
}

} // namespace qivo::record
