#include "tools/publish/Input.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <gst/audio/audio.h>
#include <gst/pbutils/pbutils.h>
#include <optional>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>

namespace qivo {
namespace {

using namespace std::chrono_literals;
using Clock = std::chrono::steady_clock;

// A device or address that failed is tried again after this time.
constexpr auto reopenAfter = 500ms;

// An address that connects but brings no picture for this long is opened anew.
constexpr auto stallLimit = 5s;

// The bus is looked at this often for the order to stop.
constexpr auto busWait = 50ms;

// A loop shorter than this would only cost processor time.
constexpr auto shortestLoop = 40ms;

// On a machine that is too slow for a file, what comes is not said to be older than this.
constexpr auto longestDelay = 250ms;

// What the relayed stream may be late before it is shown, in milliseconds.
constexpr guint relayLatency = 40;

// Microseconds until a relayed stream that sends nothing over UDP is asked for over TCP.
constexpr guint64 udpPatience = 1'000'000;

// Back to the first picture. The sinks do not preroll, so that they do not take the pipeline's time back to 0 either.
bool rewind(GstElement* pipeline) {
    gst_element_set_state(pipeline, GST_STATE_PAUSED);
    if (gst_element_seek_simple(pipeline, GST_FORMAT_TIME, GST_SEEK_FLAG_FLUSH, 0) == FALSE) {
        return false;
    }
    gst_element_set_start_time(pipeline, 0);
    gst_element_set_state(pipeline, GST_STATE_PLAYING);
    return true;
}

bool isRecorded(InputKind kind) {
    return kind == InputKind::file || kind == InputKind::stillPicture;
}

// When what comes out of a sink that keeps to its pipeline's clock was due, however late the thread that brings it is.
// That clock tells the time of the steady one. A sink that was added while the pipeline started may not know yet when
// that was.
Clock::time_point dueTime(GstAppSink* sink, GstSample* sample) {
    const auto now = Clock::now();
    const GstClockTime start = gst_element_get_base_time(GST_ELEMENT(sink));
    const GstClockTime running = gst_segment_to_running_time(gst_sample_get_segment(sample), GST_FORMAT_TIME,
                                                             GST_BUFFER_PTS(gst_sample_get_buffer(sample)));
    if (start == 0 || !GST_CLOCK_TIME_IS_VALID(running)) {
        return now;
    }
    return std::clamp(Clock::time_point(std::chrono::nanoseconds(start + running)), now - longestDelay, now);
}

void onSourceSetup(GstElement*, GstElement* source, gpointer) {
    if (g_object_class_find_property(G_OBJECT_GET_CLASS(source), "drop-on-latency") != nullptr) {
        g_object_set(source, "latency", relayLatency, "drop-on-latency", TRUE, "timeout", udpPatience, nullptr);
    }
}

std::string checkFile(InputPlace& place) {
    const std::string start = "--input \"" + place.location + "\": ";
    struct stat status {};
    if (stat(place.location.c_str(), &status) != 0) {
        return start + std::strerror(errno) + "; check the path";
    }
    if (!S_ISREG(status.st_mode)) {
        return start + "not a file; give a media file, /dev/videoN or an rtsp:// address";
    }
    if (access(place.location.c_str(), R_OK) != 0) {
        return start + std::strerror(errno) + "; make the file readable";
    }
    const Text uri(gst_filename_to_uri(place.location.c_str(), nullptr));
    const Object<GstDiscoverer> discoverer(gst_discoverer_new(10 * GST_SECOND, nullptr));
    if (!uri || !discoverer) {
        return start + "cannot be examined; check the GStreamer installation";
    }
    GError* failure = nullptr;
    const Object<GstDiscovererInfo> info(gst_discoverer_discover_uri(discoverer.get(), uri.get(), &failure));
    const Error error(failure);
    GList* videos = info ? gst_discoverer_info_get_video_streams(info.get()) : nullptr;
    const bool still =
        videos != nullptr && gst_discoverer_video_info_is_image(GST_DISCOVERER_VIDEO_INFO(videos->data)) != FALSE;
    const bool video = videos != nullptr;
    gst_discoverer_stream_info_list_free(videos);
    GList* sounds = info ? gst_discoverer_info_get_audio_streams(info.get()) : nullptr;
    place.sound = sounds != nullptr && !still;
    gst_discoverer_stream_info_list_free(sounds);
    const GstDiscovererResult result = info ? gst_discoverer_info_get_result(info.get()) : GST_DISCOVERER_ERROR;
    if (result == GST_DISCOVERER_MISSING_PLUGINS) {
        return start + "no decoder for it; install the Debian package gstreamer1.0-libav";
    }
    if (result != GST_DISCOVERER_OK && !video) {
        return start + "not a media file that can be read (" + (error ? error->message : "no reason given") + ")";
    }
    if (!video) {
        return start + "holds no video; give a file with pictures in it";
    }
    place.kind = still ? InputKind::stillPicture : InputKind::file;
    return {};
}

std::string checkDevice(const InputPlace& place) {
    const std::string start = "--input \"" + place.location + "\": ";
    struct stat status {};
    if (stat(place.location.c_str(), &status) != 0) {
        return start + std::strerror(errno) + "; check that the capture device is plugged in";
    }
    if (!S_ISCHR(status.st_mode)) {
        return start + "not a capture device; give /dev/videoN";
    }
    if (access(place.location.c_str(), R_OK | W_OK) != 0) {
        return start + std::strerror(errno) + "; add yourself to the group that owns the device, normally video";
    }
    return {};
}

} // namespace

std::string InputPlace::shown() const {
    const std::size_t scheme = location.find("://");
    const std::size_t host = scheme == std::string::npos ? scheme : scheme + 3;
    const std::size_t at =
        kind == InputKind::stream ? location.substr(0, location.find('/', host)).rfind('@') : std::string::npos;
    return at == std::string::npos ? location : location.substr(0, host) + location.substr(at + 1);
}

InputPlace placeOf(const std::string& input) {
    const std::size_t scheme = input.find("://");
    if (scheme != std::string::npos && input.find('/') > scheme) {
        return {InputKind::stream, input, true};
    }
    return {input.rfind("/dev/", 0) == 0 ? InputKind::device : InputKind::file, input, false};
}

std::string inputProblem(InputPlace& place) {
    switch (place.kind) {
    case InputKind::device:
        return checkDevice(place);
    case InputKind::stream:
        return {};
    case InputKind::file:
    case InputKind::stillPicture:
        break;
    }
    return checkFile(place);
}

// A device takes the first that it can do, and of a range what is nearest to the very first. Many a device brings large
// pictures at their full rate only as JPEG.
std::string captureCaps(const PictureFormat& wanted) {
    const std::string size =
        ",width=" + std::to_string(wanted.size.width) + ",height=" + std::to_string(wanted.size.height);
    const std::string rate = std::to_string(wanted.rate.numerator) + "/" + std::to_string(wanted.rate.denominator);
    const std::string exact = ",framerate=" + rate;
    const std::string atLeast = ",framerate=[" + rate + ",2147483647/1]";
    std::string caps;
    for (const std::string& demand : {size + exact, size + atLeast, atLeast, std::string()}) {
        for (const char* kind : {"video/x-raw", "image/jpeg"}) {
            caps += (caps.empty() ? "" : ";") + std::string(kind) + demand;
        }
    }
    // Some bring nothing but what is to be decoded; those have always one of these.
    return caps + ";video/x-h264;video/x-h265;video/mpegts,systemstream=(boolean)true"
                  ";video/x-dv,systemstream=(boolean)true";
}

std::vector<NeededElement> elementsFor(InputKind kind) {
    constexpr const char* base = "gstreamer1.0-plugins-base";
    constexpr const char* good = "gstreamer1.0-plugins-good";
    std::vector<NeededElement> elements{{"videoconvert", base}, {"videoscale", base},   {"videorate", base},
                                        {"appsink", base},      {"decodebin", base},    {"uridecodebin", base},
                                        {"audioconvert", base}, {"audioresample", base}};
    if (kind == InputKind::device) {
        elements.push_back({"v4l2src", good});
        elements.push_back({"jpegdec", good});
    } else if (kind == InputKind::stream) {
        elements.push_back({"rtspsrc", good});
    } else {
        elements.push_back({"imagefreeze", good});
    }
    return elements;
}

/** The pictures of a branch, and in their absence a picture that says so. */
class InputPictureSource final : public PictureSource {
  public:
    InputPictureSource(std::shared_ptr<Input> input, Input::Branch branch, TestPictureLook look)
        : m_input(std::move(input)), m_branch(branch), m_slot(m_input->m_slots[static_cast<int>(branch)]),
          m_look(std::move(look)), m_pacer(m_slot.format.rate, Clock::now()),
          m_patientUntil(Clock::now() + Input::patience) {
        m_look.note = "No picture from " + m_input->m_place.shown();
        m_look.space = m_slot.format.space;
        m_input->watched(m_branch);
    }

    ~InputPictureSource() override { m_input->unwatched(m_branch); }

    Picture next() override {
        std::unique_lock lock(m_input->m_mutex);
        const auto due = m_substitute ? m_pacer.next(Clock::now()) : m_patientUntil;
        m_input->m_changed.wait_until(lock, due, [this] { return m_stopped || m_slot.newest.buffer; });
        if (m_stopped) {
            return {};
        }
        if (m_slot.newest.buffer) {
            m_substitute.reset();
            m_patientUntil = Clock::now() + Input::patience;
            Picture picture = std::move(m_slot.newest);
            picture.taken = std::max(picture.taken, m_earliest);
            return picture;
        }
        lock.unlock();
        if (!m_substitute) {
            m_substitute = std::make_unique<PicturePainter>(m_slot.format, drawTestPicture(m_slot.format, m_look));
        }
        m_earliest = due + 1ms;
        return {m_substitute->paint(due), due};
    }

    void stop() override {
        {
            const std::lock_guard lock(m_input->m_mutex);
            m_stopped = true;
        }
        m_input->m_changed.notify_all();
    }

  private:
    std::shared_ptr<Input> m_input;
    Input::Branch m_branch;
    Input::Slot& m_slot;
    TestPictureLook m_look;
    Pacer m_pacer;
    Clock::time_point m_patientUntil;
    Clock::time_point m_earliest; // a late picture of a file does not go before one that stood in for it
    std::unique_ptr<PicturePainter> m_substitute; // while there is no picture
    bool m_stopped = false;                       // under the input's m_mutex
};

/** The sound of a branch, a little late so that it does not stutter: a decoder brings more at a time than is asked for,
 *  and not in time where the machine is busy. */
class InputSoundSource final : public SoundSource {
  public:
    InputSoundSource(std::shared_ptr<Input> input, Input::Branch branch)
        : m_input(std::move(input)), m_slot(m_input->m_slots[static_cast<int>(branch)]) {
        const std::lock_guard lock(m_input->m_mutex);
        ++m_slot.listeners;
    }

    ~InputSoundSource() override {
        const std::lock_guard lock(m_input->m_mutex);
        --m_slot.listeners;
        if (m_slot.recorded) {
            m_slot.recorded->clear();
        } else {
            m_slot.live->clear();
        }
    }

    void fill(float* samples, std::size_t count, Time begin) override {
        const auto channels = static_cast<std::size_t>(m_input->m_sound->channels);
        const std::lock_guard lock(m_input->m_mutex);
        if (m_slot.recorded) {
            m_slot.recorded->take(samples, count * channels, begin - age());
        } else {
            m_slot.live->take(samples, count * channels);
        }
    }

    [[nodiscard]] std::chrono::nanoseconds age() const override { return SoundCushion::held; }

  private:
    std::shared_ptr<Input> m_input;
    Input::Slot& m_slot;
};

Input::Input(InputPlace place, const PictureFormat& full, const PictureFormat& low, std::optional<SoundFormat> sound,
             Say say)
    : m_place(std::move(place)), m_sound(sound), m_say(std::move(say)) {
    m_slots[0].owner = this;
    m_slots[0].format = full;
    m_slots[1].owner = this;
    m_slots[1].format = low;
    for (Slot& slot : m_slots) {
        if (sound && isRecorded(m_place.kind)) {
            slot.recorded.emplace(*sound);
        } else if (sound) {
            slot.live.emplace(*sound);
        }
    }
}

Input::~Input() = default;

std::unique_ptr<PictureSource> Input::watch(const std::shared_ptr<Input>& input, Branch branch,
                                            const TestPictureLook& look) {
    return std::make_unique<InputPictureSource>(input, branch, look);
}

std::unique_ptr<SoundSource> Input::listen(const std::shared_ptr<Input>& input, Branch branch) {
    return std::make_unique<InputSoundSource>(input, branch);
}

void Input::watched(Branch branch) {
    const std::lock_guard running(m_running);
    {
        const std::lock_guard lock(m_mutex);
        ++m_slots[static_cast<int>(branch)].watchers;
        if (!m_stop) {
            return;
        }
        m_stop = false;
    }
    m_thread = std::thread([this] { run(); });
}

void Input::unwatched(Branch branch) {
    const std::lock_guard running(m_running);
    {
        const std::lock_guard lock(m_mutex);
        Slot& slot = m_slots[static_cast<int>(branch)];
        --slot.watchers;
        slot.newest = {};
        if (m_slots[0].watchers + m_slots[1].watchers > 0) {
            return;
        }
        m_stop = true;
    }
    m_changed.notify_all();
    m_thread.join();
}

bool Input::stopping() {
    const std::lock_guard lock(m_mutex);
    return m_stop;
}

// False when it is time to stop.
bool Input::pauseFor(std::chrono::milliseconds time) {
    std::unique_lock lock(m_mutex);
    return !m_changed.wait_for(lock, time, [this] { return m_stop; });
}

void Input::run() {
    do {
        playOnce();
    } while (pauseFor(reopenAfter));
}

bool Input::stalled(Clock::time_point opened) {
    const std::lock_guard lock(m_mutex);
    return m_place.kind == InputKind::stream && Clock::now() - std::max(opened, m_lastPicture) > stallLimit;
}

// Plays until the input fails, ends for good, or nobody watches any more.
void Input::playOnce() {
    const Object<GstElement> pipeline = build();
    if (!pipeline) {
        return;
    }
    const Object<GstBus> bus(gst_element_get_bus(pipeline.get()));
    const auto opened = Clock::now();
    gst_element_set_state(pipeline.get(), GST_STATE_PLAYING);
    bool going = true;
    while (going && !stopping() && !stalled(opened)) {
        const Message message(
            gst_bus_timed_pop_filtered(bus.get(), std::chrono::nanoseconds(busWait).count(),
                                       static_cast<GstMessageType>(GST_MESSAGE_ERROR | GST_MESSAGE_EOS)));
        going = !message || handle(pipeline.get(), message.get());
    }
    gst_element_set_state(pipeline.get(), GST_STATE_NULL);
}

bool Input::handle(GstElement* pipeline, GstMessage* message) {
    if (GST_MESSAGE_TYPE(message) == GST_MESSAGE_EOS && isRecorded(m_place.kind)) {
        return pauseFor(shortestLoop) && rewind(pipeline);
    }
    if (GST_MESSAGE_TYPE(message) == GST_MESSAGE_ERROR) {
        report(message);
    }
    return false;
}

// A reason is said once, however often the input is tried again, until a picture comes.
void Input::report(GstMessage* message) {
    GError* failure = nullptr;
    gst_message_parse_error(message, &failure, nullptr);
    const Error error(failure);
    const std::string reason = error ? error->message : "no reason given";
    {
        const std::lock_guard lock(m_mutex);
        if (std::exchange(m_reported, reason) == reason) {
            return;
        }
    }
    m_say("no picture from " + m_place.shown() + ": " + reason + " It is tried again.");
}

std::string Input::description() const {
    std::string text = "videoconvert name=entry ! tee name=fork ";
    const bool live = !isRecorded(m_place.kind);
    for (const char* name : {"full", "low"}) {
        text += std::string("fork. ! queue name=") + name +
                "-queue max-size-buffers=2 max-size-bytes=0 max-size-time=0" + (live ? " leaky=downstream" : "") +
                " ! videorate skip-to-first=true ! videoscale ! videoconvert" + " ! appsink name=" + name +
                " max-buffers=1 drop=true async=false sync=" + (live ? "false " : "true ");
    }
    // Sound is linked when it appears; other streams are left unlinked, which their demultiplexer bears.
    const std::string start =
        m_place.kind == InputKind::device
            ? "v4l2src name=in ! capsfilter caps=\"" + captureCaps(m_slots[0].format) + "\" ! decodebin ! "
        : m_place.kind == InputKind::stillPicture ? "uridecodebin name=in ! imagefreeze ! "
                                                  : "uridecodebin name=in ! ";
    return start + text;
}

Object<GstElement> Input::build() {
    GError* failure = nullptr;
    GstElement* parsed = gst_parse_launch(description().c_str(), &failure);
    const Error error(failure);
    Object<GstElement> pipeline(parsed != nullptr ? GST_ELEMENT(gst_object_ref_sink(parsed)) : nullptr);
    if (!pipeline || error) {
        return nullptr;
    }
    const Object<GstClock> clock(gst_system_clock_obtain());
    gst_pipeline_use_clock(GST_PIPELINE(pipeline.get()), clock.get());
    const Object<GstElement> in(gst_bin_get_by_name(GST_BIN(pipeline.get()), "in"));
    if (m_place.kind == InputKind::device) {
        g_object_set(in.get(), "device", m_place.location.c_str(), nullptr);
    } else if (m_place.kind == InputKind::stream) {
        g_object_set(in.get(), "uri", m_place.location.c_str(), nullptr);
        g_signal_connect(in.get(), "source-setup", G_CALLBACK(onSourceSetup), nullptr);
    } else {
        const Text uri(gst_filename_to_uri(m_place.location.c_str(), nullptr));
        g_object_set(in.get(), "uri", uri.get(), nullptr);
    }
    if (m_sound && m_place.sound) {
        g_signal_connect(in.get(), "pad-added", G_CALLBACK(onPadAdded), this);
    }
    connect(pipeline.get(), "full", m_slots[0]);
    connect(pipeline.get(), "low", m_slots[1]);
    return pipeline;
}

void Input::connect(GstElement* pipeline, const char* sinkName, Slot& slot) {
    const Object<GstElement> sink(gst_bin_get_by_name(GST_BIN(pipeline), sinkName));
    gst_app_sink_set_caps(GST_APP_SINK(sink.get()), slot.format.caps().get());
    GstAppSinkCallbacks callbacks{};
    callbacks.new_sample = onSample;
    gst_app_sink_set_callbacks(GST_APP_SINK(sink.get()), &callbacks, &slot, nullptr);
    const Object<GstElement> queue(gst_bin_get_by_name(GST_BIN(pipeline), (std::string(sinkName) + "-queue").c_str()));
    const Object<GstPad> pad(gst_element_get_static_pad(queue.get(), "sink"));
    gst_pad_add_probe(pad.get(), GST_PAD_PROBE_TYPE_BUFFER, onBuffer, &slot, nullptr);
}

// Null if an element is missing. The channels' places matter to the conversion alone.
Object<GstElement> Input::buildSound() const {
    const std::string live = isRecorded(m_place.kind) ? "true" : "false";
    const std::string text = "queue ! audioconvert ! audioresample ! appsink name=sound max-buffers=8 drop=true "
                             "async=false sync=" +
                             live;
    GError* failure = nullptr;
    GstElement* parsed = gst_parse_bin_from_description(text.c_str(), TRUE, &failure);
    const Error error(failure);
    if (parsed == nullptr) {
        return nullptr;
    }
    const Object<GstElement> sink(gst_bin_get_by_name(GST_BIN(parsed), "sound"));
    const Caps caps = m_sound->caps();
    if (m_sound->channels > 1) {
        gst_caps_set_simple(caps.get(), "channel-mask", GST_TYPE_BITMASK,
                            gst_audio_channel_get_fallback_mask(m_sound->channels), nullptr);
    }
    gst_app_sink_set_caps(GST_APP_SINK(sink.get()), caps.get());
    return Object<GstElement>(GST_ELEMENT(gst_object_ref_sink(parsed)));
}

void Input::onPadAdded(GstElement* decoder, GstPad* pad, gpointer data) {
    auto* input = static_cast<Input*>(data);
    const Caps caps(gst_pad_query_caps(pad, nullptr));
    const Object<GstObject> pipeline(gst_object_get_parent(GST_OBJECT(decoder)));
    const bool sound = !gst_caps_is_empty(caps.get()) && !gst_caps_is_any(caps.get()) &&
                       gst_structure_has_name(gst_caps_get_structure(caps.get(), 0), "audio/x-raw") != FALSE;
    const Object<GstElement> taken(gst_bin_get_by_name(GST_BIN(pipeline.get()), "sound"));
    const Object<GstElement> bin = sound && !taken ? input->buildSound() : nullptr;
    if (!bin) {
        return;
    }
    const Object<GstElement> sink(gst_bin_get_by_name(GST_BIN(bin.get()), "sound"));
    GstAppSinkCallbacks callbacks{};
    callbacks.new_sample = onSound;
    gst_app_sink_set_callbacks(GST_APP_SINK(sink.get()), &callbacks, input, nullptr);
    gst_bin_add(GST_BIN(pipeline.get()), bin.get());
    gst_element_sync_state_with_parent(bin.get());
    const Object<GstPad> in(gst_element_get_static_pad(bin.get(), "sink"));
    gst_pad_link(pad, in.get());
}

GstFlowReturn Input::onSound(GstAppSink* sink, gpointer data) {
    auto& input = *static_cast<Input*>(data);
    const Sample sample(gst_app_sink_pull_sample(sink));
    GstBuffer* buffer = sample ? gst_sample_get_buffer(sample.get()) : nullptr;
    GstMapInfo map;
    if (buffer == nullptr || gst_buffer_map(buffer, &map, GST_MAP_READ) == FALSE) {
        return GST_FLOW_EOS;
    }
    const auto* begin = reinterpret_cast<const float*>(map.data);
    const auto due = dueTime(sink, sample.get());
    {
        const std::lock_guard lock(input.m_mutex);
        for (Slot& slot : input.m_slots) {
            if (slot.listeners > 0 && slot.recorded) {
                slot.recorded->add(begin, map.size / sizeof(float), due);
            } else if (slot.listeners > 0) {
                slot.live->add(begin, map.size / sizeof(float));
            }
        }
    }
    gst_buffer_unmap(buffer, &map);
    return GST_FLOW_OK;
}

// A branch that nobody watches costs nothing.
GstPadProbeReturn Input::onBuffer(GstPad*, GstPadProbeInfo*, gpointer data) {
    auto& slot = *static_cast<Slot*>(data);
    const std::lock_guard lock(slot.owner->m_mutex);
    return slot.watchers > 0 ? GST_PAD_PROBE_OK : GST_PAD_PROBE_DROP;
}

GstFlowReturn Input::onSample(GstAppSink* sink, gpointer data) {
    auto& slot = *static_cast<Slot*>(data);
    const Sample sample(gst_app_sink_pull_sample(sink));
    GstBuffer* buffer = sample ? gst_sample_get_buffer(sample.get()) : nullptr;
    if (buffer == nullptr) {
        return GST_FLOW_EOS;
    }
    const auto now = Clock::now();
    const auto taken = isRecorded(slot.owner->m_place.kind) ? dueTime(sink, sample.get()) : now;
    {
        const std::lock_guard lock(slot.owner->m_mutex);
        slot.newest = {Buffer(gst_buffer_ref(buffer)), taken};
        slot.owner->m_lastPicture = now;
        slot.owner->m_reported.clear();
    }
    slot.owner->m_changed.notify_all();
    return GST_FLOW_OK;
}

} // namespace qivo
