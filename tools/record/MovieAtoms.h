#pragma once

#include "tools/record/MovieFormat.h"
#include "tools/record/SampleTables.h"

#include <cstdint>
#include <optional>
#include <vector>

namespace qivo::record {

/** What the atoms tell of the whole movie. */
struct MovieInfo {
    std::optional<PictureFormat> picture; ///< empty as long as there is none
    std::optional<SoundFormat> sound;
    std::uint64_t created = 0; ///< seconds since 1904-01-01 00:00:00 UTC
};

/** The first bytes of the file: its type, a place for the header of one large data atom, the index of a movie of
 *  fragments with the lengths so far, and padding. Always `headBytes` long, so that it can be written anew in its
 * place. */
inline constexpr std::size_t headBytes = 4096;
/** Where the place for the data atom's header lies, and its length. */
inline constexpr std::size_t dataHeaderOffset = 20;
inline constexpr std::size_t dataHeaderBytes = 16;

[[nodiscard]] std::vector<std::uint8_t> headOf(const MovieInfo& info, const SampleTables& tables);

/** A fragment's index and the header of its data, which follows: pictures, then sound. `sequence` counts from 1. */
[[nodiscard]] std::vector<std::uint8_t> fragmentHead(const MovieInfo& info, const Fragment& fragment,
                                                     std::uint32_t sequence);

/** The complete index, for the end of a finished movie. */
[[nodiscard]] std::vector<std::uint8_t> indexOf(const MovieInfo& info, const SampleTables& tables);

/** The header that makes everything from `dataHeaderOffset` to `end` data, over which the complete index rules. */
[[nodiscard]] std::vector<std::uint8_t> dataHeader(std::uint64_t end);

} // namespace qivo::record
