// A libqivo that only says that it was called.
#include "sdk/qivo.h"

#include <cstdio>

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
    return nullptr;
}
void QIVOlib_find_destroy(QIVOlib_find_instance_t) {}
bool QIVOlib_find_wait_for_sources(QIVOlib_find_instance_t, uint32_t) {
    return true;
}
const QIVOlib_source_t* QIVOlib_find_get_current_sources(QIVOlib_find_instance_t, uint32_t*) {
    return nullptr;
}
QIVOlib_recv_instance_t QIVOlib_recv_create_v3(const QIVOlib_recv_create_v3_t*) {
    return nullptr;
}
void QIVOlib_recv_destroy(QIVOlib_recv_instance_t) {}
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
