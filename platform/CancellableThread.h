#pragma once

#include <atomic>
#include <functional>
#include <stop_token>
#include <thread>
#include <utility>

namespace qivo {

/// A thread of its own for one piece of work, which can be asked to end and tells whether it is still at it.
///
/// Thread: one owner, apart from the thread that this class runs.
class CancellableThread {
  public:
    /// The token tells the work that it has been cancelled.
    using Work = std::function<void(const std::stop_token& cancelled)>;

    /// Starts at once.
    explicit CancellableThread(Work work)
        : m_thread([this, todo = std::move(work)](const std::stop_token& cancelled) {
              todo(cancelled);
              m_isExecuting = false;
          }) {}

    // Destroying it cancels the work and waits for its end.

    void cancel() { m_thread.request_stop(); }

    /// True from the beginning until the work has been done.
    bool isExecuting() const { return m_isExecuting; }

  private:
    std::atomic<bool> m_isExecuting = true;
    std::jthread m_thread; // last, so that it is joined before the rest goes
};

} // namespace qivo
