#include "ptz/PTZPanel.h"

#include "tests/ptz/PanelFixture.h"

#include <QAccessible>
#include <QKeyEvent>
#include <QScreen>
#include <QWindow>

#include <algorithm>
#include <set>

namespace qivo {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

using PTZPanelTest = test::PanelFixture;

TEST_F(PTZPanelTest, EveryControlTellsItsNameAndPurpose) {
    std::vector<QWidget*> controls;
    for (QAbstractButton* button : panel->findChildren<QAbstractButton*>()) {
        controls.push_back(button);
    }
    EXPECT_EQ(controls.size(), 6U + 1 + 9 + 1);
    controls.push_back(control<QWidget>("focus"));
    std::set<QString> names;
    for (QWidget* widget : controls) {
        QAccessibleInterface* accessible = QAccessible::queryAccessibleInterface(widget);
        ASSERT_NE(accessible, nullptr);
        EXPECT_FALSE(accessible->text(QAccessible::Name).isEmpty()) << widget->objectName().toStdString();
        EXPECT_FALSE(widget->toolTip().isEmpty()) << widget->objectName().toStdString();
        names.insert(accessible->text(QAccessible::Name));
    }
    EXPECT_EQ(names.size(), controls.size());
}

/// A press without a pointer, as a screen reader makes it, cannot be held: the description tells what can.
TEST_F(PTZPanelTest, MotionButtonsDescribeTheKeyThatIsHeldInTheirPlace) {
    for (const auto& [name, key] : {std::pair{"panLeft", "Left"},
                                    {"panRight", "Right"},
                                    {"tiltUp", "Up"},
                                    {"tiltDown", "Down"},
                                    {"zoomIn", "plus"},
                                    {"zoomOut", "minus"}}) {
        QAccessibleInterface* accessible = QAccessible::queryAccessibleInterface(control(name));
        ASSERT_NE(accessible, nullptr);
        EXPECT_THAT(accessible->text(QAccessible::Description).toStdString(),
                    testing::HasSubstr(std::string("the ") + key + " "))
            << name;
        control(name)->click();
    }
    EXPECT_THAT(sent(),
                testing::Each(testing::AnyOf("recv_ptz_zoom_speed(r1, 0)", "recv_ptz_pan_tilt_speed(r1, 0, 0)")))
        << "nothing moves that cannot be held";
}

TEST_F(PTZPanelTest, ButtonsStandAsACrossAndTheirLooksDiffer) {
    const auto place = [&](const char* name) { return middleOf(control(name)); };
    EXPECT_EQ(place("panLeft").y(), place("panRight").y());
    EXPECT_EQ(place("tiltUp").x(), place("tiltDown").x());
    EXPECT_LT(place("panLeft").x(), place("tiltUp").x());
    EXPECT_LT(place("tiltUp").x(), place("panRight").x());
    EXPECT_LT(place("tiltUp").y(), place("panLeft").y());
    EXPECT_LT(place("panLeft").y(), place("tiltDown").y());
    EXPECT_LT(place("zoomIn").y(), place("zoomOut").y());
    std::vector<QImage> looks;
    for (const char* name : {"panLeft", "panRight", "tiltUp", "tiltDown", "zoomIn", "zoomOut", "storePreset"}) {
        looks.push_back(control(name)->icon().pixmap(32).toImage());
    }
    looks.push_back(control("storePreset")->icon().pixmap(32, QIcon::Normal, QIcon::On).toImage());
    for (std::size_t i = 0; i < looks.size(); ++i) {
        EXPECT_EQ(std::count(looks.begin(), looks.end(), looks[i]), 1) << i;
    }
}

TEST_F(PTZPanelTest, EveryArrowMovesWhileHeld) {
    const std::vector<std::pair<const char*, const char*>> keys = {{"Left", "recv_ptz_pan_tilt_speed(r1, 0.1, 0)"},
                                                                   {"Right", "recv_ptz_pan_tilt_speed(r1, -0.1, 0)"},
                                                                   {"Up", "recv_ptz_pan_tilt_speed(r1, 0, 0.1)"},
                                                                   {"Down", "recv_ptz_pan_tilt_speed(r1, 0, -0.1)"}};
    for (const auto& [key, call] : keys) {
        screen->pressKey(key);
        EXPECT_THAT(sentOnce(1), ElementsAre(call));
        screen->releaseKey(key);
        EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_pan_tilt_speed(r1, 0, 0)"));
    }
}

TEST_F(PTZPanelTest, PlusAndMinusZoomWhileHeld) {
    for (const auto& [key, call] : {std::pair{"KP_Add", "recv_ptz_zoom_speed(r1, 0.1)"},
                                    {"minus", "recv_ptz_zoom_speed(r1, -0.1)"},
                                    {"equal", "recv_ptz_zoom_speed(r1, 0.1)"}}) {
        screen->pressKey(key);
        EXPECT_THAT(sentOnce(1), ElementsAre(call));
        screen->releaseKey(key);
        EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_zoom_speed(r1, 0)"));
    }
}

TEST_F(PTZPanelTest, PlusStopsAlsoWhenShiftIsLetGoFirst) {
    screen->pressKey("Shift");
    screen->pressKey("equal");
    EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_zoom_speed(r1, 0.1)"));
    screen->releaseKey("Shift");
    EXPECT_THAT(sentOnce(0), IsEmpty());
    screen->releaseKey("equal");
    EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_zoom_speed(r1, 0)"));
}

TEST_F(PTZPanelTest, KeyThatRepeatsSendsOneCommand) {
    int repeats = 0;
    struct Filter : QObject {
        explicit Filter(int& counted) : count(counted) {}
        bool eventFilter(QObject*, QEvent* event) override {
            const auto* key = event->type() == QEvent::KeyPress ? static_cast<QKeyEvent*>(event) : nullptr;
            count += key != nullptr && key->isAutoRepeat() ? 1 : 0;
            return false;
        }
        int& count;
    } filter(repeats);
    panel->windowHandle()->installEventFilter(&filter); // the last one installed is asked first
    screen->pressKey("Left");
    EXPECT_TRUE(test::runUntil([&] { return repeats >= 5; })) << "the server does not repeat keys";
    EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_pan_tilt_speed(r1, 0.1, 0)"));
    screen->releaseKey("Left");
    EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_pan_tilt_speed(r1, 0, 0)"));
}

TEST_F(PTZPanelTest, KeyboardLostWhileAKeyIsHeldStopsTheCamera) {
    screen->pressKey("Up");
    screen->pressKey("minus");
    ASSERT_THAT(sentOnce(2), ElementsAre("recv_ptz_pan_tilt_speed(r1, 0, 0.1)", "recv_ptz_zoom_speed(r1, -0.1)"));
    screen->activate(screen->findWindow("Main").value());
    EXPECT_THAT(sentOnce(2), ElementsAre("recv_ptz_pan_tilt_speed(r1, 0, 0)", "recv_ptz_zoom_speed(r1, 0)"));
    screen->releaseKey("Up");
    screen->releaseKey("minus");
    EXPECT_THAT(sentOnce(0), IsEmpty());
}

TEST_F(PTZPanelTest, KeyboardLostWhileAButtonIsHeldStopsTheCameraAndReleaseStopsItAgain) {
    press("tiltDown");
    ASSERT_THAT(sentOnce(1), ElementsAre("recv_ptz_pan_tilt_speed(r1, 0, -0.1)"));
    screen->activate(screen->findWindow("Main").value());
    EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_pan_tilt_speed(r1, 0, 0)"));
    screen->release();
    EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_pan_tilt_speed(r1, 0, 0)"));
}

TEST_F(PTZPanelTest, ButtonLetGoLeavesTheMotionOfAHeldKey) {
    press("panLeft");
    ASSERT_THAT(sentOnce(1), ElementsAre("recv_ptz_pan_tilt_speed(r1, 0.1, 0)"));
    screen->pressKey("Up");
    EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_pan_tilt_speed(r1, 0, 0.1)")) << "the newest counts";
    screen->release();
    EXPECT_THAT(sentOnce(2), ElementsAre("recv_ptz_pan_tilt_speed(r1, 0, 0)", "recv_ptz_pan_tilt_speed(r1, 0, 0.1)"));
    screen->releaseKey("Up");
    EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_pan_tilt_speed(r1, 0, 0)"));
}

TEST_F(PTZPanelTest, KeyLetGoLeavesTheMotionOfAHeldButton) {
    press("zoomIn");
    ASSERT_THAT(sentOnce(1), ElementsAre("recv_ptz_zoom_speed(r1, 0.1)"));
    screen->key("Left");
    EXPECT_THAT(sentOnce(2), ElementsAre("recv_ptz_pan_tilt_speed(r1, 0.1, 0)", "recv_ptz_pan_tilt_speed(r1, 0, 0)"))
        << "the zoom goes on anyway";
    screen->key("minus");
    EXPECT_THAT(sentOnce(3), ElementsAre("recv_ptz_zoom_speed(r1, -0.1)", "recv_ptz_zoom_speed(r1, 0)",
                                         "recv_ptz_zoom_speed(r1, 0.1)"));
    screen->release();
    EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_zoom_speed(r1, 0)"));
}

TEST_F(PTZPanelTest, KeyboardLostWhileKeyAndButtonAreHeldStopsForGood) {
    press("tiltUp");
    ASSERT_THAT(sentOnce(1), ElementsAre("recv_ptz_pan_tilt_speed(r1, 0, 0.1)"));
    screen->pressKey("Down");
    ASSERT_THAT(sentOnce(1), ElementsAre("recv_ptz_pan_tilt_speed(r1, 0, -0.1)"));
    screen->activate(screen->findWindow("Main").value());
    EXPECT_THAT(sentOnce(2), testing::Each("recv_ptz_pan_tilt_speed(r1, 0, 0)"));
    screen->releaseKey("Down");
    screen->release();
    EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_pan_tilt_speed(r1, 0, 0)"));
}

TEST_F(PTZPanelTest, ButtonPressedInAPanelWithoutTheKeyboardMovesUntilItIsReleased) {
    screen->activate(screen->findWindow("Main").value());
    ASSERT_TRUE(test::runUntil([&] { return window->isActiveWindow(); }));
    press("panRight");
    EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_pan_tilt_speed(r1, -0.1, 0)"));
    screen->release();
    EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_pan_tilt_speed(r1, 0, 0)"));
}

TEST_F(PTZPanelTest, PanelClosedWhileAButtonIsHeldStopsTheCamera) {
    press("zoomIn");
    ASSERT_THAT(sentOnce(1), ElementsAre("recv_ptz_zoom_speed(r1, 0.1)"));
    panel->close();
    EXPECT_TRUE(closes());
    EXPECT_THAT(sent(), testing::Each("recv_ptz_zoom_speed(r1, 0)"));
    EXPECT_THAT(sent(), testing::Not(IsEmpty()));
}

TEST_F(PTZPanelTest, PanelDestroyedWithItsWindowWhileAKeyIsHeldStopsTheCamera) {
    screen->pressKey("Left");
    ASSERT_THAT(sentOnce(1), ElementsAre("recv_ptz_pan_tilt_speed(r1, 0.1, 0)"));
    window.reset();
    EXPECT_THAT(sent(), ElementsAre("recv_ptz_pan_tilt_speed(r1, 0, 0)"));
    screen->releaseKey("Left");
}

TEST_F(PTZPanelTest, SourceChosenWhileAButtonIsHeldSteersNoOtherCamera) {
    press("panLeft");
    ASSERT_THAT(sentOnce(1), ElementsAre("recv_ptz_pan_tilt_speed(r1, 0.1, 0)"));
    model.setQIVOSourceInfoNamed("STUDIO (Cam 2)", "fake://2");
    endReceiver();
    QIVOlib_recv_create_v3_t settings{};
    receiver = QIVOlib_recv_create_v3(&settings);
    model.setPtzSource(receiver);
    EXPECT_TRUE(closes());
    screen->release();
    settle();
    EXPECT_THAT(sent(), testing::Each("recv_ptz_pan_tilt_speed(null, 0, 0)"));
}

TEST_F(PTZPanelTest, BandwidthToggledWhileAButtonIsHeldLeavesThePanelOpenAndStopsTheNewReceiver) {
    press("zoomIn");
    ASSERT_THAT(sentOnce(1), ElementsAre("recv_ptz_zoom_speed(r1, 0.1)"));
    // As the video view reconnects: a new receiver, which is published once the source has told what it is.
    endReceiver();
    QIVOlib_recv_create_v3_t settings{};
    receiver = QIVOlib_recv_create_v3(&settings);
    model.setPtzSource(receiver);
    EXPECT_TRUE(panel->isVisible());
    screen->release();
    EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_zoom_speed(r2, 0)"));
}

TEST_F(PTZPanelTest, DigitsRecallAndInStoreModeStore) {
    screen->key("7");
    EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_recall_preset(r1, 7, 0.25)"));
    screen->key("Alt+t");
    ASSERT_TRUE(test::runUntil([&] { return control("storePreset")->isChecked(); }));
    screen->key("7");
    EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_store_preset(r1, 7)"));
    EXPECT_FALSE(control("storePreset")->isChecked());
    screen->key("0");
    EXPECT_THAT(sentOnce(0), IsEmpty());
}

TEST_F(PTZPanelTest, AutomaticFocusHasAKey) {
    screen->key("Alt+a");
    EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_auto_focus(r1)"));
}

TEST_F(PTZPanelTest, ArrowsMoveTheCameraWhereverTheKeyboardIsInThePanel) {
    for (const char* name : {"focus", "preset1", "autofocus"}) {
        control<QWidget>(name)->setFocus(Qt::TabFocusReason);
        screen->key("Right");
        EXPECT_THAT(sentOnce(2),
                    ElementsAre("recv_ptz_pan_tilt_speed(r1, -0.1, 0)", "recv_ptz_pan_tilt_speed(r1, 0, 0)"))
            << name;
        EXPECT_TRUE(control<QWidget>(name)->hasFocus());
    }
}

TEST_F(PTZPanelTest, PageKeysMoveTheSliderThatHasTheKeyboard) {
    control<QWidget>("focus")->setFocus(Qt::TabFocusReason);
    screen->key("Next");
    EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_focus(r1, 0.45)"));
}

TEST_F(PTZPanelTest, KeysWithModifiersAreNotTaken) {
    control("preset1")->setFocus(Qt::TabFocusReason); // the slider has a use of its own for them
    screen->key("Control+Left");
    screen->key("Control+1");
    EXPECT_THAT(sentOnce(0), IsEmpty());
}

TEST_F(PTZPanelTest, OpeningAndClosingItSendsNothing) {
    screen->key("Escape");
    EXPECT_TRUE(closes());
    open();
    screen->close(screen->findWindow(kTitle).value());
    EXPECT_TRUE(closes());
    EXPECT_THAT(sent(), IsEmpty());
}

TEST_F(PTZPanelTest, PanelRemembersNothing) {
    control("storePreset")->click();
    control<QAbstractSlider>("focus")->setValue(0);
    panel->move(5, 5);
    panel->close();
    ASSERT_TRUE(closes());
    open();
    EXPECT_FALSE(control("storePreset")->isChecked());
    EXPECT_EQ(control<QAbstractSlider>("focus")->value(), 500);
    EXPECT_NE(panel->pos(), QPoint(5, 5));
}

TEST_F(PTZPanelTest, PanelStandsBesideItsWindowWhereThereIsRoom) {
    // Both places come from the window manager, one after the other.
    EXPECT_TRUE(test::runUntil([&] { return panel->frameGeometry().left() > window->frameGeometry().right(); }));
    panel->close();
    ASSERT_TRUE(closes());
    const QRect available = window->screen()->availableGeometry();
    window->setGeometry(available.adjusted(0, 40, 0, 0));
    ASSERT_TRUE(test::runUntil([&] { return window->frameGeometry().right() > available.right() - 40; }));
    settle();
    open();
    EXPECT_TRUE(test::runUntil([&] { return available.contains(panel->geometry()); }, std::chrono::seconds(5)));
}

TEST_F(PTZPanelTest, PanelStaysAboveItsWindow) {
    const QPoint over = window->mapToGlobal(QPoint(40, 20));
    panel->move(over);
    ASSERT_TRUE(test::runUntil([&] { return window->geometry().contains(panel->geometry().topLeft()); }));
    screen->activate(screen->findWindow("Main").value());
    ASSERT_TRUE(test::runUntil([&] { return window->isActiveWindow(); }));
    window->raise();
    settle();
    fake.takeCalls();
    click("preset5");
    EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_recall_preset(r1, 5, 0.25)")) << "the click reached the panel";
}

} // namespace
} // namespace qivo
