#pragma once

#include "platform/AudioOutput.h"

#include <string>
#include <utility>

namespace qivo {

/// This machine's default device through SDL, for machines without a sound server.
///
/// SDL never speaks to a sound server itself: the thread with which it watches PulseAudio ends the program when the
/// last sink goes (null name in its hot-plug code, as of 2.26). `PulseAudioDriver` does that instead.
///
/// SDL is touched by one thread of this driver alone, since opening and closing may take as long as the sound server
/// likes; the device pulls on another thread, SDL's. While no output exists SDL's audio is shut down, so that the next
/// one looks for servers and devices afresh. SDL's video is never started and its signal handlers never installed. At
/// the end of the process the thread gets a second to close what is open.
class SdlAudioDriver : public AudioOutputDriver {
  public:
    /// What the device asks for at a time; its own buffer is of this size.
    static constexpr int kPeriodInFrames = 480;
    /// How often devices are asked whether they are still there.
    static constexpr std::chrono::milliseconds kPollInterval{250};

    /// The kernel's own interface. In the form of SDL's hint, which it overrides, as it does the environment.
    static constexpr const char* kSystems = "alsa";

    SdlAudioDriver() : SdlAudioDriver(kSystems) {}
    /// SDL has one system at a time in a process: the first of the outputs that exist at once decides.
    explicit SdlAudioDriver(std::string systems) : m_systems(std::move(systems)) {}

    int open(const AudioStreamBasicDescription& format, std::shared_ptr<AudioSource> source,
             std::unique_ptr<AudioOutput>& output) override;
    std::chrono::nanoseconds now() const override;

  private:
    const std::string m_systems;
};

} // namespace qivo
