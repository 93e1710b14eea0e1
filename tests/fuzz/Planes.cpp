// Whatever layouts surfaces are given, by properties, in a picture's description or by another process: what is
// accepted must be in memory, and copies must stay within it. The input is taken as numbers, most of them small.
#include "platform/CGBitmapContext.h"
#include "tests/platform/SurfaceSocket.h"
#include "video/IOSurface2D.h"
#include "video/s2dcpy.h"

#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <string>
#include <sys/mman.h>
#include <unistd.h>
#include <vector>

using namespace qivo;

namespace {

class Numbers {
  public:
    Numbers(const unsigned char* data, std::size_t size) : _data(data), _end(data + size) {}

    std::uint64_t byte() { return _data < _end ? *_data++ : 0; }
    /// Small, at the edge of a power of two, or anything.
    std::uint64_t number() {
        const std::uint64_t kind = byte();
        if (kind < 160) {
            return byte();
        }
        if (kind < 200) {
            return (std::uint64_t{1} << byte() % 64) - kind % 3;
        }
        std::uint64_t value = 0;
        for (int count = 0; count < 8; ++count) {
            value = value << 8 | byte();
        }
        return value;
    }

  private:
    const unsigned char* _data;
    const unsigned char* _end;
};

IOSurfacePlane planeOf(Numbers& numbers) {
    return {.width = numbers.number(),
            .height = numbers.number(),
            .bytesPerElement = numbers.number(),
            .bytesPerRow = numbers.number(),
            .offset = numbers.number()};
}

/// Large surfaces are sound too, but take all the time.
bool isSmall(std::uint64_t bytes) {
    return bytes <= std::uint64_t{1} << 20;
}

std::shared_ptr<IOSurface> created(Numbers& numbers) {
    const IOSurfacePlane whole = planeOf(numbers);
    const std::uint64_t bytes = numbers.number();
    std::vector<IOSurfacePlane> planes(numbers.byte() % 6);
    for (auto& plane : planes) {
        plane = planeOf(numbers);
    }
    const auto number = [](std::uint64_t value) { return static_cast<std::int64_t>(value); };
    return isSmall(bytes) ? IOSurfaceCreate({{kIOSurfaceWidth, number(whole.width)},
                                             {kIOSurfaceHeight, number(whole.height)},
                                             {kIOSurfacePixelFormat, number(numbers.byte())},
                                             {kIOSurfaceBytesPerElement, number(whole.bytesPerElement)},
                                             {kIOSurfaceBytesPerRow, number(whole.bytesPerRow)},
                                             {kIOSurfaceAllocSize, number(bytes)}},
                                            planes)
                          : nullptr;
}

/// Every byte of every plane, each of which must lie within the surface's memory.
void touch(IOSurfaceRef surface) {
    for (std::uint64_t plane = 0; plane < 6; ++plane) {
        auto* base = static_cast<unsigned char*>(IOSurfaceGetBaseAddressOfPlane(surface, plane));
        const auto bytes = IOSurfaceGetBytesPerRowOfPlane(surface, plane) * IOSurfaceGetHeightOfPlane(surface, plane);
        if ((base == nullptr) != (bytes == 0)) {
            std::abort();
        }
        if (base) {
            const auto offset = base - static_cast<unsigned char*>(IOSurfaceGetBaseAddress(surface));
            if (offset < 0 || static_cast<std::uint64_t>(offset) + bytes > IOSurfaceGetAllocSize(surface)) {
                std::abort();
            }
            std::memset(base, static_cast<int>(plane), bytes);
        }
    }
}

void copyPlanes(Numbers& numbers) {
    const auto source = created(numbers);
    const auto target = created(numbers);
    touch(source.get());
    touch(target.get());
    IOReturn status = kIOReturnError;
    s2dcpy_ex(numbers.number(), source.get(), numbers.number(), target.get(), &status);
    if (status == kIOReturnError || (status == kIOReturnCpySuccess && (!source || !target))) {
        std::abort();
    }
}

void drawPicture(Numbers& numbers) {
    CGImageLayout layout;
    layout.width = numbers.number();
    layout.height = numbers.number();
    layout.bitsPerComponent = numbers.number();
    layout.bitsPerPixel = numbers.number();
    layout.bytesPerRow = numbers.number();
    layout.bitmapInfo = static_cast<CGBitmapInfo>(numbers.byte() % 8 | numbers.byte() % 8 << 12);
    const std::vector<unsigned char> pixels(numbers.number() % 65536 + 1);
    const auto image = CGImage::create(layout, pixels.data(), pixels.size());
    const auto surface = IOSurface2D::initWithImageRef(image.get());
    touch(surface->surface());
}

void receive(Numbers& numbers) {
    SurfaceMessage message;
    message.layout.whole = planeOf(numbers);
    message.layout.allocSize = numbers.number();
    message.layout.planeCount = static_cast<std::uint32_t>(numbers.byte() % 6);
    for (auto& plane : message.layout.planes) {
        plane = planeOf(numbers);
    }
    const FileDescriptor memory(::memfd_create("surface", MFD_ALLOW_SEALING));
    const std::uint64_t pages = 1 + numbers.byte();
    if (!isSmall(message.layout.allocSize) || ::ftruncate(memory.number(), static_cast<off_t>(pages * 4096)) != 0) {
        return;
    }
    ::fcntl(memory.number(), F_ADD_SEALS, F_SEAL_SHRINK | F_SEAL_GROW | F_SEAL_SEAL);
    SurfaceSocket socket;
    socket.send(message, {memory.number()});
    std::string error;
    touch(IOSurfaceReceive(socket.there(), error).get());
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const unsigned char* data, std::size_t size) {
    Numbers numbers(data, size);
    switch (numbers.byte() % 3) {
    case 0:
        copyPlanes(numbers);
        break;
    case 1:
        drawPicture(numbers);
        break;
    default:
        receive(numbers);
    }
    return 0;
}
