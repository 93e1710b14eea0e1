#pragma once

#include "tests/platform/TemporaryDirectory.h"
#include "tests/record/MovieReader.h"
#include "tests/support/Process.h"

#include <chrono>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace qivo::test {

/// The recorder as its launcher runs it: with an open empty pipe as its input, in a folder of the test's own. Its
/// libqivo is the one with a scripted source unless `library` is empty, which leaves the one that ships.
class RecorderProcess {
  public:
    /// Starts it. `around` is a shell command line that ends in running its arguments as the recorder, for surroundings
    /// such as a small disk; $folder is the folder for movies.
    explicit RecorderProcess(const std::string& script, std::string name = "STUDIO (Cam 1)",
                             const std::string& around = "exec \"$@\"", const std::string& library = STAND_IN);
    ~RecorderProcess();
    RecorderProcess(const RecorderProcess&) = delete;
    RecorderProcess& operator=(const RecorderProcess&) = delete;

    Process& process() { return *m_process; }
    /// Waits until the progress tells that the movie is so long.
    bool waitForLength(std::chrono::milliseconds length);
    /// Interrupts it again and again, as the launcher does, until it has ended; the exit code, or 1000 after 20 s.
    int interrupt();
    /// How long the last interrupting took.
    std::chrono::milliseconds ending() const { return m_ending; }
    void closeInput();
    /// What it has said on its standard error but which encoder it took.
    std::string complaints() const;
    /// The last whole line of its progress.
    std::string lastProgress() const;
    /// How long the progress says that the movie is.
    std::chrono::milliseconds length() const;

    const TemporaryDirectory& folder() const { return m_folder; }
    std::string moviePath() const { return m_folder.path("movies/" + m_name + ".mov"); }
    DecodedMovie movie() const { return decodeMovie(moviePath()); }

  private:
    TemporaryDirectory m_folder;
    std::string m_name;
    int m_input = -1;
    std::unique_ptr<Process> m_process;
    std::chrono::milliseconds m_ending{0};
};

} // namespace qivo::test
