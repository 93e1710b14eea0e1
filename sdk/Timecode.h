#pragma once

#include <cstdint>

namespace qivo {

/** From here on the timecode of a frame is the sender's wall clock, in units of 100 ns since the Unix epoch; below, it
 *  counts from the connection's beginning. The beginning of the year 2000: no connection lasts thirty years, and a
 *  sender whose clock is earlier has not been told the time. */
inline constexpr std::int64_t firstWallTimecode = 9'466'848'000'000'000;

} // namespace qivo
