#pragma once

#include <cstdint>

namespace qivo::runtime {

/// How luma and colour differences of 8 bits become R, G and B, in 64ths of a level:
/// luma = y * 257 * lumaScale / 65536 - lumaBias, R = luma + redOfV * (v - 128), G = luma - greenOfU * (u - 128) -
/// greenOfV * (v - 128), B = luma + blueOfU * (u - 128). The bias has half a level in it, for rounding.
struct RgbaColours {
    std::uint16_t lumaScale = 0;
    std::int16_t lumaBias = 0;
    std::int16_t redOfV = 0;
    std::int16_t greenOfU = 0;
    std::int16_t greenOfV = 0;
    std::int16_t blueOfU = 0;

    /// Of the parts that red and blue have in luma, between 0 and 1 together, and of the range: all 256 levels, or 16
    /// to 235 for luma and 16 to 240 for colour differences. Formulas: Recommendation ITU-R BT.601-7, 2.5.
    static RgbaColours of(double red, double blue, bool fullRange);
};

/// Whether this processor has what rgbaRow() needs.
bool hasRgbaRow();

/// One row of `width` pixels, at least 1, as R, G, B and 255, a byte each. Two neighbours share a u and a v, so that
/// there are (width + 1) / 2 of these. Within two and a half levels of the exact value. Nothing beyond the rows is read
/// or written.
void rgbaRow(const RgbaColours& colours, const std::uint8_t* y, const std::uint8_t* u, const std::uint8_t* v,
             std::uint8_t* rgba, int width);

} // namespace qivo::runtime
