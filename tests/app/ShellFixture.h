#pragma once

#include "app/AppData.h"
#include "tests/fake/FakeQivo.h"

#include <QApplication>
#include <QDeadlineTimer>

#include <functional>
#include <gmock/gmock.h>
#include <memory>
#include <thread>

namespace qivo::test {

/// Runs the event loop until the condition holds. False once the deadline has passed.
inline bool runUntil(const std::function<bool()>& condition,
                     std::chrono::milliseconds deadline = std::chrono::seconds(20)) {
    const QDeadlineTimer end(deadline);
    while (!condition()) {
        if (end.hasExpired()) {
            return false;
        }
        QCoreApplication::processEvents(QEventLoop::AllEvents, 10);
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
    }
    return true;
}

/// An application with the scripted libqivo. The shared model is the process's, so that its state is put back.
class ShellFixture : public testing::Test {
  protected:
    static void SetUpTestSuite() {
        static int count = 1;
        static char name[] = "shell-test";          // NOLINT(modernize-avoid-c-arrays): argv is an array
        static char* arguments[] = {name, nullptr}; // NOLINT(modernize-avoid-c-arrays)
        application() = std::make_unique<QApplication>(count, static_cast<char**>(arguments));
        QGuiApplication::setQuitOnLastWindowClosed(false);
    }
    static void TearDownTestSuite() { application().reset(); }

    void SetUp() override {
        fake.reset();
        model.setDeviceWebpageURL(QString());
        model.setIsRecording(false);
        model.setRecorderPath(QString()); // not the one that this machine may have
        model.setMute(false);
        model.setIsLowBandwidth(false);
    }

    void TearDown() override {
        EXPECT_THAT(fake.misuse(), testing::IsEmpty());
        EXPECT_EQ(fake.openReceivers(), 0);
        fake.reset();
    }

    FakeQivo& fake = FakeQivo::instance();
    AppData& model = *AppData::inst();

  private:
    static std::unique_ptr<QApplication>& application() {
        static std::unique_ptr<QApplication> instance;
        return instance;
    }
};

} // namespace qivo::test
