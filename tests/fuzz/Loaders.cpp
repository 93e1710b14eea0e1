// Whatever a picture file holds: it is read from a file, as surfaces read it, and what comes of it must be whole.
#include "video/IOSurface2D.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <string>
#include <sys/mman.h>
#include <unistd.h>

namespace {

/// A file in memory, kept for all runs.
int file() {
    static const int number = ::memfd_create("picture", MFD_CLOEXEC);
    return number;
}

/// Reads all that a surface says it has, so that the sanitizers see it.
void readAll(qivo::IOSurface2D& surface) {
    if (!surface.surface()) {
        return;
    }
    if (!surface.lock(true)) {
        std::abort();
    }
    unsigned sum = 0;
    const auto* bytes = static_cast<const unsigned char*>(surface.map());
    for (std::size_t at = 0; at < surface.size(); ++at) {
        sum += bytes[at];
    }
    asm volatile("" : : "r"(sum));
    surface.unlock();
    const auto copy = surface.copyWithZone();
    if (copy->surface() && std::memcmp(copy->map(), surface.map(), surface.size()) != 0) {
        std::abort();
    }
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const unsigned char* data, std::size_t size) {
    if (::ftruncate(file(), 0) != 0 || ::pwrite(file(), data, size, 0) != static_cast<ssize_t>(size)) {
        std::abort();
    }
    const std::string path = "/proc/self/fd/" + std::to_string(file());
    readAll(*qivo::IOSurface2D::initWithFile(path.c_str()));
    return 0;
}
