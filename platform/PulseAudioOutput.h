#pragma once

#include "platform/AudioOutput.h"

namespace qivo {

/// The default sink of a sound server that speaks PulseAudio's protocol, PulseAudio or PipeWire.
///
/// Which server is the business of its client library; none is ever started. Each output has a thread and a connection
/// of its own, on which everything about it happens: connecting, pulling, closing. Opening takes as long as the server
/// likes. The server moves the stream when the default changes or its sink is unplugged; where no sink is left the
/// output fails. At the end of the process outputs get a second to close.
class PulseAudioDriver : public AudioOutputDriver {
  public:
    /// How much the server and its sink hold together, and the least that the server asks for.
    static constexpr std::chrono::milliseconds kLatency{30};
    static constexpr std::chrono::milliseconds kLeastRequest{5};

    /// Answers 0, Format for a rate that the server cannot take, or Resources.
    int open(const AudioStreamBasicDescription& format, std::shared_ptr<AudioSource> source,
             std::unique_ptr<AudioOutput>& output) override;
    std::chrono::nanoseconds now() const override;
};

} // namespace qivo
