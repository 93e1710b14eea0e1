#include "tests/audio/AllocationCount.h"

#include <cerrno>
#include <cstddef>
#include <cstdlib>

#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
#define QIVO_SANITIZED 1
#elif defined(__has_feature)
#if __has_feature(address_sanitizer) || __has_feature(thread_sanitizer)
#define QIVO_SANITIZED 1
#endif
#endif

namespace {

thread_local std::uint64_t allocations = 0;

} // namespace

std::uint64_t qivo::test::allocationsOfThisThread() {
    return allocations;
}

extern "C" {

#ifdef QIVO_SANITIZED

// The sanitizer calls this after each allocation.
__attribute__((visibility("default"))) void __sanitizer_malloc_hook(const volatile void* /*memory*/,
                                                                    std::size_t /*size*/) {
    ++allocations;
}

#else

// The C library's own functions under their second names.
void* __libc_malloc(std::size_t size);
void* __libc_calloc(std::size_t count, std::size_t size);
void* __libc_realloc(void* memory, std::size_t size);
void* __libc_memalign(std::size_t alignment, std::size_t size);
void* __libc_valloc(std::size_t size);
void* __libc_pvalloc(std::size_t size);

__attribute__((visibility("default"))) void* malloc(std::size_t size) {
    ++allocations;
    return __libc_malloc(size);
}

__attribute__((visibility("default"))) void* calloc(std::size_t count, std::size_t size) {
    ++allocations;
    return __libc_calloc(count, size);
}

__attribute__((visibility("default"))) void* realloc(void* memory, std::size_t size) {
    ++allocations;
    return __libc_realloc(memory, size);
}

__attribute__((visibility("default"))) void* aligned_alloc(std::size_t alignment, std::size_t size) {
    ++allocations;
    return __libc_memalign(alignment, size);
}

__attribute__((visibility("default"))) void* memalign(std::size_t alignment, std::size_t size) {
    ++allocations;
    return __libc_memalign(alignment, size);
}

__attribute__((visibility("default"))) void* valloc(std::size_t size) {
    ++allocations;
    return __libc_valloc(size);
}

__attribute__((visibility("default"))) void* pvalloc(std::size_t size) {
    ++allocations;
    return __libc_pvalloc(size);
}

__attribute__((visibility("default"))) void* reallocarray(void* memory, std::size_t count, std::size_t size) {
    ++allocations;
    std::size_t all = 0;
    if (__builtin_mul_overflow(count, size, &all)) {
        errno = ENOMEM;
        return nullptr;
    }
    return __libc_realloc(memory, all);
}

__attribute__((visibility("default"))) int posix_memalign(void** memory, std::size_t alignment, std::size_t size) {
    ++allocations;
    *memory = __libc_memalign(alignment, size);
    return *memory != nullptr ? 0 : ENOMEM;
}

#endif

} // extern "C"
