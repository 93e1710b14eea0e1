#include "tests/support/Process.h"

#include "tests/support/Screen.h"

#include <array>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <fcntl.h>
#include <poll.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

extern char** environ;

namespace qivo::test {
namespace {

constexpr auto kLastWords = std::chrono::seconds(1);

std::vector<char*> pointers(std::vector<std::string>& strings) {
    std::vector<char*> result;
    for (auto& string : strings) {
        result.push_back(string.data());
    }
    result.push_back(nullptr);
    return result;
}

/// The options of the address sanitizer for whole programs. What their libraries keep for the life of the process, or
/// have allocated before they were unloaded, cannot be told from leaks; those of our classes show in their own tests.
/// What tells leaks apart in a test would slow a whole program down beyond its pace.
std::string withoutLeakCheck() {
    const char* inherited = std::getenv("ASAN_OPTIONS");
    return std::string("ASAN_OPTIONS=") + (inherited != nullptr ? inherited : "") +
           ":detect_leaks=0:fast_unwind_on_malloc=1";
}

/// The inherited environment with some variables added or replaced.
std::vector<std::string> environmentWith(const std::vector<std::string>& additional) {
    std::vector<std::string> result = additional;
    result.push_back(withoutLeakCheck());
    for (char** entry = environ; *entry != nullptr; ++entry) {
        const std::string inherited = *entry;
        const std::string name = inherited.substr(0, inherited.find('=') + 1);
        bool replaced = false;
        for (const auto& own : additional) {
            replaced = replaced || own.rfind(name, 0) == 0;
        }
        if (!replaced) {
            result.push_back(inherited);
        }
    }
    return result;
}

} // namespace

std::unique_ptr<Process> Process::start(const std::vector<std::string>& command,
                                        const std::vector<std::string>& environment) {
    std::array<int, 2> out{};
    std::array<int, 2> err{};
    if (pipe2(out.data(), O_CLOEXEC) != 0 || pipe2(err.data(), O_CLOEXEC) != 0) {
        return nullptr;
    }
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_adddup2(&actions, out[1], STDOUT_FILENO);
    posix_spawn_file_actions_adddup2(&actions, err[1], STDERR_FILENO);
    std::vector<std::string> arguments = command;
    std::vector<std::string> variables = environmentWith(environment);
    pid_t pid = -1;
    const int failed = posix_spawn(&pid, command.front().c_str(), &actions, nullptr, pointers(arguments).data(),
                                   pointers(variables).data());
    posix_spawn_file_actions_destroy(&actions);
    close(out[1]);
    close(err[1]);
    if (failed != 0) {
        close(out[0]);
        close(err[0]);
        return nullptr;
    }
    return std::unique_ptr<Process>(new Process(pid, out[0], err[0])); // NOLINT: the constructor is private
}

Process::Process(pid_t pid, int outputPipe, int errorPipe) : m_pid(pid) {
    m_reader = std::thread([this, outputPipe, errorPipe] { collect(outputPipe, errorPipe); });
}

Process::~Process() {
    if (running()) {
        signal(SIGKILL);
        wait(std::chrono::seconds(10));
    }
    m_reader.join();
    passReportOn();
}

/// What a sanitizer found in the program belongs to the test's output, whatever the test makes of the program's end.
void Process::passReportOn() const {
    if (m_errors.find("Sanitizer:") != std::string::npos || m_errors.find(": runtime error: ") != std::string::npos) {
        std::fputs(m_errors.c_str(), stderr);
    }
}

void Process::collect(int outputPipe, int errorPipe) {
    std::array<pollfd, 2> pipes = {{{outputPipe, POLLIN, 0}, {errorPipe, POLLIN, 0}}};
    std::array<char, 4096> buffer{};
    while (pipes[0].fd >= 0 || pipes[1].fd >= 0) {
        if (poll(pipes.data(), pipes.size(), -1) < 0) {
            continue;
        }
        for (auto& pipe : pipes) {
            if (pipe.fd < 0 || pipe.revents == 0) {
                continue;
            }
            const ssize_t length = read(pipe.fd, buffer.data(), buffer.size());
            if (length <= 0) {
                close(pipe.fd);
                pipe.fd = -1;
                continue;
            }
            const std::lock_guard guard(m_mutex);
            (&pipe == pipes.data() ? m_output : m_errors).append(buffer.data(), static_cast<std::size_t>(length));
        }
    }
    m_collected = true;
}

void Process::signal(int number) const {
    kill(m_pid, number);
}

std::optional<int> Process::wait(std::chrono::milliseconds deadline) {
    if (eventually([this] { return !running(); }, deadline)) {
        // What it wrote last may still be on its way; a child of its own may keep the pipes open for longer.
        eventually([this] { return m_collected.load(); }, kLastWords);
    }
    return m_status;
}

bool Process::running() {
    if (m_status) {
        return false;
    }
    int status = 0;
    if (waitpid(m_pid, &status, WNOHANG) != m_pid) {
        return true;
    }
    m_status = WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
    return false;
}

std::string Process::output() const {
    const std::lock_guard guard(m_mutex);
    return m_output;
}

std::string Process::errors() const {
    const std::lock_guard guard(m_mutex);
    return m_errors;
}

bool Process::waitForOutput(const std::string& text, std::chrono::milliseconds deadline) const {
    return eventually([&] { return output().find(text) != std::string::npos; }, deadline);
}

} // namespace qivo::test
