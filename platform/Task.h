#pragma once

#include "platform/FileDescriptor.h"

#include <memory>
#include <string>
#include <vector>

#include <sys/types.h>

namespace qivo {

/// A program that runs as a child of this process. Its standard output comes through a pipe; its standard input is a
/// pipe that stays open and empty. Standard error, environment and working directory are this process's own; of the
/// rest it inherits nothing: no other descriptor, no blocked and no ignored signal.
///
/// Thread: one at a time.
class Task {
  public:
    /// Starts the program at a path; `arguments` follow its name. Null if it cannot be started, for example because it
    /// is missing or not executable.
    static std::unique_ptr<Task> launch(const std::string& path, const std::vector<std::string>& arguments);

    /// Closes both pipes and waits until the program has ended.
    ~Task();
    Task(const Task&) = delete;
    Task& operator=(const Task&) = delete;

    /// Waits until the program writes something, and takes it. Empty once its output has ended, which may be before
    /// the program ends.
    std::string readOutput();

    /// Sends the interrupt signal, if the program still runs.
    void interrupt();

    /// False from the moment on that the program has ended.
    bool isRunning();

  private:
    Task(pid_t pid, FileDescriptor input, FileDescriptor output);

    pid_t m_pid; // 0 once the end has been seen, after which the number may be another program's
    FileDescriptor m_input;
    FileDescriptor m_output;
};

} // namespace qivo
