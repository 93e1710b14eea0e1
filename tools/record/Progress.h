#pragma once

#include "tools/record/SourceClock.h"

#include <cstdint>
#include <string>

namespace qivo::record {

/** How far a recording is. */
struct Progress {
    Nanoseconds length{};       ///< of the movie
    std::uint64_t pictures = 0; ///< written
    std::uint64_t dropped = 0;  ///< received, but left out: encoder or disk were behind, they could not be read, or the
                                ///< encoder had taken them when it failed or ended
    std::uint64_t bytes = 0;    ///< of the file
    Nanoseconds soundLost{};    ///< received, but left out because the disk was behind
    std::string waiting;        ///< why it does not go on just now; empty if it does
};

/** One line, without its end: "time 00:01:02.345 pictures 1870 dropped 0 bytes 123456", where sound was lost
 *  " sound lost 00:00:01.250", and where it waits " waiting for …". */
[[nodiscard]] std::string progressLine(const Progress& progress);

/** Hours, minutes, seconds and milliseconds. */
[[nodiscard]] std::string timeText(Nanoseconds time);

} // namespace qivo::record
