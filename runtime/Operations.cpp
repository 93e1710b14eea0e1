// The C operations: handles are looked up, everything else is passed on.

#include "runtime/Finder.h"
#include "runtime/Library.h"
#include "runtime/Steering.h"
#include "sdk/qivo.h"

#include <chrono>
#include <memory>
#include <utility>

using qivo::runtime::Finder;
using qivo::runtime::Library;
using qivo::runtime::Receiver;
using qivo::runtime::Steering;

namespace {

Library& library() {
    return Library::instance();
}

std::shared_ptr<Receiver> receiver(QIVOlib_recv_instance_t handle) {
    return library().receivers.find(handle);
}

/// Null if the handle is refused or no camera has been found.
std::shared_ptr<Steering> steering(QIVOlib_recv_instance_t handle) {
    const auto found = receiver(handle);
    return found ? found->steering() : nullptr;
}

} // namespace

extern "C" {

bool QIVOlib_initialize(void) {
    return library().initialize();
}

void QIVOlib_destroy(void) {
    library().destroy();
}

QIVOlib_find_instance_t QIVOlib_find_create_v2(const QIVOlib_find_create_t* p_settings) {
    return library().admit(library().finders,
                           [p_settings] { return std::shared_ptr<Finder>(Finder::create(p_settings)); });
}

void QIVOlib_find_destroy(QIVOlib_find_instance_t p_instance) {
    if (const auto finder = library().finders.remove(p_instance)) {
        finder->end();
    }
}

bool QIVOlib_find_wait_for_sources(QIVOlib_find_instance_t p_instance, uint32_t timeout_in_ms) {
    const auto finder = library().finders.find(p_instance);
    return finder && finder->wait(std::chrono::milliseconds(timeout_in_ms));
}

const QIVOlib_source_t* QIVOlib_find_get_current_sources(QIVOlib_find_instance_t p_instance, uint32_t* p_no_sources) {
    uint32_t count = 0;
    const auto finder = library().finders.find(p_instance);
    const QIVOlib_source_t* sources = finder ? finder->sources(&count) : nullptr;
    if (p_no_sources != nullptr) {
        *p_no_sources = count;
    }
    return sources;
}

QIVOlib_recv_instance_t QIVOlib_recv_create_v3(const QIVOlib_recv_create_v3_t* p_settings) {
    return library().admit(library().receivers, [p_settings] {
        return std::shared_ptr<Receiver>(Receiver::create(p_settings, library().receiverEnvironment()));
    });
}

void QIVOlib_recv_destroy(QIVOlib_recv_instance_t p_instance) {
    library().receivers.remove(p_instance);
}

int32_t QIVOlib_recv_capture_v2(QIVOlib_recv_instance_t p_instance, QIVOlib_video_frame_v2_t* p_video,
                                QIVOlib_audio_frame_v2_t* p_audio, QIVOlib_metadata_frame_t* p_metadata,
                                uint32_t timeout_in_ms) {
    const auto found = receiver(p_instance);
    return found ? found->capture(p_video, p_audio, p_metadata, std::chrono::milliseconds(timeout_in_ms))
                 : static_cast<int32_t>(QIVOlib_frame_type_none);
}

void QIVOlib_recv_free_video_v2(QIVOlib_recv_instance_t p_instance, const QIVOlib_video_frame_v2_t* p_video) {
    if (const auto found = receiver(p_instance)) {
        found->freeVideo(p_video);
    }
}

void QIVOlib_recv_free_audio_v2(QIVOlib_recv_instance_t p_instance, const QIVOlib_audio_frame_v2_t* p_audio) {
    if (const auto found = receiver(p_instance)) {
        found->freeAudio(p_audio);
    }
}

void QIVOlib_recv_free_string(QIVOlib_recv_instance_t p_instance, const char* p_string) {
    if (const auto found = receiver(p_instance)) {
        found->freeString(p_string);
    }
}

const char* QIVOlib_recv_get_web_control(QIVOlib_recv_instance_t p_instance) {
    const auto found = receiver(p_instance);
    return found ? found->webControl() : nullptr;
}

void QIVOlib_recv_get_queue(QIVOlib_recv_instance_t p_instance, QIVOlib_recv_queue_t* p_queue) {
    if (p_queue != nullptr) {
        const auto found = receiver(p_instance);
        *p_queue = found ? found->queue() : QIVOlib_recv_queue_t{};
    }
}

bool QIVOlib_recv_ptz_is_supported(QIVOlib_recv_instance_t p_instance) {
    return steering(p_instance) != nullptr;
}

bool QIVOlib_recv_ptz_zoom_speed(QIVOlib_recv_instance_t p_instance, float zoom_speed) {
    const auto found = steering(p_instance);
    return found && found->zoom(zoom_speed);
}

bool QIVOlib_recv_ptz_pan_tilt_speed(QIVOlib_recv_instance_t p_instance, float pan_speed, float tilt_speed) {
    const auto found = steering(p_instance);
    return found && found->panTilt(pan_speed, tilt_speed);
}

bool QIVOlib_recv_ptz_auto_focus(QIVOlib_recv_instance_t p_instance) {
    const auto found = steering(p_instance);
    return found && found->autoFocus();
}

bool QIVOlib_recv_ptz_focus(QIVOlib_recv_instance_t p_instance, float focus_value) {
    const auto found = steering(p_instance);
    return found && found->focus(focus_value);
}

bool QIVOlib_recv_ptz_store_preset(QIVOlib_recv_instance_t p_instance, int32_t preset_no) {
    const auto found = steering(p_instance);
    return found && found->store(preset_no);
}

bool QIVOlib_recv_ptz_recall_preset(QIVOlib_recv_instance_t p_instance, int32_t preset_no, float speed) {
    const auto found = steering(p_instance);
    return found && found->recall(preset_no, speed);
}

} // extern "C"
