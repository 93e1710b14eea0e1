#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>

// The machine-readable clock in the test picture.
//
// The bottom eighteenth of the picture is a row of 64 cells of equal width, each black or white, read from left to
// right:
//
//   cells  0 to  3   white, black, white, black: the levels to compare with
//   cells  4 to 47   milliseconds since 1970-01-01 00:00:00 UTC, 44 bits, most significant first, white for 1
//   cells 48 to 63   CRC-16 (polynomial 0x1021, start value 0xFFFF) of the 44 bits put into six bytes, most significant
//                    first, the upper four bits of the first byte 0
//
// Cells are read near their centres and compared with the levels beside them, so that the row survives scaling, lossy
// compression and changes of contrast. Neither function needs anything but the standard library.
namespace qivo {

inline constexpr int timeCodeCells = 64;
inline constexpr int timeCodeRowDivisor = 18;
inline constexpr int timeCodeBits = 44;

/** The narrowest picture whose cells are wide enough to be read. */
inline constexpr int timeCodeMinimumWidth = 2 * timeCodeCells;

/** First row of the strip in a picture of this height; even, so that chroma rows do not straddle its edge. */
[[nodiscard]] int timeCodeTop(int height);

/** Writes the strip into a plane of 8-bit samples, a byte a sample. `milliseconds` is taken modulo 2^44; `black` and
 *  `white` are the plane's levels (16 and 235 for limited-range luma). */
void writeTimeCode(std::uint8_t* plane, int width, int height, std::ptrdiff_t stride, std::int64_t milliseconds,
                   std::uint8_t black = 16, std::uint8_t white = 235);

/** Reads the strip of a picture whose pixels are `bytesPerPixel` bytes, of which the first three (or the only one) are
 *  colour in any order. `pixels` is the picture's first row, `stride` the bytes from one row to the next, negative for
 *  pictures stored bottom up. Milliseconds since the epoch, or nothing where no intact strip is seen. */
[[nodiscard]] std::optional<std::int64_t> readTimeCode(const std::uint8_t* pixels, int width, int height,
                                                       std::ptrdiff_t stride, int bytesPerPixel = 4);

} // namespace qivo
