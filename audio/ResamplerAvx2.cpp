#ifdef __x86_64__

#include "audio/ResamplerBlocks.h"
#include "audio/ResamplerLanes.h"

#include <algorithm>
#include <immintrin.h>

#define QIVO_AVX2 __attribute__((target("avx2")))
#define QIVO_INLINE_AVX2 __attribute__((target("avx2"), always_inline)) inline

namespace qivo::lanes {

namespace {

constexpr int kLanes = 8;

/// What rounding adds before each of eight steps, of which `mask` has those that reach 2^24; `sum` is what it has added
/// in the steps before, in every lane.
QIVO_INLINE_AVX2 __m256i driftBefore(const DriftTable& table, unsigned mask, unsigned& residue, __m256i& sum) {
    const Drift& drift = table.take(mask, residue);
    const __m128i bytes = _mm_loadl_epi64(reinterpret_cast<const __m128i*>(drift.before.data()));
    const __m256i here = _mm256_add_epi32(_mm256_cvtepi8_epi32(bytes), sum);
    sum = _mm256_add_epi32(sum, _mm256_set1_epi32(drift.total));
    return here;
}

/// `Drifts` where delta is odd in units.
template <bool Drifts>
QIVO_AVX2 bool guessPositions(const Step& step, Positions& positions, int count) {
    const __m256i counted = _mm256_setr_epi32(0, 1, 2, 3, 4, 5, 6, 7);
    const __m256i last = _mm256_setr_epi32(7, 0, 1, 2, 3, 4, 5, 6);
    const __m256i delta8 = _mm256_set1_epi32(step.inUnits * kLanes);
    const __m256i fraction = _mm256_set1_epi32((1 << step.shift) - 1);
    const __m256i unreached = _mm256_set1_epi32(kRounded - 1 - step.inUnits);
    const __m128i shift = _mm_cvtsi32_si128(step.shift);
    const __m256 unit = _mm256_set1_ps(step.unit);
    const __m256 delta = _mm256_set1_ps(step.delta);
    const __m256 whole = _mm256_set1_ps(step.whole);
    const __m256 one = _mm256_set1_ps(1.0F);
    const DriftTable& table = kDrift[(step.inUnits & 3) >> 1];

    // The positions without the drift since the first: it hardly ever decides whether a step reaches the limit.
    const auto first = static_cast<std::int32_t>(positions.t[0] * step.perUnit);
    const __m256i start =
        _mm256_add_epi32(_mm256_set1_epi32(first), _mm256_mullo_epi32(counted, _mm256_set1_epi32(step.inUnits)));
    __m256i exact = _mm256_and_si256(start, fraction);
    __m256i taken = _mm256_add_epi32(_mm256_set1_epi32(positions.taken[0]), _mm256_srl_epi32(start, shift));
    unsigned residue = (static_cast<unsigned>(first) & 3) * DriftTable::kEntry;
    __m256i drift = _mm256_setzero_si256();
    __m256i stepped = _mm256_castps_si256(_mm256_set1_ps(positions.t[0])); // the last one goes first
    __m256i wrong = _mm256_setzero_si256();
    for (int at = 0; at < count; at += kLanes) {
        __m256i here = exact;
        __m256i takenHere = taken;
        if constexpr (Drifts) {
            const int mask = _mm256_movemask_ps(_mm256_castsi256_ps(_mm256_cmpgt_epi32(exact, unreached)));
            here = _mm256_add_epi32(here, driftBefore(table, static_cast<unsigned>(mask), residue, drift));
            takenHere = _mm256_add_epi32(taken, _mm256_sra_epi32(here, shift));
            here = _mm256_and_si256(here, fraction);
        }
        const __m256 t = _mm256_mul_ps(_mm256_cvtepi32_ps(here), unit);
        _mm256_store_ps(positions.t.data() + at, t);
        _mm256_store_si256(reinterpret_cast<__m256i*>(positions.taken.data() + at), takenHere);

        // As an unsigned number a negative float is larger than a positive one.
        const __m256 less = _mm256_sub_ps(_mm256_add_ps(t, delta), whole);
        const __m256i next = _mm256_min_epu32(_mm256_castps_si256(less), _mm256_castps_si256(_mm256_sub_ps(less, one)));
        const __m256i rotated = _mm256_permutevar8x32_epi32(next, last);
        const __m256i expected = _mm256_blend_epi32(rotated, stepped, 1);
        wrong = _mm256_or_si256(wrong, _mm256_xor_si256(expected, _mm256_castps_si256(t)));
        stepped = rotated;

        exact = _mm256_add_epi32(exact, delta8);
        taken = _mm256_add_epi32(taken, _mm256_srl_epi32(exact, shift));
        exact = _mm256_and_si256(exact, fraction);
    }
    return _mm256_testz_si256(wrong, wrong) != 0;
}

bool guess(const Step& step, Positions& positions, int count) {
    return (step.inUnits & 1) != 0 ? guessPositions<true>(step, positions, count)
                                   : guessPositions<false>(step, positions, count);
}

QIVO_AVX2 void repeat(const Step& step, Positions& positions, int count) {
    const __m256i counted = _mm256_setr_epi32(0, 1, 2, 3, 4, 5, 6, 7);
    const auto delta = static_cast<std::int32_t>(step.delta);
    const __m256i delta8 = _mm256_set1_epi32(delta * kLanes);
    const __m256 t = _mm256_set1_ps(positions.t[0]);
    __m256i taken =
        _mm256_add_epi32(_mm256_set1_epi32(positions.taken[0]), _mm256_mullo_epi32(counted, _mm256_set1_epi32(delta)));
    for (int at = 0; at < count; at += kLanes) {
        _mm256_store_ps(positions.t.data() + at, t);
        _mm256_store_si256(reinterpret_cast<__m256i*>(positions.taken.data() + at), taken);
        taken = _mm256_add_epi32(taken, delta8);
    }
}

struct History {
    __m256 x0, x1, x2, x3;
};

/// The four samples of each of eight outputs that begin within eight samples of the first.
QIVO_INLINE_AVX2 History near(const float* first, __m256i offset) {
    return {_mm256_permutevar8x32_ps(_mm256_loadu_ps(first), offset),
            _mm256_permutevar8x32_ps(_mm256_loadu_ps(first + 1), offset),
            _mm256_permutevar8x32_ps(_mm256_loadu_ps(first + 2), offset),
            _mm256_permutevar8x32_ps(_mm256_loadu_ps(first + 3), offset)};
}

QIVO_INLINE_AVX2 __m256 pair(const float* low, const float* high) {
    return _mm256_insertf128_ps(_mm256_castps128_ps256(_mm_loadu_ps(low)), _mm_loadu_ps(high), 1);
}

/// The same for outputs that begin anywhere.
QIVO_INLINE_AVX2 History apart(const float* base, const std::int32_t* taken) {
    const __m256 r0 = pair(base + taken[0], base + taken[4]);
    const __m256 r1 = pair(base + taken[1], base + taken[5]);
    const __m256 r2 = pair(base + taken[2], base + taken[6]);
    const __m256 r3 = pair(base + taken[3], base + taken[7]);
    const __m256 low01 = _mm256_unpacklo_ps(r0, r1);
    const __m256 high01 = _mm256_unpackhi_ps(r0, r1);
    const __m256 low23 = _mm256_unpacklo_ps(r2, r3);
    const __m256 high23 = _mm256_unpackhi_ps(r2, r3);
    return {_mm256_shuffle_ps(low01, low23, 0x44), _mm256_shuffle_ps(low01, low23, 0xEE),
            _mm256_shuffle_ps(high01, high23, 0x44), _mm256_shuffle_ps(high01, high23, 0xEE)};
}

/// The spline in the resampler's own grouping.
QIVO_INLINE_AVX2 __m256 splines(const History& x, __m256 t, __m256 scaling) {
    const __m256 half = _mm256_set1_ps(0.5F);
    const __m256 rise = _mm256_mul_ps(_mm256_sub_ps(x.x1, x.x2), _mm256_set1_ps(3.0F));
    const __m256 a = _mm256_mul_ps(_mm256_add_ps(_mm256_sub_ps(rise, x.x0), x.x3), half);
    const __m256 outer = _mm256_add_ps(_mm256_mul_ps(x.x1, _mm256_set1_ps(5.0F)), x.x3);
    const __m256 b = _mm256_sub_ps(_mm256_add_ps(_mm256_add_ps(x.x2, x.x2), x.x0), _mm256_mul_ps(outer, half));
    const __m256 c = _mm256_mul_ps(_mm256_sub_ps(x.x2, x.x0), half);
    const __m256 cubic = _mm256_add_ps(_mm256_mul_ps(_mm256_add_ps(_mm256_mul_ps(a, t), b), t), c);
    return _mm256_mul_ps(_mm256_add_ps(_mm256_mul_ps(cubic, t), x.x1), scaling);
}

QIVO_INLINE_AVX2 void storeFour(__m128 out, float* dst, std::ptrdiff_t stride) {
    _mm_store_ss(dst, out);
    _mm_store_ss(dst + stride, _mm_shuffle_ps(out, out, 1));
    _mm_store_ss(dst + 2 * stride, _mm_shuffle_ps(out, out, 2));
    _mm_store_ss(dst + 3 * stride, _mm_shuffle_ps(out, out, 3));
}

/// Only the slots themselves are written: what lies between them belongs to other channels. One by one, since masked
/// stores are slower than that on many processors without AVX-512.
QIVO_INLINE_AVX2 void store(__m256 out, float* dst, std::ptrdiff_t stride) {
    if (stride == 1) {
        _mm256_storeu_ps(dst, out);
        return;
    }
    storeFour(_mm256_castps256_ps128(out), dst, stride);
    storeFour(_mm256_extractf128_ps(out, 1), dst + 4 * stride, stride);
}

QIVO_INLINE_AVX2 __m256 eight(const ResamplerRun& run, const Positions& positions, int at, __m256 scaling) {
    const float* const oldest = run.src - 4;
    const std::int32_t* taken = positions.taken.data() + at;
    const __m256 t = _mm256_loadu_ps(positions.t.data() + at);
    if (taken[kLanes - 1] - taken[0] >= kLanes) {
        return splines(apart(oldest, taken), t, scaling);
    }
    // Near the end of the source the loads begin before the first output's samples, so as to stay within.
    const std::int32_t first = std::min(taken[0], static_cast<std::int32_t>(run.srcLeft) - (kLanes - 1));
    const __m256i all = _mm256_loadu_si256(reinterpret_cast<const __m256i*>(taken));
    return splines(near(oldest + first, _mm256_sub_epi32(all, _mm256_set1_epi32(first))), t, scaling);
}

QIVO_AVX2 void interpolate(const ResamplerRun& run, const Positions& positions, int from, int count) {
    const __m256 scaling = _mm256_set1_ps(run.scaling);
    const std::ptrdiff_t stride = run.dstStride;
    int at = from;
    for (; at + kLanes <= count; at += kLanes) {
        store(eight(run, positions, at, scaling), run.dst + at * stride, stride);
    }
    if (at < count) {
        alignas(32) std::array<float, kLanes> rest;
        _mm256_store_ps(rest.data(), eight(run, positions, at, scaling));
        for (int i = 0; at + i < count; ++i) {
            run.dst[(at + i) * stride] = rest[i];
        }
    }
}

} // namespace

const Kernel kEight = {guess, repeat, interpolate};

} // namespace qivo::lanes

#endif
