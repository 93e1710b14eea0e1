#pragma once

#include <gst/gst.h>
#include <memory>

namespace qivo {

struct ObjectUnref {
    void operator()(gpointer object) const { g_object_unref(object); }
};
struct BufferUnref {
    void operator()(GstBuffer* buffer) const { gst_buffer_unref(buffer); }
};
struct CapsUnref {
    void operator()(GstCaps* caps) const { gst_caps_unref(caps); }
};
struct SampleUnref {
    void operator()(GstSample* sample) const { gst_sample_unref(sample); }
};
struct MessageUnref {
    void operator()(GstMessage* message) const { gst_message_unref(message); }
};
struct ErrorFree {
    void operator()(GError* error) const { g_error_free(error); }
};
struct TextFree {
    void operator()(gchar* text) const { g_free(text); }
};

/** One reference to a GObject or GstObject, not floating. */
template <typename T>
using Object = std::unique_ptr<T, ObjectUnref>;
using Buffer = std::unique_ptr<GstBuffer, BufferUnref>;
using Caps = std::unique_ptr<GstCaps, CapsUnref>;
using Sample = std::unique_ptr<GstSample, SampleUnref>;
using Message = std::unique_ptr<GstMessage, MessageUnref>;
using Error = std::unique_ptr<GError, ErrorFree>;
using Text = std::unique_ptr<gchar, TextFree>;

/** A further reference. */
template <typename T>
[[nodiscard]] Object<T> share(T* object) {
    return Object<T>(object != nullptr ? static_cast<T*>(g_object_ref(object)) : nullptr);
}

} // namespace qivo
