#include "audio/ResamplerBlocks.h"

#ifndef __x86_64__

namespace qivo {

ResamplerLanes widestResamplerLanes() noexcept {
    return ResamplerLanes::One;
}

void resampleBlocks(ResamplerRun& /*run*/, ResamplerLanes /*lanes*/) noexcept {}

} // namespace qivo

#else

#include "audio/ResamplerLanes.h"
#include "audio/ResamplerSpline.h"

#include <algorithm>
#include <bit>
#include <cstddef>

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

namespace lanes {

constexpr std::array<DriftTable, 2> kDrift = {DriftTable(1), DriftTable(3)};

} // namespace lanes

namespace {

using lanes::Kernel;
using lanes::Positions;
using lanes::Step;

constexpr float kLargestDelta = 256.0F;
constexpr std::ptrdiff_t kHistory = 4;

/// Where an output lies: its position, below 1, and the samples taken for it since run.src.
struct Point {
    float t;
    std::int32_t taken;
};

/// False for a delta whose positions the steps below would not get right.
bool takeApart(float delta, Step& step) {
    if (!(delta > 0.0F && delta < kLargestDelta)) {
        return false;
    }
    step.delta = delta;
    step.whole = static_cast<float>(static_cast<std::int32_t>(delta));
    step.isWhole = delta == step.whole;
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
Point after(const Step& step, Point point) {
    const float less = point.t + step.delta - step.whole;
    const float least = less - 1.0F;
    const bool more = least >= 0.0F;
    return {more ? least : less, point.taken + static_cast<std::int32_t>(step.whole) + (more ? 1 : 0)};
}

/// The block's positions after the first, each from the one before.
void followChain(const Step& step, Positions& positions, int count) {
    for (int i = 1; i < count; ++i) {
        const Point next = after(step, {positions.t[i - 1], positions.taken[i - 1]});
        positions.t[i] = next.t;
        positions.taken[i] = next.taken;
    }
}

/// The two zeros differ.
bool sameBits(float one, float other) {
    return std::bit_cast<std::uint32_t>(one) == std::bit_cast<std::uint32_t>(other);
}

/// As many outputs as a block holds, the slots and probably the source allow.
int outputsProbable(const ResamplerRun& run, const Step& step, const Point& first) {
    const double bySource = static_cast<double>(run.srcLeft - first.taken) / step.delta + 2.0;
    const auto most = static_cast<double>(std::min<std::int64_t>(run.dstSlots, lanes::kBlock));
    return static_cast<int>(std::min(bySource, most));
}

/// Finds the block's positions. Returns how many of its outputs leave a source sample untaken.
int findPositions(const ResamplerRun& run, const Step& step, const Kernel& kernel, const Point& first,
                  Positions& positions) {
    if (first.taken >= run.srcLeft) {
        return 0;
    }
    int count = outputsProbable(run, step, first);
    positions.t[0] = first.t;
    positions.taken[0] = first.taken;
    if (step.isWhole && sameBits(after(step, first).t, first.t)) {
        kernel.repeat(step, positions, count);
    } else if (!step.onGrid || !kernel.guess(step, positions, count)) {
        positions.t[0] = first.t;
        positions.taken[0] = first.taken;
        followChain(step, positions, count);
    }
    while (count > 0 && positions.taken[count - 1] >= run.srcLeft) {
        --count;
    }
    return count;
}

/// The outputs for which samples from before the call are needed still. Returns the first one for which none are.
/// `samples` are the four from before the call and those after them, `taken` the ones taken since.
int interpolateFirst(const ResamplerRun& run, const Positions& positions, int count, const float* samples,
                     std::ptrdiff_t taken) {
    int at = 0;
    for (; at < count && taken + positions.taken[at] < kHistory; ++at) {
        const float* x = samples + taken + positions.taken[at];
        run.dst[at * std::ptrdiff_t{run.dstStride}] = spline(x[0], x[1], x[2], x[3], positions.t[at]) * run.scaling;
    }
    return at;
}

/// Leaves run where output `last` of the block does.
void moveOn(ResamplerRun& run, const Step& step, const Point& last, int count) {
    run.src += last.taken;
    run.srcLeft -= last.taken;
    run.dst += std::ptrdiff_t{count} * run.dstStride;
    run.dstSlots -= count;
    run.position = last.t + step.delta;
}

void resample(ResamplerRun& run, const Step& step, const Kernel& kernel) {
    Positions positions;
    const float* const begin = run.src;
    std::array<float, 2 * kHistory> samples = {};
    std::copy_n(run.history.begin(), kHistory, samples.begin());
    std::copy_n(begin, kHistory, samples.begin() + kHistory);
    Point first = {run.position, 0};
    while (run.dstSlots > 0) {
        const int count = findPositions(run, step, kernel, first, positions);
        if (count == 0) {
            return;
        }
        const Point last = {positions.t[count - 1], positions.taken[count - 1]};
        std::fill_n(positions.taken.begin() + count, lanes::kMost, last.taken);
        int from = 0;
        if (run.src - begin < kHistory) {
            from = interpolateFirst(run, positions, count, samples.data(), run.src - begin);
        }
        kernel.interpolate(run, positions, from, count);
        moveOn(run, step, last, count);
        first = after(step, {last.t, 0});
    }
}

} // namespace

ResamplerLanes widestResamplerLanes() noexcept {
    if (__builtin_cpu_supports("avx512f")) {
        return ResamplerLanes::Sixteen;
    }
    return __builtin_cpu_supports("avx2") ? ResamplerLanes::Eight : ResamplerLanes::One;
}

void resampleBlocks(ResamplerRun& run, ResamplerLanes lanes) noexcept {
    Step step = {};
    if (lanes != ResamplerLanes::One && run.srcLeft >= lanes::kShortest && run.position >= 0.0F &&
        run.position < 1.0F && takeApart(run.delta, step)) {
        resample(run, step, lanes == ResamplerLanes::Sixteen ? lanes::kSixteen : lanes::kEight);
    }
}

} // namespace qivo

#endif
