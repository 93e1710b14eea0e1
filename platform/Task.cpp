#include "platform/Task.h"

#include <array>
#include <cerrno>
#include <csignal>
#include <fcntl.h>
#include <optional>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>
#include <utility>

namespace qivo {
namespace {

constexpr int kFirstFreeDescriptor = 3; // after the standard streams

struct Pipe {
    FileDescriptor readingEnd;
    FileDescriptor writingEnd;
};

/// A process may run with its standard streams closed. What it prints must not go into a pipe that took their place.
FileDescriptor aboveStandardStreams(FileDescriptor descriptor) {
    if (descriptor.number() >= kFirstFreeDescriptor) {
        return descriptor;
    }
    return FileDescriptor(fcntl(descriptor.number(), F_DUPFD_CLOEXEC, kFirstFreeDescriptor));
}

std::optional<Pipe> makePipe() {
    std::array<int, 2> ends{};
    if (pipe2(ends.data(), O_CLOEXEC) != 0) {
        return std::nullopt;
    }
    FileDescriptor readingEnd(ends[0]);
    FileDescriptor writingEnd(ends[1]);
    Pipe pipe{aboveStandardStreams(std::move(readingEnd)), aboveStandardStreams(std::move(writingEnd))};
    return pipe.readingEnd.isOpen() && pipe.writingEnd.isOpen() ? std::optional(std::move(pipe)) : std::nullopt;
}

/// What the child does with descriptors before the program begins.
class Redirections {
  public:
    Redirections(const FileDescriptor& input, const FileDescriptor& output) {
        posix_spawn_file_actions_init(&m_actions);
        posix_spawn_file_actions_adddup2(&m_actions, input.number(), STDIN_FILENO);
        posix_spawn_file_actions_adddup2(&m_actions, output.number(), STDOUT_FILENO);
        // Not every library marks its descriptors as ours are marked.
        posix_spawn_file_actions_addclosefrom_np(&m_actions, kFirstFreeDescriptor);
    }
    ~Redirections() { posix_spawn_file_actions_destroy(&m_actions); }
    Redirections(const Redirections&) = delete;
    Redirections& operator=(const Redirections&) = delete;

    const posix_spawn_file_actions_t* get() const { return &m_actions; }

  private:
    posix_spawn_file_actions_t m_actions{};
};

/// Signals as a program expects them that a shell starts. What this process blocks or ignores is its own affair.
class UsualSignals {
  public:
    UsualSignals() {
        sigset_t none;
        sigset_t all;
        sigemptyset(&none);
        sigfillset(&all);
        posix_spawnattr_init(&m_attributes);
        posix_spawnattr_setsigmask(&m_attributes, &none);
        posix_spawnattr_setsigdefault(&m_attributes, &all);
        posix_spawnattr_setflags(&m_attributes, POSIX_SPAWN_SETSIGMASK | POSIX_SPAWN_SETSIGDEF);
    }
    ~UsualSignals() { posix_spawnattr_destroy(&m_attributes); }
    UsualSignals(const UsualSignals&) = delete;
    UsualSignals& operator=(const UsualSignals&) = delete;

    const posix_spawnattr_t* get() const { return &m_attributes; }

  private:
    posix_spawnattr_t m_attributes{};
};

/// The form in which the system takes arguments, which it does not change.
std::vector<char*> argumentVector(const std::string& path, const std::vector<std::string>& arguments) {
    std::vector<char*> vector{const_cast<char*>(path.c_str())};
    for (const std::string& argument : arguments) {
        vector.push_back(const_cast<char*>(argument.c_str()));
    }
    vector.push_back(nullptr);
    return vector;
}

} // namespace

std::unique_ptr<Task> Task::launch(const std::string& path, const std::vector<std::string>& arguments) {
    auto input = makePipe();
    auto output = makePipe();
    if (!input || !output) {
        return nullptr;
    }
    const Redirections redirections(input->readingEnd, output->writingEnd);
    const UsualSignals usualSignals;
    pid_t pid = 0;
    if (posix_spawn(&pid, path.c_str(), redirections.get(), usualSignals.get(), argumentVector(path, arguments).data(),
                    environ) != 0) {
        return nullptr;
    }
    // NOLINTNEXTLINE(modernize-make-unique): the constructor is private
    return std::unique_ptr<Task>(new Task(pid, std::move(input->writingEnd), std::move(output->readingEnd)));
}

Task::Task(pid_t pid, FileDescriptor input, FileDescriptor output)
    : m_pid(pid), m_input(std::move(input)), m_output(std::move(output)) {}

Task::~Task() {
    m_input.reset();
    m_output.reset();
    while (m_pid != 0 && waitpid(m_pid, nullptr, 0) < 0 && errno == EINTR) {
    }
}

std::string Task::readOutput() {
    std::array<char, 4096> bytes{};
    ssize_t length = 0;
    do {
        length = read(m_output.number(), bytes.data(), bytes.size());
    } while (length < 0 && errno == EINTR);
    return {bytes.data(), length > 0 ? static_cast<std::size_t>(length) : 0};
}

void Task::interrupt() {
    if (m_pid != 0) {
        kill(m_pid, SIGINT);
    }
}

bool Task::isRunning() {
    // Whoever ignores SIGCHLD is told at the end that there is no such child.
    if (m_pid != 0 && waitpid(m_pid, nullptr, WNOHANG) != 0) {
        m_pid = 0;
    }
    return m_pid != 0;
}

} // namespace qivo
