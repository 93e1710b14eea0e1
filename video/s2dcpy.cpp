#include "video/s2dcpy.h"

#include <cstring>

namespace qivo {

namespace {

IOReturn copyLocked(std::size_t srcPlane, IOSurfaceRef src, std::size_t dstPlane, IOSurfaceRef dst) {
    const std::uint64_t height = IOSurfaceGetHeightOfPlane(src, srcPlane);
    if (height != IOSurfaceGetHeightOfPlane(dst, dstPlane)) {
        return kIOReturnCpyErrHeight;
    }
    const std::uint64_t bytesPerRow = IOSurfaceGetBytesPerRowOfPlane(src, srcPlane);
    if (bytesPerRow != IOSurfaceGetBytesPerRowOfPlane(dst, dstPlane)) {
        return kIOReturnCpyErrRowBytes;
    }
    const std::uint64_t length = bytesPerRow * height;
    if (length == 0) {
        return kIOReturnCpyErrSize;
    }
    const void* source = IOSurfaceGetBaseAddressOfPlane(src, srcPlane);
    if (!source) {
        return kIOReturnCpyErrSrcPtr;
    }
    void* destination = IOSurfaceGetBaseAddressOfPlane(dst, dstPlane);
    if (!destination) {
        return kIOReturnCpyErrDstPtr;
    }
    // A plane may be copied onto itself or, within one surface, onto one that overlaps it.
    std::memmove(destination, source, length);
    return kIOReturnCpySuccess;
}

IOReturn copyWithDestination(std::size_t srcPlane, IOSurfaceRef src, std::size_t dstPlane, IOSurfaceRef dst) {
    std::uint32_t seed = 0;
    IOReturn result = IOSurfaceLock(dst, 0, &seed);
    if (result == kIOReturnSuccess) {
        result = copyLocked(srcPlane, src, dstPlane, dst);
        IOSurfaceUnlock(dst, 0, &seed);
    }
    return result;
}

IOReturn copyPlane(std::size_t srcPlane, IOSurfaceRef src, std::size_t dstPlane, IOSurfaceRef dst) {
    if (!src) {
        return kIOReturnCpyErrSrcRef;
    }
    if (!dst) {
        return kIOReturnCpyErrDstRef;
    }
    std::uint32_t seed = 0;
    IOReturn result = IOSurfaceLock(src, kIOSurfaceLockReadOnly, &seed);
    if (result == kIOReturnSuccess) {
        result = copyWithDestination(srcPlane, src, dstPlane, dst);
        IOSurfaceUnlock(src, 0, &seed);
    }
    return result;
}

} // namespace

IOSurfaceRef s2dcpy_ex(std::size_t srcPlane, IOSurfaceRef src, std::size_t dstPlane, IOSurfaceRef dst,
                       IOReturn* status) {
    const IOReturn result = copyPlane(srcPlane, src, dstPlane, dst);
    if (status) {
        *status = result;
    }
    return dst;
}

IOSurfaceRef s2dcpy(IOSurfaceRef src, IOSurfaceRef dst, IOReturn* status) {
    return s2dcpy_ex(0, src, 0, dst, status);
}

} // namespace qivo
