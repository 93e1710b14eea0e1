#include "runtime/Sound.h"

#include <utility>

namespace qivo::runtime {

Sound::Sound(SoundFormat format, std::vector<float> planes, std::int64_t timecode, std::int64_t arrived)
    : m_format(format), m_planes(std::move(planes)), m_timecode(timecode), m_arrived(arrived) {}

QIVOlib_audio_frame_v2_t Sound::record() {
    QIVOlib_audio_frame_v2_t record{};
    record.sample_rate = m_format.rate;
    record.no_channels = m_format.channels;
    record.no_samples = static_cast<std::int32_t>(m_planes.size() / static_cast<std::size_t>(m_format.channels));
    record.timecode = m_timecode;
    record.p_data = m_planes.data();
    record.channel_stride_in_bytes = record.no_samples * static_cast<std::int32_t>(sizeof(float));
    record.timestamp = m_arrived;
    return record;
}

std::chrono::nanoseconds Sound::length() const {
    const auto samples = static_cast<std::int64_t>(m_planes.size()) / m_format.channels;
    return std::chrono::nanoseconds(samples * std::nano::den / m_format.rate);
}

} // namespace qivo::runtime
