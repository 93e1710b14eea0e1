#pragma once

#include <functional>
#include <memory>
#include <utility>
#include <vector>

#include <avahi-common/watch.h>

namespace qivo::runtime {

/// The loop that drives the multicast DNS stack. It serves every ready descriptor once a turn, so that a flood on one
/// can't starve the others, and lets its owner look at a descriptor before the stack reads it.
///
/// Thread: one, except wake.
class EventLoop {
  public:
    EventLoop();
    EventLoop(const EventLoop&) = delete;
    EventLoop& operator=(const EventLoop&) = delete;
    ~EventLoop();

    /// The interface for the stack, valid for the loop's life.
    const AvahiPoll* api() const { return &m_api; }

    /// Asked before each reading of a descriptor; false passes this turn over.
    void setGate(std::function<bool(int descriptor)> gate) { m_gate = std::move(gate); }

    /// Told of each descriptor that begins to be watched.
    void setOpened(std::function<void(int descriptor)> opened) { m_opened = std::move(opened); }

    /// Waits for something to do, at most `timeout` milliseconds, without limit if below 0, and does it.
    void turn(int timeout);

    /// Ends the wait of the turn that is running, or of the next. Thread: any.
    void wake() const;

  private:
    static AvahiWatch* watchNew(const AvahiPoll* api, int descriptor, AvahiWatchEvent events,
                                AvahiWatchCallback callback, void* data);
    static void watchUpdate(AvahiWatch* watch, AvahiWatchEvent events);
    static AvahiWatchEvent watchGetEvents(AvahiWatch* watch);
    static void watchFree(AvahiWatch* watch);
    static AvahiTimeout* timeoutNew(const AvahiPoll* api, const timeval* when, AvahiTimeoutCallback callback,
                                    void* data);
    static void timeoutUpdate(AvahiTimeout* timeout, const timeval* when);
    static void timeoutFree(AvahiTimeout* timeout);

    int pause(int timeout) const;
    void serveTimeouts();
    void serveWatches();
    void sweep();

    AvahiPoll m_api{};
    int m_wake = -1;
    std::function<bool(int)> m_gate;
    std::function<void(int)> m_opened;
    std::vector<std::unique_ptr<AvahiWatch>> m_watches; // freed ones stay until the end of the turn
    std::vector<std::unique_ptr<AvahiTimeout>> m_timeouts;
};

} // namespace qivo::runtime
