#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace qivo::test {

/// A movie's pictures and sound, decoded from beginning to end.
struct DecodedMovie {
    struct Picture {
        double time = 0;                       ///< seconds
        std::optional<std::int64_t> published; ///< the time code in it, ms since the epoch
        int middle = 0;                        ///< luma in the middle
        int corner = 0;                        ///< luma in the upper left corner
    };

    bool readable = false; ///< to its end, without an error
    std::string error;
    int width = 0;
    int height = 0;
    std::vector<Picture> pictures;
    int rate = 0;
    int channels = 0;
    double soundStart = 0;    ///< seconds
    std::vector<float> sound; ///< the first channel
    double soundJump = 0;     ///< the largest difference between where a piece of sound is and where it should be, s

    double soundEnd() const { return rate > 0 ? soundStart + static_cast<double>(sound.size()) / rate : 0; }
};

DecodedMovie decodeMovie(const std::string& path);

/// When the pictures turn white, in seconds.
std::vector<double> flashes(const DecodedMovie& movie);

/// When sound is heard after at least 0.2 s of silence, in seconds.
std::vector<double> tones(const DecodedMovie& movie);

} // namespace qivo::test
