#include "platform/DmaBuf.h"

#include "platform/SurfaceMemory.h"

#include <fcntl.h>
#include <linux/udmabuf.h>
#include <sys/ioctl.h>
#include <utility>

namespace qivo {

namespace {

DmaBufMaker otherMaker;

Descriptor madeBySystem(IOSurfaceRef surface) {
    const Descriptor device(::open("/dev/udmabuf", O_RDWR | O_CLOEXEC));
    if (!device) {
        return Descriptor();
    }
    udmabuf_create request{};
    request.memfd = static_cast<std::uint32_t>(IOSurfaceGetDescriptor(surface));
    request.flags = UDMABUF_FLAGS_CLOEXEC;
    request.size = IOSurface::pixelBytes(surface->layout());
    return Descriptor(::ioctl(device.number(), UDMABUF_CREATE, &request));
}

} // namespace

Descriptor IOSurfaceCreateDmaBuf(IOSurfaceRef surface) {
    if (!surface) {
        return Descriptor();
    }
    return otherMaker ? otherMaker(surface) : madeBySystem(surface);
}

void setDmaBufMaker(DmaBufMaker maker) {
    otherMaker = std::move(maker);
}

} // namespace qivo
