#include "tools/publish/Sound.h"

#include <algorithm>
#include <array>
#include <cmath>

namespace qivo {
namespace {

struct CodecFacts {
    SoundCodec codec;
    const char* name;
    std::vector<int> rates; ///< none: all
    int channels;
    const char* pipeline;
    std::vector<NeededElement> elements;
};

const std::vector<CodecFacts>& allCodecs() {
    constexpr const char* good = "gstreamer1.0-plugins-good";
    constexpr const char* base = "gstreamer1.0-plugins-base";
    static const std::vector<CodecFacts> facts{
        {SoundCodec::l16,
         "l16",
         {},
         maximumAudioChannels,
         "audioconvert dithering=none ! audio/x-raw,format=S16BE ! rtpL16pay name=pay1 pt=97",
         {{"rtpL16pay", good}}},
        {SoundCodec::l24,
         "l24",
         {},
         maximumAudioChannels,
         "audioconvert dithering=none ! audio/x-raw,format=S24BE ! rtpL24pay name=pay1 pt=97",
         {{"rtpL24pay", good}}},
        // Not the encoder of libav: it takes two tones for one sound between the loudspeakers.
        {SoundCodec::aac,
         "aac",
         {8000, 11025, 12000, 16000, 22050, 24000, 32000, 44100, 48000, 64000, 88200, 96000},
         2,
         "audioconvert ! voaacenc bitrate=128000 ! aacparse ! rtpmp4gpay name=pay1 pt=97",
         {{"voaacenc", "gstreamer1.0-plugins-bad"}, {"aacparse", good}, {"rtpmp4gpay", good}}},
        {SoundCodec::opus,
         "opus",
         {8000, 12000, 16000, 24000, 48000},
         2,
         "audioconvert ! opusenc audio-type=restricted-lowdelay bitrate=128000 ! rtpopuspay name=pay1 pt=97",
         {{"opusenc", base}, {"rtpopuspay", good}}},
        {SoundCodec::pcmu,
         "pcmu",
         {8000},
         1,
         "audioconvert dithering=none ! mulawenc ! rtppcmupay name=pay1 pt=0",
         {{"mulawenc", good}, {"rtppcmupay", good}}},
    };
    return facts;
}

const CodecFacts& factsOf(SoundCodec codec) {
    return *std::find_if(allCodecs().begin(), allCodecs().end(),
                         [codec](const CodecFacts& facts) { return facts.codec == codec; });
}

std::string listOf(const std::vector<int>& rates) {
    std::string text;
    for (std::size_t i = 0; i < rates.size(); ++i) {
        text += (i == 0 ? "" : i + 1 == rates.size() ? " or " : ", ") + std::to_string(rates[i]);
    }
    return text;
}

} // namespace

Caps SoundFormat::caps() const {
    Caps caps(gst_caps_new_simple("audio/x-raw", "format", G_TYPE_STRING, "F32LE", "layout", G_TYPE_STRING,
                                  "interleaved", "rate", G_TYPE_INT, rate, "channels", G_TYPE_INT, channels, nullptr));
    if (channels > 1) {
        constexpr guint64 frontLeftAndRight = 3;
        gst_caps_set_simple(caps.get(), "channel-mask", GST_TYPE_BITMASK,
                            channels == 2 ? frontLeftAndRight : guint64{0}, nullptr);
    }
    return caps;
}

int toneFrequency(std::size_t source, int channel) {
    constexpr int lowest = 440;
    constexpr int betweenChannels = 256; // as many as there can be sources
    constexpr int betweenNeighbours = 16;
    const int number = static_cast<int>(source % maximumSources);
    return lowest + betweenChannels * channel + betweenNeighbours * (number % betweenNeighbours) +
           number / betweenNeighbours;
}

void ToneSource::fill(float* samples, std::size_t count, Time /*begin*/) {
    const double turn = 2.0 * std::acos(-1.0);
    for (std::size_t i = 0; i < count; ++i) {
        for (int channel = 0; channel < m_format.channels; ++channel) {
            const std::int64_t part = toneFrequency(m_source, channel) * m_next % m_format.rate;
            *samples++ = toneAmplitude * static_cast<float>(std::sin(turn * static_cast<double>(part) / m_format.rate));
        }
        m_next = (m_next + 1) % m_format.rate;
    }
}

std::vector<NeededElement> elementsFor(SoundCodec codec) {
    std::vector<NeededElement> elements = factsOf(codec).elements;
    elements.push_back({"audioconvert", "gstreamer1.0-plugins-base"});
    return elements;
}

std::string soundPipeline(SoundCodec codec) {
    return std::string("appsrc name=sound is-live=true format=time block=false max-buffers=25 max-bytes=0 max-time=0 "
                       "leaky-type=downstream ! ") +
           factsOf(codec).pipeline;
}

std::string soundCodecProblem(SoundCodec codec, int rate, int channels) {
    const CodecFacts& facts = factsOf(codec);
    const std::string start = std::string("--audio-codec ") + facts.name + " carries ";
    if (!facts.rates.empty() && std::find(facts.rates.begin(), facts.rates.end(), rate) == facts.rates.end()) {
        return start + listOf(facts.rates) + " Hz; choose another --audio-rate or --audio-codec";
    }
    if (channels > facts.channels) {
        return start + "at most " + std::to_string(facts.channels) + (facts.channels == 1 ? " channel" : " channels") +
               "; choose fewer --audio-channels or another --audio-codec";
    }
    return {};
}

} // namespace qivo
