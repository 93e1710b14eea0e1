#include "platform/Activity.h"

#include <QCoreApplication>
#include <QDBusConnection>
#include <QDBusContext>
#include <QDBusMessage>
#include <QDBusObjectPath>
#include <QDBusUnixFileDescriptor>
#include <QDeadlineTimer>
#include <QProcess>
#include <QVariantMap>

#include <array>
#include <atomic>
#include <chrono>
#include <cstdlib>
#include <fcntl.h>
#include <functional>
#include <gmock/gmock.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <thread>
#include <unistd.h>
#include <vector>

namespace qivo {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::UnorderedElementsAre;

/// Stands for whatever services a desktop has, and notes what they are asked.
class Portal : public QObject {
    Q_OBJECT
    Q_CLASSINFO("D-Bus Interface", "org.freedesktop.portal.Inhibit")

  public:
    explicit Portal(std::vector<std::string>& calls) : m_calls(calls) {}

  public slots:
    QDBusObjectPath Inhibit(const QString& window, uint flags, const QVariantMap& options) {
        m_calls.push_back("portal inhibit '" + window.toStdString() + "' " + std::to_string(flags) + " " +
                          options["reason"].toString().toStdString());
        return QDBusObjectPath("/org/freedesktop/portal/desktop/request/1");
    }

  private:
    std::vector<std::string>& m_calls;
};

class PortalRequest : public QObject {
    Q_OBJECT
    Q_CLASSINFO("D-Bus Interface", "org.freedesktop.portal.Request")

  public:
    explicit PortalRequest(std::vector<std::string>& calls) : m_calls(calls) {}

  public slots:
    void Close() { m_calls.emplace_back("portal close"); }

  private:
    std::vector<std::string>& m_calls;
};

class ScreenSaver : public QObject {
    Q_OBJECT
    Q_CLASSINFO("D-Bus Interface", "org.freedesktop.ScreenSaver")

  public:
    explicit ScreenSaver(std::vector<std::string>& calls) : m_calls(calls) {}

  public slots:
    uint Inhibit(const QString& who, const QString& reason) {
        m_calls.push_back("saver inhibit " + who.toStdString() + ": " + reason.toStdString());
        return 42;
    }
    void UnInhibit(uint cookie) { m_calls.push_back("saver uninhibit " + std::to_string(cookie)); }

  private:
    std::vector<std::string>& m_calls;
};

class LoginManager : public QObject {
    Q_OBJECT
    Q_CLASSINFO("D-Bus Interface", "org.freedesktop.login1.Manager")

  public:
    explicit LoginManager(std::vector<std::string>& calls) : m_calls(calls) {
        if (pipe2(m_pipe.data(), O_CLOEXEC | O_NONBLOCK) != 0) {
            m_pipe = {-1, -1};
        }
    }
    ~LoginManager() override { close(m_pipe[0]); }

    /// Like the real one, it knows that an inhibitor is given up by its end of the pipe being closed.
    bool isReleased() const {
        char byte = 0;
        return read(m_pipe[0], &byte, 1) == 0;
    }

  public slots:
    QDBusUnixFileDescriptor Inhibit(const QString& what, const QString& who, const QString& why, const QString& mode) {
        m_calls.push_back("login inhibit " + what.toStdString() + " " + who.toStdString() + ": " + why.toStdString() +
                          " " + mode.toStdString());
        const QDBusUnixFileDescriptor given(m_pipe[1]);
        close(m_pipe[1]);
        return given;
    }

  private:
    std::vector<std::string>& m_calls;
    std::array<int, 2> m_pipe{-1, -1};
};

bool runUntil(const std::function<bool()>& condition) {
    const QDeadlineTimer end(20000);
    while (!condition()) {
        if (end.hasExpired()) {
            return false;
        }
        QCoreApplication::processEvents(QEventLoop::AllEvents, 10);
    }
    return true;
}

/// A bus of the test's own, on which this process offers the services. Each case needs a process of its own, as the
/// test runner gives it, because the addresses of the buses are read once in a process.
class ActivityTest : public testing::Test {
  protected:
    void SetUp() override {
        daemon.start("dbus-daemon", {"--session", "--nofork", "--print-address"});
        ASSERT_TRUE(daemon.waitForReadyRead(20000)) << "dbus-daemon did not start";
        const QByteArray address = daemon.readLine().trimmed();
        qputenv("DBUS_SESSION_BUS_ADDRESS", address);
        qputenv("DBUS_SYSTEM_BUS_ADDRESS", address);
        ASSERT_TRUE(bus().isConnected());
    }

    void TearDown() override {
        QDBusConnection::disconnectFromBus("services");
        daemon.terminate();
        daemon.waitForFinished();
    }

    static QDBusConnection bus() {
        return QDBusConnection::connectToBus(QDBusConnection::SessionBus, QStringLiteral("services"));
    }

    static void offer(const char* service, const char* path, QObject* object) {
        ASSERT_TRUE(bus().registerService(service));
        ASSERT_TRUE(bus().registerObject(path, object, QDBusConnection::ExportAllSlots));
    }

    void end(std::unique_ptr<Activity>& activity) {
        // The services answer on this thread, which therefore must not be the one that waits.
        std::atomic<bool> ended = false;
        std::thread ending([&] {
            activity.reset();
            ended = true;
        });
        runUntil([&] { return ended.load(); });
        ending.join();
        QCoreApplication::processEvents();
    }

    int count = 1;
    char name[5] = "test";                // NOLINT(modernize-avoid-c-arrays): argv is an array
    char* arguments[2] = {name, nullptr}; // NOLINT(modernize-avoid-c-arrays)
    QCoreApplication application{count, arguments};
    QProcess daemon;
    std::vector<std::string> calls;
};

TEST_F(ActivityTest, AsksThePortalAndReleasesItAtItsEnd) {
    Portal portal(calls);
    PortalRequest request(calls);
    offer("org.freedesktop.portal.Desktop", "/org/freedesktop/portal/desktop", &portal);
    offer("org.freedesktop.portal.Desktop", "/org/freedesktop/portal/desktop/request/1", &request);
    ScreenSaver saver(calls);
    offer("org.freedesktop.ScreenSaver", "/org/freedesktop/ScreenSaver", &saver);
    LoginManager login(calls);
    offer("org.freedesktop.login1", "/org/freedesktop/login1", &login);

    auto activity = std::make_unique<Activity>("realtime UDP receiving");
    EXPECT_TRUE(runUntil([&] { return calls.size() >= 2; }));
    EXPECT_THAT(calls, UnorderedElementsAre("portal inhibit '' 12 realtime UDP receiving",
                                            "login inhibit idle:sleep QIVO Viewer: realtime UDP receiving block"));
    EXPECT_FALSE(login.isReleased());
    end(activity);
    ASSERT_TRUE(runUntil([&] { return calls.size() >= 3 && login.isReleased(); }));
    EXPECT_EQ(calls.back(), "portal close");
}

TEST_F(ActivityTest, AsksTheScreenSaverWhereThereIsNoPortal) {
    ScreenSaver saver(calls);
    offer("org.freedesktop.ScreenSaver", "/org/freedesktop/ScreenSaver", &saver);
    auto activity = std::make_unique<Activity>("realtime UDP receiving");
    EXPECT_TRUE(runUntil([&] { return !calls.empty(); }));
    EXPECT_THAT(calls, ElementsAre("saver inhibit QIVO Viewer: realtime UDP receiving"));
    end(activity);
    ASSERT_TRUE(runUntil([&] { return calls.size() >= 2; }));
    EXPECT_EQ(calls.back(), "saver uninhibit 42");
}

TEST(Activity, IsSilentWhereThereIsNoBus) {
    qputenv("DBUS_SESSION_BUS_ADDRESS", "unix:path=/nonexistent");
    qputenv("DBUS_SYSTEM_BUS_ADDRESS", "unix:path=/nonexistent");
    testing::internal::CaptureStderr();
    { const Activity activity("realtime UDP receiving"); }
    EXPECT_THAT(testing::internal::GetCapturedStderr(), IsEmpty());
}

TEST(Activity, EndsAtOnceWhereBothBusesRefuseTheConnection) {
    const std::string path = testing::TempDir() + "qivo-rude-bus-" + std::to_string(getpid());
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    path.copy(address.sun_path, sizeof(address.sun_path) - 1);
    const int listener = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    ASSERT_EQ(bind(listener, reinterpret_cast<const sockaddr*>(&address), sizeof(address)), 0);
    ASSERT_EQ(listen(listener, 2), 0);
    qputenv("DBUS_SESSION_BUS_ADDRESS", ("unix:path=" + path).c_str());
    qputenv("DBUS_SYSTEM_BUS_ADDRESS", ("unix:path=" + path).c_str());
    std::array<int, 2> connections{};
    std::chrono::steady_clock::time_point ended;
    {
        const Activity activity("realtime UDP receiving");
        const std::string refusal = "REJECTED\r\nREJECTED\r\nREJECTED\r\n"; // as many lines as answers are due
        for (int& connection : connections) {
            connection = accept(listener, nullptr, nullptr);
            EXPECT_EQ(write(connection, refusal.data(), refusal.size()), static_cast<ssize_t>(refusal.size()));
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(100));
        ended = std::chrono::steady_clock::now();
    }
    EXPECT_LT(std::chrono::steady_clock::now() - ended, std::chrono::milliseconds(Activity::kEndTimeoutMs / 2));
    for (const int descriptor : {connections[0], connections[1], listener}) {
        close(descriptor);
    }
    unlink(path.c_str());
}

/// Two buses that take connections and never say a word.
class SilentBusTest : public testing::Test {
  protected:
    void SetUp() override {
        sockaddr_un address{};
        address.sun_family = AF_UNIX;
        path.copy(address.sun_path, sizeof(address.sun_path) - 1);
        ASSERT_EQ(bind(silent, reinterpret_cast<const sockaddr*>(&address), sizeof(address)), 0);
        ASSERT_EQ(listen(silent, 2), 0);
        qputenv("DBUS_SESSION_BUS_ADDRESS", ("unix:path=" + path).c_str());
        qputenv("DBUS_SYSTEM_BUS_ADDRESS", ("unix:path=" + path).c_str());
    }

    void TearDown() override {
        close(silent);
        unlink(path.c_str());
    }

    const std::string path = testing::TempDir() + "qivo-silent-bus-" + std::to_string(getpid());
    const int silent = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
};

TEST_F(SilentBusTest, KeepsNeitherTheBeginningNorTheEndWaiting) {
    const auto start = std::chrono::steady_clock::now();
    {
        const Activity activity("realtime UDP receiving");
        EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::milliseconds(200));
    }
    EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::milliseconds(2 * Activity::kEndTimeoutMs));
}

TEST_F(SilentBusTest, KeepsNoProcessFromEnding) {
    const auto runAndExit = [] {
        {
            const Activity activity("realtime UDP receiving");
            std::this_thread::sleep_for(std::chrono::milliseconds(100)); // so that it is in the middle of asking
        }
        std::exit(7); // NOLINT(concurrency-mt-unsafe): destroys what is static, as the end of main does
    };
    const auto start = std::chrono::steady_clock::now();
    EXPECT_EXIT(runAndExit(), testing::ExitedWithCode(7), "^$");
    EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::seconds(3));
}

/// A bus that works, with services that take requests and never answer.
TEST_F(ActivityTest, ServiceThatDoesNotAnswerKeepsNobodyWaiting) {
    ASSERT_TRUE(bus().registerService("org.freedesktop.portal.Desktop"));
    ASSERT_TRUE(bus().registerService("org.freedesktop.login1"));
    const auto start = std::chrono::steady_clock::now();
    {
        const Activity activity("realtime UDP receiving");
        std::this_thread::sleep_for(std::chrono::milliseconds(100)); // nothing is served meanwhile
    }
    EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::milliseconds(100 + 2 * Activity::kEndTimeoutMs));
}

} // namespace
} // namespace qivo

#include "ActivityTest.moc"
