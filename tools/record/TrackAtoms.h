#pragma once

#include "tools/record/AtomWriter.h"
#include "tools/record/MovieAtoms.h"

namespace qivo::record {

inline constexpr std::uint32_t pictureTrackId = 1;
inline constexpr std::uint32_t soundTrackId = 2;

/** Frames of sound in units of movieTimescale. */
[[nodiscard]] std::int64_t movieTimeOfSound(const SoundFormat& format, std::int64_t frames);

/** Whether a track's atom lists its samples or leaves them to the fragments. */
enum class Samples { inFragments, listed };

/** The trak atoms of what the movie has. */
void writeTracks(AtomWriter& out, const MovieInfo& info, const SampleTables& tables, Samples samples);

} // namespace qivo::record
