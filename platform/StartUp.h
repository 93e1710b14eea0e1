#pragma once

namespace qivo {

/// While it lives, the toolkit's own account of a missing display, several lines and an abort, is replaced: one clear
/// line on standard error, and the process ends with kExitCode. To be held only while the application object is made.
///
/// Thread: main, one at a time.
class MissingDisplayGuard {
  public:
    static constexpr int kExitCode = 1;

    MissingDisplayGuard();
    ~MissingDisplayGuard();
    MissingDisplayGuard(const MissingDisplayGuard&) = delete;
    MissingDisplayGuard& operator=(const MissingDisplayGuard&) = delete;
};

} // namespace qivo
