#include "platform/NullAudioOutput.h"

#include <algorithm>
#include <atomic>
#include <cmath>
#include <condition_variable>
#include <mutex>
#include <thread>
#include <utility>

namespace qivo {

using std::chrono::nanoseconds;

namespace {

std::size_t floatsIn(nanoseconds time, const AudioStreamBasicDescription& format) {
    const double seconds = std::chrono::duration<double>(time).count();
    return static_cast<std::size_t>(std::llround(seconds * format.mSampleRate)) * format.mChannelsPerFrame;
}

/// What was pulled, with room for all of it from the start, so that recording allocates nothing.
struct Recording {
    std::vector<float> floats;
    std::size_t used = 0;
};

/// A device, driven one step at a time.
struct Device {
    AudioStreamBasicDescription format;
    std::shared_ptr<AudioSource> source;
    NullAudioDriver::Options options;
    bool opens = true;
    nanoseconds openAt{};
    nanoseconds nextPull{};
    bool hung = false;
    std::atomic<AudioOutput::State> state = AudioOutput::State::Opening;
    std::vector<float> buffer; // one period
    std::size_t held = 0;      // floats pulled and not heard yet
};

} // namespace

struct NullAudioDriver::State {
    mutable std::mutex mutex; // protects everything below
    std::condition_variable changed;
    Options options;
    nanoseconds now{};
    std::shared_ptr<Device> device;    // the newest
    std::weak_ptr<AudioSource> source; // its source, also when it is closed
    Recording recording;
    int attempts = 0;
    int outputs = 0;
    void (*probe)(bool after) = nullptr;
    bool stepping = false; // the device's thread has a step to do
    bool quit = false;
    std::thread thread;

    void run();
    void step(Device& device);
    void pull(Device& device);
};

void NullAudioDriver::State::run() {
    std::unique_lock lock(mutex);
    while (true) {
        changed.wait(lock, [this] { return stepping || quit; });
        if (quit) {
            return;
        }
        if (device) {
            step(*device);
        }
        stepping = false;
        changed.notify_all();
    }
}

void NullAudioDriver::State::step(Device& current) {
    if (current.state == AudioOutput::State::Opening && now >= current.openAt) {
        const auto failed = current.options.absent ? AudioOutput::State::Absent : AudioOutput::State::Failed;
        current.state = current.opens ? AudioOutput::State::Running : failed;
        current.nextPull = now + current.options.period * current.options.burst;
        for (nanoseconds filled{}; current.opens && filled < current.options.latency;
             filled += current.options.period) {
            pull(current);
            current.held += current.buffer.size();
        }
    }
    while (current.state == AudioOutput::State::Running && !current.hung && now >= current.nextPull) {
        for (int i = 0; i < current.options.burst; ++i) {
            pull(current);
        }
        current.nextPull += current.options.period * current.options.burst;
    }
}

void NullAudioDriver::State::pull(Device& current) {
    if (probe != nullptr) {
        probe(false);
    }
    current.source->pull(current.buffer.data(), current.buffer.size());
    if (probe != nullptr) {
        probe(true);
    }
    const std::size_t room = recording.floats.size() - recording.used;
    const std::size_t kept = std::min(room, current.buffer.size());
    std::copy_n(current.buffer.data(), kept, recording.floats.data() + recording.used);
    recording.used += kept;
}

namespace {

class NullAudioOutput : public AudioOutput {
  public:
    NullAudioOutput(std::shared_ptr<NullAudioDriver::State> driver, std::shared_ptr<Device> device)
        : m_driver(std::move(driver)), m_device(std::move(device)) {
        const std::lock_guard guard(m_driver->mutex);
        ++m_driver->outputs;
    }
    ~NullAudioOutput() override {
        const std::lock_guard guard(m_driver->mutex);
        --m_driver->outputs;
        if (m_driver->device == m_device) {
            m_driver->device.reset();
        }
    }
    NullAudioOutput(const NullAudioOutput&) = delete;
    NullAudioOutput& operator=(const NullAudioOutput&) = delete;

    State state() override { return m_device->state; }
    std::string description() override { return "a stand-in for a device"; }

  private:
    const std::shared_ptr<NullAudioDriver::State> m_driver;
    const std::shared_ptr<Device> m_device;
};

} // namespace

NullAudioDriver::NullAudioDriver() : NullAudioDriver(Options()) {}

NullAudioDriver::NullAudioDriver(const Options& options) : m_state(std::make_shared<State>()) {
    m_state->options = options;
    m_state->thread = std::thread([state = m_state.get()] { state->run(); });
}

NullAudioDriver::~NullAudioDriver() {
    {
        const std::lock_guard guard(m_state->mutex);
        m_state->quit = true;
        m_state->changed.notify_all();
    }
    m_state->thread.join();
}

int NullAudioDriver::open(const AudioStreamBasicDescription& format, std::shared_ptr<AudioSource> source,
                          std::unique_ptr<AudioOutput>& output) {
    auto device = std::make_shared<Device>();
    {
        const std::lock_guard guard(m_state->mutex);
        ++m_state->attempts;
        Options& options = m_state->options;
        if (options.status != 0) {
            return options.status;
        }
        device->format = format;
        device->source = std::move(source);
        device->options = options;
        device->opens = options.failingOpens == 0;
        options.failingOpens -= options.failingOpens > 0 ? 1 : 0;
        device->openAt = m_state->now + options.openTime;
        device->buffer.resize(floatsIn(options.period, format));
        m_state->recording.floats.resize(floatsIn(options.recording, format));
        m_state->device = device;
        m_state->source = device->source;
    }
    output = std::make_unique<NullAudioOutput>(m_state, std::move(device));
    return 0;
}

nanoseconds NullAudioDriver::now() const {
    const std::lock_guard guard(m_state->mutex);
    return m_state->now;
}

void NullAudioDriver::setOptions(const Options& options) {
    const std::lock_guard guard(m_state->mutex);
    m_state->options = options;
}

void NullAudioDriver::advance(nanoseconds time) {
    std::unique_lock lock(m_state->mutex);
    m_state->now += time;
    m_state->stepping = true;
    m_state->changed.notify_all();
    m_state->changed.wait(lock, [this] { return !m_state->stepping; });
    if (const auto source = m_state->source.lock()) {
        source->stateChanged();
    }
}

void NullAudioDriver::unplug() {
    const std::lock_guard guard(m_state->mutex);
    if (m_state->device) {
        m_state->device->state = AudioOutput::State::Failed;
        m_state->device->source->stateChanged();
    }
}

void NullAudioDriver::setHung(bool hung) {
    const std::lock_guard guard(m_state->mutex);
    if (m_state->device) {
        m_state->device->hung = hung;
        m_state->device->nextPull = m_state->now + m_state->device->options.period * m_state->device->options.burst;
    }
}

std::vector<float> NullAudioDriver::heard() const {
    const std::lock_guard guard(m_state->mutex);
    const std::size_t held = m_state->device ? m_state->device->held : 0;
    const std::size_t played = m_state->recording.used - std::min(held, m_state->recording.used);
    return {m_state->recording.floats.begin(), m_state->recording.floats.begin() + static_cast<std::ptrdiff_t>(played)};
}

void NullAudioDriver::forgetHeard() {
    const std::lock_guard guard(m_state->mutex);
    m_state->recording.used = m_state->device ? std::min(m_state->device->held, m_state->recording.used) : 0;
}

int NullAudioDriver::attempts() const {
    const std::lock_guard guard(m_state->mutex);
    return m_state->attempts;
}

int NullAudioDriver::outputs() const {
    const std::lock_guard guard(m_state->mutex);
    return m_state->outputs;
}

void NullAudioDriver::setProbe(void (*probe)(bool after)) {
    const std::lock_guard guard(m_state->mutex);
    m_state->probe = probe;
}

} // namespace qivo
