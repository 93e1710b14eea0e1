// The second process of a test: receives a surface over the Unix socket with this number, then fills it with each byte
// that arrives, under a lock, and answers with that byte.
//
//   surface-writer DESCRIPTOR
#include "platform/Surface.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>
#include <sys/socket.h>

int main(int argc, char** argv) {
    using namespace qivo;
    const int socket = argc > 1 ? std::atoi(argv[1]) : -1;
    std::string error;
    const auto surface = IOSurfaceReceive(socket, error);
    if (!surface) {
        std::fprintf(stderr, "surface-writer: %s\n", error.c_str());
        return 1;
    }
    unsigned char byte = 0;
    while (::recv(socket, &byte, 1, 0) == 1) {
        if (IOSurfaceLock(surface.get(), 0, nullptr) != kIOReturnSuccess) {
            return 1;
        }
        std::memset(IOSurfaceGetBaseAddress(surface.get()), byte, IOSurfaceGetAllocSize(surface.get()));
        IOSurfaceUnlock(surface.get(), 0, nullptr);
        if (::send(socket, &byte, 1, MSG_NOSIGNAL) != 1) {
            return 1;
        }
    }
    return 0;
}
