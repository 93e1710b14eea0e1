#include "audio/AudioResampler.h"

#include "audio/ResamplerSpline.h"

#include <algorithm>
#include <cfloat>
#include <climits>
#include <cmath>
#include <cstddef>
#include <functional>

#ifdef __FAST_MATH__
#error "The resampler's rounding is part of its contract: build it without -ffast-math"
#endif
static_assert(FLT_EVAL_METHOD == 0, "the resampler needs each step rounded to single precision");

namespace qivo {

namespace {

constexpr std::ptrdiff_t kHistory = 4;

/// Up to this far from a whole sample, a call at nearly equal rates copies.
constexpr float kPassThroughDrift = 0.01F;

int slotsLeft(const SampleCursor& cursor, int stride) {
    return static_cast<int>((cursor.end - cursor.position) / stride);
}

bool overlap(const SampleCursor& one, const SampleCursor& other) {
    const std::less<const float*> before;
    return before(one.position, other.end) && before(other.position, one.end);
}

} // namespace

void AudioResampler::setSourceSampleRate(float sourceSampleRate, float andDestRate) noexcept {
    m_output_delta = sourceSampleRate / andDestRate;
}

void AudioResampler::reset() noexcept {
    m_sample_index = -1;
    m_output_posn = 0.0F;
    m_output_delta = 1.0F;
}

int AudioResampler::getMaxBufferLengthInSamples(int n) const noexcept {
    constexpr int margin = 2;
    constexpr float tooLarge = 2147483648.0F;
    const float length = std::ceil(static_cast<float>(n) / m_output_delta);
    if (std::isnan(length)) {
        return margin;
    }
    if (length >= tooLarge) {
        return INT_MAX;
    }
    return (length < -tooLarge ? INT_MIN : static_cast<int>(length)) + margin;
}

int AudioResampler::processDst(SampleCursor* dst, int withStride) const noexcept {
    for (; dst->position < dst->end; dst->position += withStride) {
        *dst->position = 0.0F;
    }
    return 1;
}

int AudioResampler::processSrc(SampleCursor* src, SampleCursor* toDst, int withSrcStride,
                               int andWithDstStride) noexcept {
    if (src->position == nullptr) {
        return processDst(toDst, andWithDstStride);
    }
    return process(*src, *toDst, withSrcStride, andWithDstStride, widestResamplerLanes());
}

int AudioResampler::process(SampleCursor& src, SampleCursor& dst, int srcStride, int dstStride,
                            ResamplerLanes lanes) noexcept {
    if (src.position >= src.end) {
        return 0;
    }
    if (dst.position >= dst.end) {
        return 1;
    }
    const int inSrc = slotsLeft(src, srcStride);
    const int inDst = slotsLeft(dst, dstStride);
    const int n = inSrc < inDst ? inSrc : inDst;
    const float endPosn = (-1.0F + m_output_delta) * static_cast<float>(n) + m_output_posn;
    if (m_sample_index == -1) {
        for (float& sample : m_last_samples) {
            sample = *src.position;
        }
        m_sample_index = 0;
    }
    if (endPosn <= kPassThroughDrift && std::fabs(m_output_posn) < kPassThroughDrift && endPosn >= 0.0F) {
        m_output_posn = endPosn;
        return copy(src, dst, n, srcStride, dstStride);
    }
    return interpolate(src, dst, srcStride, dstStride, lanes);
}

/// The history stays as it is: a spline that follows goes on from before the copy.
int AudioResampler::copy(SampleCursor& src, SampleCursor& dst, int n, std::ptrdiff_t srcStride,
                         std::ptrdiff_t dstStride) const noexcept {
    const float scaling = m_scaling;
    const float* from = src.position;
    float* into = dst.position;
    int left = n;
    for (; left >= 4; left -= 4) {
        into[0] = from[0] * scaling;
        into[dstStride] = from[srcStride] * scaling;
        into[2 * dstStride] = from[2 * srcStride] * scaling;
        into[3 * dstStride] = from[3 * srcStride] * scaling;
        from += 4 * srcStride;
        into += 4 * dstStride;
    }
    for (; left > 0; --left) {
        *into = *from * scaling;
        from += srcStride;
        into += dstStride;
    }
    src.position += n * srcStride;
    dst.position += n * dstStride;
    return src.position < src.end ? 1 : 0;
}

int AudioResampler::interpolate(SampleCursor& src, SampleCursor& dst, int srcStride, int dstStride,
                                ResamplerLanes lanes) noexcept {
    bool blocksAhead = srcStride == 1 && !overlap(src, dst);
    while (true) {
        if (!catchUp(src, srcStride)) {
            return 0;
        }
        // Positions are negative for some outputs at most, and only where the ratio or the position was set so.
        if (blocksAhead && m_output_posn >= 0.0F) {
            blocksAhead = false;
            interpolateBlocks(src, dst, dstStride, lanes);
            if (dst.position >= dst.end) {
                return 1;
            }
            continue;
        }
        const auto k = static_cast<std::uint32_t>(m_sample_index);
        const float t = m_output_posn;
        *dst.position = spline(m_last_samples[k & 3], m_last_samples[(k + 1) & 3], m_last_samples[(k + 2) & 3],
                               m_last_samples[(k - 1) & 3], t) *
                        m_scaling;
        dst.position += dstStride;
        m_output_posn = t + m_output_delta;
        if (dst.position >= dst.end) {
            return 1;
        }
    }
}

bool AudioResampler::catchUp(SampleCursor& src, int srcStride) noexcept {
    while (m_output_posn >= 1.0F) {
        m_output_posn = m_output_posn - 1.0F;
        take(*src.position);
        src.position += srcStride;
        if (src.position >= src.end) {
            return false;
        }
    }
    return true;
}

void AudioResampler::take(float sample) noexcept {
    const auto index = static_cast<std::uint32_t>(m_sample_index);
    m_last_samples[index & 3] = sample;
    m_sample_index = static_cast<std::int32_t>(index + 1);
}

void AudioResampler::interpolateBlocks(SampleCursor& src, SampleCursor& dst, int dstStride,
                                       ResamplerLanes lanes) noexcept {
    ResamplerRun run = {};
    for (std::uint32_t i = 0; i < kHistory; ++i) {
        run.history[i] = m_last_samples[(static_cast<std::uint32_t>(m_sample_index) + i) & 3];
    }
    run.src = src.position;
    run.srcLeft = src.end - src.position;
    run.dst = dst.position;
    run.dstSlots = (dst.end - dst.position + dstStride - 1) / dstStride;
    run.dstStride = dstStride;
    run.position = m_output_posn;
    run.scaling = m_scaling;
    run.delta = m_output_delta;
    resampleBlocks(run, lanes);
    const std::ptrdiff_t taken = run.src - src.position;
    const std::ptrdiff_t keeping = std::min(taken, kHistory);
    m_sample_index = static_cast<std::int32_t>(static_cast<std::uint32_t>(m_sample_index) +
                                               static_cast<std::uint32_t>(taken - keeping));
    for (std::ptrdiff_t i = -keeping; i < 0; ++i) {
        take(run.src[i]);
    }
    src.position += taken;
    dst.position = run.dst;
    m_output_posn = run.position;
}

} // namespace qivo
