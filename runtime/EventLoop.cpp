#include "runtime/EventLoop.h"

#include <algorithm>
#include <cstdint>
#include <limits>
#include <optional>
#include <poll.h>
#include <sys/eventfd.h>
#include <sys/socket.h>
#include <unistd.h>

#include <avahi-common/timeval.h>

// The stack leaves these two for its host to define.
struct AvahiWatch {
    int descriptor = -1;
    AvahiWatchEvent events = AVAHI_WATCH_IN;
    AvahiWatchEvent happened = AVAHI_WATCH_IN;
    AvahiWatchCallback callback = nullptr;
    void* data = nullptr;
    bool dead = false;
};

struct AvahiTimeout {
    std::optional<timeval> when;
    AvahiTimeoutCallback callback = nullptr;
    void* data = nullptr;
    bool dead = false;
};

namespace qivo::runtime {
namespace {

/// The stack works off one of its events each time, and may have thousands due.
constexpr int kTimeoutsPerTurn = 256;

EventLoop& loopOf(const AvahiPoll* api) {
    return *static_cast<EventLoop*>(api->userdata);
}

std::optional<timeval> timeOf(const timeval* when) {
    return when != nullptr ? std::optional(*when) : std::nullopt;
}

/// The stack insists on being called only for what it asked for, so an error by itself is taken off the socket here.
void happened(AvahiWatch& watch, int events) {
    watch.happened = static_cast<AvahiWatchEvent>(events & watch.events);
    if (watch.happened == 0 && events != 0) {
        int error = 0;
        socklen_t size = sizeof error;
        getsockopt(watch.descriptor, SOL_SOCKET, SO_ERROR, &error, &size);
    }
}

bool isDue(const AvahiTimeout& timeout) {
    return !timeout.dead && timeout.when && avahi_age(&*timeout.when) >= 0;
}

} // namespace

EventLoop::EventLoop() : m_wake(eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {
    m_api.userdata = this;
    m_api.watch_new = watchNew;
    m_api.watch_update = watchUpdate;
    m_api.watch_get_events = watchGetEvents;
    m_api.watch_free = watchFree;
    m_api.timeout_new = timeoutNew;
    m_api.timeout_update = timeoutUpdate;
    m_api.timeout_free = timeoutFree;
}

EventLoop::~EventLoop() {
    if (m_wake >= 0) {
        close(m_wake);
    }
}

void EventLoop::wake() const {
    const std::uint64_t one = 1;
    [[maybe_unused]] const auto written = write(m_wake, &one, sizeof one);
}

AvahiWatch* EventLoop::watchNew(const AvahiPoll* api, int descriptor, AvahiWatchEvent events,
                                AvahiWatchCallback callback, void* data) {
    EventLoop& loop = loopOf(api);
    if (loop.m_opened) {
        loop.m_opened(descriptor);
    }
    loop.m_watches.push_back(std::make_unique<AvahiWatch>());
    *loop.m_watches.back() = {descriptor, events, {}, callback, data, false};
    return loop.m_watches.back().get();
}

void EventLoop::watchUpdate(AvahiWatch* watch, AvahiWatchEvent events) {
    watch->events = events;
}

AvahiWatchEvent EventLoop::watchGetEvents(AvahiWatch* watch) {
    return watch->happened;
}

void EventLoop::watchFree(AvahiWatch* watch) {
    watch->dead = true;
}

AvahiTimeout* EventLoop::timeoutNew(const AvahiPoll* api, const timeval* when, AvahiTimeoutCallback callback,
                                    void* data) {
    auto& timeouts = loopOf(api).m_timeouts;
    timeouts.push_back(std::make_unique<AvahiTimeout>());
    *timeouts.back() = {timeOf(when), callback, data, false};
    return timeouts.back().get();
}

void EventLoop::timeoutUpdate(AvahiTimeout* timeout, const timeval* when) {
    timeout->when = timeOf(when);
}

void EventLoop::timeoutFree(AvahiTimeout* timeout) {
    timeout->dead = true;
}

int EventLoop::pause(int timeout) const {
    AvahiUsec shortest = timeout < 0 ? std::numeric_limits<int>::max() : timeout;
    for (const auto& one : m_timeouts) {
        if (!one->dead && one->when) {
            // Rounded up, else the last millisecond would be spent spinning.
            shortest = std::min<AvahiUsec>(shortest, std::max<AvahiUsec>(0, (999 - avahi_age(&*one->when)) / 1000));
        }
    }
    return static_cast<int>(shortest);
}

void EventLoop::serveTimeouts() {
    for (int served = 0; served < kTimeoutsPerTurn; ++served) {
        const auto due =
            std::find_if(m_timeouts.begin(), m_timeouts.end(), [](const auto& one) { return isDue(*one); });
        if (due == m_timeouts.end()) {
            return;
        }
        AvahiTimeout& timeout = **due;
        timeout.when.reset();
        timeout.callback(&timeout, timeout.data);
    }
}

void EventLoop::serveWatches() {
    // By index, because a callback may add watches.
    for (std::size_t i = 0; i < m_watches.size(); ++i) {
        AvahiWatch& watch = *m_watches[i];
        if (watch.dead || watch.happened == 0) {
            continue;
        }
        if ((watch.happened & AVAHI_WATCH_IN) == 0 || !m_gate || m_gate(watch.descriptor)) {
            watch.callback(&watch, watch.descriptor, watch.happened, watch.data);
        }
        watch.happened = {};
    }
}

void EventLoop::sweep() {
    const auto dead = [](const auto& one) { return one->dead; };
    m_watches.erase(std::remove_if(m_watches.begin(), m_watches.end(), dead), m_watches.end());
    m_timeouts.erase(std::remove_if(m_timeouts.begin(), m_timeouts.end(), dead), m_timeouts.end());
}

void EventLoop::turn(int timeout) {
    sweep();
    std::vector<pollfd> descriptors{{m_wake, POLLIN, 0}};
    for (const auto& watch : m_watches) {
        descriptors.push_back({watch->descriptor, static_cast<short>(watch->events), 0});
    }
    poll(descriptors.data(), descriptors.size(), pause(timeout));
    if (descriptors.front().revents != 0) {
        std::uint64_t count = 0;
        [[maybe_unused]] const auto size = read(m_wake, &count, sizeof count);
    }
    for (std::size_t i = 0; i < m_watches.size(); ++i) {
        happened(*m_watches[i], descriptors[i + 1].revents);
    }
    serveTimeouts();
    serveWatches();
}

} // namespace qivo::runtime
