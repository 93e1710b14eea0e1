#include "tools/publish/Colour.h"

#include <algorithm>
#include <cmath>

namespace qivo {

std::array<std::uint8_t, 3> toYCbCr(const Colour& colour, const ColourSpace& space) {
    const double luma = space.red * colour.red + (1 - space.red - space.blue) * colour.green + space.blue * colour.blue;
    const double cb = (colour.blue - luma) / (2 * (1 - space.blue));
    const double cr = (colour.red - luma) / (2 * (1 - space.red));
    const double lumaScale = space.fullRange ? 255 : 219;
    const double chromaScale = space.fullRange ? 255 : 224;
    const auto sample = [](double value) {
        return static_cast<std::uint8_t>(std::clamp(std::lround(value), 0L, 255L));
    };
    return {sample(space.black() + lumaScale * luma), sample(128 + chromaScale * cb), sample(128 + chromaScale * cr)};
}

Colour fromHue(double turns, double saturation, double value) {
    const auto component = [&](double shift) {
        const double position = std::fmod(shift + turns * 6, 6);
        return value - value * saturation * std::clamp(std::min(position, 4 - position), 0.0, 1.0);
    };
    return {component(5), component(3), component(1)};
}

} // namespace qivo
