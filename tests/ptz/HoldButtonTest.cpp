#include "ptz/HoldButton.h"

#include "tests/app/ShellFixture.h"

#include <QSignalSpy>
#include <QTest>

namespace qivo {
namespace {

class HoldButtonTest : public test::ShellFixture {
  protected:
    void SetUp() override {
        ShellFixture::SetUp();
        button.resize(40, 40);
        button.show();
    }

    HoldButton button;
    QSignalSpy pressed{&button, &HoldButton::pressed};
    QSignalSpy released{&button, &HoldButton::released};
    QSignalSpy state{&button, &HoldButton::stateChanged};
    QSignalSpy interrupted{&button, &HoldButton::interrupted};
    const QPoint inside{20, 20};
    const QPoint outside{200, 20};
};

TEST_F(HoldButtonTest, IsPressedOnceAndReleasedOnceAndMovesItsStateOn) {
    QTest::mousePress(&button, Qt::LeftButton, {}, inside);
    EXPECT_TRUE(button.isDown());
    EXPECT_EQ(pressed.count(), 1);
    EXPECT_EQ(released.count(), 0);
    QTest::mouseRelease(&button, Qt::LeftButton, {}, inside);
    EXPECT_FALSE(button.isDown());
    EXPECT_EQ(released.count(), 1);
    EXPECT_EQ(button.state(), 1);
    QTest::mouseClick(&button, Qt::LeftButton, {}, inside);
    EXPECT_EQ(button.state(), 0);
    EXPECT_EQ(state.count(), 2);
}

TEST_F(HoldButtonTest, DraggingOffAndOnSendsNothingAndReleaseOutsideCountsButKeepsTheState) {
    QTest::mousePress(&button, Qt::LeftButton, {}, inside);
    QTest::mouseMove(&button, outside);
    QTest::mouseMove(&button, inside);
    QTest::mouseMove(&button, outside);
    EXPECT_EQ(pressed.count(), 1);
    EXPECT_EQ(released.count(), 0);
    QTest::mouseRelease(&button, Qt::LeftButton, {}, outside);
    EXPECT_EQ(released.count(), 1);
    EXPECT_EQ(state.count(), 0);
}

TEST_F(HoldButtonTest, OtherMouseButtonsDoNothing) {
    QTest::mouseClick(&button, Qt::RightButton, {}, inside);
    EXPECT_EQ(pressed.count(), 0);
    QTest::mousePress(&button, Qt::LeftButton, {}, inside);
    QTest::mouseClick(&button, Qt::MiddleButton, {}, inside);
    EXPECT_EQ(pressed.count(), 1);
    EXPECT_EQ(released.count(), 0);
    QTest::mouseRelease(&button, Qt::LeftButton, {}, inside);
    EXPECT_EQ(released.count(), 1);
}

TEST_F(HoldButtonTest, SecondPressOfADoubleClickCounts) {
    QTest::mouseClick(&button, Qt::LeftButton, {}, inside);
    QTest::mouseDClick(&button, Qt::LeftButton, {}, inside); // sends that one event alone
    EXPECT_EQ(pressed.count(), 2);
    QTest::mouseRelease(&button, Qt::LeftButton, {}, inside);
    EXPECT_EQ(released.count(), 2);
}

TEST_F(HoldButtonTest, HiddenWhileHeldItTellsOnceAndForgetsThePress) {
    QTest::mousePress(&button, Qt::LeftButton, {}, inside);
    button.hide();
    EXPECT_EQ(interrupted.count(), 1);
    EXPECT_FALSE(button.isDown());
    button.show();
    QTest::mouseRelease(&button, Qt::LeftButton, {}, inside);
    EXPECT_EQ(released.count(), 0);
    button.hide();
    EXPECT_EQ(interrupted.count(), 1);
}

TEST_F(HoldButtonTest, WindowWithoutTheKeyboardInterruptsAndReleaseStillComes) {
    QTest::mousePress(&button, Qt::LeftButton, {}, inside);
    QEvent deactivated(QEvent::WindowDeactivate);
    QCoreApplication::sendEvent(&button, &deactivated);
    EXPECT_EQ(interrupted.count(), 1);
    QTest::mouseRelease(&button, Qt::LeftButton, {}, inside);
    EXPECT_EQ(released.count(), 1);
    QCoreApplication::sendEvent(&button, &deactivated);
    EXPECT_EQ(interrupted.count(), 1);
}

} // namespace
} // namespace qivo
