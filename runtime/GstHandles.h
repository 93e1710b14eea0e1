#pragma once

#include <gst/gst.h>

#include <memory>

namespace qivo::runtime {

/// Gives a reference or an allocation of GStreamer back.
struct GstRelease {
    void operator()(GstElement* element) const { gst_object_unref(element); }
    void operator()(GstBus* bus) const { gst_object_unref(bus); }
    void operator()(GstPad* pad) const { gst_object_unref(pad); }
    void operator()(GstCaps* caps) const { gst_caps_unref(caps); }
    void operator()(GstEvent* event) const { gst_event_unref(event); }
    void operator()(GstSample* sample) const { gst_sample_unref(sample); }
    void operator()(GError* error) const { g_error_free(error); }
    void operator()(gchar* text) const { g_free(text); }
};

/// An owned reference.
template <typename T>
using GstOwned = std::unique_ptr<T, GstRelease>;

} // namespace qivo::runtime
