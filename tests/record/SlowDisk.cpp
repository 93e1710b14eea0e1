#include "tests/record/SlowDisk.h"

#include <atomic>
#include <sys/syscall.h>
#include <unistd.h>

namespace {

std::atomic<std::int64_t> handedOver = 0;
std::atomic<bool> heldUp = false;

} // namespace

extern "C" __attribute__((visibility("default"))) int fdatasync(int descriptor) {
    ++handedOver;
    heldUp.wait(true);
    return static_cast<int>(syscall(SYS_fdatasync, descriptor));
}

namespace qivo::test {

std::int64_t SlowDisk::times() {
    return handedOver;
}

SlowDisk::SlowDisk() {
    heldUp = true;
}

SlowDisk::~SlowDisk() {
    heldUp = false;
    heldUp.notify_all();
}

} // namespace qivo::test
