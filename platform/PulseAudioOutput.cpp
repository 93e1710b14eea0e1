#include "platform/PulseAudioOutput.h"

#include <pulse/pulseaudio.h>

#include <algorithm>
#include <atomic>
#include <condition_variable>
#include <mutex>
#include <system_error>
#include <thread>
#include <utility>

namespace qivo {
namespace {

/// A thread looks at least so often whether the process ends.
constexpr std::chrono::microseconds kLongestTurn = std::chrono::milliseconds(250);
constexpr std::chrono::seconds kTimeToClose{1};

template <auto Free>
struct Release {
    template <class T>
    void operator()(T* object) const {
        Free(object);
    }
};
using Loop = std::unique_ptr<pa_mainloop, Release<pa_mainloop_free>>;
using Context = std::unique_ptr<pa_context, Release<pa_context_unref>>;
using Stream = std::unique_ptr<pa_stream, Release<pa_stream_unref>>;
using Properties = std::unique_ptr<pa_proplist, Release<pa_proplist_free>>;

pa_sample_spec sampleSpec(const AudioStreamBasicDescription& format) {
    return {PA_SAMPLE_FLOAT32NE, static_cast<std::uint32_t>(format.mSampleRate),
            static_cast<std::uint8_t>(format.mChannelsPerFrame)};
}

/// Counts the threads of all outputs, so that the end of the process can wait for them.
class Threads {
  public:
    static const std::shared_ptr<Threads>& instance() {
        static const Keeper keeper;
        return keeper.threads;
    }

    bool ending() const { return m_ending; }
    void begin() {
        const std::lock_guard guard(m_mutex);
        ++m_running;
    }
    void end() {
        const std::lock_guard guard(m_mutex);
        --m_running;
        m_changed.notify_all();
    }

  private:
    struct Keeper {
        Keeper() = default;
        ~Keeper() { threads->endAll(); }
        Keeper(const Keeper&) = delete;
        Keeper& operator=(const Keeper&) = delete;

        const std::shared_ptr<Threads> threads = std::make_shared<Threads>();
    };

    void endAll() {
        m_ending = true;
        std::unique_lock lock(m_mutex);
        m_changed.wait_for(lock, kTimeToClose, [this] { return m_running == 0; });
    }

    std::atomic<bool> m_ending = false;
    std::mutex m_mutex; // protects m_running
    std::condition_variable m_changed;
    int m_running = 0;
};

/// A stream, shared by the output that stands for it and the thread that runs it.
class Device {
  public:
    Device(const AudioStreamBasicDescription& format, std::shared_ptr<AudioSource> source)
        : m_spec(sampleSpec(format)), m_source(std::move(source)), m_loop(pa_mainloop_new()) {}

    // --- Owner.
    bool usable() const { return m_loop != nullptr; }
    AudioOutput::State state() const { return m_state; }
    std::string description() const {
        const std::string reason = std::string(" (") + pa_strerror(m_error) + ")";
        switch (m_state) {
        case AudioOutput::State::Absent:
            return "no sound server" + reason;
        case AudioOutput::State::Failed:
            return "no stream of the sound server" + reason;
        default:
            return "the sound server";
        }
    }
    void close() {
        m_unwanted = true;
        pa_mainloop_wakeup(m_loop.get());
    }

    // --- Its thread.
    void run(const Threads& threads) {
        if (connect()) {
            while (isOpen() && !m_unwanted && !threads.ending() && turn()) {
            }
        }
        if (isOpen()) {
            fail(PA_ERR_INTERNAL);
        }
        disconnect();
    }

  private:
    bool isOpen() const { return m_state == AudioOutput::State::Opening || m_state == AudioOutput::State::Running; }

    void become(AudioOutput::State state) {
        m_state = state;
        m_source->stateChanged();
    }

    /// A server that was never ready might as well not be there: none, or one that denies access or does not answer.
    void fail(int error) {
        m_error = error;
        become(m_stream ? AudioOutput::State::Failed : AudioOutput::State::Absent);
    }

    bool turn() {
        return pa_mainloop_prepare(m_loop.get(), static_cast<int>(kLongestTurn.count())) >= 0 &&
               pa_mainloop_poll(m_loop.get()) >= 0 && pa_mainloop_dispatch(m_loop.get()) >= 0;
    }

    bool connect() {
        const Properties properties(pa_proplist_new());
        pa_proplist_sets(properties.get(), PA_PROP_MEDIA_ROLE, kAudioStreamRole);
        m_context.reset(
            pa_context_new_with_proplist(pa_mainloop_get_api(m_loop.get()), kAudioApplicationName, properties.get()));
        if (!m_context) {
            return false;
        }
        const auto changed = [](pa_context*, void* device) { static_cast<Device*>(device)->contextChanged(); };
        pa_context_set_state_callback(m_context.get(), changed, this);
        if (pa_context_connect(m_context.get(), nullptr, PA_CONTEXT_NOAUTOSPAWN, nullptr) < 0) {
            contextChanged();
        }
        return true;
    }

    void contextChanged() {
        switch (pa_context_get_state(m_context.get())) {
        case PA_CONTEXT_READY:
            if (!play()) {
                m_error = pa_context_errno(m_context.get());
                become(AudioOutput::State::Failed);
            }
            break;
        case PA_CONTEXT_FAILED:
        case PA_CONTEXT_TERMINATED:
            if (isOpen()) {
                fail(pa_context_errno(m_context.get()));
            }
            break;
        default:
            break;
        }
    }

    bool play() {
        pa_channel_map map;
        pa_channel_map_init_extend(&map, m_spec.channels, PA_CHANNEL_MAP_WAVEEX);
        m_stream.reset(pa_stream_new(m_context.get(), kAudioStreamName, &m_spec, &map));
        if (!m_stream) {
            return false;
        }
        const auto changed = [](pa_stream*, void* device) { static_cast<Device*>(device)->streamChanged(); };
        pa_stream_set_state_callback(m_stream.get(), changed, this);
        const auto write = [](pa_stream*, std::size_t bytes, void* device) {
            static_cast<Device*>(device)->write(bytes);
        };
        pa_stream_set_write_callback(m_stream.get(), write, this);
        constexpr auto kServersChoice = static_cast<std::uint32_t>(-1);
        const pa_buffer_attr buffer{kServersChoice, bytesIn(PulseAudioDriver::kLatency), kServersChoice,
                                    bytesIn(PulseAudioDriver::kLeastRequest), kServersChoice};
        return pa_stream_connect_playback(m_stream.get(), nullptr, &buffer, PA_STREAM_ADJUST_LATENCY, nullptr,
                                          nullptr) >= 0;
    }

    std::uint32_t bytesIn(std::chrono::microseconds time) const {
        return static_cast<std::uint32_t>(pa_usec_to_bytes(static_cast<pa_usec_t>(time.count()), &m_spec));
    }

    void streamChanged() {
        const pa_stream_state_t state = pa_stream_get_state(m_stream.get());
        if (state == PA_STREAM_READY) {
            become(AudioOutput::State::Running);
        } else if (!PA_STREAM_IS_GOOD(state) && isOpen()) {
            fail(pa_context_errno(m_context.get()));
        }
    }

    /// Answers the server's request at once and in full, so that it never holds more or less than it should.
    void write(std::size_t bytes) {
        while (bytes > 0) {
            void* memory = nullptr;
            std::size_t size = bytes;
            if (pa_stream_begin_write(m_stream.get(), &memory, &size) < 0 || memory == nullptr || size == 0) {
                return;
            }
            size = std::min(size, bytes);
            m_source->pull(static_cast<float*>(memory), size / sizeof(float));
            if (pa_stream_write(m_stream.get(), memory, size, nullptr, 0, PA_SEEK_RELATIVE) < 0) {
                return;
            }
            bytes -= size;
        }
    }

    void disconnect() {
        if (m_stream) {
            pa_stream_set_state_callback(m_stream.get(), nullptr, nullptr);
            pa_stream_set_write_callback(m_stream.get(), nullptr, nullptr);
            pa_stream_disconnect(m_stream.get());
            m_stream.reset();
        }
        if (m_context) {
            pa_context_set_state_callback(m_context.get(), nullptr, nullptr);
            pa_context_disconnect(m_context.get());
            m_context.reset();
        }
    }

    const pa_sample_spec m_spec;
    const std::shared_ptr<AudioSource> m_source;
    const Loop m_loop; // its thread's, save for waking it up
    std::atomic<AudioOutput::State> m_state = AudioOutput::State::Opening;
    std::atomic<int> m_error = PA_OK; // set before the state
    std::atomic<bool> m_unwanted = false;
    // Its thread only.
    Context m_context;
    Stream m_stream;
};

class PulseAudioOutput : public AudioOutput {
  public:
    explicit PulseAudioOutput(std::shared_ptr<Device> device) : m_device(std::move(device)) {}
    ~PulseAudioOutput() override { m_device->close(); }
    PulseAudioOutput(const PulseAudioOutput&) = delete;
    PulseAudioOutput& operator=(const PulseAudioOutput&) = delete;

    State state() override { return m_device->state(); }
    std::string description() override { return m_device->description(); }

  private:
    const std::shared_ptr<Device> m_device;
};

/// False if no thread can be had.
bool startThread(const std::shared_ptr<Device>& device) {
    const std::shared_ptr<Threads>& threads = Threads::instance();
    threads->begin();
    try {
        std::thread([device = device, threads]() mutable {
            device->run(*threads);
            device.reset();
            threads->end();
        }).detach();
    } catch (const std::system_error&) {
        threads->end();
        return false;
    }
    return true;
}

} // namespace

int PulseAudioDriver::open(const AudioStreamBasicDescription& format, std::shared_ptr<AudioSource> source,
                           std::unique_ptr<AudioOutput>& output) {
    const pa_sample_spec spec = sampleSpec(format);
    if (pa_sample_spec_valid(&spec) == 0) {
        return kAudioQueueErrFormat;
    }
    auto device = std::make_shared<Device>(format, std::move(source));
    if (!device->usable() || !startThread(device)) {
        return kAudioQueueErrResources;
    }
    output = std::make_unique<PulseAudioOutput>(std::move(device));
    return kAudioQueueOk;
}

std::chrono::nanoseconds PulseAudioDriver::now() const {
    return std::chrono::steady_clock::now().time_since_epoch();
}

} // namespace qivo
