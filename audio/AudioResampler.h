#pragma once

#include "audio/ResamplerBlocks.h"
#include "audio/SampleCursor.h"

#include <cstddef>
#include <cstdint>

namespace qivo {

/// Converts one channel of float samples from one sample rate to another: a Catmull-Rom spline through the last four
/// source samples, in single precision throughout. The state outlives the call, so that a stream that arrives in frames
/// of any length is converted without seams. At equal rates it is a scaled copy.
///
/// The output runs about two source samples behind the newest sample taken.
///
/// Nothing here allocates, locks, throws or fails. One thread at a time uses an object; two objects may write
/// interleaved channels of one buffer from two threads, since the floats between the strides are never touched.
///
/// What a caller may not do:
/// - pass a stride below 1 (0 divides by zero, a negative one never reaches the end of its region),
/// - pass a region of more than INT32_MAX floats,
/// - let a region hold this object or a cursor. The two regions may overlap each other: the result is that of taking
///   and writing one sample after the other.
///
/// Any rates and samples end every call, as each step takes a source sample or fills a slot: where the ratio is
/// infinite the whole source is taken, where it is 0, negative or NaN none is taken once the position is below 1 and
/// the destination is filled, with NaN where the position is NaN. reset() recovers from each of them.
class AudioResampler {
  public:
    /// Source rate / destination rate, both in Hz, is the step from here on. History and position stay as they are.
    void setSourceSampleRate(float sourceSampleRate, float andDestRate) noexcept;

    /// The next sample starts a new stream. The step becomes 1 too: set the rates again before processing.
    void reset() noexcept;

    /// The most output samples that n source samples can yield: ceil(n / step) + 2. INT_MAX where an int can't hold it,
    /// INT_MIN + 2 likewise below, and 2 where n and the step are both 0 or the step is NaN.
    [[nodiscard]] int getMaxBufferLengthInSamples(int n) const noexcept;

    /// Writes silence into every withStride-th float up to the end of dst. Returns 1. The state stays as it is.
    int processDst(SampleCursor* dst, int withStride) const noexcept;

    /// Resamples until a region is exhausted. Returns 0 if that was the source (supply more), 1 if it was the
    /// destination; a copy at equal rates returns 1 only if source samples remain. A null source position is silence.
    /// Strides count floats.
    int processSrc(SampleCursor* src, SampleCursor* toDst, int withSrcStride, int andWithDstStride) noexcept;

  private:
    friend class AudioResamplerState; // tests read and set the state through it, and choose the lanes

    int process(SampleCursor& src, SampleCursor& dst, int srcStride, int dstStride, ResamplerLanes lanes) noexcept;
    int copy(SampleCursor& src, SampleCursor& dst, int n, std::ptrdiff_t srcStride,
             std::ptrdiff_t dstStride) const noexcept;
    int interpolate(SampleCursor& src, SampleCursor& dst, int srcStride, int dstStride, ResamplerLanes lanes) noexcept;
    bool catchUp(SampleCursor& src, int srcStride) noexcept;
    void interpolateBlocks(SampleCursor& src, SampleCursor& dst, int dstStride, ResamplerLanes lanes) noexcept;
    void take(float sample) noexcept;

    /// Source samples taken into the history since the last reset; -1 before the first. The low two bits name the slot
    /// of the oldest sample, which the next one overwrites. Wraps around.
    std::int32_t m_sample_index = -1;
    /// Ring of the last four source samples taken.
    float m_last_samples[4] = {0.0F, 0.0F, 0.0F, 0.0F};
    /// Position of the next output, in source samples from the second-oldest of the history (0) to the second-newest
    /// (1). At or above 1 between calls: that many samples are to be taken first.
    float m_output_posn = 0.0F;
    /// Source samples per output sample.
    float m_output_delta = 1.0F;
    /// Gain of every output sample.
    float m_scaling = 1.0F;
};

} // namespace qivo
