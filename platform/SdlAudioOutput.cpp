#include "platform/SdlAudioOutput.h"

#define SDL_MAIN_HANDLED // the program keeps its own main
#include <SDL.h>

#include <algorithm>
#include <atomic>
#include <condition_variable>
#include <mutex>
#include <system_error>
#include <thread>
#include <utility>
#include <vector>

namespace qivo {
namespace {

/// A device between the output that stands for it and the thread that opens and closes it.
struct Device {
    AudioStreamBasicDescription format;
    std::shared_ptr<AudioSource> source;
    std::string systems;
    std::atomic<AudioOutput::State> state = AudioOutput::State::Opening;
    std::atomic<bool> unwanted = false;
    std::string trouble; // written before the state becomes Failed, and read after that
    // Worker only.
    SDL_AudioDeviceID id = 0;
    bool tried = false;
};

/// What the worker and everybody else share. The worker keeps it alive, also past the end of main if SDL hangs.
struct Shared {
    std::mutex mutex; // protects everything below
    std::condition_variable changed;
    std::vector<std::shared_ptr<Device>> added;
    bool news = false; // a device was added or is unwanted
    bool quit = false;
    bool ended = false;
};

void SDLCALL fill(void* source, Uint8* out, int bytes) {
    static_cast<AudioSource*>(source)->pull(reinterpret_cast<float*>(out),
                                            static_cast<std::size_t>(bytes) / sizeof(float));
}

/// The thread that opens, watches and closes devices.
class Worker {
  public:
    explicit Worker(std::shared_ptr<Shared> shared) : m_shared(std::move(shared)) {}

    void run() {
        while (waitForNews()) {
            closeUnwanted();
            for (const auto& device : m_devices) {
                device->tried ? poll(*device) : open(*device);
            }
            if (m_devices.empty()) {
                shutDown();
            }
        }
        for (const auto& device : m_devices) {
            device->unwanted = true;
        }
        closeUnwanted();
        shutDown();
        SDL_TLSCleanup(); // SDL does this for its own threads only
        const std::lock_guard guard(m_shared->mutex);
        m_shared->ended = true;
        m_shared->changed.notify_all();
    }

  private:
    /// False when it is time to end.
    bool waitForNews() {
        std::unique_lock lock(m_shared->mutex);
        const auto news = [this] { return m_shared->news || m_shared->quit; };
        if (m_devices.empty()) {
            m_shared->changed.wait(lock, news);
        } else {
            m_shared->changed.wait_for(lock, SdlAudioDriver::kPollInterval, news);
        }
        m_shared->news = false;
        m_devices.insert(m_devices.end(), m_shared->added.begin(), m_shared->added.end());
        m_shared->added.clear();
        return !m_shared->quit;
    }

    void closeUnwanted() {
        std::erase_if(m_devices, [](const auto& device) {
            if (device->unwanted && device->id != 0) {
                SDL_CloseAudioDevice(device->id);
            }
            return device->unwanted.load();
        });
    }

    static void fail(Device& device, const char* reason) {
        device.trouble = reason;
        become(device, AudioOutput::State::Failed);
    }

    static void become(Device& device, AudioOutput::State state) {
        device.state = state;
        device.source->stateChanged();
    }

    void open(Device& device) {
        device.tried = true;
        // A machine that lists no device is not asked to open one: its libraries would complain at every attempt.
        if (device.unwanted || !startUp(device.systems)) {
            fail(device, SDL_GetError());
            return;
        }
        if (SDL_GetNumAudioDevices(0) == 0) {
            fail(device, "none is there");
            return;
        }
        SDL_AudioSpec wanted{};
        wanted.freq = static_cast<int>(device.format.mSampleRate);
        wanted.format = AUDIO_F32SYS;
        wanted.channels = static_cast<Uint8>(device.format.mChannelsPerFrame);
        wanted.samples = SdlAudioDriver::kPeriodInFrames;
        wanted.callback = fill;
        wanted.userdata = device.source.get();
        device.id = SDL_OpenAudioDevice(nullptr, 0, &wanted, nullptr, 0);
        if (device.id == 0) {
            fail(device, SDL_GetError());
            return;
        }
        SDL_PauseAudioDevice(device.id, 0);
        become(device, AudioOutput::State::Running);
    }

    static void poll(Device& device) {
        if (device.state == AudioOutput::State::Running && SDL_GetAudioDeviceStatus(device.id) == SDL_AUDIO_STOPPED) {
            fail(device, "it is gone");
        }
    }

    bool startUp(const std::string& systems) {
        if (m_started) {
            return true;
        }
        SDL_SetMainReady();
        SDL_SetHintWithPriority(SDL_HINT_AUDIODRIVER, systems.c_str(), SDL_HINT_OVERRIDE);
        SDL_SetHint(SDL_HINT_NO_SIGNAL_HANDLERS, "1");
        SDL_SetHint(SDL_HINT_APP_NAME, kAudioApplicationName);
        SDL_SetHint(SDL_HINT_AUDIO_DEVICE_STREAM_NAME, kAudioStreamName);
        SDL_SetHint(SDL_HINT_AUDIO_DEVICE_STREAM_ROLE, kAudioStreamRole);
        m_started = SDL_InitSubSystem(SDL_INIT_AUDIO) == 0;
        // Nobody reads SDL's events; they would pile up.
        SDL_EventState(SDL_AUDIODEVICEADDED, SDL_IGNORE);
        SDL_EventState(SDL_AUDIODEVICEREMOVED, SDL_IGNORE);
        return m_started;
    }

    void shutDown() {
        if (std::exchange(m_started, false)) {
            SDL_QuitSubSystem(SDL_INIT_AUDIO);
        }
    }

    const std::shared_ptr<Shared> m_shared;
    std::vector<std::shared_ptr<Device>> m_devices;
    bool m_started = false;
};

/// Starts the worker with the first device and ends it with the process.
class Workplace {
  public:
    static Workplace& instance() {
        static Workplace workplace;
        return workplace;
    }

    ~Workplace() {
        if (!m_worker.joinable()) {
            return;
        }
        std::unique_lock lock(m_shared->mutex);
        m_shared->quit = true;
        m_shared->changed.notify_all();
        const bool ended =
            m_shared->changed.wait_for(lock, std::chrono::seconds(1), [this] { return m_shared->ended; });
        lock.unlock();
        ended ? m_worker.join() : m_worker.detach();
    }
    Workplace(const Workplace&) = delete;
    Workplace& operator=(const Workplace&) = delete;

    /// False if no thread can be had.
    bool add(std::shared_ptr<Device> device) {
        if (!m_worker.joinable()) {
            try {
                m_worker = std::thread([shared = m_shared] { Worker(shared).run(); });
            } catch (const std::system_error&) {
                return false;
            }
        }
        {
            const std::lock_guard guard(m_shared->mutex);
            m_shared->added.push_back(std::move(device));
        }
        tell();
        return true;
    }

    /// Wakes the worker. What nobody wants any more while it is busy is not opened at all.
    void tell() {
        const std::lock_guard guard(m_shared->mutex);
        std::erase_if(m_shared->added, [](const auto& device) { return device->unwanted.load(); });
        m_shared->news = true;
        m_shared->changed.notify_all();
    }

  private:
    Workplace() = default;

    const std::shared_ptr<Shared> m_shared = std::make_shared<Shared>();
    std::thread m_worker;
};

class SdlAudioOutput : public AudioOutput {
  public:
    explicit SdlAudioOutput(std::shared_ptr<Device> device) : m_device(std::move(device)) {}
    ~SdlAudioOutput() override {
        m_device->unwanted = true;
        Workplace::instance().tell();
    }
    SdlAudioOutput(const SdlAudioOutput&) = delete;
    SdlAudioOutput& operator=(const SdlAudioOutput&) = delete;

    State state() override { return m_device->state; }
    std::string description() override {
        if (m_device->state == State::Failed) {
            return "no device through SDL (" + m_device->systems + ": " + m_device->trouble + ")";
        }
        return "a device through SDL (" + m_device->systems + ")";
    }

  private:
    const std::shared_ptr<Device> m_device;
};

} // namespace

int SdlAudioDriver::open(const AudioStreamBasicDescription& format, std::shared_ptr<AudioSource> source,
                         std::unique_ptr<AudioOutput>& output) {
    auto device = std::make_shared<Device>();
    device->format = format;
    device->source = std::move(source);
    device->systems = m_systems;
    if (!Workplace::instance().add(device)) {
        return kAudioQueueErrResources;
    }
    output = std::make_unique<SdlAudioOutput>(std::move(device));
    return kAudioQueueOk;
}

std::chrono::nanoseconds SdlAudioDriver::now() const {
    return std::chrono::steady_clock::now().time_since_epoch();
}

} // namespace qivo
