#pragma once

#include "tests/support/Process.h"

#include <chrono>
#include <memory>
#include <string>
#include <vector>

namespace qivo::test {

/// A sound server of the test's own, with sinks that play into nothing and whose monitors can be recorded. It lives in
/// a folder of its own and talks to nobody else.
///
/// Thread: one.
class SoundServer {
  public:
    /// Makes the folder and points this process at the server that is to be. Starts nothing yet.
    SoundServer();
    ~SoundServer();
    SoundServer(const SoundServer&) = delete;
    SoundServer& operator=(const SoundServer&) = delete;

    /// Starts it with these sinks, the first being the default. False if it does not answer in time.
    bool start(const std::vector<std::string>& sinks = {"speaker"});
    /// Ends it at once, as a crash would.
    void kill();
    /// Halts it, or lets it go on.
    void setHalted(bool halted);
    /// Runs the server's control program; its output.
    std::string control(const std::vector<std::string>& arguments) const;
    /// The names of the streams that play, as the server lists them.
    std::string streams() const { return control({"list", "sink-inputs"}); }

    /// The number of the module whose sink has that name, to unload it by.
    std::string moduleOf(const std::string& sink) const;

    /// Interleaved stereo at 48000 Hz, as a sink hears it from now on.
    class Recording {
      public:
        Recording(const SoundServer& server, const std::string& sink);
        /// What has been recorded by now.
        std::vector<float> samples() const;

      private:
        std::unique_ptr<Process> m_process;
    };
    Recording record(const std::string& sink = "speaker") const { return {*this, sink}; }

  private:
    std::string m_folder;
    std::vector<std::string> m_environment;
    std::unique_ptr<Process> m_process;
};

} // namespace qivo::test
