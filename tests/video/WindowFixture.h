#pragma once

#include "app/AppData.h"
#include "tests/fake/FakeQivo.h"
#include "tests/support/Screen.h"
#include "video/VideoView.h"

#include <QApplication>
#include <QDeadlineTimer>
#include <QMainWindow>
#include <QString>
#include <QWindow>
#include <dlfcn.h>
#include <functional>
#include <gtest/gtest.h>
#include <link.h>
#include <memory>

namespace qivo::test {

/// A main window that announces its closing, as the application's does.
class ClosingWindow : public QMainWindow {
    Q_OBJECT

  public:
    ClosingWindow() { setAttribute(Qt::WA_QuitOnClose, false); }

    /// Gives up the window of the window system, with all that is in it, and makes another one.
    void makeAnew() {
        windowHandle()->destroy();
        windowHandle()->show();
    }

  signals:
    void willClose();

  protected:
    void closeEvent(QCloseEvent* event) override {
        emit willClose();
        QMainWindow::closeEvent(event);
    }
};

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

/// Runs the event loop for so long, for tests that something does not happen.
inline void runFor(std::chrono::milliseconds time) {
    runUntil([] { return false; }, time);
}

/// A user in front of a window with the video view, fed by the scripted libqivo.
class WindowFixture : public testing::Test {
  protected:
    static constexpr const char* kTitle = "Monitor";
    static constexpr float kWide = 16.0F / 9.0F;
    static constexpr std::uint32_t kRed = 0xff0000;
    static constexpr std::uint32_t kGreen = 0x00ff00;
    static constexpr std::uint32_t kBlack = 0;

    static void SetUpTestSuite() {
        static int count = 1;
        static char name[] = "video-window-test"; // NOLINT(modernize-avoid-c-arrays): argv is an array
        static char* arguments[] = {name, nullptr};
        s_application = std::make_unique<QApplication>(count, static_cast<char**>(arguments));
    }
    /// The graphics driver stays mapped, so that what it keeps for good has a name when leaks are counted.
    static void TearDownTestSuite() {
        dl_iterate_phdr(
            [](dl_phdr_info* info, std::size_t, void*) {
                dlopen(info->dlpi_name, RTLD_LAZY | RTLD_NOLOAD | RTLD_NODELETE);
                return 0;
            },
            nullptr);
        s_application.reset();
    }

    void SetUp() override {
        FakeQivo::instance().reset();
        screen = Screen::open();
        ASSERT_TRUE(screen);
        window = std::make_unique<ClosingWindow>();
        window->setWindowTitle(QString::fromLatin1(kTitle));
        view = new VideoView;
        window->setCentralWidget(view);
    }

    void TearDown() override {
        window.reset();
        EXPECT_EQ(FakeQivo::instance().misuse(), std::vector<std::string>());
        EXPECT_EQ(FakeQivo::instance().openReceivers(), 0);
        EXPECT_EQ(FakeQivo::instance().framesOut(), 0);
        FakeQivo::instance().reset();
    }

    /// Shows the window with an area for the picture of so many pixels, at scale 1.
    void show(int width, int height) {
        window->resize(width, height);
        window->show();
        ASSERT_TRUE(runUntil([&] { return picture().has_value() && picture()->width == width; }));
    }

    /// Shows the window with a red picture, 16 to 9, in it.
    void showRed(int width, int height) {
        show(width, height);
        FakeQivo::instance().addVideo(64, 36, 0xff0000ff, kWide);
        select();
        ASSERT_TRUE(waitForColour(width, height, width / 2, height / 2, kRed));
    }

    /// The whole picture has one colour in a rectangle and black round it.
    static void expectBox(const Picture& shot, int left, int top, int width, int height, std::uint32_t rgb) {
        int wrong = 0;
        for (int y = 0; y < shot.height; ++y) {
            for (int x = 0; x < shot.width; ++x) {
                const bool inside = x >= left && x < left + width && y >= top && y < top + height;
                wrong += colour(shot, x, y) != (inside ? rgb : kBlack) ? 1 : 0;
            }
        }
        EXPECT_EQ(wrong, 0) << "pixels differ from " << width << " x " << height << " at " << left << ", " << top;
    }

    void select() { AppData::inst()->setQIVOSourceInfoNamed("STUDIO (Cam 1)", "fake://one"); }

    /// The picture's own window.
    std::optional<Window> picture() const {
        const auto main = screen->findWindow(kTitle);
        return main ? screen->largestChild(*main) : std::nullopt;
    }

    Picture grab() const {
        const auto found = picture();
        return found ? screen->grab(*found) : Picture();
    }

    /// Waits until the picture's window has this size and this colour at a place in it.
    bool waitForColour(int width, int height, int x, int y, std::uint32_t rgb) const {
        return runUntil([&] {
            const Picture shot = grab();
            return shot.width == width && shot.height == height && colour(shot, x, y) == rgb;
        });
    }

    static std::uint32_t colour(const Picture& shot, int x, int y) {
        const auto at = shot.at(x, y);
        return static_cast<std::uint32_t>(at.red << 16 | at.green << 8 | at.blue);
    }

    std::unique_ptr<Screen> screen;
    std::unique_ptr<ClosingWindow> window;
    VideoView* view = nullptr; // the window's

  private:
    inline static std::unique_ptr<QApplication> s_application;
};

} // namespace qivo::test
