#include "tools/publish/Camera.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <limits>
#include <thread>

namespace qivo {
namespace {

using namespace std::chrono_literals;
using testing::ElementsAre;
using testing::Pair;

const double notANumber = std::numeric_limits<double>::quiet_NaN();
const double infinite = std::numeric_limits<double>::infinity();
constexpr double near = 1e-9;

class CameraTest : public testing::Test {
  protected:
    PanTilt direction() { return m_camera.state().position.direction; }
    double zoom() { return m_camera.state().position.zoom; }
    void expectDirection(double pan, double tilt) {
        EXPECT_NEAR(direction().pan, pan, near);
        EXPECT_NEAR(direction().tilt, tilt, near);
    }

    Camera::Time m_now{1000s};
    Camera m_camera{[this] { return m_now; }};
};

TEST_F(CameraTest, standsInTheMiddleZoomedOutAndInAutomaticFocus) {
    m_now += 1h;
    EXPECT_EQ(m_camera.state(), (CameraState{{{0, 0}, 0}, false, false, Camera::sharpFocus, false, true}));
    EXPECT_EQ(m_camera.serial(), 0U);
}

TEST_F(CameraTest, turnsAndZoomsAtTheCommandedSpeed) {
    ASSERT_TRUE(m_camera.move(PanTilt{0.5, -0.25}, 0.1));
    m_now += 500ms;
    expectDirection(0.5 * 0.5 * Camera::turnRate, -0.25 * 0.5 * Camera::turnRate);
    EXPECT_NEAR(zoom(), 0.1 * 0.5 * Camera::zoomRate, near);
    EXPECT_TRUE(m_camera.state().turning);
    EXPECT_TRUE(m_camera.state().zooming);
}

TEST_F(CameraTest, standsByItselfAtTheTimeoutHoweverLateItIsLookedAt) {
    ASSERT_TRUE(m_camera.move(PanTilt{1, 0}, std::nullopt, 400ms));
    m_now += 1h;
    expectDirection(0.4 * Camera::turnRate, 0);
    EXPECT_FALSE(m_camera.state().turning);
}

TEST_F(CameraTest, aMoveWithoutTimeoutEndsAfterTheDefaultOne) {
    ASSERT_TRUE(m_camera.move(PanTilt{0.1, 0}, std::nullopt));
    m_now += 1h;
    expectDirection(0.1 * 5 * Camera::turnRate, 0);
}

TEST_F(CameraTest, aTimeoutOfZeroDoesNotMove) {
    ASSERT_TRUE(m_camera.move(PanTilt{1, 1}, 1, 0ms));
    m_now += 1s;
    EXPECT_EQ(m_camera.state().position, CameraPosition());
}

TEST_F(CameraTest, aRenewedMoveGoesOnWithoutAStep) {
    for (int i = 0; i < 10; ++i) {
        ASSERT_TRUE(m_camera.move(PanTilt{0.2, 0}, std::nullopt, 300ms));
        m_now += 200ms;
    }
    expectDirection(0.2 * 2 * Camera::turnRate, 0);
}

TEST_F(CameraTest, aNewerSpeedReplacesTheOlderFromWhereItStands) {
    ASSERT_TRUE(m_camera.move(PanTilt{1, 0}, std::nullopt));
    m_now += 1s;
    ASSERT_TRUE(m_camera.move(PanTilt{-0.5, 0}, std::nullopt));
    m_now += 1s;
    expectDirection(0.5 * Camera::turnRate, 0);
}

TEST_F(CameraTest, whatIsNotGivenGoesOn) {
    ASSERT_TRUE(m_camera.move(PanTilt{0.1, 0}, 0.1));
    m_now += 1s;
    ASSERT_TRUE(m_camera.move(std::nullopt, 0.0));
    m_now += 1s;
    expectDirection(0.1 * 2 * Camera::turnRate, 0);
    EXPECT_NEAR(zoom(), 0.1 * Camera::zoomRate, near);
}

TEST_F(CameraTest, stopsTurningAndZoomingEachByItself) {
    ASSERT_TRUE(m_camera.move(PanTilt{0.1, 0.1}, 0.1));
    m_camera.stop(false, true);
    EXPECT_TRUE(m_camera.state().turning);
    EXPECT_FALSE(m_camera.state().zooming);
    ASSERT_TRUE(m_camera.move(std::nullopt, 0.1));
    m_camera.stop(true, false);
    EXPECT_FALSE(m_camera.state().turning);
    EXPECT_TRUE(m_camera.state().zooming);
    m_camera.stop();
    m_now += 1s;
    EXPECT_EQ(m_camera.state().position, CameraPosition());
}

TEST_F(CameraTest, standsAtItsLimits) {
    ASSERT_TRUE(m_camera.move(PanTilt{1, -1}, 1, 60s));
    m_now += 59s;
    EXPECT_EQ(m_camera.state().position, (CameraPosition{{1, -1}, 1}));
    EXPECT_FALSE(m_camera.state().turning);
    ASSERT_TRUE(m_camera.move(PanTilt{1, -1}, 1));
    EXPECT_FALSE(m_camera.state().turning) << "moves against the limit";
    ASSERT_TRUE(m_camera.move(PanTilt{-1, 0}, -1));
    m_now += 1s;
    expectDirection(1 - Camera::turnRate, -1);
}

TEST_F(CameraTest, speedsThatAreNoneAreRefusedAndItGoesOnAsBefore) {
    ASSERT_TRUE(m_camera.move(PanTilt{0.1, 0}, std::nullopt));
    const auto serial = m_camera.serial();
    for (const double wrong : {notANumber, infinite, -infinite, 1.0001, -1.0001, 1e300}) {
        EXPECT_FALSE(m_camera.move(PanTilt{wrong, 0}, std::nullopt)) << wrong;
        EXPECT_FALSE(m_camera.move(PanTilt{0, wrong}, std::nullopt)) << wrong;
        EXPECT_FALSE(m_camera.move(std::nullopt, wrong)) << wrong;
    }
    EXPECT_FALSE(m_camera.move(PanTilt{0, 0}, 0, -1ms));
    EXPECT_FALSE(m_camera.move(PanTilt{0, 0}, 0, Camera::maximumTimeout + 1ms));
    EXPECT_EQ(m_camera.serial(), serial);
    m_now += 1s;
    expectDirection(0.1 * Camera::turnRate, 0);
}

TEST_F(CameraTest, goesToAPositionAtTheSpeedOfEachAxisAndStands) {
    ASSERT_TRUE(m_camera.moveTo(PanTilt{0.5, -0.5}, 0.5, {1, 0.5}, 1));
    m_now += 500ms;
    expectDirection(0.5 * Camera::turnRate, -0.25 * Camera::turnRate);
    m_now += 1h;
    EXPECT_EQ(m_camera.state().position, (CameraPosition{{0.5, -0.5}, 0.5}));
    EXPECT_FALSE(m_camera.state().turning);
}

TEST_F(CameraTest, aSpeedOfZeroToAPositionIsTheSlowestAndStillGetsThere) {
    ASSERT_TRUE(m_camera.moveTo(PanTilt{-0.1, 0}, std::nullopt, {0, 0}, 0));
    m_now += 1s;
    EXPECT_LT(direction().pan, 0);
    EXPECT_GT(direction().pan, -0.1);
    m_now += 1h;
    expectDirection(-0.1, 0);
}

TEST_F(CameraTest, goesOnByAStepAtMostToTheLimit) {
    ASSERT_TRUE(m_camera.moveBy(PanTilt{0.6, 0.25}, 0.25));
    m_now += 1min;
    ASSERT_TRUE(m_camera.moveBy(PanTilt{0.6, -0.5}, std::nullopt));
    m_now += 1min;
    expectDirection(1, -0.25);
    EXPECT_NEAR(zoom(), 0.25, near);
}

TEST_F(CameraTest, positionsAndStepsOutOfRangeAreRefused) {
    for (const double wrong : {notANumber, infinite, -1.01, 1.01}) {
        EXPECT_FALSE(m_camera.moveTo(PanTilt{wrong, 0}, std::nullopt)) << wrong;
        EXPECT_FALSE(m_camera.moveTo(PanTilt{0, wrong}, std::nullopt)) << wrong;
        EXPECT_FALSE(m_camera.moveTo(std::nullopt, wrong)) << wrong;
        EXPECT_FALSE(m_camera.moveTo(PanTilt{}, 0, {wrong, 1}, 1)) << wrong;
        EXPECT_FALSE(m_camera.moveTo(PanTilt{}, 0, {1, 1}, wrong)) << wrong;
        EXPECT_FALSE(m_camera.moveBy(std::nullopt, wrong)) << wrong;
    }
    EXPECT_FALSE(m_camera.moveTo(std::nullopt, -0.01));
    EXPECT_FALSE(m_camera.moveTo(PanTilt{}, 0, {-0.1, 1}, 1));
    EXPECT_FALSE(m_camera.moveBy(PanTilt{2.1, 0}, std::nullopt));
    EXPECT_FALSE(m_camera.state().turning);
}

TEST_F(CameraTest, aStopHoldsAMoveToAPosition) {
    ASSERT_TRUE(m_camera.moveTo(PanTilt{1, 0}, std::nullopt));
    m_now += 500ms;
    m_camera.stop();
    m_now += 1h;
    expectDirection(0.5 * Camera::turnRate, 0);
}

TEST_F(CameraTest, manualFocusGlidesAndTheAutomaticFindsWhatIsSharp) {
    ASSERT_TRUE(m_camera.setFocus(1));
    EXPECT_FALSE(m_camera.state().automaticFocus);
    m_now += 500ms;
    EXPECT_NEAR(m_camera.state().focus, Camera::sharpFocus + 0.5 * Camera::focusRate, near);
    m_now += 10s;
    EXPECT_EQ(m_camera.state().focus, 1);
    m_camera.setAutomaticFocus(true);
    EXPECT_TRUE(m_camera.state().focusing);
    m_now += 10s;
    EXPECT_EQ(m_camera.state().focus, Camera::sharpFocus);
    EXPECT_TRUE(m_camera.state().automaticFocus);
}

TEST_F(CameraTest, focusMovesUntilItIsStopped) {
    ASSERT_TRUE(m_camera.moveFocus(-0.5));
    m_now += 500ms;
    m_camera.stopFocus();
    m_now += 1s;
    EXPECT_NEAR(m_camera.state().focus, Camera::sharpFocus - 0.25 * Camera::focusRate, near);
    EXPECT_FALSE(m_camera.state().automaticFocus);
}

TEST_F(CameraTest, aStopDoesNotEndTheAutomaticFocus) {
    ASSERT_TRUE(m_camera.setFocus(0));
    m_now += 1h;
    m_camera.setAutomaticFocus(true);
    m_camera.stopFocus();
    m_now += 1h;
    EXPECT_EQ(m_camera.state().focus, Camera::sharpFocus);
}

TEST_F(CameraTest, focusOutOfRangeIsRefusedAndStaysAutomatic) {
    for (const double wrong : {notANumber, infinite, -0.01, 1.01}) {
        EXPECT_FALSE(m_camera.setFocus(wrong)) << wrong;
    }
    EXPECT_FALSE(m_camera.moveFocus(notANumber));
    EXPECT_FALSE(m_camera.moveFocus(1.01));
    EXPECT_TRUE(m_camera.state().automaticFocus);
}

TEST_F(CameraTest, aPresetBringsBackThePositionWhereItWasStored) {
    ASSERT_TRUE(m_camera.move(PanTilt{0.5, 0.5}, 0.5, 1s));
    m_now += 500ms;
    ASSERT_TRUE(m_camera.storePreset("3"));
    const CameraPosition stored = m_camera.state().position;
    m_now += 1s;
    ASSERT_NE(m_camera.state().position, stored);
    ASSERT_TRUE(m_camera.recallPreset("3", 0.25));
    EXPECT_TRUE(m_camera.state().turning) << "glides there";
    m_now += 1min;
    EXPECT_EQ(m_camera.state().position, stored);
}

TEST_F(CameraTest, presetsHaveNamesOfTheirOwn) {
    EXPECT_TRUE(m_camera.storePreset("1", "Door"));
    EXPECT_TRUE(m_camera.storePreset("2"));
    EXPECT_FALSE(m_camera.storePreset("3", "Door")) << "another's";
    EXPECT_TRUE(m_camera.storePreset("1")) << "keeps its name";
    EXPECT_TRUE(m_camera.storePreset("2", "Window"));
    EXPECT_FALSE(m_camera.storePreset("4", std::string(Camera::maximumPresetNameBytes + 1, 'x')));
    EXPECT_FALSE(m_camera.storePreset("4", "a\nb"));
    EXPECT_FALSE(m_camera.storePreset("4", "\xFF"));
    EXPECT_THAT(m_camera.presets(), ElementsAre(Pair(1, testing::Field(&CameraPreset::name, "Door")),
                                                Pair(2, testing::Field(&CameraPreset::name, "Window"))));
}

TEST_F(CameraTest, presetsOutOfRangeAreRefused) {
    for (const char* wrong : {"", "0", "-1", "65", "01", "+1", " 1", "1 ", "1.0", "one", "4294967297"}) {
        EXPECT_FALSE(m_camera.storePreset(wrong)) << wrong;
        EXPECT_FALSE(m_camera.recallPreset(wrong)) << wrong;
        EXPECT_FALSE(m_camera.removePreset(wrong)) << wrong;
    }
    EXPECT_TRUE(m_camera.storePreset("64"));
    EXPECT_FALSE(m_camera.recallPreset("64", notANumber));
    EXPECT_FALSE(m_camera.recallPreset("64", 1.1));
    EXPECT_FALSE(m_camera.recallPreset("1"));
    EXPECT_TRUE(m_camera.removePreset("64"));
    EXPECT_FALSE(m_camera.recallPreset("64"));
}

TEST_F(CameraTest, aNewPresetTakesTheNumberThatItIsCalledOrTheLowestFree) {
    EXPECT_EQ(m_camera.freePreset(), "1");
    EXPECT_EQ(m_camera.freePreset("7"), "7");
    EXPECT_EQ(m_camera.freePreset("Door"), "1");
    EXPECT_EQ(m_camera.freePreset("65"), "1");
    EXPECT_EQ(m_camera.freePreset("QIVO 3"), "3");
    EXPECT_EQ(m_camera.freePreset("QIVO 03"), "1");
    EXPECT_EQ(m_camera.freePreset("QIVO3"), "1");
    EXPECT_EQ(m_camera.freePreset("QIVO 255"), "1");
    ASSERT_TRUE(m_camera.storePreset("1"));
    ASSERT_TRUE(m_camera.storePreset("7"));
    EXPECT_EQ(m_camera.freePreset("7"), "2");
    EXPECT_EQ(m_camera.freePreset("QIVO 7"), "2");
    for (int number = 1; number <= Camera::maximumPresets; ++number) {
        ASSERT_TRUE(m_camera.storePreset(std::to_string(number)));
    }
    EXPECT_EQ(m_camera.freePreset(), "");
}

TEST_F(CameraTest, theSerialTellsOfEveryCommand) {
    std::uint64_t serial = m_camera.serial();
    const auto grown = [&] { return m_camera.serial() > std::exchange(serial, m_camera.serial()); };
    EXPECT_TRUE(m_camera.move(PanTilt{}, std::nullopt) && grown());
    m_camera.stop();
    EXPECT_TRUE(grown());
    EXPECT_TRUE(m_camera.setFocus(1) && grown());
    m_camera.setAutomaticFocus(true);
    EXPECT_TRUE(grown());
    EXPECT_TRUE(m_camera.storePreset("1") && grown());
    EXPECT_TRUE(m_camera.recallPreset("1") && grown());
    EXPECT_TRUE(m_camera.removePreset("1") && grown());
    EXPECT_FALSE(m_camera.removePreset("1") || grown());
}

TEST(CameraThreads, isSteeredAndWatchedFromManyThreads) {
    Camera camera;
    std::vector<std::thread> threads;
    for (int i = 0; i < 4; ++i) {
        threads.emplace_back([&camera, i] {
            const std::string token = std::to_string(i + 1);
            for (int round = 0; round < 200; ++round) {
                EXPECT_TRUE(camera.move(PanTilt{i % 2 == 0 ? 1.0 : -1.0, 0}, 0.5));
                EXPECT_TRUE(camera.storePreset(token));
                EXPECT_TRUE(camera.recallPreset(token));
                const CameraState state = camera.state();
                EXPECT_LE(std::abs(state.position.direction.pan), 1);
                camera.stop();
            }
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    EXPECT_EQ(camera.presets().size(), 4U);
    EXPECT_EQ(camera.serial(), 4U * 200 * 4);
}

} // namespace
} // namespace qivo
