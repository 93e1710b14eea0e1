#ifdef __x86_64__

#include "audio/ResamplerBlocks.h"
#include "audio/ResamplerLanes.h"

#include <algorithm>

#ifndef __clang__
// g++ 12 takes the undefined lanes within its own intrinsics for uninitialised variables of ours.
#pragma GCC diagnostic ignored "-Wuninitialized"
#pragma GCC diagnostic ignored "-Wmaybe-uninitialized"
#endif
#include <immintrin.h>

#define QIVO_AVX512 __attribute__((target("avx512f")))
#define QIVO_INLINE_AVX512 __attribute__((target("avx512f"), always_inline)) inline

namespace qivo::lanes {

namespace {

constexpr int kLanes = 16;

/// The rounding of sixteen steps, one table entry after the other.
struct Drifting {
    const DriftTable& table;
    unsigned residue;
    __m512i sum; ///< in the steps before, in every lane
};

/// What rounding adds before each of sixteen steps; `mask` has the steps that reach 2^24.
QIVO_INLINE_AVX512 __m512i driftBefore(Drifting& drifting, __mmask16 mask) {
    const Drift& low = drifting.table.take(mask & 0xFF, drifting.residue);
    const Drift& high = drifting.table.take(mask >> 8, drifting.residue);
    const __m128i bytes = _mm_castps_si128(
        _mm_loadh_pi(_mm_castsi128_ps(_mm_loadl_epi64(reinterpret_cast<const __m128i*>(low.before.data()))),
                     reinterpret_cast<const __m64*>(high.before.data())));
    const __m512i lowTotal = _mm512_set1_epi32(low.total);
    const __m512i here = _mm512_add_epi32(_mm512_cvtepi8_epi32(bytes), drifting.sum);
    drifting.sum = _mm512_add_epi32(_mm512_add_epi32(drifting.sum, lowTotal), _mm512_set1_epi32(high.total));
    return _mm512_mask_add_epi32(here, 0xFF00, here, lowTotal);
}

/// `Drifts` where delta is odd in units.
template <bool Drifts>
QIVO_AVX512 bool guessPositions(const Step& step, Positions& positions, int count) {
    const __m512i counted = _mm512_setr_epi32(0, 1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12, 13, 14, 15);
    const __m512i delta16 = _mm512_set1_epi32(step.inUnits * kLanes);
    const __m512i fraction = _mm512_set1_epi32((1 << step.shift) - 1);
    const __m512i unreached = _mm512_set1_epi32(kRounded - 1 - step.inUnits);
    const __m128i shift = _mm_cvtsi32_si128(step.shift);
    const __m512 unit = _mm512_set1_ps(step.unit);
    const __m512 delta = _mm512_set1_ps(step.delta);
    const __m512 whole = _mm512_set1_ps(step.whole);
    const __m512 one = _mm512_set1_ps(1.0F);

    // The positions without the drift since the first: it hardly ever decides whether a step reaches the limit.
    const auto first = static_cast<std::int32_t>(positions.t[0] * step.perUnit);
    const __m512i start =
        _mm512_add_epi32(_mm512_set1_epi32(first), _mm512_mullo_epi32(counted, _mm512_set1_epi32(step.inUnits)));
    __m512i exact = _mm512_and_si512(start, fraction);
    __m512i taken = _mm512_add_epi32(_mm512_set1_epi32(positions.taken[0]), _mm512_srl_epi32(start, shift));
    Drifting drifting = {kDrift[(step.inUnits & 3) >> 1], (static_cast<unsigned>(first) & 3) * DriftTable::kEntry,
                         _mm512_setzero_si512()};
    __m512i stepped = _mm512_castps_si512(_mm512_set1_ps(positions.t[0]));
    __m512i wrong = _mm512_setzero_si512();
    for (int at = 0; at < count; at += kLanes) {
        __m512i here = exact;
        __m512i takenHere = taken;
        if constexpr (Drifts) {
            here = _mm512_add_epi32(here, driftBefore(drifting, _mm512_cmpgt_epi32_mask(exact, unreached)));
            takenHere = _mm512_add_epi32(taken, _mm512_sra_epi32(here, shift));
            here = _mm512_and_si512(here, fraction);
        }
        const __m512 t = _mm512_mul_ps(_mm512_cvtepi32_ps(here), unit);
        _mm512_store_ps(positions.t.data() + at, t);
        _mm512_store_si512(positions.taken.data() + at, takenHere);

        // As an unsigned number a negative float is larger than a positive one.
        const __m512 less = _mm512_sub_ps(_mm512_add_ps(t, delta), whole);
        const __m512i next = _mm512_min_epu32(_mm512_castps_si512(less), _mm512_castps_si512(_mm512_sub_ps(less, one)));
        const __m512i expected = _mm512_alignr_epi32(next, stepped, kLanes - 1);
        wrong = _mm512_or_si512(wrong, _mm512_xor_si512(expected, _mm512_castps_si512(t)));
        stepped = next;

        exact = _mm512_add_epi32(exact, delta16);
        taken = _mm512_add_epi32(taken, _mm512_srl_epi32(exact, shift));
        exact = _mm512_and_si512(exact, fraction);
    }
    return _mm512_test_epi32_mask(wrong, wrong) == 0;
}

bool guess(const Step& step, Positions& positions, int count) {
    return (step.inUnits & 1) != 0 ? guessPositions<true>(step, positions, count)
                                   : guessPositions<false>(step, positions, count);
}

QIVO_AVX512 void repeat(const Step& step, Positions& positions, int count) {
    const __m512i counted = _mm512_setr_epi32(0, 1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12, 13, 14, 15);
    const auto delta = static_cast<std::int32_t>(step.delta);
    const __m512i delta16 = _mm512_set1_epi32(delta * kLanes);
    const __m512 t = _mm512_set1_ps(positions.t[0]);
    __m512i taken =
        _mm512_add_epi32(_mm512_set1_epi32(positions.taken[0]), _mm512_mullo_epi32(counted, _mm512_set1_epi32(delta)));
    for (int at = 0; at < count; at += kLanes) {
        _mm512_store_ps(positions.t.data() + at, t);
        _mm512_store_si512(positions.taken.data() + at, taken);
        taken = _mm512_add_epi32(taken, delta16);
    }
}

struct History {
    __m512 x0, x1, x2, x3;
};

/// The four samples of each of sixteen outputs that begin within sixteen samples of the first.
QIVO_INLINE_AVX512 History near(const float* first, __m512i offset) {
    return {_mm512_permutexvar_ps(offset, _mm512_loadu_ps(first)),
            _mm512_permutexvar_ps(offset, _mm512_loadu_ps(first + 1)),
            _mm512_permutexvar_ps(offset, _mm512_loadu_ps(first + 2)),
            _mm512_permutexvar_ps(offset, _mm512_loadu_ps(first + 3))};
}

QIVO_INLINE_AVX512 __m512 fromTwo(const float* first, __m512i offset) {
    return _mm512_permutex2var_ps(_mm512_loadu_ps(first), offset, _mm512_loadu_ps(first + kLanes));
}

/// The same within 32.
QIVO_INLINE_AVX512 History wide(const float* first, __m512i offset) {
    return {fromTwo(first, offset), fromTwo(first + 1, offset), fromTwo(first + 2, offset), fromTwo(first + 3, offset)};
}

/// The samples of four outputs, four apart in `taken`.
QIVO_INLINE_AVX512 __m512 four(const float* base, const std::int32_t* taken) {
    __m512 all = _mm512_castps128_ps512(_mm_loadu_ps(base + taken[0]));
    all = _mm512_insertf32x4(all, _mm_loadu_ps(base + taken[4]), 1);
    all = _mm512_insertf32x4(all, _mm_loadu_ps(base + taken[8]), 2);
    return _mm512_insertf32x4(all, _mm_loadu_ps(base + taken[12]), 3);
}

/// The same anywhere.
QIVO_INLINE_AVX512 History apart(const float* base, const std::int32_t* taken) {
    const __m512 r0 = four(base, taken);
    const __m512 r1 = four(base, taken + 1);
    const __m512 r2 = four(base, taken + 2);
    const __m512 r3 = four(base, taken + 3);
    const __m512 low01 = _mm512_unpacklo_ps(r0, r1);
    const __m512 high01 = _mm512_unpackhi_ps(r0, r1);
    const __m512 low23 = _mm512_unpacklo_ps(r2, r3);
    const __m512 high23 = _mm512_unpackhi_ps(r2, r3);
    return {_mm512_shuffle_ps(low01, low23, 0x44), _mm512_shuffle_ps(low01, low23, 0xEE),
            _mm512_shuffle_ps(high01, high23, 0x44), _mm512_shuffle_ps(high01, high23, 0xEE)};
}

/// The spline in the resampler's own grouping.
QIVO_INLINE_AVX512 __m512 splines(const History& x, __m512 t, __m512 scaling) {
    const __m512 half = _mm512_set1_ps(0.5F);
    const __m512 rise = _mm512_mul_ps(_mm512_sub_ps(x.x1, x.x2), _mm512_set1_ps(3.0F));
    const __m512 a = _mm512_mul_ps(_mm512_add_ps(_mm512_sub_ps(rise, x.x0), x.x3), half);
    const __m512 outer = _mm512_add_ps(_mm512_mul_ps(x.x1, _mm512_set1_ps(5.0F)), x.x3);
    const __m512 b = _mm512_sub_ps(_mm512_add_ps(_mm512_add_ps(x.x2, x.x2), x.x0), _mm512_mul_ps(outer, half));
    const __m512 c = _mm512_mul_ps(_mm512_sub_ps(x.x2, x.x0), half);
    const __m512 cubic = _mm512_add_ps(_mm512_mul_ps(_mm512_add_ps(_mm512_mul_ps(a, t), b), t), c);
    return _mm512_mul_ps(_mm512_add_ps(_mm512_mul_ps(cubic, t), x.x1), scaling);
}

QIVO_INLINE_AVX512 void storeFour(__m128 out, float* dst, std::ptrdiff_t stride) {
    _mm_store_ss(dst, out);
    _mm_store_ss(dst + stride, _mm_shuffle_ps(out, out, 1));
    _mm_store_ss(dst + 2 * stride, _mm_shuffle_ps(out, out, 2));
    _mm_store_ss(dst + 3 * stride, _mm_shuffle_ps(out, out, 3));
}

/// Only the first `count` slots are written: what lies between and behind them belongs to others.
QIVO_INLINE_AVX512 void store(__m512 out, float* dst, std::ptrdiff_t stride, int count) {
    if (stride == 1) {
        _mm512_mask_storeu_ps(dst, static_cast<__mmask16>((1U << count) - 1), out);
    } else if (stride == 2) {
        const __m512i twice = _mm512_setr_epi32(0, 0, 1, 1, 2, 2, 3, 3, 4, 4, 5, 5, 6, 6, 7, 7);
        const __m512i upper = _mm512_add_epi32(twice, _mm512_set1_epi32(kLanes / 2));
        const auto slots = 0x55555555U & static_cast<unsigned>((std::uint64_t{1} << 2 * count) - 1);
        _mm512_mask_storeu_ps(dst, static_cast<__mmask16>(slots), _mm512_permutexvar_ps(twice, out));
        if (count > kLanes / 2) {
            _mm512_mask_storeu_ps(dst + kLanes, static_cast<__mmask16>(slots >> 16), _mm512_permutexvar_ps(upper, out));
        }
    } else if (count == kLanes) {
        storeFour(_mm512_castps512_ps128(out), dst, stride);
        storeFour(_mm512_extractf32x4_ps(out, 1), dst + 4 * stride, stride);
        storeFour(_mm512_extractf32x4_ps(out, 2), dst + 8 * stride, stride);
        storeFour(_mm512_extractf32x4_ps(out, 3), dst + 12 * stride, stride);
    } else {
        alignas(64) std::array<float, kLanes> each;
        _mm512_store_ps(each.data(), out);
        for (int i = 0; i < count; ++i) {
            dst[i * stride] = each[i];
        }
    }
}

QIVO_INLINE_AVX512 __m512 sixteen(const ResamplerRun& run, const Positions& positions, int at, __m512 scaling) {
    const float* const oldest = run.src - 4;
    const std::int32_t* taken = positions.taken.data() + at;
    const __m512i all = _mm512_loadu_si512(taken);
    const __m512 t = _mm512_loadu_ps(positions.t.data() + at);
    const std::int32_t span = taken[kLanes - 1] - taken[0];
    if (span >= 2 * kLanes) {
        return splines(apart(oldest, taken), t, scaling);
    }
    // Near the end of the source the loads begin before the first output's samples, so as to stay within.
    const bool isNear = span < kLanes;
    const std::int32_t last = static_cast<std::int32_t>(run.srcLeft) - ((isNear ? kLanes : 2 * kLanes) - 1);
    const std::int32_t first = std::min(taken[0], last);
    const __m512i offset = _mm512_sub_epi32(all, _mm512_set1_epi32(first));
    return splines(isNear ? near(oldest + first, offset) : wide(oldest + first, offset), t, scaling);
}

QIVO_AVX512 void interpolate(const ResamplerRun& run, const Positions& positions, int from, int count) {
    const __m512 scaling = _mm512_set1_ps(run.scaling);
    const std::ptrdiff_t stride = run.dstStride;
    int at = from;
    for (; at + kLanes <= count; at += kLanes) {
        store(sixteen(run, positions, at, scaling), run.dst + at * stride, stride, kLanes);
    }
    if (at < count) {
        store(sixteen(run, positions, at, scaling), run.dst + at * stride, stride, count - at);
    }
}

} // namespace

const Kernel kSixteen = {guess, repeat, interpolate};

} // namespace qivo::lanes

#endif
