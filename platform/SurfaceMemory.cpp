#include "platform/SurfaceMemory.h"

#include <fcntl.h>
#include <sys/mman.h>
#include <unistd.h>
#include <utility>

#if defined(__SANITIZE_ADDRESS__)
#define QIVO_ADDRESS_SANITIZER
#elif defined(__has_feature)
#if __has_feature(address_sanitizer)
#define QIVO_ADDRESS_SANITIZER
#endif
#endif
#ifdef QIVO_ADDRESS_SANITIZER
#include <sanitizer/asan_interface.h>
#else
#define ASAN_POISON_MEMORY_REGION(address, bytes) (static_cast<void>(address), static_cast<void>(bytes))
#define ASAN_UNPOISON_MEMORY_REGION(address, bytes) (static_cast<void>(address), static_cast<void>(bytes))
#endif

namespace qivo {

namespace {

constexpr std::uint32_t knownOptions = kIOSurfaceLockReadOnly | kIOSurfaceLockAvoidSync;

std::uint64_t pageBytes() {
    static const auto bytes = static_cast<std::uint64_t>(::sysconf(_SC_PAGESIZE));
    return bytes;
}

} // namespace

SharedMapping::SharedMapping(const FileDescriptor& file, std::size_t bytes, bool writable) : _bytes(bytes) {
    void* memory = ::mmap(nullptr, bytes, PROT_READ | (writable ? PROT_WRITE : 0), MAP_SHARED, file.number(), 0);
    _memory = memory == MAP_FAILED ? nullptr : static_cast<std::byte*>(memory);
}

SharedMapping::~SharedMapping() {
    if (_memory) {
        ::munmap(_memory, _bytes);
    }
}

SharedMapping::SharedMapping(SharedMapping&& other) noexcept
    : _memory(std::exchange(other._memory, nullptr)), _bytes(std::exchange(other._bytes, 0)) {}

const int IOSurface::seals = F_SEAL_SHRINK | F_SEAL_GROW | F_SEAL_SEAL;

std::uint64_t IOSurface::maximumBytes() {
    static const auto bytes = static_cast<std::uint64_t>(::sysconf(_SC_PHYS_PAGES)) * pageBytes();
    return bytes;
}

std::size_t IOSurface::pixelBytes(const SurfaceLayout& layout) {
    return (layout.allocSize + pageBytes() - 1) / pageBytes() * pageBytes();
}

std::size_t IOSurface::fileBytes(const SurfaceLayout& layout) {
    return pixelBytes(layout) + pageBytes();
}

IOSurface::IOSurface(const SurfaceLayout& layout, FileDescriptor file, SharedMapping mapping, bool writable)
    : _layout(layout), _file(std::move(file)), _mapping(std::move(mapping)), _writable(writable) {
    ASAN_POISON_MEMORY_REGION(base() + _layout.allocSize, fileBytes(_layout) - _layout.allocSize);
    ASAN_UNPOISON_MEMORY_REGION(&sharedSeed(), sizeof sharedSeed());
}

IOSurface::~IOSurface() {
    ASAN_UNPOISON_MEMORY_REGION(base(), fileBytes(_layout)); // other memory may lie there next
}

std::atomic<std::uint32_t>& IOSurface::sharedSeed() const {
    static_assert(std::atomic<std::uint32_t>::is_always_lock_free && sizeof(std::atomic<std::uint32_t>) == 4);
    return *reinterpret_cast<std::atomic<std::uint32_t>*>(base() + pixelBytes(_layout));
}

std::uint32_t IOSurface::seed() const {
    return sharedSeed().load(std::memory_order_acquire);
}

void IOSurface::changeSeed() {
    sharedSeed().fetch_add(1, std::memory_order_acq_rel);
}

IOReturn IOSurface::lock(std::uint32_t options, std::uint32_t* receivedSeed) {
    if (options & ~knownOptions) {
        return kIOReturnBadArgument;
    }
    const bool forWriting = !(options & kIOSurfaceLockReadOnly);
    if (forWriting && !_writable) {
        return kIOReturnNotWritable;
    }
    const std::lock_guard guard(_lock);
    ++(forWriting ? _writers : _readers);
    if (forWriting) {
        changeSeed();
    }
    if (receivedSeed) {
        *receivedSeed = seed();
    }
    return kIOReturnSuccess;
}

IOReturn IOSurface::unlock(std::uint32_t options, std::uint32_t* receivedSeed) {
    if (options & ~knownOptions) {
        return kIOReturnBadArgument;
    }
    const std::lock_guard guard(_lock);
    if (_writers == 0 && _readers == 0) {
        return kIOReturnNotPermitted;
    }
    const bool asWriter = options & kIOSurfaceLockReadOnly ? _readers == 0 : _writers > 0;
    --(asWriter ? _writers : _readers);
    if (asWriter) {
        changeSeed();
    }
    if (receivedSeed) {
        *receivedSeed = seed();
    }
    return kIOReturnSuccess;
}

} // namespace qivo
