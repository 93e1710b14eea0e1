#pragma once

#include "platform/Geometry.h"

#include <cstdint>

namespace qivo {

/// A viewport in pixels; the origin is its lower left corner.
struct Viewport {
    std::int32_t x = 0;
    std::int32_t y = 0;
    std::int32_t width = 0;
    std::int32_t height = 0;

    bool operator==(const Viewport&) const = default;
};

/// The largest viewport of an aspect ratio (width / height) in the middle of an area of so many pixels.
///
/// Sizes are cut to whole pixels toward zero, the ratios are compared in single precision, the fitted side is rounded
/// to the nearest pixel, and the bars differ by one pixel where they must. The whole area is used if the ratios are
/// equal or one is not a number. What does not fit 32 bits is taken as the nearest that does, not a number as 0; a
/// negative aspect gives a negative size, as the arithmetic has it.
Viewport letterBox(Size area, float aspect);

} // namespace qivo
