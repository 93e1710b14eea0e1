#include "tools/record/PictureShape.h"

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <numeric>

namespace qivo::record {
namespace {

constexpr double narrowest = 0.05;
constexpr double widest = 20;
constexpr double sameAspect = 0.005; ///< what whole pixels do to a small picture
constexpr int aspectDenominator = 1000;
constexpr int highestRate = 1000;

int sideFor(std::int32_t pixels) {
    return std::clamp(pixels, smallestSide, largestSide) & ~1;
}

/// The even number next to a length, within a side.
int evenWithin(double length, int side) {
    return std::clamp(2 * static_cast<int>(std::lround(length / 2)), 2, side);
}

} // namespace

double PictureShape::aspect() const {
    return static_cast<double>(width) * pixelAspectN / (static_cast<double>(height) * pixelAspectD);
}

double aspectOf(const QIVOlib_video_frame_v2_t& frame) {
    const double told = frame.picture_aspect_ratio;
    return told >= narrowest && told <= widest ? told : static_cast<double>(frame.xres) / frame.yres;
}

PictureShape shapeFor(const QIVOlib_video_frame_v2_t& frame) {
    PictureShape shape;
    shape.width = sideFor(frame.xres);
    shape.height = sideFor(frame.yres);
    const double pixelAspect = aspectOf(frame) * shape.height / shape.width;
    if (std::abs(pixelAspect - 1) > 2 * sameAspect) {
        shape.pixelAspectN = std::max(1, static_cast<int>(std::lround(pixelAspect * aspectDenominator)));
        shape.pixelAspectD = aspectDenominator;
        const int common = std::gcd(shape.pixelAspectN, shape.pixelAspectD);
        shape.pixelAspectN /= common;
        shape.pixelAspectD /= common;
    }
    if (frame.frame_rate_N > 0 && frame.frame_rate_D > 0 && frame.frame_rate_N / frame.frame_rate_D <= highestRate) {
        shape.rateN = frame.frame_rate_N;
        shape.rateD = frame.frame_rate_D;
    }
    return shape;
}

PictureArea areaFor(double aspect, const PictureShape& shape) {
    PictureArea area{0, 0, shape.width, shape.height};
    const double ratio = aspect / shape.aspect();
    if (ratio < 1 - sameAspect) {
        area.width = evenWithin(shape.width * ratio, shape.width);
        area.x = (shape.width - area.width) / 2 & ~1;
    } else if (ratio > 1 + sameAspect) {
        area.height = evenWithin(shape.height / ratio, shape.height);
        area.y = (shape.height - area.height) / 2 & ~1;
    }
    return area;
}

} // namespace qivo::record
