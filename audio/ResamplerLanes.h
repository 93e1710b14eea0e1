#pragma once

#include <array>
#include <cstddef>
#include <cstdint>

namespace qivo {

struct ResamplerRun;

/// What the instruction sets share that make several outputs of the resampler side by side.
namespace lanes {

constexpr int kMost = 16;   // outputs side by side
constexpr int kBlock = 512; // outputs whose positions are found before their samples are read
constexpr std::int32_t kRounded = 1 << 24;

/// Sources with fewer samples than this are left to the caller: in all others the widest loads find room.
constexpr int kShortest = 36;

/// What rounding does in eight steps from a position of a given residue.
struct Drift {
    std::array<std::int8_t, 8> before; ///< added before each of the steps, in g
    std::int32_t total;                ///< added by all of them
    std::int32_t unused;
};

/// For deltas that are 1 or 3 modulo 4. A mask has a bit for each of eight steps, set if the step reaches 2^24; a
/// residue is a position modulo 4, given as the offset of its entry.
struct DriftTable {
    static constexpr unsigned kEntry = sizeof(Drift);
    static constexpr unsigned kResidues = 3 * kEntry;

    std::array<std::array<Drift, 4>, 256> drift = {};
    std::array<std::uint64_t, 256> residueAfter = {}; ///< the residue after the steps, shifted by the one before

    constexpr explicit DriftTable(unsigned delta) {
        for (unsigned mask = 0; mask < 256; ++mask) {
            for (unsigned residue = 0; residue < 4; ++residue) {
                const std::uint64_t after = fill(drift[mask][residue], delta, residue, mask);
                residueAfter[mask] |= after * kEntry << residue * kEntry;
            }
        }
    }

    static constexpr unsigned fill(Drift& drift, unsigned delta, unsigned residue, unsigned mask) {
        constexpr int toMultipleOf4[4] = {0, -1, 0, 1};
        for (unsigned step = 0; step < drift.before.size(); ++step) {
            drift.before[step] = static_cast<std::int8_t>(drift.total);
            residue = (residue + delta) & 3;
            if ((mask >> step & 1) != 0) {
                drift.total += toMultipleOf4[residue];
                residue = (residue + static_cast<unsigned>(toMultipleOf4[residue])) & 3;
            }
        }
        return residue;
    }

    /// The entry of eight steps; moves the residue on.
    [[nodiscard]] const Drift& take(unsigned mask, unsigned& residue) const {
        const auto* entries = reinterpret_cast<const std::byte*>(drift[mask].data());
        const auto* entry = reinterpret_cast<const Drift*>(entries + residue);
        residue = static_cast<unsigned>(residueAfter[mask] >> residue) & kResidues;
        return *entry;
    }
};

/// By delta modulo 4: 1, 3.
extern const std::array<DriftTable, 2> kDrift;

/// A delta taken apart.
struct Step {
    float delta;
    float whole;          ///< its integer part: a step takes that many samples or one more
    bool isWhole;         ///< delta is an integer: most often no position differs from the first
    bool onGrid;          ///< positions are multiples of `unit` and can be guessed
    float unit;           ///< g
    float perUnit;        ///< 1 / g
    int shift;            ///< log2 of 1 / g
    std::int32_t inUnits; ///< delta / g
};

/// Where the outputs of a block lie: their positions, below 1, and the samples taken for them since run.src. Beyond a
/// block's outputs there is room for as many as are made side by side.
struct Positions {
    alignas(64) std::array<float, kBlock + kMost> t;
    alignas(64) std::array<std::int32_t, kBlock + kMost> taken;
};

/// What an instruction set does.
struct Kernel {
    /// Finds the block's positions from the first, for a step that is on the grid. Returns false, with anything in
    /// `positions`, where they are not what steps in single precision lead to.
    bool (*guess)(const Step& step, Positions& positions, int count);
    /// Does the same where every output's position is the first one's.
    void (*repeat)(const Step& step, Positions& positions, int count);
    /// Makes outputs [from, count) of a block; the block's first one belongs into run.dst. All their samples lie within
    /// the source, which has kShortest or more. The kMost entries of `taken` behind the last output's repeat it, so
    /// that the lanes without an output read what one with an output reads.
    void (*interpolate)(const ResamplerRun& run, const Positions& positions, int from, int count);
};

extern const Kernel kEight;
extern const Kernel kSixteen;

} // namespace lanes

} // namespace qivo
