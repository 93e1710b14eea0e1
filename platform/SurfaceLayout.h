#pragma once

#include <array>
#include <cstdint>

namespace qivo {

/// One rectangle of pixels within a surface's memory. All sizes are in bytes, save width and height.
struct IOSurfacePlane {
    std::uint64_t width = 0;
    std::uint64_t height = 0;
    std::uint64_t bytesPerElement = 0;
    std::uint64_t bytesPerRow = 0;
    std::uint64_t offset = 0; ///< from the surface's base

    bool operator==(const IOSurfacePlane&) const = default;
};

/// How the pixels of a surface lie in its memory. Also what one process tells another of a surface that it hands over,
/// byte for byte: of fixed size, without padding.
struct SurfaceLayout {
    static constexpr std::uint32_t maximumPlanes = 4;

    IOSurfacePlane whole; ///< the only plane of a surface without planes; its offset is 0
    std::uint64_t allocSize = 0;
    std::uint32_t pixelFormat = 0;
    std::uint32_t planeCount = 0; ///< 0 for a surface without planes
    std::array<IOSurfacePlane, maximumPlanes> planes{};

    bool operator==(const SurfaceLayout&) const = default;

    /// The plane of this index; plane 0 of a surface without planes is the whole of it. Null if there is no such plane.
    const IOSurfacePlane* plane(std::uint64_t index) const;
};
static_assert(sizeof(SurfaceLayout) == sizeof(IOSurfacePlane) * (1 + SurfaceLayout::maximumPlanes) + 16);

/// Whether every plane has pixels, rows that hold its width, and lies within `allocSize`, which is at most
/// `maximumBytes`. Sizes that overflow are refused, however they were come by.
bool isSound(const SurfaceLayout& layout, std::uint64_t maximumBytes);

} // namespace qivo
