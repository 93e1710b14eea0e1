#include "runtime/SenderClock.h"

#include "runtime/GstHandles.h"
#include "sdk/Timecode.h"

#include <algorithm>
#include <cstdlib>

namespace qivo::runtime {
namespace {

constexpr std::int64_t kNanosecondsPerUnit = 100;
/// NTP's seconds have 32 bits and count from the beginning of 1900.
constexpr GstClockTime kLastNtp = (GstClockTime{1} << 32U) * GST_SECOND;
constexpr std::int64_t kUnixEpoch = 2'208'988'800 * static_cast<std::int64_t>(GST_SECOND);

GstCaps* ntpCaps() {
    static const GstOwned<GstCaps> caps(gst_caps_new_empty_simple("timestamp/x-ntp"));
    return caps.get();
}

} // namespace

void SenderClock::look(GstBuffer* packet) {
    const GstReferenceTimestampMeta* meta =
        packet != nullptr ? gst_buffer_get_reference_timestamp_meta(packet, ntpCaps()) : nullptr;
    if (meta != nullptr) {
        note(GST_BUFFER_PTS(packet), meta->timestamp);
    }
}

void SenderClock::note(GstClockTime pts, GstClockTime ntp) {
    if (!GST_CLOCK_TIME_IS_VALID(pts) || ntp > kLastNtp) {
        return;
    }
    const auto time = static_cast<std::int64_t>(pts);
    const std::int64_t told = static_cast<std::int64_t>(ntp - pts) - kUnixEpoch;
    const std::int64_t offset = m_offset;
    const std::int64_t most = std::max<std::int64_t>(time - m_pts, 0) / kSlowness;
    const bool first = offset == kUnknown || std::llabs(told - offset) >= kStep.count();
    m_offset = first ? told : offset + std::clamp(told - offset, -most, most);
    m_pts = time;
}

std::optional<std::int64_t> SenderClock::at(GstClockTime pts) const {
    const std::int64_t offset = m_offset;
    if (offset == kUnknown || !GST_CLOCK_TIME_IS_VALID(pts)) {
        return std::nullopt;
    }
    const std::int64_t time = (static_cast<std::int64_t>(pts) + offset) / kNanosecondsPerUnit;
    return time >= firstWallTimecode ? std::optional(time) : std::nullopt;
}

} // namespace qivo::runtime
