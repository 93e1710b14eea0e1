// A libqivo that only says that it was called. With STAND_IN_NOTES in the environment it knows one source, and notes in
// that file when a finder or a receiver goes.
#include "sdk/qivo.h"

#include <cstdio>
#include <cstdlib>
#include <utility>

namespace {

const char* notes() {
    return std::getenv("STAND_IN_NOTES");
}

void note(const char* text) {
    if (std::FILE* file = notes() != nullptr ? std::fopen(notes(), "a") : nullptr) {
        std::fprintf(file, "%s\n", text);
        std::fclose(file);
    }
}

/// Handles; all that is known of a receiver is what it receives.
char finder = 0;
char video = 0;
char sound = 0;

} // namespace

extern "C" {
bool QIVOlib_initialize(void) {
    std::puts("stand-in: initialize");
#ifdef REFUSES_TO_START
    return false;
#else
    return true;
#endif
}
void QIVOlib_destroy(void) {
    std::puts("stand-in: destroy");
}
QIVOlib_find_instance_t QIVOlib_find_create_v2(const QIVOlib_find_create_t*) {
    return notes() != nullptr ? reinterpret_cast<QIVOlib_find_instance_t>(&finder) : nullptr;
}
void QIVOlib_find_destroy(QIVOlib_find_instance_t) {
    note("finder goes");
}
bool QIVOlib_find_wait_for_sources(QIVOlib_find_instance_t, uint32_t) {
    static bool changed = true;
    return std::exchange(changed, false);
}
const QIVOlib_source_t* QIVOlib_find_get_current_sources(QIVOlib_find_instance_t instance, uint32_t* count) {
    static const QIVOlib_source_t source{"STUDIO (Cam 1)", "stand-in://1"};
    if (instance == nullptr) {
        return nullptr;
    }
    *count = 1;
    return &source;
}
QIVOlib_recv_instance_t QIVOlib_recv_create_v3(const QIVOlib_recv_create_v3_t* settings) {
    if (notes() == nullptr) {
        return nullptr;
    }
    const bool hears = settings->bandwidth == QIVOlib_recv_bandwidth_audio_only;
    note(hears ? "sound comes" : "video comes");
    return reinterpret_cast<QIVOlib_recv_instance_t>(hears ? &sound : &video);
}
void QIVOlib_recv_destroy(QIVOlib_recv_instance_t instance) {
    if (instance != nullptr) {
        note(instance == reinterpret_cast<QIVOlib_recv_instance_t>(&sound) ? "sound goes" : "video goes");
    }
}
int32_t QIVOlib_recv_capture_v2(QIVOlib_recv_instance_t, QIVOlib_video_frame_v2_t*, QIVOlib_audio_frame_v2_t*,
                                QIVOlib_metadata_frame_t*, uint32_t timeout) {
    return static_cast<int32_t>(timeout);
}
void QIVOlib_recv_free_video_v2(QIVOlib_recv_instance_t, const QIVOlib_video_frame_v2_t*) {}
void QIVOlib_recv_free_audio_v2(QIVOlib_recv_instance_t, const QIVOlib_audio_frame_v2_t*) {}
void QIVOlib_recv_free_string(QIVOlib_recv_instance_t, const char*) {}
const char* QIVOlib_recv_get_web_control(QIVOlib_recv_instance_t) {
    return nullptr;
}
void QIVOlib_recv_get_queue(QIVOlib_recv_instance_t, QIVOlib_recv_queue_t*) {}
bool QIVOlib_recv_ptz_is_supported(QIVOlib_recv_instance_t) {
    return true;
}
bool QIVOlib_recv_ptz_zoom_speed(QIVOlib_recv_instance_t, float) {
    return true;
}
bool QIVOlib_recv_ptz_pan_tilt_speed(QIVOlib_recv_instance_t, float, float) {
    return true;
}
bool QIVOlib_recv_ptz_auto_focus(QIVOlib_recv_instance_t) {
    return true;
}
bool QIVOlib_recv_ptz_focus(QIVOlib_recv_instance_t, float) {
    return true;
}
bool QIVOlib_recv_ptz_store_preset(QIVOlib_recv_instance_t, int32_t) {
    return true;
}
#ifndef LACKS_AN_OPERATION
bool QIVOlib_recv_ptz_recall_preset(QIVOlib_recv_instance_t, int32_t, float) {
    return true;
}
#endif
}
