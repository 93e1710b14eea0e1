#include "runtime/Library.h"

#include "runtime/BackgroundThreads.h"
#include "runtime/DirectoryView.h"
#include "runtime/Finder.h"
#include "runtime/GstHandles.h"
#include "runtime/Log.h"

#include <string>
#include <vector>

namespace qivo::runtime {
namespace {

constexpr const char* kNeeded[] = {"rtspsrc", "queue", "capsfilter", "videoconvert", "fakesink"};
constexpr const char* kUseful[] = {"rtph264depay", "h264parse",    "avdec_h264",   "rtph265depay", "h265parse",
                                   "avdec_h265",   "rtpjpegdepay", "jpegdec",      "audioconvert", "rtpL16depay",
                                   "rtpL24depay",  "rtppcmudepay", "mulawdec",     "rtppcmadepay", "alawdec",
                                   "deinterlace",  "rtpmp4gdepay", "rtpmp4adepay", "aacparse",     "avdec_aac",
                                   "rtpopusdepay", "opusdec"};

/// Whether the element can be made. Loads what makes it, so that the first receiver need not.
bool canMake(const char* factory) {
    GstElement* element = gst_element_factory_make(factory, nullptr);
    if (element == nullptr) {
        log(std::string("the GStreamer element ") + factory + " is missing");
        return false;
    }
    const GstOwned<GstElement> owned(GST_ELEMENT(gst_object_ref_sink(element)));
    return true;
}

bool prepareGstreamer() {
    GError* error = nullptr;
    if (gst_init_check(nullptr, nullptr, &error) == FALSE) {
        const GstOwned<GError> owned(error);
        log(std::string("GStreamer does not start: ") + (error != nullptr ? error->message : "unknown reason"));
        return false;
    }
    bool complete = true;
    for (const char* factory : kNeeded) {
        complete = canMake(factory) && complete;
    }
    for (const char* factory : kUseful) {
        canMake(factory);
    }
    return complete;
}

} // namespace

Library& Library::instance() {
    // Never taken apart: threads that outlast the last destroy may still look at it.
    static Library* const library = new Library; // NOLINT(cppcoreguidelines-owning-memory)
    return *library;
}

bool Library::initialize() {
    const std::lock_guard guard(m_mutex);
    if (m_count == 0 && !prepareGstreamer()) {
        return false;
    }
    ++m_count;
    return true;
}

void Library::destroy() {
    const std::lock_guard guard(m_mutex);
    if (m_count == 0) {
        return;
    }
    std::vector<std::shared_ptr<Receiver>> endingReceivers;
    std::vector<std::shared_ptr<Finder>> endingFinders;
    {
        const std::lock_guard admitting(m_admitting);
        if (--m_count > 0) {
            return;
        }
        endingReceivers = receivers.removeAll();
        endingFinders = finders.removeAll();
    }
    for (const auto& finder : endingFinders) {
        finder->end();
    }
    endingReceivers.clear();
    endingFinders.clear();
    if (!BackgroundThreads::waitForAll(kEndLimit)) {
        log("a connection could not be taken apart in time");
    }
}

Receiver::Environment Library::receiverEnvironment() const {
    return {directoryView, m_transports};
}

} // namespace qivo::runtime
