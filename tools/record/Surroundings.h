#pragma once

#include "tools/record/MovieFile.h"
#include "tools/record/SourceClock.h"

#include <string>

namespace qivo::record {

/** What the program hears from and says to whoever started it: signals to end, its standard input that closes, and the
 *  progress on its standard output. Make it before the first thread, and initialise nothing before it that starts some.
 *  Thread: one. */
class Surroundings {
  public:
    Surroundings();

    /** Whether the recording is to end: SIGINT, SIGTERM or SIGHUP has come, the pipe on standard input has closed, or
     *  nobody reads standard output any more. Waits at most `timeout` for any of that. */
    [[nodiscard]] bool endWanted(Nanoseconds timeout);
    /** Writes a line to standard output, unless that would have to wait. */
    void tell(const std::string& line);

  private:
    FileHandle m_signals;
    bool m_watchesInput = false;
    bool m_endWanted = false;
};

} // namespace qivo::record
