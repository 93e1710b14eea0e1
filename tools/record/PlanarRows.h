#pragma once

#include <cstdint>

namespace qivo::record {

/** How R, G and B of 8 bits become luma (16 to 235) and colour differences (16 to 240, 128 of greys), in 32768ths:
 *  Y = 16 + redToY * R + greenToY * G + blueToY * B, U = 128 + own * B - redOffU * R - greenOffU * G and
 *  V = 128 + own * R - greenOffV * G - blueOffV * B. */
struct PlanarColours {
    std::int16_t redToY = 0;
    std::int16_t greenToY = 0;
    std::int16_t blueToY = 0;
    std::int16_t redOffU = 0;
    std::int16_t greenOffU = 0;
    std::int16_t greenOffV = 0;
    std::int16_t blueOffV = 0;
    std::int16_t own = 0;

    /** Of the parts that red and blue have in luma, between 0 and 1 together. Formulas: Recommendation ITU-R BT.601-7,
     *  2.5. Green takes what rounding leaves: white is 235, and greys have no colour. */
    static PlanarColours of(double red, double blue);
};

/** Where two rows go. */
struct PlanarPlace {
    std::uint8_t* topY = nullptr;
    std::uint8_t* bottomY = nullptr;
    std::uint8_t* u = nullptr;
    std::uint8_t* v = nullptr;
};

/** Whether this processor has what planarRows() needs. */
[[nodiscard]] bool hasPlanarRows();

/** Two rows of `width` pixels, at least 1, of R, G, B and a byte that does not count, as two rows of luma and one of
 *  each colour difference, (width + 1) / 2 long. Of an odd number of rows the last one is both, and so is its place.
 *  Colour differences stand for the even pixels, horizontally, and for between the rows: they are those of the mean of
 *  both rows, half of the pixel's and a quarter of each neighbour's. Beyond an edge it looks as at the edge.
 *  All are within 0.52 levels of the exact value. Nothing beyond the rows is read or written. */
void planarRows(const PlanarColours& colours, const std::uint8_t* top, const std::uint8_t* bottom,
                const PlanarPlace& place, int width);

} // namespace qivo::record
