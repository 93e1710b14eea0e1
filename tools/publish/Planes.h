#pragma once

#include "tools/publish/Colour.h"
#include "tools/publish/Options.h"
#include "tools/publish/TextMask.h"

#include <array>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <string>

namespace qivo {

/** The three planes of an I420 picture: luma, then Cb and Cr of half its width and height. */
struct PicturePlanes {
    std::array<std::uint8_t*, 3> data{};
    std::array<std::ptrdiff_t, 3> stride{};
};

/** A rectangle of whole pixels; even numbers, for the sake of chroma. */
struct PictureArea {
    int left = 0;
    int top = 0;
    int right = 0;  ///< the first column beyond
    int bottom = 0; ///< the first row beyond
};

/** `over` on `under`, as opaque as `coverage` (0 to 255) says. */
[[nodiscard]] inline std::uint8_t blend(std::uint8_t under, std::uint8_t over, int coverage) {
    return static_cast<std::uint8_t>((under * (255 - coverage) + over * coverage + 127) / 255);
}

/** Fills an area with a colour. */
void fillArea(const PicturePlanes& planes, const PictureArea& area, const Colour& colour, const ColourSpace& space);

/** Puts white text at a place; what would be outside a picture of `size` is left out. */
void drawText(const PicturePlanes& planes, PictureSize size, const TextMask& mask, int left, int top,
              const ColourSpace& space);

/** A running clock, hh:mm:ss.mmm, in digits of equal width. */
class ClockFace {
  public:
    /** At most `width` pixels wide, `height` high. */
    ClockFace(int width, int height);

    [[nodiscard]] int width() const { return length * m_glyphWidth; }

    /** Draws luma alone, from `dark` to `white`, with the upper left corner at `corner`. */
    void draw(std::uint8_t* corner, std::ptrdiff_t stride, std::chrono::milliseconds sinceEpoch, std::uint8_t dark,
              std::uint8_t white) const;

  private:
    static constexpr int length = 12;

    std::array<TextMask, 12> m_glyphs; // digits, colon, point
    int m_glyphWidth = 0;
};

/** A time of day as the clock shows it: hh:mm:ss.mmm, local time. */
[[nodiscard]] std::string clockText(std::chrono::milliseconds sinceEpoch);

/** The colour of a source's band: neighbours get clearly different ones. */
[[nodiscard]] Colour bandColour(std::size_t source);

} // namespace qivo
