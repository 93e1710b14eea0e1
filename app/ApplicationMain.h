#pragma once

namespace qivo {

/// Runs the application until its last window has closed, or until it is told to end (SIGTERM, SIGINT, SIGHUP), and
/// returns the process's exit code. Without a display it says so in one line and ends the process.
int applicationMain(int argc, char** argv);

} // namespace qivo
