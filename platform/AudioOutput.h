#pragma once

#include "platform/AudioQueue.h"

#include <chrono>
#include <cstddef>
#include <memory>
#include <mutex>
#include <string>

namespace qivo {

/// How sound systems show the stream to the user.
constexpr const char* kAudioApplicationName = "QIVO Viewer";
constexpr const char* kAudioStreamName = "Source";
constexpr const char* kAudioStreamRole = "video";

/// Where a device's thread gets its sound.
class AudioSource {
  public:
    virtual ~AudioSource() = default;
    /// Fills `out` with that many floats, whole frames, with silence where there is nothing to play. Never allocates,
    /// waits or fails. One thread at a time, any.
    virtual void pull(float* out, std::size_t floats) noexcept = 0;
    /// Something has changed: the device's state, or the driver's clock by leaps. Any thread; never waits.
    virtual void stateChanged() noexcept = 0;
};

/// A device that is open or on its way to be. Destroying it closes it in the background without waiting; the source
/// may be pulled until that is done, for as long as a hung sound server takes.
class AudioOutput {
  public:
    enum class State {
        Opening,
        Running,
        Failed, ///< it could not be opened, or is gone; it does not come back
        Absent  ///< failed, since nothing is there that the driver could have asked, or that lets itself be asked
    };
    virtual ~AudioOutput() = default;
    /// Thread: the owner's.
    virtual State state() = 0;
    /// For the log: what it plays to while `state` is Running, and why it does not once that has told a failure.
    /// Thread: the owner's.
    virtual std::string description() = 0;
};

/// A way to reach devices, with the clock that goes with it.
///
/// Thread: those of `AudioQueue`'s owner.
class AudioOutputDriver {
  public:
    virtual ~AudioOutputDriver() = default;
    /// Begins to open the default device and returns at once. Answers 0, or a status if it cannot even be tried; then
    /// `output` is left alone.
    virtual int open(const AudioStreamBasicDescription& format, std::shared_ptr<AudioSource> source,
                     std::unique_ptr<AudioOutput>& output) = 0;
    /// Time that never goes back, from any origin.
    virtual std::chrono::nanoseconds now() const = 0;

    /// Writes a line to the system log, unless it is the same as the last one: attempts are made again and again, and a
    /// queue follows another.
    void tell(const std::string& line);

  private:
    std::mutex m_mutex; // protects m_told
    std::string m_told;
};

/// The driver that queues use from now on; null is the default, this machine's devices. Queues that exist keep theirs.
void setAudioOutputDriver(std::shared_ptr<AudioOutputDriver> driver);
std::shared_ptr<AudioOutputDriver> audioOutputDriver();

} // namespace qivo
