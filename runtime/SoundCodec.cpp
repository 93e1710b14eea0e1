#include "runtime/SoundCodec.h"

#include "runtime/Sound.h"

#include <algorithm>
#include <array>

namespace qivo::runtime {
namespace {

constexpr std::array<SoundCodec, 8> kCodecs{{
    {"L16", "rtpL16depay", nullptr, nullptr, true, ChannelOrder::stream},
    {"L24", "rtpL24depay", nullptr, nullptr, true, ChannelOrder::stream},
    {"PCMU", "rtppcmudepay", nullptr, "mulawdec", true, ChannelOrder::decoder},
    {"PCMA", "rtppcmadepay", nullptr, "alawdec", true, ChannelOrder::decoder},
    {"MPEG4-GENERIC", "rtpmp4gdepay", "aacparse", "avdec_aac", false, ChannelOrder::decoder},
    {"MP4A-LATM", "rtpmp4adepay", "aacparse", "avdec_aac", false, ChannelOrder::decoder},
    {"OPUS", "rtpopusdepay", nullptr, "opusdec", false, ChannelOrder::opus},
    {"MULTIOPUS", "rtpopusdepay", nullptr, "opusdec", false, ChannelOrder::opus},
}};

struct StaticPayload {
    int type;
    const char* encoding;
    int channels;
};

constexpr std::array<StaticPayload, 5> kStaticPayloads{
    {{0, "PCMU", 1}, {8, "PCMA", 1}, {10, "L16", 2}, {11, "L16", 1}, {26, "JPEG", 0}}};

const StaticPayload* staticPayloadOf(const GstStructure* rtp) {
    int type = -1;
    gst_structure_get_int(rtp, "payload", &type);
    const auto* it = std::find_if(kStaticPayloads.begin(), kStaticPayloads.end(),
                                  [type](const StaticPayload& payload) { return payload.type == type; });
    return it != kStaticPayloads.end() ? it : nullptr;
}

} // namespace

const SoundCodec* soundCodecFor(const std::string& encoding) {
    const auto* it =
        std::find_if(kCodecs.begin(), kCodecs.end(), [&](const SoundCodec& c) { return encoding == c.encoding; });
    return it != kCodecs.end() ? it : nullptr;
}

std::string encodingOf(const GstStructure* rtp) {
    const char* named = gst_structure_get_string(rtp, "encoding-name");
    std::string encoding = named != nullptr ? named : "";
    if (const StaticPayload* known = encoding.empty() ? staticPayloadOf(rtp) : nullptr) {
        encoding = known->encoding;
    }
    std::transform(encoding.begin(), encoding.end(), encoding.begin(), [](char c) { return g_ascii_toupper(c); });
    return encoding;
}

int describedChannels(const GstStructure* rtp) {
    constexpr gint64 kMost = 1000;
    const char* parameters = gst_structure_get_string(rtp, "encoding-params");
    if (parameters == nullptr || *parameters == '\0') {
        const StaticPayload* known = staticPayloadOf(rtp);
        return known != nullptr ? known->channels : 1;
    }
    gint64 channels = 0;
    return g_ascii_string_to_signed(parameters, 10, 0, kMost, &channels, nullptr) ? static_cast<int>(channels) : 0;
}

std::string soundProblem(const GstStructure* rtp) {
    const std::string encoding = encodingOf(rtp);
    const SoundCodec* codec = soundCodecFor(encoding);
    if (codec == nullptr) {
        return "sound as " + (encoding.empty() ? "an unnamed encoding" : encoding) + " is not received";
    }
    int rate = 0;
    gst_structure_get_int(rtp, "clock-rate", &rate);
    return codec->described ? soundProblem(rate, describedChannels(rtp)) : std::string();
}

std::string soundProblem(int rate, int channels) {
    if (SoundFormat{rate, channels}.isReceived()) {
        return {};
    }
    return "sound of " + std::to_string(rate) + " Hz in " + std::to_string(channels) +
           " channels is not received: rates go from " + std::to_string(kLowestSoundRate) + " to " +
           std::to_string(kHighestSoundRate) + " Hz, channels from 1 to " + std::to_string(kMostSoundChannels);
}

} // namespace qivo::runtime
