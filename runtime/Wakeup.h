#pragma once

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <mutex>

namespace qivo::runtime {

/// Tells one waiting thread that something happened; what it was, the thread finds out by itself.
///
/// Thread: any.
class Wakeup {
  public:
    using Clock = std::chrono::steady_clock;

    void notify() {
        {
            const std::lock_guard guard(m_mutex);
            ++m_count;
        }
        m_changed.notify_all();
    }

    /// Taken before looking at the state of things, so that nothing that happens in between is slept through.
    std::uint64_t count() const {
        const std::lock_guard guard(m_mutex);
        return m_count;
    }

    /// Returns when something has happened since `seen` was taken, at the latest at the deadline.
    void wait(std::uint64_t seen, Clock::time_point deadline) {
        std::unique_lock lock(m_mutex);
        m_changed.wait_until(lock, deadline, [&] { return m_count != seen; });
    }

  private:
    mutable std::mutex m_mutex; // protects the rest
    std::condition_variable m_changed;
    std::uint64_t m_count = 0;
};

} // namespace qivo::runtime
