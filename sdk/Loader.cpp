#include "sdk/Loader.h"

#include "sdk/qivo.h"

#include <atomic>
#include <dlfcn.h>
#include <limits.h>
#include <mutex>
#include <unistd.h>

namespace qivo {
namespace {

/// Every operation with the type of its function, so that the table, the look-up and the forwarders cannot disagree.
#define QIVO_OPERATIONS(X)                                                                                             \
    X(initialize)                                                                                                      \
    X(destroy)                                                                                                         \
    X(find_create_v2)                                                                                                  \
    X(find_destroy)                                                                                                    \
    X(find_wait_for_sources)                                                                                           \
    X(find_get_current_sources)                                                                                        \
    X(recv_create_v3)                                                                                                  \
    X(recv_destroy)                                                                                                    \
    X(recv_capture_v2)                                                                                                 \
    X(recv_free_video_v2)                                                                                              \
    X(recv_free_audio_v2)                                                                                              \
    X(recv_free_string)                                                                                                \
    X(recv_get_web_control)                                                                                            \
    X(recv_get_queue)                                                                                                  \
    X(recv_ptz_is_supported)                                                                                           \
    X(recv_ptz_zoom_speed)                                                                                             \
    X(recv_ptz_pan_tilt_speed)                                                                                         \
    X(recv_ptz_auto_focus)                                                                                             \
    X(recv_ptz_focus)                                                                                                  \
    X(recv_ptz_store_preset)                                                                                           \
    X(recv_ptz_recall_preset)

struct Operations {
#define QIVO_FIELD(name) decltype(&QIVOlib_##name) name = nullptr; // NOLINT(bugprone-macro-parentheses): a declaration
    QIVO_OPERATIONS(QIVO_FIELD)
#undef QIVO_FIELD
};

constexpr const char* kLibraryName = "libqivo.so";

/// The table is filled completely before `open` is set, and never changes after; readers need no lock.
struct Library {
    std::mutex mutex; // protects path, error and the opening
    std::string path;
    std::string error;
    Operations operations;
    std::atomic<bool> open = false;
};

Library& library() {
    static Library instance;
    return instance;
}

std::string programFolder() {
    char path[PATH_MAX];
    const ssize_t length = readlink("/proc/self/exe", path, sizeof(path));
    if (length <= 0) {
        return {};
    }
    const std::string program(path, static_cast<std::size_t>(length));
    return program.substr(0, program.rfind('/'));
}

/// Fills the table; the name of the first operation that the library lacks, or null.
const char* resolve(void* handle, Operations& operations) {
#define QIVO_RESOLVE(name)                                                                                             \
    operations.name = reinterpret_cast<decltype(operations.name)>(dlsym(handle, "QIVOlib_" #name));                    \
    if (operations.name == nullptr) {                                                                                  \
        return "QIVOlib_" #name;                                                                                       \
    }
    QIVO_OPERATIONS(QIVO_RESOLVE)
#undef QIVO_RESOLVE
    return nullptr;
}

void* openShared(const std::string& name, std::string& error) {
    // NODELETE: the media libraries underneath start threads and register types that do not survive unloading.
    void* handle = dlopen(name.c_str(), RTLD_NOW | RTLD_LOCAL | RTLD_NODELETE);
    if (handle == nullptr) {
        const char* reason = dlerror();
        error += error.empty() ? "" : "; ";
        error += reason != nullptr ? reason : name + " could not be opened";
    }
    return handle;
}

/// Whether the linker's message is about the library's bare name, which it goes by until it has been found somewhere.
/// The words of the message depend on the user's language.
bool wasNotFound(const std::string& error) {
    return error.rfind(std::string(kLibraryName) + ":", 0) == 0;
}

bool openLibrary(Library& lib) {
    const std::lock_guard guard(lib.mutex);
    if (lib.open) {
        return true;
    }
    lib.error.clear();
    std::string name = kLibraryName;
    void* handle = openShared(name, lib.error);
    if (handle == nullptr && wasNotFound(lib.error)) {
        name = programFolder() + "/../lib/" + kLibraryName;
        handle = openShared(name, lib.error);
    }
    if (handle == nullptr) {
        return false;
    }
    Operations operations;
    if (const char* missing = resolve(handle, operations)) {
        lib.error = name + " lacks the operation " + missing;
        dlclose(handle);
        return false;
    }
    lib.path = name;
    lib.operations = operations;
    lib.open = true;
    return true;
}

bool initialize(Library& lib) {
    if (!openLibrary(lib)) {
        return false;
    }
    const bool runs = lib.operations.initialize();
    const std::lock_guard guard(lib.mutex);
    lib.error = runs ? "" : lib.path + " refused to start";
    return runs;
}

/// The table once a library is open, else null.
const Operations* operations() {
    Library& lib = library();
    return lib.open ? &lib.operations : nullptr;
}

} // namespace

std::string loadedLibraryPath() {
    const std::lock_guard guard(library().mutex);
    return library().path;
}

std::string loadError() {
    const std::lock_guard guard(library().mutex);
    return library().error;
}

} // namespace qivo

using qivo::operations;

extern "C" {

bool QIVOlib_initialize(void) {
    return qivo::initialize(qivo::library());
}

void QIVOlib_destroy(void) {
    if (const auto* lib = operations()) {
        lib->destroy();
    }
}

QIVOlib_find_instance_t QIVOlib_find_create_v2(const QIVOlib_find_create_t* p_settings) {
    const auto* lib = operations();
    return lib != nullptr ? lib->find_create_v2(p_settings) : nullptr;
}

void QIVOlib_find_destroy(QIVOlib_find_instance_t p_instance) {
    if (const auto* lib = operations()) {
        lib->find_destroy(p_instance);
    }
}

bool QIVOlib_find_wait_for_sources(QIVOlib_find_instance_t p_instance, uint32_t timeout_in_ms) {
    const auto* lib = operations();
    return lib != nullptr && lib->find_wait_for_sources(p_instance, timeout_in_ms);
}

const QIVOlib_source_t* QIVOlib_find_get_current_sources(QIVOlib_find_instance_t p_instance, uint32_t* p_no_sources) {
    if (const auto* lib = operations()) {
        return lib->find_get_current_sources(p_instance, p_no_sources);
    }
    if (p_no_sources != nullptr) {
        *p_no_sources = 0;
    }
    return nullptr;
}

QIVOlib_recv_instance_t QIVOlib_recv_create_v3(const QIVOlib_recv_create_v3_t* p_settings) {
    const auto* lib = operations();
    return lib != nullptr ? lib->recv_create_v3(p_settings) : nullptr;
}

void QIVOlib_recv_destroy(QIVOlib_recv_instance_t p_instance) {
    if (const auto* lib = operations()) {
        lib->recv_destroy(p_instance);
    }
}

int32_t QIVOlib_recv_capture_v2(QIVOlib_recv_instance_t p_instance, QIVOlib_video_frame_v2_t* p_video,
                                QIVOlib_audio_frame_v2_t* p_audio, QIVOlib_metadata_frame_t* p_metadata,
                                uint32_t timeout_in_ms) {
    const auto* lib = operations();
    return lib != nullptr ? lib->recv_capture_v2(p_instance, p_video, p_audio, p_metadata, timeout_in_ms)
                          : static_cast<int32_t>(QIVOlib_frame_type_none);
}

void QIVOlib_recv_free_video_v2(QIVOlib_recv_instance_t p_instance, const QIVOlib_video_frame_v2_t* p_video) {
    if (const auto* lib = operations()) {
        lib->recv_free_video_v2(p_instance, p_video);
    }
}

void QIVOlib_recv_free_audio_v2(QIVOlib_recv_instance_t p_instance, const QIVOlib_audio_frame_v2_t* p_audio) {
    if (const auto* lib = operations()) {
        lib->recv_free_audio_v2(p_instance, p_audio);
    }
}

void QIVOlib_recv_free_string(QIVOlib_recv_instance_t p_instance, const char* p_string) {
    if (const auto* lib = operations()) {
        lib->recv_free_string(p_instance, p_string);
    }
}

const char* QIVOlib_recv_get_web_control(QIVOlib_recv_instance_t p_instance) {
    const auto* lib = operations();
    return lib != nullptr ? lib->recv_get_web_control(p_instance) : nullptr;
}

void QIVOlib_recv_get_queue(QIVOlib_recv_instance_t p_instance, QIVOlib_recv_queue_t* p_queue) {
    if (const auto* lib = operations()) {
        lib->recv_get_queue(p_instance, p_queue);
    } else if (p_queue != nullptr) {
        *p_queue = {};
    }
}

bool QIVOlib_recv_ptz_is_supported(QIVOlib_recv_instance_t p_instance) {
    const auto* lib = operations();
    return lib != nullptr && lib->recv_ptz_is_supported(p_instance);
}

bool QIVOlib_recv_ptz_zoom_speed(QIVOlib_recv_instance_t p_instance, float zoom_speed) {
    const auto* lib = operations();
    return lib != nullptr && lib->recv_ptz_zoom_speed(p_instance, zoom_speed);
}

bool QIVOlib_recv_ptz_pan_tilt_speed(QIVOlib_recv_instance_t p_instance, float pan_speed, float tilt_speed) {
    const auto* lib = operations();
    return lib != nullptr && lib->recv_ptz_pan_tilt_speed(p_instance, pan_speed, tilt_speed);
}

bool QIVOlib_recv_ptz_auto_focus(QIVOlib_recv_instance_t p_instance) {
    const auto* lib = operations();
    return lib != nullptr && lib->recv_ptz_auto_focus(p_instance);
}

bool QIVOlib_recv_ptz_focus(QIVOlib_recv_instance_t p_instance, float focus_value) {
    const auto* lib = operations();
    return lib != nullptr && lib->recv_ptz_focus(p_instance, focus_value);
}

bool QIVOlib_recv_ptz_store_preset(QIVOlib_recv_instance_t p_instance, int32_t preset_no) {
    const auto* lib = operations();
    return lib != nullptr && lib->recv_ptz_store_preset(p_instance, preset_no);
}

bool QIVOlib_recv_ptz_recall_preset(QIVOlib_recv_instance_t p_instance, int32_t preset_no, float speed) {
    const auto* lib = operations();
    return lib != nullptr && lib->recv_ptz_recall_preset(p_instance, preset_no, speed);
}

} // extern "C"
