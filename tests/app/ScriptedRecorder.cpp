// A recorder that does as the name says by which it was started, and notes beside that name what it has seen:
//   chatty    writes every few milliseconds, and ends when it is interrupted
//   torrent   writes far more than a pipe holds, then goes on as chatty
//   stubborn  as chatty, but ends only with the sixth interrupt
//   closing   closes its output and runs on until it is interrupted
//   silent    writes nothing, and ends when a file named "release" appears beside it
//   brief     ends by itself
// The journal has a line per event: "start PID", "end PID interrupts=N input=open".
#include <array>
#include <atomic>
#include <cerrno>
#include <csignal>
#include <cstring>
#include <dirent.h>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <poll.h>
#include <string>
#include <sys/stat.h>
#include <thread>
#include <unistd.h>

namespace {

std::atomic<int> interrupts = 0;

void countInterrupt(int /*signal*/) {
    ++interrupts;
}

class Recorder {
  public:
    explicit Recorder(const std::filesystem::path& program) : m_folder(program.parent_path()) {}

    void note(const std::string& event) const {
        const std::string line = event + "\n";
        const int journal = open((m_folder / "journal").c_str(), O_WRONLY | O_APPEND | O_CREAT | O_CLOEXEC, 0644);
        [[maybe_unused]] const ssize_t written = write(journal, line.data(), line.size());
        close(journal);
    }

    void noteArguments(int count, char** arguments) const {
        std::ofstream file(m_folder / "arguments", std::ios::binary);
        for (int i = 1; i < count; ++i) {
            file << arguments[i] << '\0';
        }
    }

    bool isReleased() const { return std::filesystem::exists(m_folder / "release"); }

  private:
    std::filesystem::path m_folder;
};

const char* input() {
    struct stat status {};
    pollfd empty{STDIN_FILENO, POLLIN, 0};
    if (fstat(STDIN_FILENO, &status) != 0 || !S_ISFIFO(status.st_mode)) {
        return "no pipe";
    }
    return poll(&empty, 1, 0) == 0 ? "open" : "ended or not empty";
}

std::string identity(int descriptor) {
    struct stat status {};
    fstat(descriptor, &status);
    return std::to_string(status.st_dev) + ":" + std::to_string(status.st_ino);
}

std::string descriptors() {
    std::string list;
    for (int number = 0; number < 1024; ++number) {
        if (fcntl(number, F_GETFD) >= 0) {
            list += " " + std::to_string(number);
        }
    }
    return list;
}

/// Signals that are blocked or not treated as usual.
std::string unusualSignals() {
    std::string list;
    sigset_t blocked;
    sigprocmask(SIG_BLOCK, nullptr, &blocked);
    for (int signal = 1; signal < SIGRTMIN; ++signal) {
        struct sigaction action {};
        if (sigaction(signal, nullptr, &action) == 0 && action.sa_handler == SIG_IGN) {
            list += " ignored " + std::to_string(signal);
        }
        if (sigismember(&blocked, signal) == 1) {
            list += " blocked " + std::to_string(signal);
        }
    }
    return list;
}

void chatter(const std::string& line, int untilInterrupts) {
    while (interrupts < untilInterrupts) {
        if (write(STDOUT_FILENO, line.data(), line.size()) < 0) {
            return;
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(5));
    }
}

void perform(const std::string& script, const Recorder& recorder) {
    if (script == "torrent") {
        for (int i = 0; i < 4; ++i) {
            const std::string much(1 << 20, '\xff'); // not UTF-8
            [[maybe_unused]] const ssize_t written = write(STDOUT_FILENO, much.data(), much.size());
        }
        recorder.note("poured");
        chatter("1 picture\n", 1);
    } else if (script == "stubborn") {
        chatter("1 picture\n", 6);
    } else if (script == "closing") {
        close(STDOUT_FILENO);
        while (interrupts == 0) {
            std::this_thread::sleep_for(std::chrono::milliseconds(1));
        }
    } else if (script == "silent") {
        while (!recorder.isReleased()) {
            std::this_thread::sleep_for(std::chrono::milliseconds(5));
        }
    } else if (script == "chatty") {
        chatter("1 picture\n", 1);
    }
}

} // namespace

int main(int count, char** arguments) {
    const std::string signalsAtStart = unusualSignals();
    const std::string descriptorsAtStart = descriptors();
    struct sigaction action {};
    action.sa_handler = countInterrupt;
    action.sa_flags = SA_RESTART;
    sigaction(SIGINT, &action, nullptr);

    const std::filesystem::path program = arguments[0];
    const Recorder recorder(program);
    recorder.noteArguments(count, arguments);
    const std::string me = std::to_string(getpid());
    recorder.note("descriptors" + descriptorsAtStart);
    recorder.note("signals" + signalsAtStart);
    recorder.note("errors " + identity(STDERR_FILENO));
    recorder.note("start " + me);
    perform(program.filename(), recorder);
    recorder.note("end " + me + " interrupts=" + std::to_string(interrupts) + " input=" + input());
    return 0;
}
