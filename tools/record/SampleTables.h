#pragma once

#include "tools/record/MovieFormat.h"

#include <cstdint>
#include <vector>

namespace qivo::record {

/** Where everything lies that has been written: what the index of a finished movie is made of. Twenty bytes a picture
 *  and two dozen a fragment, about 50 MB for a day. */
struct SampleTables {
    struct Picture {
        std::int64_t start = 0;
        std::uint32_t duration = 0; ///< until the next one where there is one, as far as the number goes
        std::uint32_t size = 0;
        bool key = false;
    };
    struct Chunk {
        std::uint64_t offset = 0; ///< in the file
        std::uint32_t count = 0;  ///< pictures or frames of sound
    };

    std::vector<Picture> pictures;
    std::vector<Chunk> pictureChunks;
    std::vector<Chunk> soundChunks;
    std::int64_t soundStart = 0;  ///< in frames; later than 0 where the sound began later
    std::int64_t soundFrames = 0; ///< without a gap

    /** Notes a fragment whose pictures, and behind them its sound, begin at `offset`. */
    void add(const Fragment& fragment, std::uint64_t offset, std::size_t soundFrameBytes);

    [[nodiscard]] std::int64_t pictureStart() const { return pictures.empty() ? 0 : pictures.front().start; }
    [[nodiscard]] std::int64_t pictureEnd() const;
    /** False if a plain movie's index has no numbers large enough: more than 2^32 frames of sound (24 hours at 48000
     * Hz), or a picture that stands for more than 2^31 units of movieTimescale (6 hours). */
    [[nodiscard]] bool fitsIndex() const;
};

} // namespace qivo::record
