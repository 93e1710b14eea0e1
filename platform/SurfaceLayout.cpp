#include "platform/SurfaceLayout.h"

#include <algorithm>

namespace qivo {

namespace {

bool isWithin(const IOSurfacePlane& plane, std::uint64_t bytes) {
    if (plane.width == 0 || plane.height == 0 || plane.bytesPerElement == 0 || plane.offset > bytes) {
        return false;
    }
    const std::uint64_t room = bytes - plane.offset;
    return plane.bytesPerRow / plane.bytesPerElement >= plane.width && room / plane.bytesPerRow >= plane.height;
}

} // namespace

const IOSurfacePlane* SurfaceLayout::plane(std::uint64_t index) const {
    if (planeCount == 0) {
        return index == 0 ? &whole : nullptr;
    }
    return index < planeCount ? &planes[index] : nullptr;
}

bool isSound(const SurfaceLayout& layout, std::uint64_t maximumBytes) {
    if (layout.allocSize > maximumBytes || layout.planeCount > SurfaceLayout::maximumPlanes ||
        layout.whole.offset != 0) {
        return false;
    }
    const auto fits = [&](const IOSurfacePlane& plane) { return isWithin(plane, layout.allocSize); };
    return fits(layout.whole) && std::all_of(layout.planes.begin(), layout.planes.begin() + layout.planeCount, fits);
}

} // namespace qivo
