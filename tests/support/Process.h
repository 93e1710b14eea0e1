#pragma once

#include <atomic>
#include <chrono>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <sys/types.h>
#include <thread>
#include <vector>

namespace qivo::test {

/// A program that a test started. Its standard output and error are collected; it is ended with this object.
///
/// Thread: one, apart from the reader that this class runs.
class Process {
  public:
    /// Starts a program by its path. Additional environment is given as NAME=value. Null if it cannot be started.
    static std::unique_ptr<Process> start(const std::vector<std::string>& command,
                                          const std::vector<std::string>& environment = {});
    /// Kills the program if it still runs.
    ~Process();
    Process(const Process&) = delete;
    Process& operator=(const Process&) = delete;

    pid_t pid() const { return m_pid; }
    void signal(int number) const;
    /// Waits for the end. The exit code; 128 plus the signal's number if one ended it; empty if it still runs then.
    std::optional<int> wait(std::chrono::milliseconds deadline);
    bool running();
    /// What it has written so far.
    std::string output() const;
    std::string errors() const;
    /// Waits until its standard output contains a text.
    bool waitForOutput(const std::string& text, std::chrono::milliseconds deadline = std::chrono::seconds(20)) const;

  private:
    Process(pid_t pid, int outputPipe, int errorPipe);
    void collect(int outputPipe, int errorPipe);
    void passReportOn() const;

    pid_t m_pid;
    std::optional<int> m_status;
    mutable std::mutex m_mutex; // protects m_output and m_errors
    std::string m_output;
    std::string m_errors;
    std::atomic<bool> m_collected = false; // both pipes have ended
    std::thread m_reader;
};

} // namespace qivo::test
