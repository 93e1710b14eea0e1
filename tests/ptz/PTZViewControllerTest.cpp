#include "platform/PointerState.h"
#include "tests/ptz/PanelFixture.h"

#include <QGuiApplication>

namespace qivo {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

using PTZViewControllerTest = test::PanelFixture;

TEST_F(PTZViewControllerTest, PressingAndHoldingPanLeftSendsPanAndReleasingStops) {
    press("panLeft");
    EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_pan_tilt_speed(r1, 0.1, 0)"));
    screen->release();
    EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_pan_tilt_speed(r1, 0, 0)"));
}

TEST_F(PTZViewControllerTest, EveryMotionButtonHasItsSignAndStopsItsOwnKind) {
    const std::vector<std::pair<const char*, std::vector<std::string>>> buttons = {
        {"panRight", {"recv_ptz_pan_tilt_speed(r1, -0.1, 0)", "recv_ptz_pan_tilt_speed(r1, 0, 0)"}},
        {"tiltUp", {"recv_ptz_pan_tilt_speed(r1, 0, 0.1)", "recv_ptz_pan_tilt_speed(r1, 0, 0)"}},
        {"tiltDown", {"recv_ptz_pan_tilt_speed(r1, 0, -0.1)", "recv_ptz_pan_tilt_speed(r1, 0, 0)"}},
        {"zoomIn", {"recv_ptz_zoom_speed(r1, 0.1)", "recv_ptz_zoom_speed(r1, 0)"}}};
    for (const auto& [name, calls] : buttons) {
        press(name);
        ASSERT_TRUE(test::runUntil([&] { return sent().size() == 1; })) << name;
        screen->release();
        EXPECT_EQ(sentOnce(2), calls) << name;
    }
}

TEST_F(PTZViewControllerTest, ButtonLetGoElsewhereStopsTheCamera) {
    press("panLeft");
    ASSERT_THAT(sentOnce(1), ElementsAre("recv_ptz_pan_tilt_speed(r1, 0.1, 0)"));
    dragAway();
    EXPECT_THAT(sentOnce(0), IsEmpty()) << "the pan goes on while the mouse button is held";
    screen->moveTo(1, 1); // outside the panel, too
    EXPECT_THAT(sentOnce(0), IsEmpty());
    screen->release();
    EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_pan_tilt_speed(r1, 0, 0)"));
}

TEST_F(PTZViewControllerTest, DraggingOffTheZoomOutButtonStopsTheZoom) {
    press("zoomOut");
    ASSERT_THAT(sentOnce(1), ElementsAre("recv_ptz_zoom_speed(r1, -0.1)"));
    EXPECT_THAT(log.take(), ElementsAre("entered"));
    dragAway();
    EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_zoom_speed(r1, 0)"));
    EXPECT_THAT(log.take(), ElementsAre("exited"));
    const QPoint back = middleOf(control("zoomOut"));
    screen->moveTo(back.x(), back.y());
    EXPECT_THAT(sentOnce(0), IsEmpty()) << "coming back does not zoom again";
    EXPECT_THAT(log.take(), ElementsAre("entered"));
    dragAway();
    EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_zoom_speed(r1, 0)"));
    screen->release();
    EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_zoom_speed(r1, 0)"));
    EXPECT_THAT(log.take(), ElementsAre("exited"));
}

TEST_F(PTZViewControllerTest, ZoomInButtonHasNoSuchStop) {
    press("zoomIn");
    ASSERT_THAT(sentOnce(1), ElementsAre("recv_ptz_zoom_speed(r1, 0.1)"));
    dragAway();
    EXPECT_THAT(sentOnce(0), IsEmpty());
    control<HoldButton>("zoomIn")->setState(1);
    EXPECT_THAT(sentOnce(0), IsEmpty());
    EXPECT_THAT(log.take(), IsEmpty());
    screen->release();
    EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_zoom_speed(r1, 0)"));
}

TEST_F(PTZViewControllerTest, AnyChangeOfTheZoomOutButtonsStateStopsTheZoomAndSaysSo) {
    auto* button = control<HoldButton>("zoomOut");
    testing::internal::CaptureStdout();
    button->setState(1);
    button->setState(1); // no change
    button->setState(0);
    EXPECT_EQ(testing::internal::GetCapturedStdout(), "Stopping zoom out\nStopping zoom out\n");
    EXPECT_THAT(sent(), ElementsAre("recv_ptz_zoom_speed(r1, 0)", "recv_ptz_zoom_speed(r1, 0)"));
}

TEST_F(PTZViewControllerTest, LettingGoOnTheZoomOutButtonChangesItsStateAndStopsTwice) {
    press("zoomOut");
    ASSERT_THAT(sentOnce(1), ElementsAre("recv_ptz_zoom_speed(r1, -0.1)"));
    testing::internal::CaptureStdout();
    screen->release();
    EXPECT_THAT(sentOnce(2), ElementsAre("recv_ptz_zoom_speed(r1, 0)", "recv_ptz_zoom_speed(r1, 0)"));
    EXPECT_EQ(testing::internal::GetCapturedStdout(), "Stopping zoom out\n");
}

TEST_F(PTZViewControllerTest, PointerIsTrackedWithoutAnyPressAndInAWindowWithoutTheKeyboard) {
    screen->activate(screen->findWindow("Main").value());
    ASSERT_TRUE(test::runUntil([&] { return window->isActiveWindow(); }));
    const QPoint at = middleOf(control("zoomOut"));
    screen->moveTo(at.x(), at.y());
    ASSERT_TRUE(test::runUntil([&] { return log.take() == std::vector<std::string>{"entered"}; }));
    EXPECT_THAT(sent(), IsEmpty());
    screen->moveTo(1, 1);
    EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_zoom_speed(r1, 0)"));
    EXPECT_THAT(log.take(), ElementsAre("exited"));
}

TEST_F(PTZViewControllerTest, ActionThatArrivesWhileNoMouseButtonIsDownStops) {
    auto& controller = panel->controller();
    controller.DoZoomIn();
    controller.DoZoomOut();
    controller.DoPanLeft();
    controller.DoPanRight();
    controller.DoTiltUp();
    controller.DoTiltDown();
    EXPECT_THAT(sent(), ElementsAre("recv_ptz_zoom_speed(r1, 0)", "recv_ptz_zoom_speed(r1, 0)",
                                    "recv_ptz_pan_tilt_speed(r1, 0, 0)", "recv_ptz_pan_tilt_speed(r1, 0, 0)",
                                    "recv_ptz_pan_tilt_speed(r1, 0, 0)", "recv_ptz_pan_tilt_speed(r1, 0, 0)"));
}

TEST_F(PTZViewControllerTest, ActionGoesByTheMouseAsItIsAndNotByTheEvents) {
    auto& controller = panel->controller();
    screen->press(1, 1); // where no window is told of it
    EXPECT_EQ(QGuiApplication::mouseButtons(), Qt::NoButton);
    EXPECT_EQ(pressedMouseButtons(), 1U);
    controller.DoZoomIn();
    screen->release();
    controller.DoZoomIn();
    EXPECT_THAT(sent(), ElementsAre("recv_ptz_zoom_speed(r1, 0.1)", "recv_ptz_zoom_speed(r1, 0)"));
    press("panLeft");
    ASSERT_THAT(sentOnce(3).back(), "recv_ptz_pan_tilt_speed(r1, 0.1, 0)");
    screen->release(); // which nobody has read yet
    EXPECT_EQ(QGuiApplication::mouseButtons(), Qt::LeftButton);
    controller.DoPanLeft();
    EXPECT_THAT(sent(), ElementsAre("recv_ptz_pan_tilt_speed(r1, 0, 0)"));
}

TEST_F(PTZViewControllerTest, StoreButtonOnAndPreset3PressedStoresOnceAndRecallsAfterwards) {
    click("storePreset");
    ASSERT_TRUE(test::runUntil([&] { return control("storePreset")->isChecked(); }));
    EXPECT_THAT(sent(), IsEmpty());
    click("preset3");
    EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_store_preset(r1, 3)"));
    EXPECT_FALSE(control("storePreset")->isChecked());
    click("preset3");
    EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_recall_preset(r1, 3, 0.25)"));
}

TEST_F(PTZViewControllerTest, StoreModeSwitchedOffAgainRecalls) {
    click("storePreset");
    ASSERT_TRUE(test::runUntil([&] { return control("storePreset")->isChecked(); }));
    click("storePreset");
    ASSERT_TRUE(test::runUntil([&] { return !control("storePreset")->isChecked(); }));
    click("preset9");
    EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_recall_preset(r1, 9, 0.25)"));
}

TEST_F(PTZViewControllerTest, EveryPresetButtonSendsItsOwnNumber) {
    for (int number = 1; number <= 9; ++number) {
        const std::string text = std::to_string(number);
        control(("preset" + text).c_str())->click();
        EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_recall_preset(r1, " + text + ", 0.25)"));
    }
}

TEST_F(PTZViewControllerTest, FocusSliderAtItsMaximumSendsOneAndAtHalfOfItAHalf) {
    auto* slider = control<QAbstractSlider>("focus");
    EXPECT_EQ(slider->minimum(), 0);
    slider->setValue(slider->maximum());
    slider->setValue(slider->maximum() / 2);
    slider->setValue(0);
    EXPECT_THAT(sent(), ElementsAre("recv_ptz_focus(r1, 1)", "recv_ptz_focus(r1, 0.5)", "recv_ptz_focus(r1, 0)"));
}

TEST_F(PTZViewControllerTest, FocusIsTheRatioInSinglePrecision) {
    auto* slider = control<QAbstractSlider>("focus");
    slider->setMaximum(3);
    fake.takeCalls();
    slider->setValue(1);
    ASSERT_THAT(sent(), ElementsAre("recv_ptz_focus(r1, 0.333333)"));
    EXPECT_EQ(fake.lastFocus(), 1.0F / 3.0F);
}

TEST_F(PTZViewControllerTest, FocusSliderIsDraggedAndGrabbingItAloneCounts) {
    auto* slider = control<QAbstractSlider>("focus");
    press("focus"); // the handle stands in the middle
    EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_focus(r1, 0.5)"));
    const QPoint end = slider->mapToGlobal(QPoint(slider->width() + 20, slider->height() / 2));
    screen->moveTo(end.x(), end.y());
    EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_focus(r1, 1)"));
    screen->release();
    EXPECT_THAT(sentOnce(0), IsEmpty());
}

TEST_F(PTZViewControllerTest, AutoFocusSendsTheCommandEachTimeAndNothingChangesOnThePanel) {
    const auto look = [&] { return screen->grab(screen->findWindow(kTitle).value()).pixels; };
    dragAway();
    settle();
    const auto before = look();
    control("autofocus")->click();
    control("autofocus")->click();
    EXPECT_THAT(sentOnce(2), ElementsAre("recv_ptz_auto_focus(r1)", "recv_ptz_auto_focus(r1)"));
    EXPECT_EQ(look(), before);
    click("autofocus");
    EXPECT_THAT(sentOnce(1), ElementsAre("recv_ptz_auto_focus(r1)"));
}

TEST_F(PTZViewControllerTest, EveryCommandAsksTheModelAfreshAndSendsAlsoToNone) {
    QIVOlib_recv_create_v3_t settings{};
    const auto second = QIVOlib_recv_create_v3(&settings);
    model.setPtzSource(second);
    fake.takeCalls();
    control("autofocus")->click();
    model.setPtzSource(nullptr);
    control("autofocus")->click();
    control("preset1")->click();
    EXPECT_THAT(sent(), ElementsAre("recv_ptz_auto_focus(r2)", "recv_ptz_auto_focus(null)",
                                    "recv_ptz_recall_preset(null, 1, 0.25)"));
    EXPECT_TRUE(panel->isVisible()) << "setting the receiver tells nobody";
    QIVOlib_recv_destroy(second);
}

TEST_F(PTZViewControllerTest, SelectingAnotherSourceClosesThePanel) {
    model.setQIVOSourceInfoNamed("STUDIO (Cam 2)", "fake://2");
    EXPECT_FALSE(panel->isVisible()) << "at once";
    EXPECT_TRUE(closes());
    EXPECT_THAT(sent(), IsEmpty());
}

TEST_F(PTZViewControllerTest, ControlLostOnAnotherThreadClosesThePanelOnTheMainThread) {
    std::thread([&] { model.clearPTZSource(); }).join();
    EXPECT_TRUE(panel->isVisible()) << "not on that thread";
    EXPECT_TRUE(closes());
}

TEST_F(PTZViewControllerTest, NoticeWhileThereIsControlLeavesThePanelOpen) {
    panel->controller().observeValueForKeyPath("hasPTZControl", &model);
    settle();
    EXPECT_TRUE(panel->isVisible());
}

TEST_F(PTZViewControllerTest, OtherKeyPathsAndObjectsAreIgnored) {
    auto& controller = panel->controller();
    testing::internal::CaptureStdout();
    controller.observeValueForKeyPath("isRecording", &model);
    controller.observeValueForKeyPath("cell.state", control("zoomIn"));
    EXPECT_EQ(testing::internal::GetCapturedStdout(), "");
    EXPECT_THAT(sent(), IsEmpty());
    EXPECT_TRUE(panel->isVisible());
}

TEST_F(PTZViewControllerTest, ViewIsSetUpOnce) {
    panel->controller().viewDidLoad();
    testing::internal::CaptureStdout();
    control<HoldButton>("zoomOut")->setState(1);
    EXPECT_EQ(testing::internal::GetCapturedStdout(), "Stopping zoom out\n");
    EXPECT_THAT(sent(), ElementsAre("recv_ptz_zoom_speed(r1, 0)"));
}

TEST_F(PTZViewControllerTest, AfterItsEndNothingIsObserved) {
    QWidget view;
    HoldButton button;
    view.show();
    auto controller = std::make_unique<PTZViewController>(&view);
    controller->setZoomOutBtn(&button);
    controller->viewDidLoad();
    EXPECT_EQ(controller->theModel(), &model);
    controller.reset();
    button.setState(1);
    model.clearPTZSource();
    EXPECT_TRUE(view.isVisible());
    EXPECT_THAT(sent(), IsEmpty());
}

} // namespace
} // namespace qivo
