#pragma once

#include <chrono>
#include <functional>

namespace qivo::runtime {

/// Threads whose end nobody waits for, save at the very end: they take apart what must not block a caller.
///
/// Thread: any.
class BackgroundThreads {
  public:
    /// Runs the work on a thread of its own. False if the system gives no thread.
    static bool start(std::function<void()> work);

    /// Waits until every thread has finished, at most `limit`. True if none is left.
    static bool waitForAll(std::chrono::milliseconds limit);
};

} // namespace qivo::runtime
