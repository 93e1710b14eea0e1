#pragma once

#include "tools/publish/Handles.h"
#include "tools/publish/NeededElement.h"
#include "tools/publish/Options.h"

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <vector>

namespace qivo {

/** The form in which sound comes: 32-bit float, interleaved. */
struct SoundFormat {
    int rate = 48000; ///< samples a second
    int channels = 2;

    /** Raw audio caps that say all of it. More than two channels are at no stated places. */
    [[nodiscard]] Caps caps() const;
};

/** What a stream lets be heard. Used by one thread. */
class SoundSource {
  public:
    using Time = std::chrono::steady_clock::time_point;

    virtual ~SoundSource() = default;

    /** The next samples, `count` in each channel, for the time from `begin` on, which is the end of the last ones
     * unless some were missed. Does not wait; where there is nothing it is silence. */
    virtual void fill(float* samples, std::size_t count, Time begin) = 0;

    /** How long before their `begin` what fill() brings was taken; about, where the source cannot know. */
    [[nodiscard]] virtual std::chrono::nanoseconds age() const { return {}; }
};

using MakeSound = std::function<std::unique_ptr<SoundSource>()>;

/** The frequency of a source's tone on one channel, in Hz. A whole number, different for every source and channel that
 *  there can be, and within what a telephone's codec carries. */
[[nodiscard]] int toneFrequency(std::size_t source, int channel);

/** The peak of the tone: 20 dB below the loudest. */
inline constexpr float toneAmplitude = 0.1F;

/** A tone on every channel that goes on without a break from fill to fill. */
class ToneSource final : public SoundSource {
  public:
    ToneSource(SoundFormat format, std::size_t source) : m_format(format), m_source(source) {}

    void fill(float* samples, std::size_t count, Time begin) override;

  private:
    SoundFormat m_format;
    std::size_t m_source;
    std::int64_t m_next = 0; // modulo the rate: after a second every whole frequency begins anew
};

/** The elements that sound of this codec needs. */
[[nodiscard]] std::vector<NeededElement> elementsFor(SoundCodec codec);

/** From raw sound to RTP packets: an appsrc "sound" and a payloader "pay1". */
[[nodiscard]] std::string soundPipeline(SoundCodec codec);

/** Why the codec cannot carry the format, and what to do; empty if it can. */
[[nodiscard]] std::string soundCodecProblem(SoundCodec codec, int rate, int channels);

} // namespace qivo
