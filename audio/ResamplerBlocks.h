#pragma once

#include <cstdint>

namespace qivo {

/// What the resampler's blocks continue from, in the state between two outputs.
struct ResamplerRun {
    const float* src;      ///< next sample to take; at least the last four taken lie directly before it
    std::int64_t srcLeft;  ///< samples from there to the end, 1 or more
    float* dst;            ///< slot of the next output
    std::int64_t dstSlots; ///< slots left, the next one included
    int dstStride;         ///< floats from slot to slot
    float position;        ///< m_output_posn: the last output's position plus delta
    float scaling;
    float delta;
};

/// Produces outputs by eights, the same to the bit as one after the other, as long as source and destination allow the
/// next eight and taking their samples does not use up the source. Moves src, srcLeft, dst, dstSlots and position on;
/// does nothing where the ratio is none it can handle, or on a processor that it was not written for.
/// The regions must not overlap.
void resampleBlocks(ResamplerRun& run) noexcept;

} // namespace qivo
