#include "platform/AudioKeeper.h"

#include <algorithm>
#include <utility>

namespace qivo {

using std::chrono::nanoseconds;

AudioKeeper::AudioKeeper(const AudioStreamBasicDescription& format, std::shared_ptr<AudioDrain> drain,
                         std::shared_ptr<AudioOutputDriver> driver)
    : m_format(format), m_drain(std::move(drain)), m_driver(std::move(driver)) {}

AudioKeeper::~AudioKeeper() {
    stop();
}

int AudioKeeper::start() {
    m_retryPause = kFirstRetry;
    const int status = open();
    if (status == 0) {
        m_drainedTo = m_driver->now();
    }
    return status;
}

void AudioKeeper::stop() {
    close();
    m_tap.reset();
    m_phase = Phase::Stopped;
}

void AudioKeeper::close() {
    if (m_tap) {
        m_tap->detach();
    }
    m_output.reset();
}

std::chrono::milliseconds AudioKeeper::interval() const {
    return m_phase == Phase::Playing ? kWatchInterval : kClockInterval;
}

int AudioKeeper::open() {
    m_tap = std::make_shared<AudioTap>(m_drain);
    const int status = m_driver->open(m_format, m_tap, m_output);
    if (status != 0) {
        m_tap.reset();
        return status;
    }
    m_phase = Phase::Opening;
    return 0;
}

void AudioKeeper::service() {
    if (m_phase == Phase::Stopped) {
        return;
    }
    const nanoseconds now = m_driver->now();
    if (m_phase != Phase::Playing) {
        drainByClock(now);
    }
    const auto state = m_output ? m_output->state() : AudioOutput::State::Failed;
    if (m_phase == Phase::Waiting) {
        if (now < m_retryAt) {
            return;
        }
        if (const int status = open(); status != 0) {
            lose(now, "status " + std::to_string(status));
        }
    } else if (state == AudioOutput::State::Failed || state == AudioOutput::State::Absent) {
        lose(now, m_output->description());
    } else if (m_phase == Phase::Playing) {
        watch(now);
    } else if (state == AudioOutput::State::Running) {
        play(now);
    }
}

void AudioKeeper::play(nanoseconds now) {
    m_phase = Phase::Playing;
    m_playingFrom = now;
    m_watchedAt = now;
    m_stalledFor = {};
    m_pulls = m_tap->pulls();
    m_tap->attach();
    m_driver->tell("Sound plays through " + m_output->description());
}

void AudioKeeper::watch(nanoseconds now) {
    const nanoseconds watched = std::min<nanoseconds>(now - m_watchedAt, 2 * kWatchInterval);
    m_watchedAt = now;
    const std::uint64_t pulls = m_tap->pulls();
    m_stalledFor = pulls == m_pulls ? m_stalledFor + watched : nanoseconds::zero();
    m_pulls = pulls;
    if (m_stalledFor >= kStall) {
        lose(now, "the device takes nothing any more");
    } else if (now - m_playingFrom >= kStable) {
        m_retryPause = kFirstRetry;
    }
}

void AudioKeeper::lose(nanoseconds now, const std::string& reason) {
    m_driver->tell((m_phase == Phase::Playing ? "Sound has stopped: " : "No sound: ") + reason);
    if (m_phase == Phase::Playing) {
        m_drainedTo = now;
    }
    close();
    m_phase = Phase::Waiting;
    m_retryAt = now + m_retryPause;
    m_retryPause = std::min<nanoseconds>(2 * m_retryPause, kLongestRetry);
}

void AudioKeeper::drainByClock(nanoseconds now) {
    m_drainedTo = std::max<nanoseconds>(m_drainedTo, now - kLongestCatchUp);
    const double framesPerNanosecond = m_format.mSampleRate * 1e-9;
    const auto frames =
        static_cast<std::int64_t>(static_cast<double>((now - m_drainedTo).count()) * framesPerNanosecond);
    if (frames <= 0) {
        return;
    }
    // Only what whole frames account for, so that the fractions add up.
    m_drainedTo += nanoseconds(static_cast<std::int64_t>(static_cast<double>(frames) / framesPerNanosecond));
    m_drain->pull(nullptr, static_cast<std::size_t>(frames) * m_format.mChannelsPerFrame);
}

} // namespace qivo
