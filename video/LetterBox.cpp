#include "video/LetterBox.h"

#include <cmath>
#include <limits>

namespace qivo {
namespace {

using Limits = std::numeric_limits<std::int32_t>;

std::int32_t truncated(double value) {
    if (std::isnan(value)) {
        return 0;
    }
    if (value <= Limits::min()) {
        return Limits::min();
    }
    return value >= Limits::max() ? Limits::max() : static_cast<std::int32_t>(value);
}

/// Wide enough that the difference of two sizes cannot overflow; half of it fits again.
std::int32_t halfOfDifference(std::int32_t whole, std::int32_t part) {
    return static_cast<std::int32_t>((std::int64_t{whole} - part) / 2);
}

} // namespace

Viewport letterBox(Size area, float aspect) {
    Viewport viewport{0, 0, truncated(area.width), truncated(area.height)};
    const auto width = static_cast<float>(viewport.width);
    const auto height = static_cast<float>(viewport.height);
    const float areaAspect = width / height;
    if (aspect > areaAspect) {
        const std::int32_t fitted = truncated(width / aspect + 0.5F);
        viewport.y = halfOfDifference(viewport.height, fitted);
        viewport.height = fitted;
    } else if (areaAspect > aspect) {
        const std::int32_t fitted = truncated(aspect * height + 0.5F);
        viewport.x = halfOfDifference(viewport.width, fitted);
        viewport.width = fitted;
    }
    return viewport;
}

} // namespace qivo
