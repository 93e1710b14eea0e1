#pragma once

#include "sdk/qivo.h"

namespace qivo::record {

/** What a movie's pictures look like: decided by the first. */
struct PictureShape {
    int width = 0; ///< in pixels, even, 16 to 8192
    int height = 0;
    int pixelAspectN = 1; ///< width of a pixel / its height
    int pixelAspectD = 1;
    int rateN = 30; ///< pictures a second, as announced; nothing relies on it
    int rateD = 1;

    /** How wide a picture looks for its height. */
    [[nodiscard]] double aspect() const;

    friend bool operator==(const PictureShape&, const PictureShape&) = default;
};

inline constexpr int smallestSide = 16;
inline constexpr int largestSide = 8192;

/** The shape of a movie that begins with this frame. */
[[nodiscard]] PictureShape shapeFor(const QIVOlib_video_frame_v2_t& frame);

/** Where a picture of that aspect goes in a movie of that shape: as large as it can be, in the middle. */
struct PictureArea {
    int x = 0; ///< in pixels, from the left, even
    int y = 0; ///< from the top, even
    int width = 0;
    int height = 0;

    friend bool operator==(const PictureArea&, const PictureArea&) = default;
};

[[nodiscard]] PictureArea areaFor(double aspect, const PictureShape& shape);

/** How wide a frame looks for its height: as it says, else by its size. */
[[nodiscard]] double aspectOf(const QIVOlib_video_frame_v2_t& frame);

} // namespace qivo::record
