#pragma once

#include <array>
#include <cstdint>

namespace qivo {

/** How colours become samples, and what GStreamer calls that. */
struct ColourSpace {
    double red;  ///< weight of red in luma
    double blue; ///< weight of blue in luma
    bool fullRange;
    const char* colorimetry;

    [[nodiscard]] std::uint8_t black() const { return fullRange ? 0 : 16; }
    [[nodiscard]] std::uint8_t white() const { return fullRange ? 255 : 235; }
};

inline constexpr ColourSpace bt601{0.299, 0.114, false, "bt601"};
inline constexpr ColourSpace bt709{0.2126, 0.0722, false, "bt709"};
inline constexpr ColourSpace jpegColours{0.299, 0.114, true, "1:4:0:0"};

/** What decoders assume of a picture of this height where the stream says nothing: BT.601 up to 576 rows, else BT.709.
 */
[[nodiscard]] inline const ColourSpace& colourSpaceFor(int height) {
    return height > 576 ? bt709 : bt601;
}

/** A colour of components from 0 to 1, gamma-corrected. */
struct Colour {
    double red = 0;
    double green = 0;
    double blue = 0;
};

/** Y, Cb and Cr by ITU-R BT.601 / BT.709, rounded. */
[[nodiscard]] std::array<std::uint8_t, 3> toYCbCr(const Colour& colour, const ColourSpace& space);

/** A colour of a hue in turns (0 red, 1/3 green, 2/3 blue), a saturation and a value from 0 to 1. */
[[nodiscard]] Colour fromHue(double turns, double saturation, double value);

} // namespace qivo
