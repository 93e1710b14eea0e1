#include "app/ViewController.h"

#include "tests/app/ShellFixture.h"

#include <QSignalSpy>

namespace qivo {
namespace {

using ViewControllerTest = test::ShellFixture;

TEST_F(ViewControllerTest, HasTheSharedModelFromTheStart) {
    ViewController controller;
    EXPECT_EQ(controller.theModel(), AppData::inst());
    controller.viewDidLoad();
    controller.setRepresentedObject(7);
    EXPECT_EQ(controller.representedObject(), 7);
}

TEST_F(ViewControllerTest, SegueIsAnnouncedAndLeadsNowhereByItself) {
    ViewController controller;
    QSignalSpy performed(&controller, &ViewController::seguePerformed);
    const auto windows = QApplication::topLevelWidgets().size();
    testing::internal::CaptureStdout();
    controller.performSegue("AnySegue", &controller);
    EXPECT_EQ(testing::internal::GetCapturedStdout(), "");
    EXPECT_EQ(performed.count(), 1);
    EXPECT_EQ(QApplication::topLevelWidgets().size(), windows);
}

} // namespace
} // namespace qivo
