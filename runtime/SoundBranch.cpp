#include "runtime/SoundBranch.h"

#include "runtime/GstChain.h"
#include "runtime/SoundCodec.h"

#include <gst/audio/audio.h>

#include <utility>
#include <vector>

namespace qivo::runtime {
namespace {

GstElement* makeDecoder(const char* factory) {
    GstElement* decoder = makeElement(factory);
    if (decoder != nullptr && g_object_class_find_property(G_OBJECT_GET_CLASS(decoder), "max-errors") != nullptr) {
        g_object_set(decoder, "max-errors", -1, nullptr);
    }
    return decoder;
}

GstOwned<GstEvent> segmentOf(GstPad* pad, const GstSegment** segment) {
    GstOwned<GstEvent> event(gst_pad_get_sticky_event(pad, GST_EVENT_SEGMENT, 0));
    if (event) {
        gst_event_parse_segment(event.get(), segment);
    }
    return event;
}

} // namespace

struct SoundBranch::Callbacks {
    static SoundBranch& self(gpointer data) { return *static_cast<SoundBranch*>(data); }

    static GstPadProbeReturn unitComplete(GstPad*, GstPadProbeInfo*, gpointer data) {
        self(data).m_calls.unitComplete();
        return GST_PAD_PROBE_OK;
    }

    /// Sound is looked at before anything of its size is allocated.
    static GstPadProbeReturn decoded(GstPad*, GstPadProbeInfo* info, gpointer data) {
        GstEvent* event = GST_PAD_PROBE_INFO_EVENT(info);
        if (GST_EVENT_TYPE(event) != GST_EVENT_CAPS) {
            return GST_PAD_PROBE_OK;
        }
        GstCaps* caps = nullptr;
        gst_event_parse_caps(event, &caps);
        int rate = 0;
        int channels = 0;
        const GstStructure* structure = gst_caps_get_structure(caps, 0);
        gst_structure_get_int(structure, "rate", &rate);
        gst_structure_get_int(structure, "channels", &channels);
        std::string problem = soundProblem(rate, channels);
        if (problem.empty()) {
            return GST_PAD_PROBE_OK;
        }
        self(data).m_calls.refused(std::move(problem));
        return GST_PAD_PROBE_DROP;
    }

    static GstPadProbeReturn converted(GstPad* pad, GstPadProbeInfo* info, gpointer data) {
        self(data).take(pad, GST_PAD_PROBE_INFO_BUFFER(info));
        return GST_PAD_PROBE_OK;
    }
};

SoundBranch::SoundBranch(Calls calls, const SenderClock& clock)
    : m_calls(std::move(calls)), m_clock(clock), m_cutter(m_calls.emit) {}

bool SoundBranch::build(GstBin* bin, GstPad* pad, const std::string& encoding) {
    const SoundCodec& codec = *soundCodecFor(encoding);
    const GstOwned<GstCaps> floats(gst_caps_new_simple("audio/x-raw", "format", G_TYPE_STRING, GST_AUDIO_NE(F32),
                                                       "layout", G_TYPE_STRING, "interleaved", nullptr));
    m_order = codec.order;
    std::vector<GstElement*> chain{makeElement(codec.depayloader)};
    if (codec.parser != nullptr) {
        chain.push_back(makeElement(codec.parser));
    }
    if (codec.decoder != nullptr) {
        chain.push_back(makeDecoder(codec.decoder));
    }
    GstElement* converter = makeElement("audioconvert");
    GstElement* sink = makeSink();
    chain.insert(chain.end(), {converter, makeFilter(floats.get()), sink});
    if (converter == nullptr || sink == nullptr || chain[1] == nullptr) {
        return appendChain(bin, pad, chain);
    }
    if (m_order == ChannelOrder::stream && chain[0] != nullptr) {
        leaveUnsorted(chain[0]);
    }
    watchInput(chain[1], kDataProbe, Callbacks::unitComplete, this);
    watchInput(converter, GST_PAD_PROBE_TYPE_EVENT_DOWNSTREAM, Callbacks::decoded, this);
    watchInput(sink, GST_PAD_PROBE_TYPE_BUFFER, Callbacks::converted, this);
    return appendChain(bin, pad, chain);
}

void SoundBranch::take(GstPad* pad, GstBuffer* buffer) {
    GstAudioInfo info;
    const GstOwned<GstCaps> caps(gst_pad_get_current_caps(pad));
    if (!caps || !gst_audio_info_from_caps(&info, caps.get())) {
        return;
    }
    const SoundFormat format{GST_AUDIO_INFO_RATE(&info), GST_AUDIO_INFO_CHANNELS(&info)};
    GstMapInfo map;
    if (!format.isReceived() || !gst_buffer_map(buffer, &map, GST_MAP_READ)) {
        return;
    }
    const GstSegment* segment = nullptr;
    const GstOwned<GstEvent> event = segmentOf(pad, &segment);
    SoundCutter::Piece piece;
    piece.format = format;
    piece.samples = reinterpret_cast<const float*>(map.data);
    std::vector<float> ordered;
    if (m_order == ChannelOrder::opus) {
        ordered = inOpusOrder(piece.samples, map.size / sizeof(float), info);
        piece.samples = ordered.data();
    }
    piece.count = map.size / static_cast<std::size_t>(GST_AUDIO_INFO_BPF(&info));
    piece.timecode = timecodeOf(buffer, segment);
    piece.taken = m_clock.at(GST_BUFFER_PTS(buffer));
    piece.arrived = wallClock();
    piece.afterGap = GST_BUFFER_FLAG_IS_SET(buffer, GST_BUFFER_FLAG_DISCONT);
    m_cutter.add(piece);
    gst_buffer_unmap(buffer, &map);
}

} // namespace qivo::runtime
