#include "tests/audio/SteadySource.h"

#include "sdk/qivo.h"

#include <array>
#include <cmath>

struct QIVOlib_recv_instance_type {};

namespace {

struct State {
    QIVOlib_audio_frame_v2_t frame{};
    std::array<float, 8UL * qivo::test::SteadySource::kLongestFrame> samples{};
    std::int64_t taken = 0;
    int receivers = 0;
    QIVOlib_recv_instance_type receiver;
};

State& state() {
    static State instance;
    return instance;
}

} // namespace

namespace qivo::test {

void SteadySource::set(std::int32_t rate, std::int32_t channels, std::int32_t samples) {
    State& source = state();
    source.frame.sample_rate = rate;
    source.frame.no_channels = channels;
    source.frame.no_samples = samples;
    source.frame.p_data = source.samples.data();
    for (int i = 0; i < channels * samples; ++i) {
        source.samples[static_cast<std::size_t>(i)] = 0.5F * std::sin(0.05F * static_cast<float>(i));
    }
}

std::int64_t SteadySource::framesTaken() {
    return state().taken;
}

int SteadySource::receiversOpen() {
    return state().receivers;
}

} // namespace qivo::test

extern "C" {

QIVOlib_recv_instance_t QIVOlib_recv_create_v3(const QIVOlib_recv_create_v3_t* /*p_settings*/) {
    ++state().receivers;
    return &state().receiver;
}

void QIVOlib_recv_destroy(QIVOlib_recv_instance_t /*p_instance*/) {
    --state().receivers;
}

void QIVOlib_recv_get_queue(QIVOlib_recv_instance_t /*p_instance*/, QIVOlib_recv_queue_t* p_queue) {
    *p_queue = {0, 3, 0};
}

int32_t QIVOlib_recv_capture_v2(QIVOlib_recv_instance_t /*p_instance*/, QIVOlib_video_frame_v2_t* /*p_video*/,
                                QIVOlib_audio_frame_v2_t* p_audio, QIVOlib_metadata_frame_t* /*p_metadata*/,
                                uint32_t /*timeout_in_ms*/) {
    ++state().taken;
    *p_audio = state().frame;
    return QIVOlib_frame_type_audio;
}

void QIVOlib_recv_free_audio_v2(QIVOlib_recv_instance_t /*p_instance*/, const QIVOlib_audio_frame_v2_t* /*p_audio*/) {}

} // extern "C"
