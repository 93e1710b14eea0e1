#pragma once

#include "audio/SampleCursor.h"

#include <cmath>
#include <cstdint>

/// The resampler as one would say it aloud: one sample, one output at a time, nothing clever. The measure of the real
/// one, which must agree to the bit; it shares no code with it.
struct ReferenceResampler {
    std::int32_t index = -1;
    float last[4] = {0, 0, 0, 0};
    float posn = 0;
    float delta = 1;
    float scaling = 1;

    int silence(qivo::SampleCursor* dst, int stride) const {
        while (dst->position < dst->end) {
            *dst->position = 0;
            dst->position += stride;
        }
        return 1;
    }

    int process(qivo::SampleCursor* src, qivo::SampleCursor* dst, int srcStride, int dstStride) {
        if (src->position == nullptr) {
            return silence(dst, dstStride);
        }
        if (src->position >= src->end) {
            return 0;
        }
        if (dst->position >= dst->end) {
            return 1;
        }
        const long srcCount = (src->end - src->position) / srcStride;
        const long dstCount = (dst->end - dst->position) / dstStride;
        const auto n = static_cast<std::int32_t>(srcCount < dstCount ? srcCount : dstCount);
        const float gain = -1.0F + delta;
        const float drift = gain * static_cast<float>(n);
        const float endPosn = drift + posn;
        if (index == -1) {
            last[0] = last[1] = last[2] = last[3] = *src->position;
            index = 0;
        }
        const bool nearEnd = endPosn <= 0.01F && endPosn >= 0.0F;
        const bool nearStart = posn > -0.01F && posn < 0.01F;
        if (nearEnd && nearStart) {
            return copy(src, dst, srcStride, dstStride, n, endPosn);
        }
        for (;;) {
            while (posn >= 1.0F) {
                posn = posn - 1.0F;
                last[index & 3] = *src->position;
                src->position += srcStride;
                index = index == INT32_MAX ? INT32_MIN : index + 1;
                if (src->position >= src->end) {
                    return 0;
                }
            }
            *dst->position = output();
            dst->position += dstStride;
            posn = posn + delta;
            if (dst->position >= dst->end) {
                return 1;
            }
        }
    }

  private:
    int copy(qivo::SampleCursor* src, qivo::SampleCursor* dst, int srcStride, int dstStride, std::int32_t n,
             float endPosn) {
        for (std::int32_t i = 0; i < n; i++) {
            *dst->position = *src->position * scaling;
            src->position += srcStride;
            dst->position += dstStride;
        }
        posn = endPosn;
        return src->position < src->end ? 1 : 0;
    }

    [[nodiscard]] float output() const {
        const float x0 = last[index & 3];
        const float x1 = last[(index & 3) == 3 ? 0 : (index & 3) + 1];
        const float x2 = last[(index & 3) >= 2 ? (index & 3) - 2 : (index & 3) + 2];
        const float x3 = last[(index & 3) == 0 ? 3 : (index & 3) - 1];
        float a = x1 - x2;
        a = a * 3.0F;
        a = a - x0;
        a = a + x3;
        a = a * 0.5F;
        float left = x2 + x2;
        left = left + x0;
        float right = x1 * 5.0F;
        right = right + x3;
        right = right * 0.5F;
        const float b = left - right;
        float c = x2 - x0;
        c = c * 0.5F;
        float out = a * posn;
        out = out + b;
        out = out * posn;
        out = out + c;
        out = out * posn;
        out = out + x1;
        return out * scaling;
    }
};
