#include "tools/record/SoundFitter.h"

namespace qivo::record {
namespace {

GstAudioInfo infoOf(GstAudioFormat format, int rate, int channels, GstAudioLayout layout) {
    GstAudioInfo info;
    gst_audio_info_init(&info);
    std::vector<GstAudioChannelPosition> positions(static_cast<std::size_t>(channels), GST_AUDIO_CHANNEL_POSITION_NONE);
    gst_audio_info_set_format(&info, format, rate, channels, positions.data());
    info.layout = layout;
    return info;
}

bool isReadable(const QIVOlib_audio_frame_v2_t& frame) {
    return frame.p_data != nullptr && frame.sample_rate > 0 && frame.sample_rate <= SoundFitter::highestRate &&
           frame.no_channels > 0 && frame.no_channels <= SoundFitter::mostChannels && frame.no_samples > 0 &&
           frame.channel_stride_in_bytes / static_cast<int>(sizeof(float)) >= frame.no_samples;
}

/// The plane that a channel of the movie takes its samples from; null for silence.
float* planeFor(const QIVOlib_audio_frame_v2_t& frame, int channel) {
    if (frame.no_channels == 1) {
        channel = 0;
    }
    const int stride = frame.channel_stride_in_bytes / static_cast<int>(sizeof(float));
    return channel < frame.no_channels ? frame.p_data + static_cast<std::ptrdiff_t>(channel) * stride : nullptr;
}

} // namespace

bool SoundFitter::prepare(int rate) {
    if (m_converter && rate == m_rate) {
        return true;
    }
    m_rate = rate;
    GstAudioInfo in = infoOf(GST_AUDIO_FORMAT_F32, rate, m_format.channels, GST_AUDIO_LAYOUT_NON_INTERLEAVED);
    GstAudioInfo out = infoOf(GST_AUDIO_FORMAT_S24BE, m_format.rate, m_format.channels, GST_AUDIO_LAYOUT_INTERLEAVED);
    m_converter.reset(gst_audio_converter_new(GST_AUDIO_CONVERTER_FLAG_NONE, &in, &out, nullptr));
    return m_converter != nullptr;
}

std::vector<std::uint8_t> SoundFitter::fit(const QIVOlib_audio_frame_v2_t& frame) {
    if (!isReadable(frame)) {
        return {};
    }
    if (m_format.rate == 0) {
        m_format = {frame.sample_rate, frame.no_channels};
    }
    if (!prepare(frame.sample_rate)) {
        return {};
    }
    const auto count = static_cast<std::size_t>(frame.no_samples);
    std::vector<float> silence(frame.no_channels < m_format.channels ? count : 0);
    std::vector<gpointer> planes;
    for (int channel = 0; channel < m_format.channels; ++channel) {
        float* plane = planeFor(frame, channel);
        planes.push_back(plane != nullptr ? plane : silence.data());
    }
    const gsize frames = gst_audio_converter_get_out_frames(m_converter.get(), count);
    std::vector<std::uint8_t> bytes(frames * bytesPerSoundFrame(m_format));
    gpointer out = bytes.data();
    if (!gst_audio_converter_samples(m_converter.get(), GST_AUDIO_CONVERTER_FLAG_NONE, planes.data(), count, &out,
                                     frames)) {
        return {};
    }
    return bytes;
}

} // namespace qivo::record
