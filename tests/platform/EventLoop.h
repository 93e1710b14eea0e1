#pragma once

#include <QCoreApplication>
#include <QEventLoop>
#include <QTimer>

#include <chrono>
#include <functional>

namespace qivo::test {

/// The event loop of the thread that a test runs on.
class EventLoop {
  public:
    /// Makes the application object that the loop needs, once in the process.
    EventLoop() {
        static int count = 1;
        static char name[] = "test";
        static char* arguments[] = {name, nullptr};
        static QCoreApplication application(count, arguments);
    }

    /// Handles everything that is due, without waiting.
    static void settle() {
        for (int turn = 0; turn < 20; ++turn) {
            QCoreApplication::processEvents(QEventLoop::AllEvents);
        }
    }

    /// Handles events until the condition holds. False once the deadline has passed.
    static bool until(const std::function<bool()>& condition,
                      std::chrono::milliseconds deadline = std::chrono::seconds(20)) {
        const auto end = std::chrono::steady_clock::now() + deadline;
        QTimer again; // conditions may come true without an event
        again.start(std::chrono::milliseconds(20));
        while (!condition()) {
            if (std::chrono::steady_clock::now() >= end) {
                return false;
            }
            QCoreApplication::processEvents(QEventLoop::AllEvents | QEventLoop::WaitForMoreEvents);
        }
        return true;
    }

    /// Handles events for a while.
    static void run(std::chrono::milliseconds time) {
        until([] { return false; }, time);
    }
};

} // namespace qivo::test
