#pragma once

#include "platform/AudioOutput.h"

#include <memory>

namespace qivo {

/// One driver where it finds something to play to, another one only where the first finds nothing at all.
///
/// Once the first has found something in this process, the second is never tried again: a sound server that restarts
/// must not find its hardware taken. While the second plays, the first is looked for now and then; when it has a device
/// to play to the output fails, and the next one is the first's. Until then a first that fails leaves the second in its
/// place, also when the output is opened anew.
class FallbackAudioDriver : public AudioOutputDriver {
  public:
    static constexpr std::chrono::seconds kLookInterval{10};

    FallbackAudioDriver(std::shared_ptr<AudioOutputDriver> preferred, std::shared_ptr<AudioOutputDriver> fallback);
    ~FallbackAudioDriver() override;
    FallbackAudioDriver(const FallbackAudioDriver&) = delete;
    FallbackAudioDriver& operator=(const FallbackAudioDriver&) = delete;

    int open(const AudioStreamBasicDescription& format, std::shared_ptr<AudioSource> source,
             std::unique_ptr<AudioOutput>& output) override;
    /// The preferred driver's.
    std::chrono::nanoseconds now() const override;

    struct Drivers;

  private:
    const std::shared_ptr<Drivers> m_drivers;
};

} // namespace qivo
