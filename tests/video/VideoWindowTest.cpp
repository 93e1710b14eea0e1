#include "tests/video/WindowFixture.h"

#include <QAction>
#include <QMenu>
#include <QMenuBar>

namespace qivo::test {
namespace {

class VideoWindowTest : public WindowFixture {};

TEST_F(VideoWindowTest, IsBlackUntilTheFirstFrame) {
    show(640, 360);
    ASSERT_TRUE(waitForColour(640, 360, 320, 180, kBlack));
    expectBox(grab(), 0, 0, 0, 0, kRed);
}

TEST_F(VideoWindowTest, FillsAnAreaOfThePicturesShape) {
    showRed(1920, 1080);
    expectBox(grab(), 0, 0, 1920, 1080, kRed);
}

TEST_F(VideoWindowTest, ASquareAreaHasBarsAboveAndBelow) {
    showRed(640, 360);
    window->resize(1000, 1000);
    ASSERT_TRUE(waitForColour(1000, 1000, 500, 500, kRed));
    ASSERT_TRUE(waitForColour(1000, 1000, 500, 218, kBlack));
    // 218 rows below, the remaining 219 above.
    expectBox(grab(), 0, 1000 - 218 - 563, 1000, 563, kRed);
}

TEST_F(VideoWindowTest, AFlatAreaHasBarsAtTheSides) {
    showRed(640, 360);
    window->resize(1000, 400);
    ASSERT_TRUE(waitForColour(1000, 400, 500, 200, kRed));
    ASSERT_TRUE(waitForColour(1000, 400, 143, 200, kBlack));
    expectBox(grab(), 144, 0, 711, 400, kRed);
}

TEST_F(VideoWindowTest, FullScreenFillsTheScreenAndKeepsTheShortcuts) {
    QAction* leave = window->addAction("Full screen");
    leave->setShortcut(Qt::Key_F11);
    QObject::connect(leave, &QAction::triggered, [&] { window->showNormal(); });
    showRed(640, 360);
    window->showFullScreen();
    const Picture all = screen->grabAll();
    ASSERT_TRUE(waitForColour(all.width, all.height, all.width / 2, all.height / 2, kRed));
    screen->click(all.width / 2, all.height / 2);
    ASSERT_TRUE(runUntil([&] { return view->hasFocus(); }));
    screen->key("F11");
    EXPECT_TRUE(waitForColour(640, 360, 320, 180, kRed));
}

TEST_F(VideoWindowTest, ThePictureSurvivesThatTheWindowIsMadeAnew) {
    showRed(640, 360);
    for (int i = 0; i < 3; ++i) {
        const unsigned long before = screen->findWindow(kTitle).value().id;
        window->makeAnew();
        ASSERT_TRUE(runUntil([&] {
            const auto found = screen->findWindow(kTitle);
            return found && found->id != before;
        }));
        EXPECT_TRUE(waitForColour(640, 360, 320, 180, kRed)) << i;
    }
    FakeQivo::instance().addVideo(64, 36, 0x00ff00ff, kWide);
    EXPECT_TRUE(waitForColour(640, 360, 320, 180, kGreen));
}

TEST_F(VideoWindowTest, ThePictureSurvivesAMoveIntoAnotherWindow) {
    showRed(640, 360);
    auto other = std::make_unique<ClosingWindow>();
    other->setWindowTitle("Elsewhere");
    other->resize(500, 500);
    other->show();
    other->setCentralWidget(view);
    view->show();
    ASSERT_TRUE(runUntil([&] {
        const auto found = screen->findWindow("Elsewhere");
        const auto area = found ? screen->largestChild(*found) : std::nullopt;
        const Picture shot = area ? screen->grab(*area) : Picture();
        return shot.width == 500 && shot.height == 500 && colour(shot, 250, 250) == kRed &&
               colour(shot, 250, 50) == kBlack;
    }));
    other.reset();
}

TEST_F(VideoWindowTest, WhileItIsMinimisedItGoesOnCapturing) {
    showRed(640, 360);
    window->showMinimized();
    ASSERT_TRUE(runUntil([&] { return !picture().has_value(); }));
    FakeQivo::instance().addVideo(64, 36, 0x00ff00ff, kWide);
    const std::size_t before = FakeQivo::instance().callsOf("recv_capture_v2").size();
    ASSERT_TRUE(runUntil([&] { return FakeQivo::instance().callsOf("recv_capture_v2").size() > before + 10; }));
    window->showNormal();
    EXPECT_TRUE(waitForColour(640, 360, 320, 180, kGreen));
}

TEST_F(VideoWindowTest, ResizingWhileItDrawsDoesNotHangAndEndsWithTheWholePicture) {
    showRed(640, 360);
    for (int i = 0; i < 40; ++i) {
        window->resize(300 + 10 * i, 700 - 10 * i);
        runFor(std::chrono::milliseconds(5));
    }
    window->resize(1000, 400);
    ASSERT_TRUE(waitForColour(1000, 400, 500, 200, kRed));
    ASSERT_TRUE(waitForColour(1000, 400, 143, 200, kBlack));
    expectBox(grab(), 144, 0, 711, 400, kRed);
}

TEST_F(VideoWindowTest, ItDrawsAtTheRateOfTheScreenAndNotFaster) {
    showRed(640, 360);
    const auto passes = [] { return FakeQivo::instance().callsOf("recv_capture_v2").size(); };
    const std::size_t before = passes();
    const auto begin = std::chrono::steady_clock::now();
    runFor(std::chrono::seconds(1));
    const std::size_t made = passes() - before;
    const std::chrono::duration<double> took = std::chrono::steady_clock::now() - begin;
    const double rate = static_cast<double>(made) / took.count();
    EXPECT_GT(rate, 20); // however busy the machine is
    EXPECT_LE(rate, 66);
}

TEST_F(VideoWindowTest, AClickOnThePictureLeavesMenusAndShortcutsAlive) {
    QMenu* menu = window->menuBar()->addMenu("&Sources");
    menu->addAction("One");
    QAction* fullScreen = window->addAction("Full screen");
    int triggered = 0;
    fullScreen->setShortcut(Qt::Key_F11);
    QObject::connect(fullScreen, &QAction::triggered, [&] { ++triggered; });
    show(640, 360);
    screen->activate(screen->findWindow(kTitle).value());
    const auto area = *picture();
    screen->click(area.x + 320, area.y + 180);
    ASSERT_TRUE(runUntil([&] { return view->hasFocus(); }));
    screen->key("F11");
    EXPECT_TRUE(runUntil([&] { return triggered == 1; }, std::chrono::seconds(5)));
    screen->key("Alt+s");
    EXPECT_TRUE(runUntil([&] { return menu->isVisible(); }, std::chrono::seconds(5)));
    screen->key("Escape");
    EXPECT_TRUE(runUntil([&] { return !menu->isVisible(); }, std::chrono::seconds(5)));
}

TEST_F(VideoWindowTest, ClosingStopsTheLinkThenEndsTheReceiver) {
    showRed(640, 360);
    window->close();
    EXPECT_EQ(FakeQivo::instance().openReceivers(), 0);
    FakeQivo::instance().takeCalls();
    runFor(std::chrono::milliseconds(100));
    EXPECT_EQ(FakeQivo::instance().calls(), std::vector<std::string>());
}

} // namespace
} // namespace qivo::test
