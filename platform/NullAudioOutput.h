#pragma once

#include "platform/AudioOutput.h"

#include <chrono>
#include <cstdint>
#include <memory>
#include <vector>

namespace qivo {

/// An output without a device: it pulls at the pace of a clock that its user moves on, and keeps what would be heard.
///
/// It pulls on a thread of its own, one step at a time while `advance` waits, so that the order of things is the same
/// in every run.
///
/// Thread: the owner's, as `AudioOutputDriver`.
class NullAudioDriver : public AudioOutputDriver {
  public:
    struct Options {
        std::chrono::nanoseconds period = std::chrono::milliseconds(10); ///< how much is pulled at a time
        int burst = 1;                       ///< how many periods are pulled at once, after as long a pause
        std::chrono::nanoseconds latency{};  ///< how much the device holds: pulled at once when it opens
        std::chrono::nanoseconds openTime{}; ///< how long a device takes to open
        int failingOpens = 0;                ///< so many attempts to open fail; negative: all of them
        bool absent = false;                 ///< those that fail find nothing at all
        int status = 0;                      ///< what `open` answers; other than 0, nothing is even tried
        std::chrono::nanoseconds recording = std::chrono::seconds(60); ///< how much is kept of what is heard
    };
    NullAudioDriver();
    explicit NullAudioDriver(const Options& options);
    ~NullAudioDriver() override;
    NullAudioDriver(const NullAudioDriver&) = delete;
    NullAudioDriver& operator=(const NullAudioDriver&) = delete;

    int open(const AudioStreamBasicDescription& format, std::shared_ptr<AudioSource> source,
             std::unique_ptr<AudioOutput>& output) override;
    std::chrono::nanoseconds now() const override;

    // --- The user's side.
    /// From the next `open` on.
    void setOptions(const Options& options);
    /// Moves the clock on, lets devices open and pull what is due, and tells the sources.
    void advance(std::chrono::nanoseconds time);
    /// The open device is gone.
    void unplug();
    /// The open device stops pulling without a word, or goes on.
    void setHung(bool hung);
    /// Every float that the devices have played by now, interleaved; what they still hold is left out.
    std::vector<float> heard() const;
    void forgetHeard();
    /// How often `open` was called, and how many outputs exist now.
    int attempts() const;
    int outputs() const;
    /// Called on the device's thread before (false) and after (true) each pull.
    void setProbe(void (*probe)(bool after));

    struct State;

  private:
    std::shared_ptr<State> m_state;
};

} // namespace qivo
