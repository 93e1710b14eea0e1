#pragma once

#include "runtime/Sound.h"

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <vector>

namespace qivo::runtime {

/// Makes frames of kJoined to kLongest out of sound that comes in pieces of any length: short pieces are joined, long
/// ones are divided. A frame never spans a gap or a change of format; what is left before one may be as short as
/// kShortest.
///
/// Samples that are no numbers become silence, and others are held within plus and minus kLoudest.
///
/// Thread: one at a time.
class SoundCutter {
  public:
    static constexpr std::chrono::milliseconds kShortest{5};
    static constexpr std::chrono::milliseconds kLongest{33};
    /// What pieces are joined to and divided into: 1024 samples at 48000 Hz. A listener keeps three frames on their way
    /// to the device, the first of them all but played, and a device may take 2048 at a time. Longer ones would be
    /// latency without a use.
    static constexpr std::chrono::microseconds kJoined{21333};
    /// A piece that begins this much off the end of the last one comes after a gap.
    static constexpr std::chrono::milliseconds kGap{20};
    static constexpr float kLoudest = 16.0F;

    using Emit = std::function<void(std::unique_ptr<Sound>)>;

    struct Piece {
        SoundFormat format;                  ///< one that is received
        const float* samples = nullptr;      ///< interleaved
        std::size_t count = 0;               ///< in each channel
        std::int64_t timecode = 0;           ///< of the first sample in the stream, in units of 100 ns
        std::int64_t arrived = 0;            ///< in units of 100 ns since the Unix epoch
        bool afterGap = false;               ///< something is missing before it
        std::optional<std::int64_t> taken{}; ///< when the first sample was, by the sender's clock; frames show it
    };

    explicit SoundCutter(Emit emit) : m_emit(std::move(emit)) {}

    void add(const Piece& piece);
    /// Ends what was begun: it becomes a frame if it is long enough for one, and is dropped otherwise.
    void flush();

  private:
    bool continues(const Piece& piece) const;
    std::size_t samplesIn(std::chrono::microseconds time) const;
    std::size_t pending() const;
    std::int64_t unitsOf(std::size_t samples) const;
    void drop(std::size_t count, const Piece& piece);
    void emit(std::size_t first, std::size_t count);

    const Emit m_emit;
    SoundFormat m_format;
    std::vector<float> m_pending; // interleaved
    std::int64_t m_timecode = 0;  // of the first sample that is pending, here and below
    std::optional<std::int64_t> m_taken;
    std::int64_t m_arrived = 0;
};

} // namespace qivo::runtime
