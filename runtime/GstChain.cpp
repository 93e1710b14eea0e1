#include "runtime/GstChain.h"

#include "runtime/Log.h"

#include <algorithm>
#include <chrono>
#include <string>

namespace qivo::runtime {
namespace {

constexpr std::int64_t kNanosecondsPerUnit = 100;

} // namespace

GstElement* makeElement(const char* factory) {
    GstElement* element = gst_element_factory_make(factory, nullptr);
    if (element == nullptr) {
        log(std::string("the GStreamer element ") + factory + " is missing");
    }
    return element;
}

GstElement* makeFilter(GstCaps* caps) {
    GstElement* filter = makeElement("capsfilter");
    if (filter != nullptr) {
        g_object_set(filter, "caps", caps, nullptr);
    }
    return filter;
}

/// Frames are handed on the moment they are ready: the caller takes them in his own time, so waiting for a presentation
/// time here would only add to the latency.
GstElement* makeSink() {
    GstElement* sink = makeElement("fakesink");
    if (sink != nullptr) {
        g_object_set(sink, "sync", FALSE, "async", FALSE, "enable-last-sample", FALSE, "qos", FALSE, nullptr);
    }
    return sink;
}

bool appendChain(GstBin* bin, GstPad* pad, const std::vector<GstElement*>& chain) {
    const bool complete = std::find(chain.begin(), chain.end(), nullptr) == chain.end();
    for (GstElement* element : chain) {
        if (element != nullptr) {
            gst_bin_add(bin, element);
        }
    }
    if (!complete) {
        return false;
    }
    for (auto it = chain.rbegin(); it != chain.rend(); ++it) {
        if (it != chain.rbegin()) {
            gst_element_link(*it, *(it - 1));
        }
        gst_element_sync_state_with_parent(*it);
    }
    const GstOwned<GstPad> in(gst_element_get_static_pad(chain.front(), "sink"));
    return gst_pad_link(pad, in.get()) == GST_PAD_LINK_OK;
}

void watchInput(GstElement* element, GstPadProbeType mask, GstPadProbeCallback call, gpointer data) {
    const GstOwned<GstPad> in(gst_element_get_static_pad(element, "sink"));
    gst_pad_add_probe(in.get(), mask, call, data, nullptr);
}

std::int64_t timecodeOf(GstBuffer* buffer, const GstSegment* segment) {
    const GstClockTime pts = GST_BUFFER_PTS(buffer);
    if (!GST_CLOCK_TIME_IS_VALID(pts) || segment == nullptr || segment->format != GST_FORMAT_TIME) {
        return 0;
    }
    const std::uint64_t time = gst_segment_to_stream_time(segment, GST_FORMAT_TIME, pts);
    return GST_CLOCK_TIME_IS_VALID(time) ? static_cast<std::int64_t>(time / kNanosecondsPerUnit) : 0;
}

std::int64_t wallClock() {
    using Units = std::chrono::duration<std::int64_t, std::ratio<1, 10'000'000>>;
    return std::chrono::duration_cast<Units>(std::chrono::system_clock::now().time_since_epoch()).count();
}

} // namespace qivo::runtime
