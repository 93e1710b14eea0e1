#pragma once

#include <atomic>
#include <cstdint>
#include <functional>
#include <memory>

namespace qivo {

/// What is known of the display that a context's drawable is on. Written by the thread that owns the window, read by
/// the thread that follows the display.
struct DisplayRefresh {
    /// Refreshes a second, as the system reports it. Nothing about it is certain: it may be 0 or nonsense.
    std::atomic<double> rate{0};
    /// Goes up whenever something may have changed how buffer swaps wait: another screen or mode, the drawable made
    /// anew, shown or hidden.
    std::atomic<std::uint32_t> generation{0};
};

/// An OpenGL context with its drawable and the one recursive lock that serialises all work on it.
///
/// Unlike elsewhere, a context here can be current in one thread at a time, and only a thread that holds the lock has
/// it: the outermost lock() makes it current in the calling thread, the matching unlock() gives it up. So a thread that
/// holds the lock may call GL, and no other may.
///
/// Thread: any, unless said otherwise.
class GLContext {
  public:
    GLContext() = default;
    virtual ~GLContext() = default;
    GLContext(const GLContext&) = delete;
    GLContext& operator=(const GLContext&) = delete;

    /// Asks for the context in the calling thread: at once if it holds the lock, else with its next lock().
    virtual void makeCurrentContext() = 0;
    /// How many vertical retraces a buffer swap waits for. The calling thread must hold the lock.
    virtual void setSwapInterval(int interval) = 0;
    virtual void lock() = 0;
    virtual void unlock() = 0;
    /// Shows what was drawn. A drawable that is not visible is left alone. The calling thread must hold the lock.
    virtual void flushDrawable() = 0;
    /// Calls `done` once, in the thread that flushes, after the next flush. A newer call replaces an older one.
    virtual void afterNextFlush(std::function<void()> done) = 0;
    /// The display that the drawable is on; never null.
    virtual std::shared_ptr<const DisplayRefresh> display() const = 0;
};

} // namespace qivo
