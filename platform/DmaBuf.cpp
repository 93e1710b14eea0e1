#include "platform/DmaBuf.h"

#include "platform/SurfaceMemory.h"

#include <fcntl.h>
#include <linux/udmabuf.h>
#include <sys/ioctl.h>
#include <utility>

namespace qivo {

namespace {

DmaBufMaker otherMaker;

FileDescriptor madeBySystem(IOSurfaceRef surface) {
    const FileDescriptor device(::open("/dev/udmabuf", O_RDWR | O_CLOEXEC));
    if (!device) {
        return FileDescriptor();
    }
    udmabuf_create request{};
    request.memfd = static_cast<std::uint32_t>(IOSurfaceGetDescriptor(surface));
    request.flags = UDMABUF_FLAGS_CLOEXEC;
    request.size = IOSurface::pixelBytes(surface->layout());
    return FileDescriptor(::ioctl(device.number(), UDMABUF_CREATE, &request));
}

} // namespace

FileDescriptor IOSurfaceCreateDmaBuf(IOSurfaceRef surface) {
    if (!surface) {
        return FileDescriptor();
    }
    return otherMaker ? otherMaker(surface) : madeBySystem(surface);
}

void setDmaBufMaker(DmaBufMaker maker) {
    otherMaker = std::move(maker);
}

} // namespace qivo
