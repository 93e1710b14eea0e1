#include "tests/audio/LiveSource.h"

#include "runtime/SoundCutter.h"
#include "runtime/SoundQueue.h"
#include "sdk/qivo.h"

#include <memory>
#include <utility>
#include <vector>

struct QIVOlib_recv_instance_type {};

namespace qivo::test {
namespace {

using std::chrono::milliseconds;
using std::chrono::nanoseconds;

constexpr int kChannels = 2;
constexpr std::int64_t kMillion = 1'000'000;
constexpr std::int64_t kUnitsPerSecond = 10'000'000; // of a timecode

struct State {
    LiveSource::Script script;
    nanoseconds began{};
    std::int64_t sent = 0;
    std::int64_t dropped = 0;
    std::vector<float> packet; // interleaved
    std::size_t next = 0;      // in the sound
    runtime::SoundQueue queue;
    runtime::SoundCutter cutter{[this](std::unique_ptr<runtime::Sound> sound) {
        for (const auto& gone : queue.push(std::move(sound))) {
            dropped += gone->record().no_samples;
        }
    }};

    /// Sends every packet whose last sample has been taken by now.
    void send() {
        const std::int64_t passed = (script.now() - began).count();
        const double rate = script.rate * (1.0 + static_cast<double>(script.partsPerMillion) / kMillion);
        const auto taken = static_cast<std::int64_t>(static_cast<double>(passed) * rate * 1e-9 + 1e-6);
        const auto count = static_cast<std::int64_t>(script.packet);
        for (; sent + count <= taken; sent += count) {
            for (float& sample : packet) {
                sample = script.sound[next];
                next = next + 1 < script.sound.size() ? next + 1 : 0;
            }
            cutter.add({{script.rate, kChannels},
                        packet.data(),
                        script.packet,
                        sent * kUnitsPerSecond / script.rate,
                        0,
                        false,
                        {}});
        }
    }
};

std::unique_ptr<State>& source() {
    static std::unique_ptr<State> instance;
    return instance;
}

LiveSource::Script& script() {
    static LiveSource::Script instance;
    return instance;
}

QIVOlib_recv_instance_type receiver;

} // namespace

void LiveSource::set(Script next) {
    script() = std::move(next);
}

std::int64_t LiveSource::sent() {
    return source() ? source()->sent : 0;
}

std::int64_t LiveSource::dropped() {
    return source() ? source()->dropped : 0;
}

nanoseconds LiveSource::waiting() {
    return source() ? source()->queue.held() : nanoseconds::zero();
}

std::size_t LiveSource::framesWaiting() {
    return source() ? source()->queue.waiting() : 0;
}

int LiveSource::receiversOpen() {
    return source() ? 1 : 0;
}

} // namespace qivo::test

using namespace qivo::test;

extern "C" {

QIVOlib_recv_instance_t QIVOlib_recv_create_v3(const QIVOlib_recv_create_v3_t* /*p_settings*/) {
    source() = std::make_unique<State>();
    source()->script = script();
    source()->began = script().now();
    source()->packet.resize(kChannels * script().packet);
    return &receiver;
}

void QIVOlib_recv_destroy(QIVOlib_recv_instance_t /*p_instance*/) {
    source().reset();
}

void QIVOlib_recv_get_queue(QIVOlib_recv_instance_t /*p_instance*/, QIVOlib_recv_queue_t* p_queue) {
    source()->send();
    *p_queue = {0, static_cast<std::int32_t>(source()->queue.waiting()), 0};
}

int32_t QIVOlib_recv_capture_v2(QIVOlib_recv_instance_t /*p_instance*/, QIVOlib_video_frame_v2_t* /*p_video*/,
                                QIVOlib_audio_frame_v2_t* p_audio, QIVOlib_metadata_frame_t* /*p_metadata*/,
                                uint32_t timeout_in_ms) {
    State& from = *source();
    from.send();
    for (std::uint32_t waited = 0; !from.queue.ready() && waited < timeout_in_ms; ++waited) {
        from.script.pass(milliseconds(1));
        from.send();
    }
    if (!from.queue.ready()) {
        return QIVOlib_frame_type_none;
    }
    *p_audio = from.queue.take();
    return QIVOlib_frame_type_audio;
}

void QIVOlib_recv_free_audio_v2(QIVOlib_recv_instance_t /*p_instance*/, const QIVOlib_audio_frame_v2_t* p_audio) {
    static_cast<void>(source()->queue.giveBack(p_audio->p_data));
}

} // extern "C"
