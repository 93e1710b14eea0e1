#include "audio/ResamplerBlocks.h"

#ifndef __x86_64__

namespace qivo {

void resampleBlocks(ResamplerRun& /*run*/) noexcept {}

} // namespace qivo

#else

#include <algorithm>
#include <array>
#include <bit>
#include <cstddef>
#include <immintrin.h>

#define QIVO_AVX2 __attribute__((target("avx2")))
#define QIVO_INLINE_AVX2 __attribute__((target("avx2"), always_inline)) inline

// Each output's position is the last one's plus delta, rounded, less the whole samples that are taken. That chain of
// dependent roundings, not the spline, is what limits a plain loop. It is broken up by guessing the positions of a
// block and then doing all its steps in single precision side by side: if every step leads from one guess to the next,
// they are the positions that the chain would have found; if not, the chain is followed.
//
// The guess. Let delta lie in [2^e, 2^(e+1)) with e >= -1. Then delta and all positions are multiples of
// g = 2^(e-23), and counted in g they are integers below 2^24. A step's sum is exact below 2^24; from there on an odd
// sum is a tie and goes to the nearest multiple of 4. So what rounding adds to eight steps depends only on delta and
// the first position modulo 4 and on which of the steps reach 2^24, and fits a table. Below a delta of 1/2 sums round
// in more than two ways; nothing is guessed there.
//
// A block's positions are found first and its samples read after that: both in one loop would keep too few steps in
// flight.

namespace qivo {

namespace {

constexpr int kLanes = 8;
constexpr int kBlock = 256; // outputs whose positions are found before their samples are read
constexpr std::int32_t kRounded = 1 << 24;

/// What rounding has added after each of eight steps, in g.
using Drift = std::array<std::int8_t, kLanes>;

/// For deltas that are 1 or 3 modulo 4. A mask has a bit for each of eight steps, set if the step reaches 2^24; a
/// residue is a position modulo 4, given as the offset of its entry.
struct DriftTable {
    static constexpr unsigned kEntry = sizeof(Drift);
    static constexpr unsigned kResidues = 3 * kEntry;

    std::array<std::array<Drift, 4>, 256> drift = {};
    std::array<std::uint32_t, 256> residueAfter = {}; ///< the residue after the steps, shifted by the one before

    constexpr explicit DriftTable(unsigned delta) {
        for (unsigned mask = 0; mask < 256; ++mask) {
            for (unsigned residue = 0; residue < 4; ++residue) {
                const unsigned after = fill(drift[mask][residue], delta, residue, mask);
                residueAfter[mask] |= after * kEntry << residue * kEntry;
            }
        }
    }

    static constexpr unsigned fill(Drift& drift, unsigned delta, unsigned residue, unsigned mask) {
        constexpr int toMultipleOf4[4] = {0, -1, 0, 1};
        int sum = 0;
        for (unsigned step = 0; step < kLanes; ++step) {
            residue = (residue + delta) & 3;
            if ((mask >> step & 1) != 0) {
                sum += toMultipleOf4[residue];
                residue = (residue + static_cast<unsigned>(toMultipleOf4[residue])) & 3;
            }
            drift[step] = static_cast<std::int8_t>(sum);
        }
        return residue;
    }
};

constexpr std::array<DriftTable, 2> kDrift = {DriftTable(1), DriftTable(3)};

/// A delta taken apart.
struct Step {
    float delta;
    float whole;          ///< its integer part: a step takes that many samples or one more
    bool onGrid;          ///< positions are multiples of `unit` and can be guessed
    float unit;           ///< g
    float perUnit;        ///< 1 / g
    int shift;            ///< log2 of 1 / g
    std::int32_t inUnits; ///< delta / g
};

/// Where an output lies: its position, below 1, and the samples taken for it since run.src.
struct Point {
    float t;
    std::int32_t taken;
};

/// Where the outputs of a block lie, and the one after it.
struct Positions {
    alignas(32) std::array<float, kBlock + kLanes> t;
    alignas(32) std::array<std::int32_t, kBlock + kLanes> taken;
};

constexpr float kLargestDelta = 256.0F;

/// False for a delta whose positions the steps below would not get right.
bool takeApart(float delta, Step& step) {
    if (!(delta >= 0.0F && delta < kLargestDelta)) {
        return false;
    }
    step.delta = delta;
    step.whole = static_cast<float>(static_cast<std::int32_t>(delta));
    step.onGrid = delta >= 0.5F;
    if (step.onGrid) {
        const int exponent = static_cast<int>(std::bit_cast<std::uint32_t>(delta) >> 23) - 127;
        step.shift = 23 - exponent;
        step.perUnit = static_cast<float>(1 << step.shift);
        step.unit = 1.0F / step.perUnit;
        step.inUnits = static_cast<std::int32_t>(delta * step.perUnit);
    }
    return true;
}

/// What is left of a sum after its whole samples, which `taken` counts. The sum is below whole + 2: delta is at least
/// its own last digit below whole + 1 and t is below 1, and half the last digit of the sum is no more than that.
inline Point after(const Step& step, Point point) {
    const float less = point.t + step.delta - step.whole;
    const float least = less - 1.0F;
    const bool more = least >= 0.0F;
    return {more ? least : less, point.taken + static_cast<std::int32_t>(step.whole) + (more ? 1 : 0)};
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
QIVO_INLINE_AVX2 __m256 spline(const History& x, __m256 t, __m256 scaling) {
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

/// Only the slots themselves are written: what lies between them belongs to other channels.
QIVO_INLINE_AVX2 void store(__m256 out, float* dst, std::ptrdiff_t stride) {
    if (stride == 1) {
        _mm256_storeu_ps(dst, out);
        return;
    }
    storeFour(_mm256_castps256_ps128(out), dst, stride);
    storeFour(_mm256_extractf128_ps(out, 1), dst + 4 * stride, stride);
}

QIVO_AVX2 void interpolate(const ResamplerRun& run, const Positions& positions, int count) {
    const float* const oldest = run.src - 4;
    const __m256 scaling = _mm256_set1_ps(run.scaling);
    const std::ptrdiff_t stride = run.dstStride;
    float* dst = run.dst;
    for (int at = 0; at < count; at += kLanes) {
        const std::int32_t* taken = positions.taken.data() + at;
        const __m256i all = _mm256_load_si256(reinterpret_cast<const __m256i*>(taken));
        const History x = taken[kLanes - 1] - taken[0] < kLanes
                              ? near(oldest + taken[0], _mm256_sub_epi32(all, _mm256_set1_epi32(taken[0])))
                              : apart(oldest, taken);
        store(spline(x, _mm256_load_ps(positions.t.data() + at), scaling), dst, stride);
        dst += kLanes * stride;
    }
}

/// The block's positions after the first, each from the one before.
void followChain(const Step& step, Positions& positions, int count) {
    for (int i = 0; i < count; ++i) {
        const Point next = after(step, {positions.t[i], positions.taken[i]});
        positions.t[i + 1] = next.t;
        positions.taken[i + 1] = next.taken;
    }
}

/// The block's positions after the first, probably. `Drifts` where delta is odd in units.
template <bool Drifts>
QIVO_AVX2 void guess(const Step& step, Positions& positions, int count) {
    const __m256i delta = _mm256_set1_epi32(step.inUnits);
    const __m256i delta8 = _mm256_slli_epi32(delta, 3);
    const __m256i fraction = _mm256_set1_epi32((1 << step.shift) - 1);
    const __m256i unreached = _mm256_set1_epi32(kRounded - 1 - step.inUnits);
    const __m128i shift = _mm_cvtsi32_si128(step.shift);
    const __m256 unit = _mm256_set1_ps(step.unit);
    const DriftTable& table = kDrift[(step.inUnits & 3) >> 1];

    // The eight positions without the drift since the first: it hardly ever decides whether a step reaches the limit.
    const auto first = static_cast<std::int32_t>(positions.t[0] * step.perUnit);
    const __m256i start = _mm256_add_epi32(_mm256_set1_epi32(first),
                                           _mm256_mullo_epi32(delta, _mm256_setr_epi32(0, 1, 2, 3, 4, 5, 6, 7)));
    __m256i exact = _mm256_and_si256(start, fraction);
    __m256i taken = _mm256_add_epi32(_mm256_set1_epi32(positions.taken[0]), _mm256_srl_epi32(start, shift));
    unsigned residue = (static_cast<unsigned>(first) & 3) * DriftTable::kEntry;
    std::int32_t drift = 0;
    for (int at = 0; at < count; at += kLanes) {
        __m256i next = _mm256_add_epi32(exact, delta);
        if constexpr (Drifts) {
            const int mask = _mm256_movemask_ps(_mm256_castsi256_ps(_mm256_cmpgt_epi32(exact, unreached)));
            const std::int8_t* entry = table.drift[mask][0].data() + residue;
            const __m128i bytes = _mm_loadl_epi64(reinterpret_cast<const __m128i*>(entry));
            next = _mm256_add_epi32(_mm256_add_epi32(next, _mm256_cvtepi8_epi32(bytes)), _mm256_set1_epi32(drift));
            drift += entry[kLanes - 1];
            residue = table.residueAfter[mask] >> residue & DriftTable::kResidues;
        }
        _mm256_storeu_ps(positions.t.data() + at + 1,
                         _mm256_mul_ps(_mm256_cvtepi32_ps(_mm256_and_si256(next, fraction)), unit));
        _mm256_storeu_si256(reinterpret_cast<__m256i*>(positions.taken.data() + at + 1),
                            _mm256_add_epi32(taken, _mm256_sra_epi32(next, shift)));
        exact = _mm256_add_epi32(exact, delta8);
        taken = _mm256_add_epi32(taken, _mm256_srl_epi32(exact, shift));
        exact = _mm256_and_si256(exact, fraction);
    }
}

/// Whether a step in single precision leads from each position to the next.
QIVO_AVX2 bool confirm(const Step& step, const Positions& positions, int count) {
    const __m256 delta = _mm256_set1_ps(step.delta);
    const __m256 whole = _mm256_set1_ps(step.whole);
    __m256i same = _mm256_set1_epi32(-1);
    for (int at = 0; at < count; at += kLanes) {
        const __m256 less = _mm256_sub_ps(_mm256_add_ps(_mm256_load_ps(positions.t.data() + at), delta), whole);
        const __m256 least = _mm256_sub_ps(less, _mm256_set1_ps(1.0F));
        // As an unsigned number a negative float is larger than a positive one.
        const __m256i stepped = _mm256_min_epu32(_mm256_castps_si256(less), _mm256_castps_si256(least));
        const __m256 next = _mm256_loadu_ps(positions.t.data() + at + 1);
        same = _mm256_and_si256(same, _mm256_cmpeq_epi32(stepped, _mm256_castps_si256(next)));
    }
    return _mm256_movemask_epi8(same) == -1;
}

/// All positions are even numbers of units: no sum, being below 2^25, is ever rounded.
bool isExact(const Step& step, float position) {
    const auto units = static_cast<std::int32_t>(position * step.perUnit);
    return ((units | step.inUnits) & 1) == 0 && static_cast<float>(units) * step.unit == position;
}

void findPositions(const Step& step, Positions& positions, int count) {
    if (step.onGrid) {
        const bool drifts = (step.inUnits & 1) != 0;
        drifts ? guess<true>(step, positions, count) : guess<false>(step, positions, count);
        if (isExact(step, positions.t[0]) || confirm(step, positions, count)) {
            return;
        }
    }
    followChain(step, positions, count);
}

/// A multiple of eight outputs, a block at most, that surely leave a source sample untaken, and whose loads stay within
/// the source.
int outputsAllowed(const ResamplerRun& run, const Step& step, const Point& point) {
    // An output's samples begin less than 2 beyond the sum of the steps; the last eight's are loaded as far as 7 more.
    const double left = static_cast<double>(run.srcLeft - point.taken) - 2.0;
    const double forTaking = (left - 1.0) / step.delta - (kLanes - 1);
    const double forLoading = (left - (kLanes - 1)) / step.delta;
    const double before = std::min(forTaking, forLoading);
    if (!(before >= 0.0)) {
        return 0;
    }
    const auto slots = static_cast<double>(std::min<std::int64_t>(run.dstSlots, kBlock));
    return static_cast<int>(std::min(before + kLanes, slots)) & -kLanes;
}

/// Leaves run where output `last` of the block does.
void moveOn(ResamplerRun& run, const Step& step, const Positions& positions, int last) {
    run.src += positions.taken[last];
    run.srcLeft -= positions.taken[last];
    run.dst += std::ptrdiff_t{last + 1} * run.dstStride;
    run.dstSlots -= last + 1;
    run.position = positions.t[last] + step.delta;
}

QIVO_AVX2 void resampleWide(ResamplerRun& run, const Step& step) {
    Positions positions;
    const auto whole = static_cast<std::int32_t>(run.position);
    Point first = {run.position - static_cast<float>(whole), whole};
    for (int count = outputsAllowed(run, step, first); count > 0; count = outputsAllowed(run, step, first)) {
        positions.t[0] = first.t;
        positions.taken[0] = first.taken;
        findPositions(step, positions, count);
        interpolate(run, positions, count);
        moveOn(run, step, positions, count - 1);
        first = {positions.t[count], positions.taken[count] - positions.taken[count - 1]};
    }
    // Where a compiler leaves this out, all scalar arithmetic after it is several times slower.
    _mm256_zeroupper();
}

} // namespace

void resampleBlocks(ResamplerRun& run) noexcept {
    Step step = {};
    if (__builtin_cpu_supports("avx2") && takeApart(run.delta, step) && run.position >= run.delta &&
        run.position < step.whole + 2.0F) {
        resampleWide(run, step);
    }
}

} // namespace qivo

#endif
