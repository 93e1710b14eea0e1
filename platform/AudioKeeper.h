#pragma once

#include "platform/AudioDrain.h"
#include "platform/AudioOutput.h"

#include <chrono>
#include <cstdint>
#include <memory>
#include <string>

namespace qivo {

/// Keeps a drain flowing: into a device where there is one, by the clock where there is none, and looks for a device
/// again whenever it has lost it. Never waits; the owner calls `service` now and then. The system log gets a line
/// whenever it changes whether and where sound is heard.
///
/// Thread: the owner's.
class AudioKeeper {
  public:
    /// A device that has not pulled for so long is given up. Time in which the owner was halted, too, hardly counts.
    static constexpr std::chrono::milliseconds kStall{1000};
    /// Pauses between attempts to open a device double from the first to the longest.
    static constexpr std::chrono::milliseconds kFirstRetry{250};
    static constexpr std::chrono::milliseconds kLongestRetry{4000};
    /// A device that has played for so long is sound: the next pause is the first again.
    static constexpr std::chrono::milliseconds kStable{5000};
    /// By the clock, at most so much is drained at once; a longer halt of the owner's thread is not made up for.
    static constexpr std::chrono::milliseconds kLongestCatchUp{200};
    /// How often the owner calls `service` while the clock drains, and while a device does.
    static constexpr std::chrono::milliseconds kClockInterval{20};
    static constexpr std::chrono::milliseconds kWatchInterval{250};

    AudioKeeper(const AudioStreamBasicDescription& format, std::shared_ptr<AudioDrain> drain,
                std::shared_ptr<AudioOutputDriver> driver);
    ~AudioKeeper();
    AudioKeeper(const AudioKeeper&) = delete;
    AudioKeeper& operator=(const AudioKeeper&) = delete;

    /// Begins. Answers 0, or the status of a driver that cannot even try; then nothing flows.
    int start();
    /// From its return on nothing is drained.
    void stop();
    bool started() const { return m_phase != Phase::Stopped; }
    void service();
    /// When to call `service` next at the latest; sooner after each signal of the drain.
    std::chrono::milliseconds interval() const;

  private:
    enum class Phase { Stopped, Opening, Playing, Waiting };

    int open();
    void close();
    void play(std::chrono::nanoseconds now);
    void watch(std::chrono::nanoseconds now);
    void lose(std::chrono::nanoseconds now, const std::string& reason);
    void drainByClock(std::chrono::nanoseconds now);

    const AudioStreamBasicDescription m_format;
    const std::shared_ptr<AudioDrain> m_drain;
    const std::shared_ptr<AudioOutputDriver> m_driver;
    std::shared_ptr<AudioTap> m_tap; ///< the newest; while none is open, the last one, through which a driver may tell
    std::unique_ptr<AudioOutput> m_output;
    Phase m_phase = Phase::Stopped;
    std::chrono::nanoseconds m_drainedTo{};   // Opening, Waiting: what came before has been drained
    std::chrono::nanoseconds m_playingFrom{}; // Playing
    std::chrono::nanoseconds m_watchedAt{};   // Playing
    std::chrono::nanoseconds m_stalledFor{};  // Playing: since m_pulls was seen to change
    std::uint64_t m_pulls = 0;
    std::chrono::nanoseconds m_retryAt{}; // Waiting
    std::chrono::nanoseconds m_retryPause = kFirstRetry;
};

} // namespace qivo
