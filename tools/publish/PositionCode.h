#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>

// The machine-readable position of a camera in its picture: a strip like that of TimeCode.h, straight above it, whose
// 44 bits are, most significant first:
//
//   12 bits   pan, 0 for -1 to 4094 for 1
//   12 bits   tilt, the same
//   10 bits   zoom, 0 for 0 to 1022 for 1
//   10 bits   focus, the same
//
// Neither function needs anything but the standard library.
namespace qivo {

/** Where a camera stands, as its picture says. The ranges are those of Camera. */
struct PositionCode {
    double pan = 0;
    double tilt = 0;
    double zoom = 0;
    double focus = 0;
};

/** First row of the strip in a picture of this height. */
[[nodiscard]] int positionCodeTop(int height);

/** Writes the strip into a plane of 8-bit samples; values out of their ranges are taken for the nearest in it. */
void writePositionCode(std::uint8_t* plane, int width, int height, std::ptrdiff_t stride, const PositionCode& position,
                       std::uint8_t black = 16, std::uint8_t white = 235);

/** Reads the strip of a picture, given as to readTimeCode(). Nothing where no intact strip is seen. */
[[nodiscard]] std::optional<PositionCode> readPositionCode(const std::uint8_t* pixels, int width, int height,
                                                           std::ptrdiff_t stride, int bytesPerPixel = 4);

} // namespace qivo
