// The place of the activity among what the controller begins and ends, seen by the service that is asked.
#include "app/AppDelegate.h"

#include "platform/Preferences.h"
#include "tests/app/ShellFixture.h"
#include "tests/audio/FakeAudioQueue.h"
#include "tests/support/Screen.h"

#include <QDBusConnection>
#include <QFile>
#include <QFileInfo>
#include <QProcess>
#include <QThread>

#include <mutex>
#include <vector>

namespace qivo {
namespace {

using testing::ElementsAre;

/// A screen saver that notes what it is asked, and whether the settings have been saved by then. It is served on a
/// thread of its own, because the main thread is what is tested.
class ScreenSaver : public QObject {
    Q_OBJECT
    Q_CLASSINFO("D-Bus Interface", "org.freedesktop.ScreenSaver")

  public:
    std::vector<std::string> notes() const {
        const std::lock_guard guard(m_mutex);
        return m_notes;
    }

    bool hasNotes(std::size_t count) const {
        return test::eventually([&] { return notes().size() >= count; });
    }

  public slots:
    uint Inhibit(const QString&, const QString& reason) {
        note("inhibit: " + reason.toStdString());
        return 1;
    }
    void UnInhibit(uint) { note(QFileInfo::exists(Preferences::userFile()) ? "let go, saved" : "let go, not saved"); }

  private:
    void note(std::string text) {
        const std::lock_guard guard(m_mutex);
        m_notes.push_back(std::move(text));
    }

    mutable std::mutex m_mutex; // protects m_notes
    std::vector<std::string> m_notes;
};

class ActivityPlaceTest : public test::ShellFixture {
  protected:
    void SetUp() override {
        ShellFixture::SetUp();
        test::FakeAudioQueue::instance().reset();
        QFile::remove(Preferences::userFile());
        daemon.start("dbus-daemon", {"--session", "--nofork", "--print-address"});
        ASSERT_TRUE(daemon.waitForReadyRead(20000)) << "dbus-daemon did not start";
        const QByteArray address = daemon.readLine().trimmed();
        qputenv("DBUS_SESSION_BUS_ADDRESS", address);
        qputenv("DBUS_SYSTEM_BUS_ADDRESS", address);
        auto bus = QDBusConnection::connectToBus(QString::fromLatin1(address), "services");
        saver.moveToThread(&thread);
        thread.start();
        ASSERT_TRUE(bus.registerObject("/org/freedesktop/ScreenSaver", &saver, QDBusConnection::ExportAllSlots));
        ASSERT_TRUE(bus.registerService("org.freedesktop.ScreenSaver"));
    }

    void TearDown() override {
        QDBusConnection::disconnectFromBus("services");
        thread.quit();
        thread.wait();
        daemon.terminate();
        daemon.waitForFinished();
        qunsetenv("DBUS_SESSION_BUS_ADDRESS");
        qunsetenv("DBUS_SYSTEM_BUS_ADDRESS");
        ShellFixture::TearDown();
    }

    QProcess daemon;
    QThread thread;
    ScreenSaver saver;
};

TEST_F(ActivityPlaceTest, ItBeginsFirstThenTheMenuIsToldThenThePlayerIsMadeAndItEndsAfterTheSettingsAreSaved) {
    AppDelegate delegate;
    fake.setFinderCreates(false);
    QIVOFileMenu menu; // makes its finder when it is told of the launch
    delegate.setQivoSourcesMenu(&menu);
    fake.setFinderCreates(true);
    bool wasAsked = false;
    bool hadPlayer = true;
    std::vector<std::string> notesAtTheFindersEnd;
    fake.setHook([&](const std::string& call) {
        if (call.rfind("find_create_v2", 0) == 0) {
            wasAsked = saver.hasNotes(1);
            hadPlayer = delegate.audioPlayer() != nullptr;
        } else if (call.rfind("find_destroy", 0) == 0) {
            notesAtTheFindersEnd = saver.notes();
        }
    });
    delegate.applicationDidFinishLaunching();
    EXPECT_TRUE(wasAsked);
    EXPECT_FALSE(hadPlayer);
    EXPECT_NE(delegate.audioPlayer(), nullptr);
    delegate.applicationWillTerminate();
    fake.setHook({});
    EXPECT_THAT(notesAtTheFindersEnd, ElementsAre("inhibit: realtime UDP receiving"));
    EXPECT_TRUE(saver.hasNotes(2));
    EXPECT_THAT(saver.notes(), ElementsAre("inhibit: realtime UDP receiving", "let go, saved"));
}

} // namespace
} // namespace qivo

#include "ActivityPlaceTest.moc"
