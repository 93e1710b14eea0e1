#include "tools/publish/PositionCode.h"

#include "tools/publish/TimeCode.h"

#include <algorithm>
#include <cmath>

namespace qivo {
namespace {

constexpr int turnBits = 12;
constexpr int ratioBits = 10;
// Even, so that the middle is a step of its own.
constexpr double turnSteps = 4094;
constexpr double ratioSteps = 1022;

static_assert(2 * turnBits + 2 * ratioBits == timeCodeBits);

std::int64_t stepOf(double ratio, double steps) {
    return std::lround(std::clamp(ratio, 0.0, 1.0) * steps);
}

double ratioOf(std::int64_t bits, int count, double steps) {
    return std::min(1.0, static_cast<double>(bits & ((std::int64_t{1} << count) - 1)) / steps);
}

} // namespace

int positionCodeTop(int height) {
    return timeCodeTop(timeCodeTop(height));
}

void writePositionCode(std::uint8_t* plane, int width, int height, std::ptrdiff_t stride, const PositionCode& position,
                       std::uint8_t black, std::uint8_t white) {
    std::int64_t bits = stepOf((position.pan + 1) / 2, turnSteps);
    bits = bits << turnBits | stepOf((position.tilt + 1) / 2, turnSteps);
    bits = bits << ratioBits | stepOf(position.zoom, ratioSteps);
    bits = bits << ratioBits | stepOf(position.focus, ratioSteps);
    writeTimeCode(plane, width, timeCodeTop(height), stride, bits, black, white);
}

std::optional<PositionCode> readPositionCode(const std::uint8_t* pixels, int width, int height, std::ptrdiff_t stride,
                                             int bytesPerPixel) {
    const auto bits = readTimeCode(pixels, width, timeCodeTop(height), stride, bytesPerPixel);
    if (!bits) {
        return std::nullopt;
    }
    return PositionCode{2 * ratioOf(*bits >> (2 * ratioBits + turnBits), turnBits, turnSteps) - 1,
                        2 * ratioOf(*bits >> (2 * ratioBits), turnBits, turnSteps) - 1,
                        ratioOf(*bits >> ratioBits, ratioBits, ratioSteps), ratioOf(*bits, ratioBits, ratioSteps)};
}

} // namespace qivo
