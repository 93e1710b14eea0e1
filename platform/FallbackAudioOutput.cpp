#include "platform/FallbackAudioOutput.h"

#include <algorithm>
#include <atomic>
#include <string>
#include <utility>

namespace qivo {

struct FallbackAudioDriver::Drivers {
    Drivers(std::shared_ptr<AudioOutputDriver> first, std::shared_ptr<AudioOutputDriver> second)
        : preferred(std::move(first)), fallback(std::move(second)) {}

    const std::shared_ptr<AudioOutputDriver> preferred;
    const std::shared_ptr<AudioOutputDriver> fallback;
    std::atomic<bool> preferredIsThere = false; // has been once
    std::atomic<bool> fallbackPlayed = false;
};

namespace {

/// What the preferred driver plays while it is only looked for.
class Silence : public AudioSource {
  public:
    void pull(float* out, std::size_t floats) noexcept override { std::fill_n(out, floats, 0.0F); }
    void stateChanged() noexcept override {}
};

class FallbackAudioOutput : public AudioOutput {
  public:
    FallbackAudioOutput(std::shared_ptr<FallbackAudioDriver::Drivers> drivers,
                        const AudioStreamBasicDescription& format, std::shared_ptr<AudioSource> source)
        : m_drivers(std::move(drivers)), m_format(format), m_source(std::move(source)) {}

    int open() { return m_drivers->preferred->open(m_format, m_source, m_output); }

    State state() override {
        if (m_onFallback) {
            look();
        } else {
            judge(m_output->state());
        }
        return m_failed ? State::Failed : m_output->state();
    }

    std::string description() override {
        if (m_found) {
            return m_looking->description() + " is there now";
        }
        if (!m_onFallback) {
            return m_output->description();
        }
        return m_failed ? m_why : m_output->description() + "; " + m_why;
    }

  private:
    void judge(State preferred) {
        // One that came without a device while the fallback played is none to wait for.
        const bool failed = preferred == State::Failed;
        if (preferred == State::Running || (failed && !m_drivers->fallbackPlayed)) {
            m_drivers->preferredIsThere = true;
        } else if ((preferred == State::Absent || failed) && !m_drivers->preferredIsThere) {
            m_onFallback = true;
            m_why = m_output->description();
            m_lookAt = m_drivers->preferred->now() + FallbackAudioDriver::kLookInterval;
            m_failed = m_drivers->fallback->open(m_format, m_source, m_output) != 0;
        }
    }

    void look() {
        if (!m_failed && m_output->state() == State::Running) {
            m_drivers->fallbackPlayed = true;
        }
        if (!m_looking && m_drivers->preferred->now() < m_lookAt) {
            return;
        }
        if (!m_looking && m_drivers->preferred->open(m_format, std::make_shared<Silence>(), m_looking) != 0) {
            lookLater();
            return;
        }
        const State found = m_looking->state();
        if (found == State::Running) {
            m_drivers->preferredIsThere = true;
            m_found = true;
            m_failed = true;
        } else if (found != State::Opening) {
            lookLater(); // without a device the preferred driver would take away sound that is heard
        }
    }

    void lookLater() {
        m_looking.reset();
        m_lookAt = m_drivers->preferred->now() + FallbackAudioDriver::kLookInterval;
    }

    const std::shared_ptr<FallbackAudioDriver::Drivers> m_drivers;
    const AudioStreamBasicDescription m_format;
    const std::shared_ptr<AudioSource> m_source;
    std::unique_ptr<AudioOutput> m_output; // the preferred driver's until m_onFallback
    bool m_onFallback = false;
    bool m_failed = false;
    bool m_found = false;                   // by m_looking, which plays
    std::string m_why;                      // m_onFallback: what the preferred driver said
    std::unique_ptr<AudioOutput> m_looking; // while the preferred driver is looked for
    std::chrono::nanoseconds m_lookAt{};    // m_onFallback
};

} // namespace

FallbackAudioDriver::FallbackAudioDriver(std::shared_ptr<AudioOutputDriver> preferred,
                                         std::shared_ptr<AudioOutputDriver> fallback)
    : m_drivers(std::make_shared<Drivers>(std::move(preferred), std::move(fallback))) {}

FallbackAudioDriver::~FallbackAudioDriver() = default;

int FallbackAudioDriver::open(const AudioStreamBasicDescription& format, std::shared_ptr<AudioSource> source,
                              std::unique_ptr<AudioOutput>& output) {
    auto combined = std::make_unique<FallbackAudioOutput>(m_drivers, format, std::move(source));
    const int status = combined->open();
    if (status == 0) {
        output = std::move(combined);
    }
    return status;
}

std::chrono::nanoseconds FallbackAudioDriver::now() const {
    return m_drivers->preferred->now();
}

} // namespace qivo
