#pragma once

#include "tests/end-to-end/ViewerFixture.h"

#include <filesystem>
#include <optional>
#include <string>
#include <sys/types.h>

namespace qivo::test {

/// A viewer that records with the real recorder at its real path, which the test has to itself, into a folder of the
/// test's own.
class RecordingViewerTest : public ViewerTest {
  protected:
    void SetUp() override;
    void TearDown() override;

    /// Publishes one machine's sources in a size that is quickly coded and read back, shows the first and waits until
    /// its pictures arrive.
    std::unique_ptr<Process> publishAndShow(const std::string& machine, const std::vector<std::string>& sources,
                                            const std::vector<std::string>& options = {});
    /// Turns recording on and waits until the movie of the source that is shown has begun.
    void startRecording();
    /// Waits until so much time of the movie has been recorded.
    void recordFor(std::chrono::milliseconds length) const;

    /// The path of a source's movie.
    std::filesystem::path movie(const std::string& name) const { return m_folder / (name + ".mov"); }
    std::filesystem::path movie() const { return movie(m_title); }
    /// All that lies in the folder for recordings.
    std::vector<std::string> recorded() const;

    /// The recorder that the viewer runs; empty if it runs none.
    std::optional<pid_t> recorder() const;
    static bool hasEnded(pid_t process);

    std::filesystem::path m_folder;
};

/// Whether a movie is a finished one, without fragments.
bool isFinished(const std::filesystem::path& movie);

/// Expects a movie that plays from its beginning to its end, lasts at least so many seconds and shows what was
/// published, at the times at which it was published, without a gap, with the sound of a machine's first source where
/// it has sound.
void expectWholeRecording(const std::filesystem::path& movie, double seconds, bool hasSound = true);

} // namespace qivo::test
