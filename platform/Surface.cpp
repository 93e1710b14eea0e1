#include "platform/Surface.h"

#include "platform/SurfaceMemory.h"

#include <algorithm>
#include <fcntl.h>
#include <optional>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>

namespace qivo {

namespace {

/// Nothing if a property is missing or negative.
std::optional<SurfaceLayout> layoutOf(const IOSurfaceProperties& properties,
                                      const std::vector<IOSurfacePlane>& planes) {
    bool complete = planes.size() <= SurfaceLayout::maximumPlanes;
    const auto property = [&](const char* key) {
        const auto found = properties.find(key);
        complete = complete && found != properties.end() && found->second >= 0;
        return complete ? static_cast<std::uint64_t>(found->second) : 0;
    };
    SurfaceLayout layout;
    layout.whole.width = property(kIOSurfaceWidth);
    layout.whole.height = property(kIOSurfaceHeight);
    layout.whole.bytesPerElement = property(kIOSurfaceBytesPerElement);
    layout.whole.bytesPerRow = property(kIOSurfaceBytesPerRow);
    layout.allocSize = property(kIOSurfaceAllocSize);
    layout.pixelFormat = static_cast<std::uint32_t>(property(kIOSurfacePixelFormat));
    if (!complete) {
        return std::nullopt;
    }
    layout.planeCount = static_cast<std::uint32_t>(planes.size());
    std::copy(planes.begin(), planes.end(), layout.planes.begin());
    return layout;
}

/// A file without a name. Newer systems may insist that it can not be executed, older ones do not know how to say so.
FileDescriptor unnamedFile() {
    constexpr unsigned notExecutable = 0x8;
    constexpr unsigned flags = MFD_CLOEXEC | MFD_ALLOW_SEALING;
    FileDescriptor file(::memfd_create("qivo-surface", flags | notExecutable));
    return file ? std::move(file) : FileDescriptor(::memfd_create("qivo-surface", flags));
}

/// One of this size, which it keeps; none if there is none to be had. Nobody may open it for writing: who has only a
/// descriptor for reading could otherwise make one for writing of it.
FileDescriptor sealedFile(std::size_t bytes) {
    constexpr mode_t forReading = S_IRUSR | S_IRGRP | S_IROTH;
    FileDescriptor file = unnamedFile();
    const bool done = file && ::ftruncate(file.number(), static_cast<off_t>(bytes)) == 0 &&
                      ::fchmod(file.number(), forReading) == 0 &&
                      ::fcntl(file.number(), F_ADD_SEALS, IOSurface::seals) == 0;
    return done ? std::move(file) : FileDescriptor();
}

const IOSurfacePlane* planeOf(IOSurfaceRef surface, std::uint64_t index) {
    return surface ? surface->layout().plane(index) : nullptr;
}

} // namespace

std::shared_ptr<IOSurface> IOSurfaceCreate(const IOSurfaceProperties& properties,
                                           const std::vector<IOSurfacePlane>& planes) {
    const auto layout = layoutOf(properties, planes);
    if (!layout || !isSound(*layout, IOSurface::maximumBytes())) {
        return nullptr;
    }
    const std::size_t bytes = IOSurface::fileBytes(*layout);
    FileDescriptor file = sealedFile(bytes);
    if (!file) {
        return nullptr;
    }
    SharedMapping mapping(file, bytes, true);
    return mapping.memory() ? std::make_shared<IOSurface>(*layout, std::move(file), std::move(mapping), true) : nullptr;
}

IOReturn IOSurfaceLock(IOSurfaceRef surface, std::uint32_t options, std::uint32_t* seed) {
    return surface ? surface->lock(options, seed) : kIOReturnBadArgument;
}

IOReturn IOSurfaceUnlock(IOSurfaceRef surface, std::uint32_t options, std::uint32_t* seed) {
    return surface ? surface->unlock(options, seed) : kIOReturnBadArgument;
}

std::uint32_t IOSurfaceGetSeed(IOSurfaceRef surface) {
    return surface ? surface->seed() : 0;
}

std::uint64_t IOSurfaceGetWidth(IOSurfaceRef surface) {
    return surface ? surface->layout().whole.width : 0;
}

std::uint64_t IOSurfaceGetHeight(IOSurfaceRef surface) {
    return surface ? surface->layout().whole.height : 0;
}

std::uint64_t IOSurfaceGetBytesPerElement(IOSurfaceRef surface) {
    return surface ? surface->layout().whole.bytesPerElement : 0;
}

std::uint64_t IOSurfaceGetBytesPerRow(IOSurfaceRef surface) {
    return surface ? surface->layout().whole.bytesPerRow : 0;
}

std::uint64_t IOSurfaceGetAllocSize(IOSurfaceRef surface) {
    return surface ? surface->layout().allocSize : 0;
}

std::uint32_t IOSurfaceGetPixelFormat(IOSurfaceRef surface) {
    return surface ? surface->layout().pixelFormat : 0;
}

void* IOSurfaceGetBaseAddress(IOSurfaceRef surface) {
    return surface ? surface->base() : nullptr;
}

std::uint64_t IOSurfaceGetPlaneCount(IOSurfaceRef surface) {
    return surface ? surface->layout().planeCount : 0;
}

std::uint64_t IOSurfaceGetWidthOfPlane(IOSurfaceRef surface, std::uint64_t plane) {
    const auto* found = planeOf(surface, plane);
    return found ? found->width : 0;
}

std::uint64_t IOSurfaceGetHeightOfPlane(IOSurfaceRef surface, std::uint64_t plane) {
    const auto* found = planeOf(surface, plane);
    return found ? found->height : 0;
}

std::uint64_t IOSurfaceGetBytesPerElementOfPlane(IOSurfaceRef surface, std::uint64_t plane) {
    const auto* found = planeOf(surface, plane);
    return found ? found->bytesPerElement : 0;
}

std::uint64_t IOSurfaceGetBytesPerRowOfPlane(IOSurfaceRef surface, std::uint64_t plane) {
    const auto* found = planeOf(surface, plane);
    return found ? found->bytesPerRow : 0;
}

void* IOSurfaceGetBaseAddressOfPlane(IOSurfaceRef surface, std::uint64_t plane) {
    const auto* found = planeOf(surface, plane);
    return found ? surface->base() + found->offset : nullptr;
}

int IOSurfaceGetDescriptor(IOSurfaceRef surface) {
    return surface ? surface->file().number() : -1;
}

} // namespace qivo
