#include "tests/audio/WaitCount.h"

#include <dlfcn.h>
#include <linux/futex.h>
#include <pthread.h>
#include <semaphore.h>
#include <sys/syscall.h>

#include <cstdarg>

namespace {

thread_local std::uint64_t waits = 0;

/// The function that would have been called: the newest where the library has several of that name.
template <class Function>
Function* next(const char* name) {
    for (const char* version : {"GLIBC_2.34", "GLIBC_2.30", "GLIBC_2.3.2"}) {
        if (void* const found = dlvsym(RTLD_NEXT, name, version)) {
            return reinterpret_cast<Function*>(found);
        }
    }
    return reinterpret_cast<Function*>(dlsym(RTLD_NEXT, name));
}

template <class Function, class... Arguments>
auto counted(Function*& function, const char* name, Arguments... arguments) {
    ++waits;
    if (function == nullptr) {
        function = next<Function>(name); // the same, whoever finds it
    }
    return function(arguments...);
}

} // namespace

std::uint64_t qivo::test::waitsOfThisThread() {
    return waits;
}

#define QIVO_SHOWN __attribute__((visibility("default")))

extern "C" {

QIVO_SHOWN int pthread_mutex_lock(pthread_mutex_t* mutex) noexcept {
    static int (*function)(pthread_mutex_t*) = nullptr;
    return counted(function, "pthread_mutex_lock", mutex);
}

QIVO_SHOWN int pthread_rwlock_rdlock(pthread_rwlock_t* lock) noexcept {
    static int (*function)(pthread_rwlock_t*) = nullptr;
    return counted(function, "pthread_rwlock_rdlock", lock);
}

QIVO_SHOWN int pthread_rwlock_wrlock(pthread_rwlock_t* lock) noexcept {
    static int (*function)(pthread_rwlock_t*) = nullptr;
    return counted(function, "pthread_rwlock_wrlock", lock);
}

QIVO_SHOWN int pthread_cond_wait(pthread_cond_t* condition, pthread_mutex_t* mutex) {
    static int (*function)(pthread_cond_t*, pthread_mutex_t*) = nullptr;
    return counted(function, "pthread_cond_wait", condition, mutex);
}

QIVO_SHOWN int pthread_cond_clockwait(pthread_cond_t* condition, pthread_mutex_t* mutex, clockid_t clock,
                                      const timespec* until) {
    static int (*function)(pthread_cond_t*, pthread_mutex_t*, clockid_t, const timespec*) = nullptr;
    return counted(function, "pthread_cond_clockwait", condition, mutex, clock, until);
}

QIVO_SHOWN int pthread_cond_timedwait(pthread_cond_t* condition, pthread_mutex_t* mutex, const timespec* until) {
    static int (*function)(pthread_cond_t*, pthread_mutex_t*, const timespec*) = nullptr;
    return counted(function, "pthread_cond_timedwait", condition, mutex, until);
}

QIVO_SHOWN int pthread_mutex_timedlock(pthread_mutex_t* mutex, const timespec* until) noexcept {
    static int (*function)(pthread_mutex_t*, const timespec*) = nullptr;
    return counted(function, "pthread_mutex_timedlock", mutex, until);
}

QIVO_SHOWN int pthread_mutex_clocklock(pthread_mutex_t* mutex, clockid_t clock, const timespec* until) noexcept {
    static int (*function)(pthread_mutex_t*, clockid_t, const timespec*) = nullptr;
    return counted(function, "pthread_mutex_clocklock", mutex, clock, until);
}

QIVO_SHOWN int sem_timedwait(sem_t* semaphore, const timespec* until) {
    static int (*function)(sem_t*, const timespec*) = nullptr;
    return counted(function, "sem_timedwait", semaphore, until);
}

QIVO_SHOWN int sem_clockwait(sem_t* semaphore, clockid_t clock, const timespec* until) {
    static int (*function)(sem_t*, clockid_t, const timespec*) = nullptr;
    return counted(function, "sem_clockwait", semaphore, clock, until);
}

QIVO_SHOWN int sem_wait(sem_t* semaphore) {
    static int (*function)(sem_t*) = nullptr;
    return counted(function, "sem_wait", semaphore);
}

/// The toolkit's mutexes and the language's atomics wait in this way.
QIVO_SHOWN long syscall(long number, ...) noexcept {
    static long (*function)(long, ...) = nullptr;
    if (function == nullptr) {
        function = next<long(long, ...)>("syscall");
    }
    std::va_list list;
    va_start(list, number);
    long arguments[6]; // NOLINT: as many as a system call has
    for (long& argument : arguments) {
        argument = va_arg(list, long);
    }
    va_end(list);
    const long operation = arguments[1] & FUTEX_CMD_MASK;
    if (number == SYS_futex && (operation == FUTEX_WAIT || operation == FUTEX_WAIT_BITSET ||
                                operation == FUTEX_LOCK_PI || operation == FUTEX_LOCK_PI2)) {
        ++waits;
    }
    return function(number, arguments[0], arguments[1], arguments[2], arguments[3], arguments[4], arguments[5]);
}

} // extern "C"
