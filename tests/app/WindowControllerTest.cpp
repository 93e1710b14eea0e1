#include "app/WindowController.h"

#include "app/MainWindow.h"
#include "tests/app/RecorderScript.h"
#include "tests/app/ShellFixture.h"

#include <QMenuBar>
#include <QSignalSpy>

namespace qivo {
namespace {

class WindowControllerTest : public test::ShellFixture {
  protected:
    MainWindow window;
    WindowController controller{&window};
};

TEST_F(WindowControllerTest, AccessoryViewStandsAtTheRightOfTheMenuBarOnceTheWindowHasLoaded) {
    auto view = std::make_unique<QWidget>();
    QWidget* placed = view.get();
    controller.setAccessoryView(std::move(view));
    EXPECT_EQ(window.menuBar()->cornerWidget(Qt::TopRightCorner), nullptr);
    controller.windowDidLoad();
    EXPECT_EQ(window.menuBar()->cornerWidget(Qt::TopRightCorner), placed);
    EXPECT_EQ(controller.accessoryView(), placed);
}

TEST_F(WindowControllerTest, AccessoryIsCreatedOnlyOnce) {
    controller.setAccessoryView(std::make_unique<QWidget>());
    controller.windowDidLoad();
    QWidget* first = window.menuBar()->cornerWidget(Qt::TopRightCorner);
    controller.setAccessoryView(std::make_unique<QWidget>());
    controller.createAccessoryViewControllerIfNeeded();
    controller.windowDidLoad();
    EXPECT_EQ(window.menuBar()->cornerWidget(Qt::TopRightCorner), first);
}

TEST_F(WindowControllerTest, WindowWithoutAccessoryViewLoads) {
    controller.windowDidLoad();
    EXPECT_EQ(window.menuBar()->cornerWidget(Qt::TopRightCorner), nullptr);
}

TEST_F(WindowControllerTest, ClosingTheWindowEndsTheRecordingBeforeAnybodyElseHearsOfIt) {
    model.setIsRecording(true);
    bool recordingWhenOthersHear = true;
    QObject::connect(&window, &MainWindow::willClose, &window, [&] { recordingWhenOthersHear = model.isRecording(); });
    window.show();
    QSignalSpy willClose(&window, &MainWindow::willClose);
    EXPECT_TRUE(window.close());
    EXPECT_EQ(willClose.count(), 1);
    EXPECT_FALSE(recordingWhenOthersHear);
    EXPECT_FALSE(model.isRecording());
}

TEST_F(WindowControllerTest, ClosingTheWindowWhileRecordingInterruptsTheRecorderAndWaitsForIt) {
    const test::RecorderScript script;
    model.setRecorderPath(QString::fromStdString(script.program("chatty")));
    model.setQIVOSourceInfoNamed("STUDIO (Cam 1)", "fake://1");
    model.setIsRecording(true);
    ASSERT_TRUE(script.waitForStarts(1));
    int endsWhenOthersHear = -1;
    QObject::connect(&window, &MainWindow::willClose, &window, [&] { endsWhenOthersHear = script.ends(); });
    window.show();
    EXPECT_TRUE(window.close());
    EXPECT_EQ(endsWhenOthersHear, 1);
}

TEST_F(WindowControllerTest, AnswersTheSharedModel) {
    EXPECT_EQ(controller.getTheModel(), AppData::inst());
}

} // namespace
} // namespace qivo
