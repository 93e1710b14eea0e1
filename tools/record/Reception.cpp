#include "tools/record/Reception.h"

#include "sdk/Timecode.h"
#include "tools/record/Arguments.h"
#include "tools/record/MovieWriter.h"

#include <algorithm>
#include <utility>

namespace qivo::record {
namespace {

constexpr std::uint32_t captureWaitMs = 20;
constexpr std::int64_t nanosecondsPerUnit = 100;
constexpr Nanoseconds longestWaiting = std::chrono::milliseconds(250);
constexpr Nanoseconds refusedPause = std::chrono::milliseconds(1);

QIVOlib_recv_instance_t createReceiver(Reception::Kind kind, const std::string& source) {
    QIVOlib_recv_create_v3_t settings{};
    settings.source.p_name = source.c_str();
    settings.color_format = QIVOlib_recv_color_format_rgba;
    settings.bandwidth =
        kind == Reception::Kind::picture ? QIVOlib_recv_bandwidth_highest : QIVOlib_recv_bandwidth_audio_only;
    settings.p_qivo_recv_name = programName;
    return QIVOlib_recv_create_v3(&settings);
}

Nanoseconds wallNow() {
    return std::chrono::system_clock::now().time_since_epoch();
}

} // namespace

Reception::Reception(Kind kind, const std::string& source, Calls calls, CommonClock& common)
    : m_kind(kind), m_calls(std::move(calls)), m_common(common), m_receiver(createReceiver(kind, source)) {
    if (started()) {
        m_thread = std::thread([this] { run(); });
    }
}

Reception::~Reception() {
    stop();
    QIVOlib_recv_destroy(m_receiver);
}

void Reception::stop() {
    m_stopped = true;
    if (m_thread.joinable()) {
        m_thread.join();
    }
}

void Reception::run() {
    while (!m_stopped) {
        capture();
    }
}

/// Arrival is told by the wall clock, which may be set at any time: only how long ago it was is taken from it.
Nanoseconds Reception::place(std::int64_t timecode, std::int64_t timestamp) {
    const Nanoseconds waited = wallNow() - Nanoseconds(timestamp * nanosecondsPerUnit);
    const bool told = waited > Nanoseconds(0) && waited < longestWaiting;
    const Nanoseconds now = steadyNow();
    m_lastFrame = now.count();
    const Nanoseconds arrival = told ? now - waited : now;
    return m_kind == Kind::picture ? placePicture(timecode, arrival) : placeSound(timecode, arrival);
}

Nanoseconds Reception::placePicture(std::int64_t timecode, Nanoseconds arrival) {
    const Nanoseconds place = m_clock.place(Nanoseconds(timecode * nanosecondsPerUnit), arrival);
    if (timecode >= firstWallTimecode) {
        m_common.tell(m_clock.offset(), steadyNow());
    }
    return place;
}

/// Pictures are decoded, which takes them longer: by arrival the sound would be ahead of them.
Nanoseconds Reception::placeSound(std::int64_t timecode, Nanoseconds arrival) {
    const Nanoseconds stamp(timecode * nanosecondsPerUnit);
    const auto offset = timecode >= firstWallTimecode ? m_common.offset(steadyNow()) : std::nullopt;
    return offset ? m_clock.place(stamp, arrival, *offset) : m_clock.place(stamp, arrival);
}

void Reception::capture() {
    QIVOlib_video_frame_v2_t picture{};
    QIVOlib_audio_frame_v2_t sound{};
    const bool wantsPicture = m_kind == Kind::picture;
    const std::int32_t type = QIVOlib_recv_capture_v2(m_receiver, wantsPicture ? &picture : nullptr,
                                                      wantsPicture ? nullptr : &sound, nullptr, captureWaitMs);
    if (type == QIVOlib_frame_type_video) {
        m_calls.picture(picture, place(picture.timecode, picture.timestamp));
        QIVOlib_recv_free_video_v2(m_receiver, &picture);
    } else if (type == QIVOlib_frame_type_audio) {
        m_calls.sound(sound, place(sound.timecode, sound.timestamp));
        QIVOlib_recv_free_audio_v2(m_receiver, &sound);
    } else if (type != QIVOlib_frame_type_none && type != QIVOlib_frame_type_status_change) {
        std::this_thread::sleep_for(refusedPause);
    }
}

} // namespace qivo::record
