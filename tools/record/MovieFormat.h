#pragma once

#include <algorithm>
#include <cstdint>
#include <limits>
#include <vector>

namespace qivo::record {

/** Units a second in which pictures and the whole movie are timed. */
inline constexpr std::uint32_t movieTimescale = 90000;

/** What is the same for all pictures of a movie. */
struct PictureFormat {
    int width = 0; ///< in pixels, even
    int height = 0;
    int pixelAspectN = 1; ///< width of a pixel / its height
    int pixelAspectD = 1;
    std::vector<std::uint8_t> decoderSetup; ///< the content of the avcC atom
};

/** What is the same for all sound of a movie: interleaved signed integers of three bytes, most significant first. */
struct SoundFormat {
    int rate = 0; ///< samples a second in each channel
    int channels = 0;

    friend bool operator==(const SoundFormat&, const SoundFormat&) = default;
};

inline constexpr int bytesPerSoundSample = 3;

[[nodiscard]] inline std::size_t bytesPerSoundFrame(const SoundFormat& format) {
    return static_cast<std::size_t>(format.channels) * bytesPerSoundSample;
}

/** A coded picture in its place. */
struct MoviePicture {
    std::vector<std::uint8_t> bytes; ///< units that begin with their length in four bytes
    std::int64_t start = 0;          ///< in units of movieTimescale
    std::uint32_t duration = 0;      ///< the same
    bool key = false;                ///< can be decoded without others
};

/** How long a picture stands until the next one, in the number that files have for it; what is longer becomes the
 *  longest that all readers take. */
[[nodiscard]] inline std::uint32_t pictureDuration(std::int64_t units) {
    return static_cast<std::uint32_t>(std::min<std::int64_t>(units, std::numeric_limits<std::int32_t>::max()));
}

/** What is written at once: from then on it can be played, whatever happens. */
struct Fragment {
    std::vector<MoviePicture> pictures; ///< in the order of their starts
    std::int64_t soundStart = 0;        ///< in frames, one sample of each channel
    std::vector<std::uint8_t> sound;    ///< whole frames
};

} // namespace qivo::record
