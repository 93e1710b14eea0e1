#include "audio/AudioResampler.h"

#include "audio/ResamplerBlocks.h"

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

constexpr int kHistory = 4;

/// Up to this far from a whole sample, a call at nearly equal rates copies.
constexpr float kPassThroughDrift = 0.01F;

int slotsLeft(const SampleCursor& cursor, int stride) {
    return static_cast<int>((cursor.end - cursor.position) / stride);
}

bool overlap(const SampleCursor& one, const SampleCursor& other) {
    const std::less<const float*> before;
    return before(one.position, other.end) && before(other.position, one.end);
}

/// The spline from x1 (t = 0) to x2 (t = 1).
float spline(float x0, float x1, float x2, float x3, float t) {
    const float a = ((x1 - x2) * 3.0F - x0 + x3) * 0.5F;
    const float b = (x2 + x2 + x0) - (x1 * 5.0F + x3) * 0.5F;
    const float c = (x2 - x0) * 0.5F;
    return ((a * t + b) * t + c) * t + x1;
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
    if (src->position >= src->end) {
        return 0;
    }
    if (toDst->position >= toDst->end) {
        return 1;
    }
    const int inSrc = slotsLeft(*src, withSrcStride);
    const int inDst = slotsLeft(*toDst, andWithDstStride);
    const int n = inSrc < inDst ? inSrc : inDst;
    const float endPosn = (-1.0F + m_output_delta) * static_cast<float>(n) + m_output_posn;
    if (m_sample_index == -1) {
        for (float& sample : m_last_samples) {
            sample = *src->position;
        }
        m_sample_index = 0;
    }
    if (endPosn <= kPassThroughDrift && std::fabs(m_output_posn) < kPassThroughDrift && endPosn >= 0.0F) {
        m_output_posn = endPosn;
        return copy(*src, *toDst, n, withSrcStride, andWithDstStride);
    }
    return interpolate(*src, *toDst, withSrcStride, andWithDstStride);
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

int AudioResampler::interpolate(SampleCursor& src, SampleCursor& dst, int srcStride, int dstStride) noexcept {
    // Blocks read their history from the source itself, so they begin when four of its samples have been taken.
    bool blocksAhead = srcStride == 1 && !overlap(src, dst);
    const float* const begin = src.position;
    while (true) {
        if (blocksAhead && src.position - begin >= kHistory) {
            blocksAhead = false;
            interpolateBlocks(src, dst, dstStride);
            if (dst.position >= dst.end) {
                return 1;
            }
        }
        if (!catchUp(src, srcStride)) {
            return 0;
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

void AudioResampler::interpolateBlocks(SampleCursor& src, SampleCursor& dst, int dstStride) noexcept {
    const std::ptrdiff_t slots = (dst.end - dst.position + dstStride - 1) / dstStride;
    ResamplerRun run = {src.position, src.end - src.position, dst.position, slots,
                        dstStride,    m_output_posn,          m_scaling,    m_output_delta};
    resampleBlocks(run);
    const auto taken = static_cast<std::uint32_t>(run.src - src.position);
    if (taken > 0) {
        m_sample_index = static_cast<std::int32_t>(static_cast<std::uint32_t>(m_sample_index) + taken - kHistory);
        for (int i = -kHistory; i < 0; ++i) {
            take(run.src[i]);
        }
    }
    src.position += taken;
    dst.position = run.dst;
    m_output_posn = run.position;
}

} // namespace qivo
