#pragma once

#include <array>
#include <cstdint>

namespace qivo {

/// How many outputs are made side by side, and by which instructions.
enum class ResamplerLanes : std::uint8_t {
    One,     ///< none: all outputs are left to the caller
    Eight,   ///< AVX2
    Sixteen, ///< AVX-512 F
};

/// The most that this processor and its system can do.
[[nodiscard]] ResamplerLanes widestResamplerLanes() noexcept;

/// What the resampler's blocks continue from, in the state between two outputs.
struct ResamplerRun {
    std::array<float, 4> history; ///< the last four samples taken, the oldest first
    const float* src;             ///< next sample to take
    std::int64_t srcLeft;         ///< samples from there to the end
    float* dst;                   ///< slot of the next output
    std::int64_t dstSlots;        ///< slots left, the next one included
    int dstStride;                ///< floats from slot to slot
    float position;               ///< of the next output: from 0 to below 1. Afterwards the last output's plus delta
    float scaling;
    float delta;
};

/// Makes all outputs that one after the other would be made, the same to the bit, until the destination is full or the
/// next output needs the source's last sample or more. Moves src, srcLeft, dst, dstSlots and position on to where the
/// last output leaves them; the history stays as it was. Does nothing where the source is short or the ratio or the
/// position none it can handle. `lanes` must be what the processor can do. The regions must not overlap. What lies
/// between the slots is neither read nor written.
void resampleBlocks(ResamplerRun& run, ResamplerLanes lanes) noexcept;

} // namespace qivo
