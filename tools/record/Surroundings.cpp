#include "tools/record/Surroundings.h"

#include <array>
#include <cerrno>
#include <csignal>
#include <poll.h>
#include <sys/signalfd.h>
#include <sys/stat.h>
#include <unistd.h>

namespace qivo::record {
namespace {

constexpr std::array<int, 3> endingSignals = {SIGINT, SIGTERM, SIGHUP};
// A reader that has gone and a file that may not grow are told by the calls that meet them.
constexpr std::array<int, 2> ignoredSignals = {SIGPIPE, SIGXFSZ};

/// Blocked in all threads and read from a descriptor. What the program inherited as ignored would never get there.
int openSignals() {
    sigset_t set;
    sigemptyset(&set);
    for (const int number : endingSignals) {
        std::signal(number, SIG_DFL);
        sigaddset(&set, number);
    }
    pthread_sigmask(SIG_BLOCK, &set, nullptr);
    return signalfd(-1, &set, SFD_CLOEXEC | SFD_NONBLOCK);
}

bool isPipe(int descriptor) {
    struct stat about {};
    return fstat(descriptor, &about) == 0 && (S_ISFIFO(about.st_mode) || S_ISSOCK(about.st_mode));
}

} // namespace

Surroundings::Surroundings() : m_signals(openSignals()), m_watchesInput(isPipe(STDIN_FILENO)) {
    for (const int number : ignoredSignals) {
        std::signal(number, SIG_IGN);
    }
}

bool Surroundings::endWanted(Nanoseconds timeout) {
    if (m_endWanted) {
        return true;
    }
    std::array<pollfd, 3> watched = {{{m_signals.get(), POLLIN, 0},
                                      {m_watchesInput ? STDIN_FILENO : -1, POLLIN, 0},
                                      {isPipe(STDOUT_FILENO) ? STDOUT_FILENO : -1, 0, 0}}};
    const auto ms = std::chrono::duration_cast<std::chrono::milliseconds>(timeout).count();
    if (poll(watched.data(), watched.size(), static_cast<int>(ms)) <= 0) {
        return false;
    }
    m_endWanted = watched[0].revents != 0 || (watched[2].revents & (POLLERR | POLLHUP)) != 0;
    if (watched[1].revents != 0) {
        std::array<char, 256> unread{};
        const ssize_t count = read(STDIN_FILENO, unread.data(), unread.size());
        m_endWanted = m_endWanted || count == 0 || (count < 0 && errno != EINTR && errno != EAGAIN);
    }
    return m_endWanted;
}

void Surroundings::tell(const std::string& line) {
    // A pipe that can be written to takes a line of this length at once.
    pollfd output = {STDOUT_FILENO, POLLOUT, 0};
    if (poll(&output, 1, 0) <= 0 || (output.revents & POLLOUT) == 0) {
        return;
    }
    const std::string text = line + "\n";
    if (write(STDOUT_FILENO, text.data(), text.size()) < 0 && errno == EPIPE) {
        m_endWanted = true;
    }
}

} // namespace qivo::record
