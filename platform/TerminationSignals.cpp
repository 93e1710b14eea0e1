#include "platform/TerminationSignals.h"

#include "platform/Log.h"

#include <QSocketNotifier>

#include <array>
#include <atomic>
#include <cerrno>
#include <csignal>
#include <cstdint>
#include <ctime>
#include <fcntl.h>
#include <unistd.h>

namespace qivo {
namespace {

constexpr std::array<int, 3> kSignals{SIGTERM, SIGINT, SIGHUP};

// A handler may do little more than write: one byte, the signal's number, goes into a pipe that the event loop reads.
std::array<int, 2> wakeUp{-1, -1};

// When the first signal came, in milliseconds of the monotonic clock; 0 before it. Handlers may read no other kind.
std::atomic<std::int64_t> firstSignal = 0;
static_assert(std::atomic<std::int64_t>::is_always_lock_free);

std::int64_t now() {
    timespec time{};
    clock_gettime(CLOCK_MONOTONIC, &time);
    return std::int64_t{time.tv_sec} * 1000 + time.tv_nsec / 1000000;
}

void handle(int signal) {
    const int before = errno;
    std::int64_t first = 0;
    if (!firstSignal.compare_exchange_strong(first, now()) && now() - first >= TerminationSignals::kPatienceMs) {
        // Nobody may ever read the pipe: ends the process as soon as this returns.
        std::signal(signal, SIG_DFL);
        raise(signal);
    }
    const auto byte = static_cast<unsigned char>(signal);
    [[maybe_unused]] const ssize_t written = write(wakeUp[1], &byte, 1);
    errno = before;
}

void setHandler(void (*handler)(int)) {
    struct sigaction action {};
    action.sa_handler = handler;
    action.sa_flags = SA_RESTART;
    for (const int signal : kSignals) {
        sigaction(signal, &action, nullptr);
    }
}

} // namespace

TerminationSignals::TerminationSignals(QObject* parent) : QObject(parent) {
    if (pipe2(wakeUp.data(), O_CLOEXEC | O_NONBLOCK) != 0) {
        logLine("Signals that end the application are not handled: no pipe (error %d)", errno);
        return;
    }
    firstSignal = 0;
    auto* notifier = new QSocketNotifier(wakeUp[0], QSocketNotifier::Read, this);
    connect(notifier, &QSocketNotifier::activated, this, &TerminationSignals::read);
    setHandler(handle);
}

TerminationSignals::~TerminationSignals() {
    if (wakeUp[0] < 0) {
        return;
    }
    setHandler(SIG_DFL);
    for (int& end : wakeUp) {
        close(end);
        end = -1;
    }
}

void TerminationSignals::read() {
    unsigned char signal = 0;
    while (::read(wakeUp[0], &signal, 1) == 1) {
        emit received(signal);
    }
}

} // namespace qivo
