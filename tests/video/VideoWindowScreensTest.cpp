// A window that goes from one screen to another, where scale and refresh rate differ.

#include "tests/support/Process.h"
#include "tests/video/WindowFixture.h"
#include "video/LetterBox.h"

#include <QAction>
#include <QScreen>
#include <cstdlib>

namespace {

double leftRate = 75;
constexpr double kRightRate = 50;

} // namespace

/// In the place of the toolkit's, which gives all screens of a virtual X server the same rate.
qreal QScreen::refreshRate() const {
    return name() == QLatin1String("left") ? leftRate : kRightRate;
}

namespace qivo::test {
namespace {

constexpr int kHalf = 1100; // of the virtual screen, in pixels

/// Cuts the virtual screen in two, the right one with a scale of its own.
class VideoWindowScreensTest : public WindowFixture {
  protected:
    static void SetUpTestSuite() {
        monitor("left", "1100/290x1300/340+0+0", "screen");
        monitor("right", "1100/290x1300/340+1100+0", "none");
        qputenv("QT_SCREEN_SCALE_FACTORS", "left=1;right=1.5");
        qputenv("QT_SCALE_FACTOR_ROUNDING_POLICY", "PassThrough");
        WindowFixture::SetUpTestSuite();
    }

    static void monitor(const char* name, const char* geometry, const char* output) {
        const auto tool = Process::start({"/usr/bin/xrandr", "--setmonitor", name, geometry, output});
        ASSERT_TRUE(tool);
        ASSERT_EQ(tool->wait(std::chrono::seconds(10)), 0) << tool->errors();
    }

    void moveRight() {
        screen->move(screen->findWindow(kTitle).value(), kHalf + 150, 100);
        ASSERT_TRUE(runUntil([&] { return view->devicePixelRatioF() == 1.5; }));
    }

    /// The picture's own window has exactly the pixels that the view believes in, and the picture fills them.
    bool fits() const {
        const Rect backing = view->convertRectToBacking(view->bounds());
        const Picture shot = grab();
        if (shot.width != backing.size.width || shot.height != backing.size.height) {
            return false;
        }
        const Viewport box = letterBox(backing.size, kWide);
        const int top = shot.height - box.y - box.height;
        return colour(shot, box.x, top) == kRed && colour(shot, box.x + box.width - 1, top + box.height - 1) == kRed &&
               (box.y == 0 || (colour(shot, 0, box.y - 1) == kBlack && colour(shot, 0, top - 1) == kBlack));
    }
};

TEST_F(VideoWindowScreensTest, ThePictureFillsThePixelsOfTheOtherScreen) {
    showRed(401, 433);
    EXPECT_TRUE(runUntil([&] { return fits(); }));
    moveRight();
    EXPECT_TRUE(runUntil([&] { return fits(); }));
    for (const QSize size : {QSize(333, 301), QSize(334, 303), QSize(501, 500)}) {
        window->resize(size);
        // The way to the window manager and back, in pixels, may cost a unit.
        const auto resized = [&] {
            return std::abs(view->width() - size.width()) <= 1 && std::abs(view->height() - size.height()) <= 1;
        };
        EXPECT_TRUE(runUntil([&] { return resized() && fits(); })) << size.width();
    }
    screen->move(screen->findWindow(kTitle).value(), 100, 100);
    ASSERT_TRUE(runUntil([&] { return view->devicePixelRatioF() == 1; }));
    EXPECT_TRUE(runUntil([&] { return fits(); }));
}

TEST_F(VideoWindowScreensTest, TheLinkFollowsTheRefreshRateOfTheScreenThatTheWindowIsOn) {
    showRed(401, 433);
    QScreen* left = view->screen();
    const auto display = view->openGLContext()->display();
    EXPECT_EQ(display->rate, leftRate);
    std::uint32_t generation = display->generation;
    moveRight();
    EXPECT_TRUE(runUntil([&] { return display->rate == kRightRate; })) << display->rate;
    EXPECT_NE(display->generation, generation);
    leftRate = 30;
    emit left->refreshRateChanged(leftRate);
    EXPECT_EQ(display->rate, kRightRate) << "what happens to the screen that it left is nothing to it";
    screen->move(screen->findWindow(kTitle).value(), 100, 100);
    EXPECT_TRUE(runUntil([&] { return display->rate == leftRate; })) << display->rate;
    generation = display->generation;
    leftRate = 75;
    emit left->refreshRateChanged(leftRate);
    EXPECT_EQ(display->rate, leftRate);
    EXPECT_NE(display->generation, generation);
}

TEST_F(VideoWindowScreensTest, ShortcutsWorkAfterAClickOnTheOtherScreen) {
    QAction* action = window->addAction("Full screen");
    int triggered = 0;
    action->setShortcut(Qt::Key_F11);
    QObject::connect(action, &QAction::triggered, [&] { ++triggered; });
    showRed(400, 300);
    moveRight();
    ASSERT_TRUE(runUntil([&] { return fits(); }));
    screen->activate(screen->findWindow(kTitle).value());
    const auto area = *picture();
    screen->click(area.x + area.width / 2, area.y + area.height / 2);
    ASSERT_TRUE(runUntil([&] { return view->hasFocus(); }));
    screen->key("F11");
    EXPECT_TRUE(runUntil([&] { return triggered == 1; }, std::chrono::seconds(5)));
}

} // namespace
} // namespace qivo::test
