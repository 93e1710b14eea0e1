#include "runtime/ChannelOrder.h"

#include "runtime/GstHandles.h"
#include "runtime/Sound.h"
#include "runtime/SoundCodec.h"

#include <array>
#include <functional>

namespace qivo::runtime {
namespace {

constexpr std::size_t kMost = kMostSoundChannels;
constexpr guint64 kStereo = 3; // front left and front right

using Places = std::array<GstAudioChannelPosition, kMost>;

constexpr auto kNone = GST_AUDIO_CHANNEL_POSITION_NONE;
constexpr auto kCentre = GST_AUDIO_CHANNEL_POSITION_FRONT_CENTER;
constexpr auto kLeft = GST_AUDIO_CHANNEL_POSITION_FRONT_LEFT;
constexpr auto kRight = GST_AUDIO_CHANNEL_POSITION_FRONT_RIGHT;
constexpr auto kSideLeft = GST_AUDIO_CHANNEL_POSITION_SIDE_LEFT;
constexpr auto kSideRight = GST_AUDIO_CHANNEL_POSITION_SIDE_RIGHT;
constexpr auto kRear = GST_AUDIO_CHANNEL_POSITION_REAR_CENTER;
constexpr auto kRearLeft = GST_AUDIO_CHANNEL_POSITION_REAR_LEFT;
constexpr auto kRearRight = GST_AUDIO_CHANNEL_POSITION_REAR_RIGHT;
constexpr auto kLow = GST_AUDIO_CHANNEL_POSITION_LFE1;

/// One row for each number of channels from 3 on; fewer are in one order everywhere.
constexpr std::array<Places, kMost - 2> kOpus{{
    {kLeft, kCentre, kRight, kNone, kNone, kNone, kNone, kNone},
    {kLeft, kRight, kRearLeft, kRearRight, kNone, kNone, kNone, kNone},
    {kLeft, kCentre, kRight, kRearLeft, kRearRight, kNone, kNone, kNone},
    {kLeft, kCentre, kRight, kRearLeft, kRearRight, kLow, kNone, kNone},
    {kLeft, kCentre, kRight, kSideLeft, kSideRight, kRear, kLow, kNone},
    {kLeft, kCentre, kRight, kSideLeft, kSideRight, kRearLeft, kRearRight, kLow},
}};

constexpr const char* kChannels = "qivo-channels"; // what was described to a depayloader, kept with it

GstEvent* withChanged(GstEvent* event, const std::function<void(GstCaps*)>& change) {
    GstCaps* caps = nullptr;
    gst_event_parse_caps(event, &caps);
    const GstOwned<GstCaps> changed(gst_caps_copy(caps));
    change(changed.get());
    gst_event_unref(event);
    return gst_event_new_caps(changed.get());
}

/// A depayloader that knows of a single channel sorts none; behind it the caps get their channels back, at no places.
/// It sorts whatever the description says, and by a usual order where it says nothing.
GstPadProbeReturn conceal(GstPad*, GstPadProbeInfo* info, gpointer depayloader) {
    GstEvent* event = GST_PAD_PROBE_INFO_EVENT(info);
    if (GST_EVENT_TYPE(event) != GST_EVENT_CAPS) {
        return GST_PAD_PROBE_OK;
    }
    GST_PAD_PROBE_INFO_DATA(info) = withChanged(event, [depayloader](GstCaps* caps) {
        const int channels = describedChannels(gst_caps_get_structure(caps, 0));
        g_object_set_data(G_OBJECT(depayloader), kChannels, GINT_TO_POINTER(channels));
        gst_caps_set_simple(caps, "encoding-params", G_TYPE_STRING, "1", "channels", G_TYPE_INT, 1, nullptr);
    });
    return GST_PAD_PROBE_OK;
}

GstPadProbeReturn reveal(GstPad*, GstPadProbeInfo* info, gpointer depayloader) {
    GstEvent* event = GST_PAD_PROBE_INFO_EVENT(info);
    const int channels = GPOINTER_TO_INT(g_object_get_data(G_OBJECT(depayloader), kChannels));
    if (GST_EVENT_TYPE(event) != GST_EVENT_CAPS || channels <= 1) {
        return GST_PAD_PROBE_OK;
    }
    GST_PAD_PROBE_INFO_DATA(info) = withChanged(event, [channels](GstCaps* caps) {
        const guint64 places = channels == 2 ? kStereo : 0;
        gst_caps_set_simple(caps, "channels", G_TYPE_INT, channels, "channel-mask", GST_TYPE_BITMASK, places, nullptr);
    });
    return GST_PAD_PROBE_OK;
}

/// A packet that ends within a sample would end the stream.
GstPadProbeReturn dropBroken(GstPad* pad, GstPadProbeInfo* info, gpointer depayloader) {
    const int channels = GPOINTER_TO_INT(g_object_get_data(G_OBJECT(depayloader), kChannels));
    const GstOwned<GstCaps> caps(gst_pad_get_current_caps(pad));
    GstAudioInfo one;
    if (channels < 1 || !caps || !gst_audio_info_from_caps(&one, caps.get())) {
        return GST_PAD_PROBE_OK;
    }
    const auto all = static_cast<std::size_t>(channels) * static_cast<std::size_t>(GST_AUDIO_INFO_BPS(&one));
    return gst_buffer_get_size(GST_PAD_PROBE_INFO_BUFFER(info)) % all == 0 ? GST_PAD_PROBE_OK : GST_PAD_PROBE_DROP;
}

} // namespace

void leaveUnsorted(GstElement* depayloader) {
    const GstOwned<GstPad> in(gst_element_get_static_pad(depayloader, "sink"));
    const GstOwned<GstPad> out(gst_element_get_static_pad(depayloader, "src"));
    gst_pad_add_probe(in.get(), GST_PAD_PROBE_TYPE_EVENT_DOWNSTREAM, conceal, depayloader, nullptr);
    gst_pad_add_probe(out.get(), GST_PAD_PROBE_TYPE_EVENT_DOWNSTREAM, reveal, depayloader, nullptr);
    gst_pad_add_probe(out.get(), GST_PAD_PROBE_TYPE_BUFFER, dropBroken, depayloader, nullptr);
}

std::vector<float> inOpusOrder(const float* samples, std::size_t count, const GstAudioInfo& info) {
    std::vector<float> ordered(samples, samples + count);
    const auto channels = static_cast<std::size_t>(GST_AUDIO_INFO_CHANNELS(&info));
    if (channels < 3 || channels > kMost || GST_AUDIO_INFO_IS_UNPOSITIONED(&info)) {
        return ordered;
    }
    std::array<gint, kMost> to{};
    if (gst_audio_get_channel_reorder_map(GST_AUDIO_INFO_CHANNELS(&info), info.position, kOpus[channels - 3].data(),
                                          to.data()) == FALSE) {
        return ordered;
    }
    for (std::size_t i = 0; i < count; ++i) {
        ordered[i - i % channels + static_cast<std::size_t>(to[i % channels])] = samples[i];
    }
    return ordered;
}

} // namespace qivo::runtime
