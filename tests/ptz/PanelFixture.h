#pragma once

#include "ptz/PTZPanel.h"
#include "ptz/PTZViewController.h"
#include "tests/app/ShellFixture.h"
#include "tests/platform/LogCapture.h"
#include "tests/support/Screen.h"

#include <QAbstractSlider>

#include <string>
#include <vector>

namespace qivo::test {

/// A user in front of a window with the panel open beside it, and a camera behind the model.
class PanelFixture : public ShellFixture {
  protected:
    using Calls = std::vector<std::string>;
    static constexpr const char* kTitle = "Camera Control";

    void SetUp() override {
        ShellFixture::SetUp();
        screen = Screen::open();
        ASSERT_TRUE(screen);
        screen->moveTo(1, 1); // where no window will be
        QIVOlib_recv_create_v3_t settings{};
        receiver = QIVOlib_recv_create_v3(&settings);
        model.setPtzSource(receiver);
        window = std::make_unique<QWidget>();
        window->setWindowTitle("Main");
        window->setGeometry(60, 60, 480, 270);
        ASSERT_TRUE(activate(*window));
        open();
        fake.takeCalls();
        log.take();
    }

    void TearDown() override {
        screen->release();
        window.reset();
        model.setPtzSource(nullptr);
        endReceiver();
        ShellFixture::TearDown();
    }

    void open() {
        panel = std::make_unique<PTZPanel>(window.get()).release(); // the window owns it
        panel->present();
        ASSERT_TRUE(runUntil([&] { return panel->isActiveWindow() && screen->findWindow(kTitle); }));
    }

    /// Now and then a window that is new does not learn that it has the keyboard; shown again, it does.
    static bool activate(QWidget& widget) {
        for (int attempt = 0; attempt < 5; ++attempt) {
            widget.show();
            if (runUntil([&] { return widget.isActiveWindow(); }, std::chrono::seconds(4))) {
                return true;
            }
            widget.hide();
        }
        return false;
    }

    /// As the video view does when it ends a connection.
    void endReceiver() {
        if (receiver != nullptr) {
            QIVOlib_recv_destroy(receiver);
            receiver = nullptr;
        }
    }

    template <typename Widget = QAbstractButton>
    Widget* control(const char* name) const {
        return panel->findChild<Widget*>(name);
    }

    static QPoint middleOf(const QWidget* widget) { return widget->mapToGlobal(widget->rect().center()); }

    void press(const char* name) {
        const QPoint at = middleOf(control<QWidget>(name));
        screen->press(at.x(), at.y());
    }

    void click(const char* name) {
        press(name);
        screen->release();
    }

    /// Drags to a place outside every button, but inside the panel.
    void dragAway() {
        const QPoint at = panel->mapToGlobal(QPoint(5, 5));
        screen->moveTo(at.x(), at.y());
    }

    /// What was sent to cameras so far.
    Calls sent() const { return fake.callsOf("recv_ptz_"); }

    /// Waits until exactly that has been sent, and a moment longer for what must not come. What has come then.
    Calls sentOnce(std::size_t count) {
        runUntil([&] { return sent().size() >= count; }, std::chrono::seconds(5));
        settle();
        const Calls all = sent();
        fake.takeCalls();
        return all;
    }

    static void settle() {
        runUntil([] { return false; }, std::chrono::milliseconds(80));
    }

    bool closes() {
        return runUntil([&] { return panel.isNull(); }) &&
               runUntil([&] { return !screen->findWindow(kTitle).has_value(); });
    }

    std::unique_ptr<Screen> screen;
    std::unique_ptr<QWidget> window;
    QPointer<PTZPanel> panel; // the window's; null once it has closed
    QIVOlib_recv_instance_t receiver = nullptr;
    LogCapture log;
};

} // namespace qivo::test
