#include "platform/Activity.h"

#include <QDBusConnection>
#include <QDBusMessage>
#include <QDBusObjectPath>
#include <QDBusUnixFileDescriptor>
#include <QVariantMap>

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <functional>
#include <mutex>
#include <optional>
#include <thread>
#include <utility>
#include <vector>

namespace qivo {
namespace {

constexpr const char* kWho = "QIVO Viewer";
constexpr uint kPortalSuspendAndIdle = 4U | 8U;

using Release = std::function<void()>;

struct Method {
    const char* service;
    const char* path;
    const char* interface;
    const char* name;
};

QDBusMessage call(const QDBusConnection& bus, const Method& method, const QVariantList& arguments) {
    auto message =
        QDBusMessage::createMethodCall(QString::fromLatin1(method.service), QString::fromLatin1(method.path),
                                       QString::fromLatin1(method.interface), QString::fromLatin1(method.name));
    message.setArguments(arguments);
    return bus.call(message, QDBus::Block, Activity::kCallTimeoutMs);
}

/// The reply's only argument as a T; nothing if the call failed or answered something else.
template <typename T>
std::optional<T> answer(const QDBusMessage& reply) {
    if (reply.type() != QDBusMessage::ReplyMessage || reply.arguments().size() != 1 ||
        !reply.arguments().at(0).canConvert<T>()) {
        return std::nullopt;
    }
    return reply.arguments().at(0).value<T>();
}

Release askPortal(const QDBusConnection& session, const QString& reason) {
    static constexpr const char* kService = "org.freedesktop.portal.Desktop";
    const auto request = answer<QDBusObjectPath>(
        call(session, {kService, "/org/freedesktop/portal/desktop", "org.freedesktop.portal.Inhibit", "Inhibit"},
             {QString(), kPortalSuspendAndIdle, QVariantMap{{QStringLiteral("reason"), reason}}}));
    if (!request) {
        return {};
    }
    return [session, path = request->path().toLatin1()] {
        call(session, {kService, path.constData(), "org.freedesktop.portal.Request", "Close"}, {});
    };
}

Release askScreenSaver(const QDBusConnection& session, const QString& reason) {
    static constexpr Method kInhibit{"org.freedesktop.ScreenSaver", "/org/freedesktop/ScreenSaver",
                                     "org.freedesktop.ScreenSaver", "Inhibit"};
    const auto cookie = answer<uint>(call(session, kInhibit, {QString::fromLatin1(kWho), reason}));
    if (!cookie) {
        return {};
    }
    return [session, cookie = *cookie] {
        call(session, {kInhibit.service, kInhibit.path, kInhibit.interface, "UnInhibit"}, {cookie});
    };
}

/// The login manager's inhibitor is a descriptor: it holds until the last copy is closed.
Release askLoginManager(const QDBusConnection& system, const QString& reason) {
    const auto lock = answer<QDBusUnixFileDescriptor>(
        call(system, {"org.freedesktop.login1", "/org/freedesktop/login1", "org.freedesktop.login1.Manager", "Inhibit"},
             {QStringLiteral("idle:sleep"), QString::fromLatin1(kWho), reason, QStringLiteral("block")}));
    if (!lock || !lock->isValid()) {
        return {};
    }
    return [held = *lock]() mutable { held = QDBusUnixFileDescriptor(); };
}

/// A connection of its own, so that an activity never shares fate or filters with another part of the application.
QDBusConnection connectTo(QDBusConnection::BusType bus) {
    static std::atomic<int> count = 0;
    return QDBusConnection::connectToBus(bus, QStringLiteral("qivo-activity-%1").arg(++count));
}

} // namespace

struct Activity::State {
    std::mutex mutex; // protects the flags
    std::condition_variable changed;
    bool ending = false;
    bool ended = false;

    bool isEnding() {
        const std::lock_guard guard(mutex);
        return ending;
    }

    void run(const QString& reason) {
        QDBusConnection session = connectTo(QDBusConnection::SessionBus);
        QDBusConnection system = connectTo(QDBusConnection::SystemBus);
        std::vector<Release> releases;
        const auto keep = [&](Release release) {
            const bool granted = static_cast<bool>(release);
            if (granted) {
                releases.push_back(std::move(release));
            }
            return granted;
        };
        if (session.isConnected() && !keep(askPortal(session, reason)) && !isEnding()) {
            keep(askScreenSaver(session, reason));
        }
        if (system.isConnected() && !isEnding()) {
            keep(askLoginManager(system, reason));
        }
        waitForEnd();
        for (Release& release : releases) {
            release();
        }
        QDBusConnection::disconnectFromBus(session.name());
        QDBusConnection::disconnectFromBus(system.name());
    }

    void waitForEnd() {
        std::unique_lock lock(mutex);
        changed.wait(lock, [this] { return ending; });
    }

    void noteEnded() {
        const std::lock_guard guard(mutex);
        ended = true;
        changed.notify_all();
    }
};

Activity::Activity(const QString& reason) : m_state(std::make_shared<State>()) {
    std::thread([state = m_state, reason] {
        state->run(reason);
        state->noteEnded();
    }).detach();
}

Activity::~Activity() {
    std::unique_lock lock(m_state->mutex);
    m_state->ending = true;
    m_state->changed.notify_all();
    m_state->changed.wait_for(lock, std::chrono::milliseconds(kEndTimeoutMs), [this] { return m_state->ended; });
}

} // namespace qivo
