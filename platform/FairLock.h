#pragma once

#include <condition_variable>
#include <cstdint>
#include <mutex>
#include <thread>

namespace qivo {

/// A recursive lock that serves its callers in the order in which they came.
///
/// A refresh thread that lets go of an ordinary mutex and takes it again at once can starve everyone else for as long
/// as buffer swaps fill nearly all of its time. Here whoever waits goes next, so nobody waits longer than the holds of
/// those who came before.
///
/// Thread: any. Meets the requirements of std::lock_guard.
class FairLock {
  public:
    void lock();
    /// The calling thread must hold the lock.
    void unlock();
    /// How often the calling thread holds the lock; 0 if it does not.
    int depth() const;

  private:
    mutable std::mutex m_mutex; // protects everything below
    std::condition_variable m_served;
    std::thread::id m_owner;
    int m_depth = 0;
    std::uint64_t m_nextTicket = 0;
    std::uint64_t m_serving = 0;
};

} // namespace qivo
