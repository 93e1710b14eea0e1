#include "tests/video/FakeSurface.h"

#include "video/IOSurface2D.h"

#include <utility>

namespace qivo {

namespace {

std::vector<std::string> calls;

void record(const char* what, IOSurfaceRef surface, std::uint32_t options, const std::uint32_t* seed) {
    calls.push_back(std::string(what) + " " + (surface ? surface->name : "null") + " " + std::to_string(options) +
                    (seed ? "" : " without seed"));
}

const IOSurfacePlane* planeOf(IOSurfaceRef surface, std::uint64_t plane) {
    return surface && plane == surface->planeIndex ? &surface->plane : nullptr;
}

} // namespace

std::vector<std::string> takeSurfaceCalls() {
    return std::exchange(calls, {});
}

FakeSurfaces& fakeSurfaces() {
    static FakeSurfaces surfaces;
    return surfaces;
}

std::shared_ptr<IOSurface> IOSurfaceCreate(const IOSurfaceProperties& properties,
                                           const std::vector<IOSurfacePlane>& /*planes*/) {
    std::vector<std::int64_t> values;
    for (const char* key : kIOSurface2DKeys) {
        values.push_back(properties.at(key));
    }
    fakeSurfaces().created.push_back(values);
    return std::exchange(fakeSurfaces().next, nullptr);
}

IOReturn IOSurfaceLock(IOSurfaceRef surface, std::uint32_t options, std::uint32_t* seed) {
    record("lock", surface, options, seed);
    if (surface->lockResult == kIOReturnSuccess) {
        *seed = ++surface->seed;
    }
    return surface->lockResult;
}

IOReturn IOSurfaceUnlock(IOSurfaceRef surface, std::uint32_t options, std::uint32_t* seed) {
    record("unlock", surface, options, seed);
    *seed = surface->seed;
    return surface->unlockResult;
}

std::uint64_t IOSurfaceGetHeightOfPlane(IOSurfaceRef surface, std::uint64_t plane) {
    const auto* found = planeOf(surface, plane);
    return found ? found->height : 0;
}

std::uint64_t IOSurfaceGetBytesPerRowOfPlane(IOSurfaceRef surface, std::uint64_t plane) {
    const auto* found = planeOf(surface, plane);
    return found ? found->bytesPerRow : 0;
}

void* IOSurfaceGetBaseAddress(IOSurfaceRef surface) {
    return surface->hasAddress ? surface->pixels.data() : nullptr;
}

void* IOSurfaceGetBaseAddressOfPlane(IOSurfaceRef surface, std::uint64_t plane) {
    return planeOf(surface, plane) ? IOSurfaceGetBaseAddress(surface) : nullptr;
}

} // namespace qivo
