#include "platform/Activity.h"

#include "platform/FileDescriptor.h"
#include "platform/Log.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <chrono>
#include <cstdint>
#include <fcntl.h>
#include <functional>
#include <optional>
#include <poll.h>
#include <string>
#include <sys/eventfd.h>
#include <systemd/sd-bus.h>
#include <thread>
#include <unistd.h>

namespace qivo {
namespace {

using std::chrono::microseconds;
using std::chrono::milliseconds;
using Clock = std::chrono::steady_clock;

constexpr const char* kWho = "QIVO Viewer";
constexpr std::uint32_t kPortalSuspendAndIdle = 4U | 8U;

struct Method {
    const char* service;
    const char* path;
    const char* interface;
    const char* name;
};

constexpr const char* kPortalService = "org.freedesktop.portal.Desktop";
constexpr Method kPortalInhibit{kPortalService, "/org/freedesktop/portal/desktop", "org.freedesktop.portal.Inhibit",
                                "Inhibit"};
constexpr Method kSaverInhibit{"org.freedesktop.ScreenSaver", "/org/freedesktop/ScreenSaver",
                               "org.freedesktop.ScreenSaver", "Inhibit"};
constexpr Method kSaverUnInhibit{kSaverInhibit.service, kSaverInhibit.path, kSaverInhibit.interface, "UnInhibit"};
constexpr Method kLoginInhibit{"org.freedesktop.login1", "/org/freedesktop/login1", "org.freedesktop.login1.Manager",
                               "Inhibit"};

struct BusCloser {
    void operator()(sd_bus* bus) const { sd_bus_close_unref(bus); }
};

/// A connection of its own, so that an activity never shares fate or filters with another part of the application.
using Bus = std::unique_ptr<sd_bus, BusCloser>;

/// Begins to connect; null where there is no such bus.
Bus connectTo(int (*open)(sd_bus**)) {
    sd_bus* bus = nullptr;
    if (open(&bus) < 0) {
        return nullptr;
    }
    sd_bus_set_method_call_timeout(bus, microseconds(milliseconds(Activity::kCallTimeoutMs)).count());
    return Bus(bus);
}

/// When the connection wants to be looked at although nothing has come.
Clock::time_point timeoutOf(sd_bus* bus) {
    std::uint64_t us = UINT64_MAX; // of the monotonic clock, which is also the steady one
    if (sd_bus_get_timeout(bus, &us) < 0 || us > static_cast<std::uint64_t>(INT64_MAX / 1000)) {
        return Clock::time_point::max();
    }
    return Clock::time_point(microseconds(us));
}

/// Handles what has come, and closes a connection that has ended.
void process(Bus& bus) {
    int handled = 1;
    while (bus && handled > 0) {
        handled = sd_bus_process(bus.get(), nullptr);
    }
    if (handled < 0) {
        bus.reset();
    }
}

/// In whole milliseconds, rounded up; -1 for ever.
int remaining(Clock::time_point until) {
    if (until == Clock::time_point::max()) {
        return -1;
    }
    const auto left = std::chrono::ceil<milliseconds>(until - Clock::now()).count();
    return static_cast<int>(std::clamp<std::int64_t>(left, 0, INT32_MAX));
}

} // namespace

/// What is said to the services, on the thread that says it. No call waits: requests are sent, answers come to
/// functions, and the thread sleeps until one of the connections or the activity's end wakes it.
class Activity::Conversation {
  public:
    explicit Conversation(const QString& reason) : m_reason(reason.toStdString()), m_end(eventfd(0, EFD_CLOEXEC)) {
        if (!m_end) {
            logLine("The system is not kept from going to sleep: no event (error %d)", errno);
            return;
        }
        m_thread = std::thread([this] { run(); });
    }

    ~Conversation() {
        if (m_thread.joinable()) {
            eventfd_write(m_end.number(), 1);
            m_thread.join();
        }
    }

    Conversation(const Conversation&) = delete;
    Conversation& operator=(const Conversation&) = delete;

  private:
    void run() {
        m_session = connectTo(sd_bus_open_user);
        m_system = connectTo(sd_bus_open_system);
        askPortal();
        askLoginManager();
        serveUntil([this] { return m_ending; }, Clock::time_point::max());
        // What has been asked is answered first, so that it can be let go.
        const Clock::time_point deadline = Clock::now() + milliseconds(kEndTimeoutMs);
        const auto answered = [this] { return m_unanswered == 0 || (!m_session && !m_system); };
        serveUntil(answered, deadline);
        release();
        serveUntil(answered, deadline);
        m_session.reset();
        m_system.reset();
    }

    void serveUntil(const std::function<bool()>& done, Clock::time_point deadline) {
        while (!done() && Clock::now() < deadline) {
            Clock::time_point until = deadline;
            std::array<pollfd, 3> waited{{{m_ending ? -1 : m_end.number(), POLLIN, 0}, {-1, 0, 0}, {-1, 0, 0}}};
            pollfd* place = &waited[1];
            for (const Bus* bus : {&m_session, &m_system}) {
                if (*bus) {
                    *place++ = {sd_bus_get_fd(bus->get()), static_cast<short>(sd_bus_get_events(bus->get())), 0};
                    until = std::min(until, timeoutOf(bus->get()));
                }
            }
            poll(waited.data(), waited.size(), remaining(until));
            m_ending = m_ending || waited[0].revents != 0;
            process(m_session);
            process(m_system);
        }
    }

    /// Sends a request; `answered` gets the answer, or the error in its place. Nothing where it cannot be sent.
    template <typename... Arguments>
    void ask(const Bus& bus, const Method& method, sd_bus_message_handler_t answered, const char* types,
             Arguments... arguments) {
        if (bus && sd_bus_call_method_async(bus.get(), nullptr, method.service, method.path, method.interface,
                                            method.name, answered, this, types, arguments...) >= 0) {
            ++m_unanswered;
        }
    }

    void askPortal() {
        ask(m_session, kPortalInhibit, portalAnswered, "sua{sv}", "", kPortalSuspendAndIdle, 1, "reason", "s",
            m_reason.c_str());
    }

    static int portalAnswered(sd_bus_message* answer, void* self, sd_bus_error*) {
        auto& my = *static_cast<Conversation*>(self);
        --my.m_unanswered;
        const char* request = nullptr;
        if (sd_bus_message_is_method_error(answer, nullptr) == 0 && sd_bus_message_read(answer, "o", &request) > 0) {
            my.m_portalRequest = request;
        } else if (!my.m_ending) {
            my.askScreenSaver();
        }
        return 0;
    }

    void askScreenSaver() { ask(m_session, kSaverInhibit, saverAnswered, "ss", kWho, m_reason.c_str()); }

    static int saverAnswered(sd_bus_message* answer, void* self, sd_bus_error*) {
        auto& my = *static_cast<Conversation*>(self);
        --my.m_unanswered;
        std::uint32_t cookie = 0;
        if (sd_bus_message_is_method_error(answer, nullptr) == 0 && sd_bus_message_read(answer, "u", &cookie) > 0) {
            my.m_saverCookie = cookie;
        }
        return 0;
    }

    void askLoginManager() {
        ask(m_system, kLoginInhibit, loginAnswered, "ssss", "idle:sleep", kWho, m_reason.c_str(), "block");
    }

    /// The login manager's inhibitor is a descriptor: it holds until the last copy is closed.
    static int loginAnswered(sd_bus_message* answer, void* self, sd_bus_error*) {
        auto& my = *static_cast<Conversation*>(self);
        --my.m_unanswered;
        int lock = -1; // the message's
        if (sd_bus_message_is_method_error(answer, nullptr) == 0 && sd_bus_message_read(answer, "h", &lock) > 0) {
            my.m_loginLock = FileDescriptor(fcntl(lock, F_DUPFD_CLOEXEC, 0));
        }
        return 0;
    }

    /// What has not been answered even now ends with its connection, by which the services know who asked.
    void release() {
        if (!m_portalRequest.empty()) {
            const Method close{kPortalService, m_portalRequest.c_str(), "org.freedesktop.portal.Request", "Close"};
            ask(m_session, close, released, "");
        }
        if (m_saverCookie) {
            ask(m_session, kSaverUnInhibit, released, "u", *m_saverCookie);
        }
        m_loginLock.reset();
    }

    static int released(sd_bus_message*, void* self, sd_bus_error*) {
        --static_cast<Conversation*>(self)->m_unanswered;
        return 0;
    }

    const std::string m_reason;
    const FileDescriptor m_end; // becomes readable once the activity ends

    // The thread's.
    Bus m_session;
    Bus m_system;
    std::string m_portalRequest;
    std::optional<std::uint32_t> m_saverCookie;
    FileDescriptor m_loginLock;
    bool m_ending = false;
    int m_unanswered = 0; // requests

    std::thread m_thread; // last, as it uses the others
};

Activity::Activity(const QString& reason) : m_conversation(std::make_unique<Conversation>(reason)) {}

Activity::~Activity() = default;

} // namespace qivo
