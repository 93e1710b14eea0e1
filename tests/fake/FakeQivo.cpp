#include "tests/fake/FakeQivo.h"

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <utility>

namespace qivo::test {

struct FakeQivo::State {
    mutable std::mutex mutex; // protects everything below
    bool initializes = true;
    bool finderCreates = true;
    bool receiverCreates = true;
    bool sourcesChanged = false;
    std::vector<Source> sources;
    std::vector<Source> reported;
    std::vector<QIVOlib_source_t> reportedRecords;
    std::deque<Capture> script;
    std::map<const void*, Capture> out;
    std::vector<std::unique_ptr<std::string>> strings;
    bool hasWeb = false;
    std::string web;
    bool ptz = false;
    QIVOlib_recv_queue_t queue{};
    float focus = 0;
    std::function<void(const std::string&)> hook;
    std::vector<std::string> calls;
    std::vector<std::string> misuse;
    std::map<const void*, std::string> finders;
    std::map<const void*, std::string> receivers;
    // Handles are addresses of these; they are never reused, so that a stale handle is recognised.
    std::vector<std::unique_ptr<int>> handles;
    int finderCount = 0;
    int receiverCount = 0;

    void note(const std::string& line) {
        std::function<void(const std::string&)> toCall;
        {
            const std::lock_guard guard(mutex);
            calls.push_back(line);
            toCall = hook;
        }
        if (toCall) {
            toCall(line);
        }
    }

    std::string nameOf(const std::map<const void*, std::string>& known, const void* handle, const char* operation) {
        const std::lock_guard guard(mutex);
        if (handle == nullptr) {
            return "null";
        }
        const auto found = known.find(handle);
        if (found == known.end()) {
            misuse.push_back(std::string(operation) + " with a handle that is not open");
            return "stale";
        }
        return found->second;
    }

    std::string receiver(const void* handle, const char* operation) { return nameOf(receivers, handle, operation); }
    std::string finder(const void* handle, const char* operation) { return nameOf(finders, handle, operation); }

    void* newHandle(std::map<const void*, std::string>& known, char letter, int& count) {
        handles.push_back(std::make_unique<int>(0));
        void* handle = handles.back().get();
        known[handle] = letter + std::to_string(++count);
        return handle;
    }
};

FakeQivo::FakeQivo() : m_state(std::make_unique<State>()) {}
FakeQivo::~FakeQivo() = default;

FakeQivo& FakeQivo::instance() {
    static FakeQivo fake;
    return fake;
}

void FakeQivo::reset() {
    m_state = std::make_unique<State>();
}

void FakeQivo::setInitializes(bool yes) {
    const std::lock_guard guard(m_state->mutex);
    m_state->initializes = yes;
}

void FakeQivo::setFinderCreates(bool yes) {
    const std::lock_guard guard(m_state->mutex);
    m_state->finderCreates = yes;
}

void FakeQivo::setReceiverCreates(bool yes) {
    const std::lock_guard guard(m_state->mutex);
    m_state->receiverCreates = yes;
}

void FakeQivo::setSources(std::vector<Source> sources) {
    const std::lock_guard guard(m_state->mutex);
    m_state->sources = std::move(sources);
    m_state->sourcesChanged = true;
}

void FakeQivo::addCapture(Capture capture) {
    const std::lock_guard guard(m_state->mutex);
    m_state->script.push_back(std::move(capture));
}

void FakeQivo::addStatusChange() {
    Capture capture;
    capture.type = QIVOlib_frame_type_status_change;
    addCapture(std::move(capture));
}

void FakeQivo::addVideo(int32_t width, int32_t height, uint32_t rgba, float aspect, int32_t stride) {
    Capture capture;
    capture.type = QIVOlib_frame_type_video;
    const int32_t bytes = stride != 0 ? stride : 4 * width;
    capture.pixels.resize(static_cast<std::size_t>(bytes) * static_cast<std::size_t>(height));
    const uint8_t colour[4] = {static_cast<uint8_t>(rgba >> 24), static_cast<uint8_t>(rgba >> 16),
                               static_cast<uint8_t>(rgba >> 8), static_cast<uint8_t>(rgba)};
    for (int32_t y = 0; y < height; ++y) {
        for (int32_t x = 0; x < width; ++x) {
            std::memcpy(capture.pixels.data() + static_cast<std::ptrdiff_t>(y) * bytes + std::ptrdiff_t{4} * x, colour,
                        4);
        }
    }
    capture.video.xres = width;
    capture.video.yres = height;
    capture.video.FourCC = 0x41424752; // "RGBA", first character in the lowest byte
    capture.video.frame_rate_N = 30;
    capture.video.frame_rate_D = 1;
    capture.video.picture_aspect_ratio = aspect;
    capture.video.frame_format_type = 1;
    capture.video.line_stride_in_bytes = bytes;
    addCapture(std::move(capture));
}

void FakeQivo::setWebControl(const char* address) {
    const std::lock_guard guard(m_state->mutex);
    m_state->hasWeb = address != nullptr;
    m_state->web = address != nullptr ? address : "";
}

void FakeQivo::setPtzSupported(bool yes) {
    const std::lock_guard guard(m_state->mutex);
    m_state->ptz = yes;
}

void FakeQivo::setQueue(QIVOlib_recv_queue_t queue) {
    const std::lock_guard guard(m_state->mutex);
    m_state->queue = queue;
}

void FakeQivo::setHook(std::function<void(const std::string&)> hook) {
    const std::lock_guard guard(m_state->mutex);
    m_state->hook = std::move(hook);
}

std::vector<std::string> FakeQivo::calls() const {
    const std::lock_guard guard(m_state->mutex);
    return m_state->calls;
}

std::vector<std::string> FakeQivo::takeCalls() {
    const std::lock_guard guard(m_state->mutex);
    return std::exchange(m_state->calls, {});
}

std::vector<std::string> FakeQivo::callsOf(const std::string& prefix) const {
    std::vector<std::string> found = calls();
    std::erase_if(found, [&](const std::string& line) { return line.rfind(prefix, 0) != 0; });
    return found;
}

int FakeQivo::openFinders() const {
    const std::lock_guard guard(m_state->mutex);
    return static_cast<int>(m_state->finders.size());
}

int FakeQivo::openReceivers() const {
    const std::lock_guard guard(m_state->mutex);
    return static_cast<int>(m_state->receivers.size());
}

int FakeQivo::framesOut() const {
    const std::lock_guard guard(m_state->mutex);
    return static_cast<int>(m_state->out.size());
}

int FakeQivo::stringsOut() const {
    const std::lock_guard guard(m_state->mutex);
    return static_cast<int>(m_state->strings.size());
}

std::vector<std::string> FakeQivo::misuse() const {
    const std::lock_guard guard(m_state->mutex);
    return m_state->misuse;
}

float FakeQivo::lastFocus() const {
    const std::lock_guard guard(m_state->mutex);
    return m_state->focus;
}

std::vector<const void*> FakeQivo::framesOutData() const {
    const std::lock_guard guard(m_state->mutex);
    std::vector<const void*> data;
    for (const auto& entry : m_state->out) {
        data.push_back(entry.first);
    }
    return data;
}

namespace {

FakeQivo::State& fake() {
    return FakeQivo::instance().state();
}

std::string text(const char* string) {
    return string != nullptr ? string : "null";
}

std::string number(double value) {
    char buffer[32];
    std::snprintf(buffer, sizeof(buffer), "%g", value);
    return buffer;
}

/// Takes the next scripted answer if the caller asked for its kind.
int32_t nextCapture(FakeQivo::State& state, QIVOlib_video_frame_v2_t* video, QIVOlib_audio_frame_v2_t* audio) {
    const std::lock_guard guard(state.mutex);
    if (state.script.empty()) {
        return QIVOlib_frame_type_none;
    }
    FakeQivo::Capture& next = state.script.front();
    const int32_t type = next.type;
    if ((type == QIVOlib_frame_type_video && video == nullptr) ||
        (type == QIVOlib_frame_type_audio && audio == nullptr)) {
        return QIVOlib_frame_type_none;
    }
    FakeQivo::Capture taken = std::move(next);
    state.script.pop_front();
    if (type == QIVOlib_frame_type_video) {
        if (!taken.pixels.empty()) {
            taken.video.p_data = taken.pixels.data();
        }
        *video = taken.video;
        state.out.emplace(video->p_data, std::move(taken));
    } else if (type == QIVOlib_frame_type_audio) {
        if (!taken.samples.empty()) {
            taken.audio.p_data = taken.samples.data();
        }
        *audio = taken.audio;
        state.out.emplace(audio->p_data, std::move(taken));
    }
    return type;
}

void giveBack(FakeQivo::State& state, const void* data, const char* operation) {
    const std::lock_guard guard(state.mutex);
    if (state.out.erase(data) == 0) {
        state.misuse.push_back(std::string(operation) + " of a frame that is not out");
    }
}

} // namespace
} // namespace qivo::test

using qivo::test::fake;
using qivo::test::giveBack;
using qivo::test::nextCapture;
using qivo::test::number;
using qivo::test::text;

extern "C" {

bool QIVOlib_initialize(void) {
    fake().note("initialize()");
    const std::lock_guard guard(fake().mutex);
    return fake().initializes;
}

void QIVOlib_destroy(void) {
    fake().note("destroy()");
}

QIVOlib_find_instance_t QIVOlib_find_create_v2(const QIVOlib_find_create_t* p_settings) {
    auto& state = fake();
    state.note("find_create_v2(local=" + std::to_string(p_settings != nullptr && p_settings->show_local_sources) +
               ", groups=" + text(p_settings != nullptr ? p_settings->p_groups : nullptr) +
               ", ips=" + text(p_settings != nullptr ? p_settings->p_extra_ips : nullptr) + ")");
    const std::lock_guard guard(state.mutex);
    if (!state.finderCreates) {
        return nullptr;
    }
    return static_cast<QIVOlib_find_instance_t>(state.newHandle(state.finders, 'f', state.finderCount));
}

void QIVOlib_find_destroy(QIVOlib_find_instance_t p_instance) {
    auto& state = fake();
    state.note("find_destroy(" + state.finder(p_instance, "find_destroy") + ")");
    const std::lock_guard guard(state.mutex);
    state.finders.erase(p_instance);
}

bool QIVOlib_find_wait_for_sources(QIVOlib_find_instance_t p_instance, uint32_t timeout_in_ms) {
    auto& state = fake();
    const std::string finder = state.finder(p_instance, "find_wait_for_sources");
    bool changed = false;
    {
        const std::lock_guard guard(state.mutex);
        changed = std::exchange(state.sourcesChanged, false);
    }
    state.note("find_wait_for_sources(" + finder + ", timeout=" + std::to_string(timeout_in_ms) + ") -> " +
               std::to_string(changed));
    return changed;
}

const QIVOlib_source_t* QIVOlib_find_get_current_sources(QIVOlib_find_instance_t p_instance, uint32_t* p_no_sources) {
    auto& state = fake();
    state.note("find_get_current_sources(" + state.finder(p_instance, "find_get_current_sources") + ")");
    const std::lock_guard guard(state.mutex);
    state.reported = state.sources;
    state.reportedRecords.clear();
    for (const auto& source : state.reported) {
        state.reportedRecords.push_back(
            {source.name ? source.name->c_str() : nullptr, source.url ? source.url->c_str() : nullptr});
    }
    *p_no_sources = static_cast<uint32_t>(state.reportedRecords.size());
    return state.reportedRecords.empty() ? nullptr : state.reportedRecords.data();
}

QIVOlib_recv_instance_t QIVOlib_recv_create_v3(const QIVOlib_recv_create_v3_t* p_settings) {
    auto& state = fake();
    state.note(
        "recv_create_v3(name=" + text(p_settings->source.p_name) + ", url=" + text(p_settings->source.p_url_address) +
        ", color=" + std::to_string(p_settings->color_format) + ", bandwidth=" + std::to_string(p_settings->bandwidth) +
        ", fields=" + std::to_string(p_settings->allow_video_fields) +
        ", receiver=" + text(p_settings->p_qivo_recv_name) + ")");
    const std::lock_guard guard(state.mutex);
    if (!state.receiverCreates) {
        return nullptr;
    }
    return static_cast<QIVOlib_recv_instance_t>(state.newHandle(state.receivers, 'r', state.receiverCount));
}

void QIVOlib_recv_destroy(QIVOlib_recv_instance_t p_instance) {
    auto& state = fake();
    state.note("recv_destroy(" + state.receiver(p_instance, "recv_destroy") + ")");
    const std::lock_guard guard(state.mutex);
    state.receivers.erase(p_instance);
}

int32_t QIVOlib_recv_capture_v2(QIVOlib_recv_instance_t p_instance, QIVOlib_video_frame_v2_t* p_video,
                                QIVOlib_audio_frame_v2_t* p_audio, QIVOlib_metadata_frame_t* p_metadata,
                                uint32_t timeout_in_ms) {
    auto& state = fake();
    std::string line = "recv_capture_v2(" + state.receiver(p_instance, "recv_capture_v2");
    line += p_video != nullptr ? ", video" : "";
    line += p_audio != nullptr ? ", audio" : "";
    line += p_metadata != nullptr ? ", metadata" : "";
    const int32_t type = p_instance != nullptr ? nextCapture(state, p_video, p_audio) : 0;
    state.note(line + ", timeout=" + std::to_string(timeout_in_ms) + ") -> " + std::to_string(type));
    return type;
}

void QIVOlib_recv_free_video_v2(QIVOlib_recv_instance_t p_instance, const QIVOlib_video_frame_v2_t* p_video) {
    auto& state = fake();
    state.note("recv_free_video_v2(" + state.receiver(p_instance, "recv_free_video_v2") + ")");
    giveBack(state, p_video->p_data, "recv_free_video_v2");
}

void QIVOlib_recv_free_audio_v2(QIVOlib_recv_instance_t p_instance, const QIVOlib_audio_frame_v2_t* p_audio) {
    auto& state = fake();
    state.note("recv_free_audio_v2(" + state.receiver(p_instance, "recv_free_audio_v2") + ")");
    giveBack(state, p_audio->p_data, "recv_free_audio_v2");
}

void QIVOlib_recv_free_string(QIVOlib_recv_instance_t p_instance, const char* p_string) {
    auto& state = fake();
    state.note("recv_free_string(" + state.receiver(p_instance, "recv_free_string") + ")");
    const std::lock_guard guard(state.mutex);
    const auto freed = std::erase_if(state.strings, [&](const auto& string) { return string->c_str() == p_string; });
    if (freed == 0) {
        state.misuse.emplace_back("recv_free_string of a string that is not out");
    }
}

const char* QIVOlib_recv_get_web_control(QIVOlib_recv_instance_t p_instance) {
    auto& state = fake();
    state.note("recv_get_web_control(" + state.receiver(p_instance, "recv_get_web_control") + ")");
    const std::lock_guard guard(state.mutex);
    if (!state.hasWeb) {
        return nullptr;
    }
    state.strings.push_back(std::make_unique<std::string>(state.web));
    return state.strings.back()->c_str();
}

void QIVOlib_recv_get_queue(QIVOlib_recv_instance_t p_instance, QIVOlib_recv_queue_t* p_queue) {
    auto& state = fake();
    state.note("recv_get_queue(" + state.receiver(p_instance, "recv_get_queue") + ")");
    const std::lock_guard guard(state.mutex);
    *p_queue = state.queue;
}

bool QIVOlib_recv_ptz_is_supported(QIVOlib_recv_instance_t p_instance) {
    auto& state = fake();
    state.note("recv_ptz_is_supported(" + state.receiver(p_instance, "recv_ptz_is_supported") + ")");
    const std::lock_guard guard(state.mutex);
    return state.ptz;
}

bool QIVOlib_recv_ptz_zoom_speed(QIVOlib_recv_instance_t p_instance, float zoom_speed) {
    auto& state = fake();
    state.note("recv_ptz_zoom_speed(" + state.receiver(p_instance, "recv_ptz_zoom_speed") + ", " + number(zoom_speed) +
               ")");
    return true;
}

bool QIVOlib_recv_ptz_pan_tilt_speed(QIVOlib_recv_instance_t p_instance, float pan_speed, float tilt_speed) {
    auto& state = fake();
    state.note("recv_ptz_pan_tilt_speed(" + state.receiver(p_instance, "recv_ptz_pan_tilt_speed") + ", " +
               number(pan_speed) + ", " + number(tilt_speed) + ")");
    return true;
}

bool QIVOlib_recv_ptz_auto_focus(QIVOlib_recv_instance_t p_instance) {
    auto& state = fake();
    state.note("recv_ptz_auto_focus(" + state.receiver(p_instance, "recv_ptz_auto_focus") + ")");
    return true;
}

bool QIVOlib_recv_ptz_focus(QIVOlib_recv_instance_t p_instance, float focus_value) {
    auto& state = fake();
    state.note("recv_ptz_focus(" + state.receiver(p_instance, "recv_ptz_focus") + ", " + number(focus_value) + ")");
    const std::lock_guard guard(state.mutex);
    state.focus = focus_value;
    return true;
}

bool QIVOlib_recv_ptz_store_preset(QIVOlib_recv_instance_t p_instance, int32_t preset_no) {
    auto& state = fake();
    state.note("recv_ptz_store_preset(" + state.receiver(p_instance, "recv_ptz_store_preset") + ", " +
               std::to_string(preset_no) + ")");
    return true;
}

bool QIVOlib_recv_ptz_recall_preset(QIVOlib_recv_instance_t p_instance, int32_t preset_no, float speed) {
    auto& state = fake();
    state.note("recv_ptz_recall_preset(" + state.receiver(p_instance, "recv_ptz_recall_preset") + ", " +
               std::to_string(preset_no) + ", " + number(speed) + ")");
    return true;
}

} // extern "C"
