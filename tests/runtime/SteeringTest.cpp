// A camera is steered, by the clock: scripted cameras on loopback.

#include "runtime/BackgroundThreads.h"
#include "runtime/OnvifMessages.h"
#include "tests/runtime/SteeringFixture.h"

#include <glib.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <memory>
#include <string>
#include <vector>

namespace qivo::test {
namespace {

using Calls = std::vector<CameraCall>;

/// Keeps the first request for an operation without an answer until the camera ends.
ScriptedCamera::Quirk hangsOn(const std::string& operation) {
    return [operation, hung = std::make_shared<std::atomic<bool>>(false)](ScriptedCamera&, Connection& connection,
                                                                          const CameraCall& call) {
        if (call.operation != operation || hung->exchange(true)) {
            return false;
        }
        connection.untilClosed();
        return true;
    };
}

/// A camera that takes no notice of the time after which it is to stop by itself.
void movesOn(ScriptedCamera& camera) {
    camera.ignoresRunOut = true;
}

/// Expects the camera to move until then. It stands for a moment only where the machine was too busy for the next move
/// to come in time.
void movesUntil(const ScriptedCamera& camera, Clock::time_point end) {
    int moves = 0;
    Stopwatch sinceMove;
    while (Clock::now() < end) {
        if (const int asked = camera.count("ContinuousMove"); asked != moves) {
            moves = asked;
            sinceMove = Stopwatch();
        }
        if (!camera.moves()) {
            ASSERT_LT(sinceMove.passed(), runtime::PtzCommands::kRunOut) << "after " << moves << " moves";
        }
        std::this_thread::sleep_for(5ms);
    }
}

TEST_F(SteeringCameraTest, CommandsReachTheCamera) {
    ScriptedCamera camera;
    const auto steering = steer(camera);
    ASSERT_TRUE(found(*steering));
    EXPECT_TRUE(steering->panTilt(0.5F, 0.25F));
    ASSERT_TRUE(camera.until([&] {
        return camera.speed() == ScriptedCamera::Speed{-0.5F, 0.25F, 0};
    })) << "left is positive here and negative there";
    EXPECT_TRUE(steering->zoom(-1));
    ASSERT_TRUE(camera.until([&] { return camera.speed() == ScriptedCamera::Speed{-0.5F, 0.25F, -1}; }));
    EXPECT_TRUE(steering->zoom(0));
    ASSERT_TRUE(camera.until([&] { return camera.speed() == ScriptedCamera::Speed{-0.5F, 0.25F, 0}; }));
    EXPECT_TRUE(steering->panTilt(0, 0));
    ASSERT_TRUE(camera.until([&] { return !camera.moves(); }));
    for (const CameraCall& call : camera.calls("ContinuousMove")) {
        EXPECT_EQ(call.after("ProfileToken>"), "dome");
        EXPECT_EQ(call.after("Timeout>"), "PT1S");
    }
}

TEST_F(SteeringCameraTest, WhatTheCameraIsIsAskedOnce) {
    ScriptedCamera camera;
    const auto steering = steer(camera);
    ASSERT_TRUE(found(*steering));
    EXPECT_TRUE(steering->store(3));
    EXPECT_TRUE(steering->recall(3, 0.25F));
    EXPECT_TRUE(steering->focus(0.5F));
    EXPECT_TRUE(steering->autoFocus());
    ASSERT_TRUE(camera.until([&] { return camera.count("SetImagingSettings") == 2; }));
    for (const char* once : {"GetSystemDateAndTime", "GetCapabilities", "GetProfiles", "GetNodes", "GetPresets",
                             "GetMoveOptions", "SetPreset", "GotoPreset", "Move"}) {
        const bool isList = std::string(once) == "GetPresets"; // once more for a number that is not known
        EXPECT_EQ(camera.count(once), isList ? 2 : 1) << once;
    }
    const Calls settings = camera.calls("SetImagingSettings");
    EXPECT_EQ(settings[0].after("AutoFocusMode>"), "MANUAL");
    EXPECT_EQ(settings[1].after("AutoFocusMode>"), "AUTO");
    EXPECT_EQ(camera.call("Move").after("Position>"), "15.0000") << "the middle of 10 to 20";
    EXPECT_EQ(camera.call("Move").after("VideoSourceToken>"), "source-1");
    EXPECT_EQ(camera.call("SetPreset").after("PresetName>"), "QIVO 3");
    EXPECT_EQ(camera.call("GotoPreset").after("PresetToken>"), "slotA");
    EXPECT_EQ(camera.call("GotoPreset").after("Speed><tt:PanTilt x=\""), "0.2500");
}

TEST_F(SteeringCameraTest, TheFocusGoesFromFarToNear) {
    ScriptedCamera camera;
    const auto steering = steer(camera);
    ASSERT_TRUE(found(*steering));
    int moves = 0;
    for (const auto& [value, position] : {std::pair{0.0F, "20.0000"}, {1.0F, "10.0000"}, {0.25F, "17.5000"}}) {
        EXPECT_TRUE(steering->focus(value));
        ASSERT_TRUE(camera.until([&, asked = moves] { return camera.count("Move") > asked; }));
        EXPECT_EQ(camera.lastCall("Move").after("Position>"), position) << "ONVIF's positions grow to what is far";
        ++moves;
    }
}

TEST_F(SteeringCameraTest, NothingIsAcceptedThatTheCameraCannotDo) {
    ScriptedCamera camera([](ScriptedCamera& self, Connection& connection, const CameraCall& call) {
        const std::string nodes = "<R><tptz:PTZNode token=\"node\"><tt:SupportedPTZSpaces>"
                                  "<tt:ContinuousPanTiltVelocitySpace/></tt:SupportedPTZSpaces></tptz:PTZNode></R>";
        return call.operation == "GetNodes"         ? connection.send(self.http(self.envelope(nodes)))
               : call.operation == "GetMoveOptions" ? connection.send(self.http(self.fault("no focus")))
                                                    : false;
    });
    const auto steering = steer(camera);
    ASSERT_TRUE(found(*steering));
    EXPECT_FALSE(steering->zoom(0.5F));
    EXPECT_FALSE(steering->focus(0.5F));
    EXPECT_TRUE(steering->panTilt(0.5F, 0));
    EXPECT_TRUE(steering->autoFocus());
    EXPECT_TRUE(steering->recall(4, 0.25F));
    EXPECT_FALSE(steering->store(-1));
    EXPECT_FALSE(steering->recall(1000, 0.25F));
    ASSERT_TRUE(camera.until([&] { return camera.count("GetPresets") == 2; })) << "somebody else may have stored it";
    EXPECT_TRUE(steering->panTilt(0, 0));
    ASSERT_TRUE(camera.until([&] { return camera.count("Stop") >= 1; }));
    EXPECT_EQ(camera.call("Stop").after("PanTilt>"), "true");
    EXPECT_EQ(camera.call("Stop").after("Zoom>"), "false");
    EXPECT_EQ(camera.count("GotoPreset"), 0);
}

TEST_F(SteeringCameraTest, AMoveHoldsUntilItIsStopped) {
    ScriptedCamera camera;
    const auto steering = steer(camera);
    ASSERT_TRUE(found(*steering));
    const auto began = Clock::now();
    EXPECT_TRUE(steering->panTilt(0.1F, 0));
    ASSERT_TRUE(camera.until([&] { return camera.moves(); }));
    ASSERT_NO_FATAL_FAILURE(movesUntil(camera, began + 1500ms));
    EXPECT_GE(camera.count("ContinuousMove"), 3);
    EXPECT_TRUE(steering->panTilt(0, 0));
    ASSERT_TRUE(camera.until([&] { return !camera.moves(); }));
}

TEST_F(SteeringCameraTest, AStopIsOnTheWireWithin50Ms) {
    ScriptedCamera camera;
    const auto steering = steer(camera);
    ASSERT_TRUE(found(*steering));
    for (int i = 1; i <= 5; ++i) {
        EXPECT_TRUE(steering->panTilt(0.1F, 0));
        ASSERT_TRUE(camera.until([&] { return camera.moves(); }));
        const Stopwatch called;
        EXPECT_TRUE(steering->panTilt(0, 0));
        EXPECT_LT(called.passed(), 5ms * kSanitizerPatience) << "the caller waits for nothing";
        ASSERT_TRUE(camera.until([&] { return camera.count("Stop") >= i && !camera.moves(); }));
        // The move may have been asked once more meanwhile.
        CameraCall halt;
        ASSERT_TRUE(camera.until([&] {
            halt = camera.lastCall("ContinuousMove");
            return halt.after("PanTilt x=\"") == "0.0000";
        }));
        EXPECT_LT(called.until(camera.lastCall("Stop").at), kStopOnWire);
        EXPECT_LT(called.until(halt.at), kStopOnWire);
        ASSERT_TRUE(settled(camera));
    }
}

TEST_F(SteeringCameraTest, AStopDoesNotWaitForAnEarlierRequestThatHangs) {
    for (const char* operation : {"ContinuousMove", "SetPreset"}) {
        ScriptedCamera camera(hangsOn(operation));
        const auto steering = steer(camera);
        ASSERT_TRUE(found(*steering));
        EXPECT_TRUE(steering->store(1));
        EXPECT_TRUE(steering->panTilt(0.1F, 0));
        ASSERT_TRUE(camera.until([&] { return camera.count(operation) >= 1; }));
        const Stopwatch called;
        EXPECT_TRUE(steering->panTilt(0, 0));
        ASSERT_TRUE(camera.until([&] { return camera.count("Stop") >= 1; }));
        EXPECT_LT(called.until(camera.call("Stop").at), kStopOnWire) << operation;
    }
}

/// The camera reads the move first and does it last.
TEST_F(SteeringCameraTest, AMoveThatTakesEffectAfterItsStopIsStoppedAgain) {
    auto late = std::make_shared<std::atomic<bool>>(false);
    ScriptedCamera camera(
        [late](ScriptedCamera& self, Connection& connection, const CameraCall& call) {
            if (call.operation != "ContinuousMove" || late->exchange(true)) {
                return false;
            }
            self.until([&] { return self.count("Stop") >= 1; });
            std::this_thread::sleep_for(100ms);
            connection.send(self.http(self.answerTo(call)));
            return true;
        },
        0, movesOn);
    const auto steering = steer(camera);
    ASSERT_TRUE(found(*steering));
    EXPECT_TRUE(steering->zoom(1));
    ASSERT_TRUE(camera.until([&] { return camera.count("ContinuousMove") >= 1; }));
    EXPECT_TRUE(steering->zoom(0));
    ASSERT_TRUE(camera.until([&] { return camera.count("Stop") >= 2 && !camera.moves(); }));
    EXPECT_TRUE(settled(camera));
}

TEST_F(SteeringCameraTest, AStopThatIsLostIsAskedAgain) {
    const auto first = std::make_shared<std::atomic<Clock::time_point>>(Clock::time_point::max());
    ScriptedCamera camera(
        [first](ScriptedCamera& self, Connection& connection, const CameraCall& call) {
            const bool stops = call.operation == "Stop" || call.after("PanTilt x=\"") == "0.0000";
            auto none = Clock::time_point::max();
            if (stops) {
                first->compare_exchange_strong(none, call.at);
            }
            return stops && call.at < first->load() + 300ms && connection.send(self.http(self.fault("busy")));
        },
        0, movesOn);
    const auto steering = steer(camera);
    ASSERT_TRUE(found(*steering));
    EXPECT_TRUE(steering->panTilt(0.1F, 0));
    ASSERT_TRUE(camera.until([&] { return camera.moves(); }));
    EXPECT_TRUE(steering->panTilt(0, 0));
    EXPECT_TRUE(camera.until([&] { return !camera.moves(); }));
    EXPECT_TRUE(settled(camera));
}

TEST_F(SteeringCameraTest, TheEndLeavesTheCameraStanding) {
    for (const bool ignoresRunOut : {false, true}) {
        ScriptedCamera camera(nullptr, 0, ignoresRunOut ? movesOn : nullptr);
        auto steering = steer(camera);
        ASSERT_TRUE(found(*steering));
        EXPECT_TRUE(steering->panTilt(1, 1));
        EXPECT_TRUE(steering->zoom(1));
        ASSERT_TRUE(camera.until([&] { return camera.speed() == ScriptedCamera::Speed{-1, 1, 1}; }));
        const Stopwatch called;
        steering->end();
        steering.reset();
        EXPECT_LT(called.passed(), 5ms * kSanitizerPatience);
        ASSERT_TRUE(camera.until([&] { return !camera.moves(); }));
        EXPECT_LT(called.passed(), 1s);
        EXPECT_TRUE(runtime::BackgroundThreads::waitForAll(2s * kSanitizerPatience));
    }
}

TEST_F(SteeringCameraTest, TheEndStopsACameraOnItsWayToAPreset) {
    ScriptedCamera camera;
    camera.setPreset("7", "QIVO 7");
    const auto steering = steer(camera);
    ASSERT_TRUE(found(*steering));
    EXPECT_TRUE(steering->recall(7, 0.25F));
    ASSERT_TRUE(camera.until([&] { return camera.glides(); }));
    const Stopwatch called;
    steering->end();
    ASSERT_TRUE(camera.until([&] { return !camera.glides(); }));
    EXPECT_LT(called.passed(), 1s);
}

TEST_F(SteeringCameraTest, AStopOfTheZoomAloneDoesNotLeaveARecallHalfWay) {
    ScriptedCamera camera;
    camera.setPreset("7", "QIVO 7");
    const auto steering = steer(camera);
    ASSERT_TRUE(found(*steering));
    EXPECT_TRUE(steering->recall(7, 0.25F));
    ASSERT_TRUE(camera.until([&] { return camera.glides(); }));
    const Stopwatch called;
    EXPECT_TRUE(steering->zoom(0));
    ASSERT_TRUE(camera.until([&] { return camera.count("GotoPreset") == 2; }));
    EXPECT_LT(called.until(camera.call("Stop").at), kStopOnWire);
    EXPECT_GT(camera.call("GotoPreset", 1).at, camera.lastCall("Stop").at);
    ASSERT_TRUE(settled(camera));
    EXPECT_TRUE(camera.glides());
    EXPECT_TRUE(steering->panTilt(0, 0));
    EXPECT_TRUE(steering->zoom(0));
    ASSERT_TRUE(settled(camera));
    EXPECT_FALSE(camera.glides());
    EXPECT_EQ(camera.count("GotoPreset"), 2);
}

/// It moves as soon as it is asked, and answers later than the movement lasts.
TEST_F(SteeringCameraTest, AMoveHoldsWhereEveryAnswerTakesLongerThanTheMoveRuns) {
    ScriptedCamera camera([](ScriptedCamera& self, Connection& connection, const CameraCall& call) {
        if (call.operation.find("Get") == 0) {
            return false;
        }
        const std::string answer = self.answerTo(call);
        std::this_thread::sleep_for(1200ms);
        connection.send(self.http(answer));
        return true;
    });
    const auto steering = steer(camera);
    ASSERT_TRUE(found(*steering));
    const auto began = Clock::now();
    EXPECT_TRUE(steering->panTilt(0.1F, 0));
    ASSERT_TRUE(camera.until([&] { return camera.moves(); }));
    ASSERT_NO_FATAL_FAILURE(movesUntil(camera, began + 3500ms));
    const Stopwatch called;
    EXPECT_TRUE(steering->panTilt(0, 0));
    ASSERT_TRUE(camera.until([&] { return !camera.moves(); }));
    EXPECT_LT(called.until(camera.call("Stop").at), kStopOnWire);
    EXPECT_TRUE(settled(camera));
}

// --- Presets that others store and take away

TEST_F(SteeringCameraTest, APresetThatAnotherClientStoredIsReplacedAndNotKeptBeside) {
    ScriptedCamera camera;
    const auto first = steer(camera);
    const auto second = steer(camera);
    ASSERT_TRUE(found(*first) && found(*second));
    EXPECT_TRUE(first->store(3));
    ASSERT_TRUE(camera.until([&] { return camera.presetsNamed("QIVO 3").size() == 1; }));
    EXPECT_TRUE(second->store(3));
    ASSERT_TRUE(camera.until([&] { return camera.count("SetPreset") == 2; }));
    EXPECT_EQ(camera.call("SetPreset", 1).after("PresetToken>"), "slotA");
    EXPECT_TRUE(second->recall(3, 0.25F));
    EXPECT_TRUE(camera.until([&] { return camera.lastRecalled() == "slotA"; }));
}

TEST_F(SteeringCameraTest, APresetThatWasTakenAwayIsStoredAnew) {
    ScriptedCamera camera;
    camera.setPreset("5", "QIVO 3");
    const auto steering = steer(camera);
    ASSERT_TRUE(found(*steering));
    camera.removePreset("5");
    EXPECT_TRUE(steering->store(3));
    ASSERT_TRUE(camera.until([&] { return camera.presetsNamed("QIVO 3") == std::vector<std::string>{"slotA"}; }));
    EXPECT_EQ(camera.count("SetPreset"), 2) << "the first was refused";
    camera.removePreset("slotA");
    camera.setPreset("9", "QIVO 3");
    EXPECT_TRUE(steering->recall(3, 0.25F));
    EXPECT_TRUE(camera.until([&] { return camera.lastRecalled() == "9"; }));
    camera.removePreset("9");
    EXPECT_TRUE(steering->recall(3, 0.25F));
    EXPECT_TRUE(steering->autoFocus());
    ASSERT_TRUE(camera.until([&] { return camera.count("SetImagingSettings") == 1; }));
    EXPECT_EQ(camera.count("GotoPreset"), 3) << "there is no such preset any more";
}

TEST_F(SteeringCameraTest, APresetIsKeptWhereTheListDoesNotCome) {
    auto busy = std::make_shared<std::atomic<bool>>(false);
    ScriptedCamera camera([busy](ScriptedCamera& self, Connection& connection, const CameraCall& call) {
        if (*busy && call.operation == "GetPresets") {
            connection.close();
            return true;
        }
        const bool isRefused = call.operation == "SetPreset" && busy->load();
        return isRefused && connection.send(self.http(self.fault("busy"), "500 Error"));
    });
    camera.setPreset("5", "QIVO 3");
    const auto steering = steer(camera);
    ASSERT_TRUE(found(*steering));
    *busy = true;
    EXPECT_TRUE(steering->store(3));
    EXPECT_TRUE(steering->autoFocus());
    ASSERT_TRUE(camera.until([&] { return camera.count("SetImagingSettings") == 1; }));
    EXPECT_EQ(camera.count("SetPreset"), 1) << "a second one beside it";
    *busy = false;
    EXPECT_TRUE(steering->store(3));
    ASSERT_TRUE(camera.until([&] { return camera.count("SetPreset") == 2; }));
    EXPECT_EQ(camera.call("SetPreset", 1).after("PresetToken>"), "5");
}

TEST_F(SteeringCameraTest, ANumberThatIsAnothersTokenIsNotTakenFromOurOwnPreset) {
    ScriptedCamera camera;
    camera.setPreset("3", "Door");
    const auto steering = steer(camera);
    ASSERT_TRUE(found(*steering));
    camera.setPreset("8", "QIVO 3");
    EXPECT_TRUE(steering->store(3));
    ASSERT_TRUE(camera.until([&] { return camera.count("SetPreset") == 2; }));
    EXPECT_EQ(camera.call("SetPreset", 1).after("PresetToken>"), "8") << "the name was taken";
    EXPECT_EQ(camera.presetsNamed("Door"), std::vector<std::string>{"3"});
}

// --- The camera's clock

/// Refuses what is not asked by its clock: by the status alone, or by the fault alone.
ScriptedCamera::Quirk minding(bool byStatus) {
    return [byStatus](ScriptedCamera& self, Connection& connection, const CameraCall& call) {
        const std::string fault = self.fault("who are you?", "ter:NotAuthorized");
        return call.operation != "GetSystemDateAndTime" && !provesToken(call, self) &&
               connection.send(byStatus ? self.http("", "401 Unauthorized") : self.http(fault, "500 Error"));
    };
}

TEST_F(SteeringCameraTest, AClockThatIsSetAnewIsReadAgain) {
    for (const bool byStatus : {true, false}) {
        ScriptedCamera camera(minding(byStatus), 0, movesOn);
        const auto steering = steer(camera, "ann:secret");
        ASSERT_TRUE(found(*steering));
        camera.clockAhead = -std::chrono::hours(24 * 365);
        const Stopwatch asked;
        EXPECT_TRUE(steering->panTilt(0.1F, 0));
        ASSERT_TRUE(camera.until([&] { return camera.moves(); }));
        EXPECT_LT(asked.passed(), 2s) << "as after a restart, before it has the time";
        camera.clockAhead = 1h;
        const Stopwatch called;
        EXPECT_TRUE(steering->panTilt(0, 0));
        ASSERT_TRUE(camera.until([&] { return !camera.moves(); }));
        EXPECT_LT(called.passed(), 1s) << "just after the clock was read";
        EXPECT_LE(camera.count("GetSystemDateAndTime"), 5);
        camera.clockAhead = -1h;
        std::this_thread::sleep_for(runtime::SoapClient::kClockPause);
        EXPECT_TRUE(steering->store(3));
        EXPECT_TRUE(camera.until([&] { return camera.presetsNamed("QIVO 3").size() == 1; }));
    }
}

TEST_F(SteeringCameraTest, ALoginThatIsRefusedForAnotherReasonIsNotTriedAgain) {
    auto changed = std::make_shared<std::atomic<bool>>(false);
    ScriptedCamera camera([changed](ScriptedCamera& self, Connection& connection, const CameraCall&) {
        return changed->load() && connection.send(self.http("", "401 Unauthorized"));
    });
    const auto steering = steer(camera, "ann:secret");
    ASSERT_TRUE(found(*steering));
    *changed = true;
    const auto began = Clock::now();
    for (int i = 0; i < 20; ++i) {
        EXPECT_TRUE(steering->autoFocus());
    }
    ASSERT_TRUE(camera.until([&] { return camera.count("SetImagingSettings") == 20; }));
    const auto pauses = (Clock::now() - began) / runtime::SoapClient::kClockPause;
    EXPECT_LE(camera.count("GetSystemDateAndTime"), 2 + pauses);
    EXPECT_EQ(camera.count("SetImagingSettings"), 20);
}

/// Refuses every login from then on, and says nothing more of its clock.
ScriptedCamera::Quirk losingItsClock(const std::shared_ptr<std::atomic<bool>>& lost) {
    return [lost](ScriptedCamera& self, Connection& connection, const CameraCall& call) {
        if (*lost && call.operation == "GetSystemDateAndTime") {
            connection.untilClosed();
            return true;
        }
        return lost->load() && connection.send(self.http("", "401 Unauthorized"));
    };
}

TEST_F(SteeringCameraTest, AStopDoesNotWaitForAClockThatSomethingElseReads) {
    auto lost = std::make_shared<std::atomic<bool>>(false);
    ScriptedCamera camera(losingItsClock(lost));
    const auto steering = steer(camera, "ann:secret");
    ASSERT_TRUE(found(*steering));
    *lost = true;
    const int clocks = camera.count("GetSystemDateAndTime");
    EXPECT_TRUE(steering->autoFocus());
    ASSERT_TRUE(camera.until([&] { return camera.count("GetSystemDateAndTime") > clocks; }));
    EXPECT_TRUE(steering->panTilt(0, 0));
    ASSERT_TRUE(camera.until([&] { return camera.count("Stop") >= 2; })) << "none is accepted";
    EXPECT_LT(camera.call("Stop", 1).at - camera.call("Stop").at, runtime::Steering::kStopLimit);
}

TEST_F(SteeringCameraTest, AnAnswerComesInTimeWhileTheClockIsRead) {
    auto lost = std::make_shared<std::atomic<bool>>(true);
    ScriptedCamera camera(losingItsClock(lost));
    runtime::SteeringTarget target;
    target.device = camera.url();
    target.hosts = {"127.0.0.1"};
    target.login = runtime::Login{"ann", "secret"};
    target.loginHost = "127.0.0.1";
    const std::unique_ptr<GMainContext, void (*)(GMainContext*)> context(g_main_context_new(), g_main_context_unref);
    g_main_context_push_thread_default(context.get());
    {
        runtime::SoapClient client(context.get(), target);
        bool answered = false;
        client.post(target.device, runtime::onvif::getCapabilities(), 2s,
                    [&](const runtime::SoapClient::Answer&) { answered = true; });
        ASSERT_TRUE(camera.until([&] {
            g_main_context_iteration(context.get(), FALSE);
            return camera.count("GetSystemDateAndTime") != 0;
        }));
        const Stopwatch asked;
        const auto answer = client.ask(target.device, runtime::onvif::getCapabilities(), 200ms, [] { return false; });
        EXPECT_LT(asked.passed(), runtime::SoapClient::kClockLimit - 100ms);
        EXPECT_EQ(answer.failure, "HTTP status 401");
        EXPECT_FALSE(answered) << "the clock was not being read";
    }
    g_main_context_pop_thread_default(context.get());
}

TEST_F(SteeringCameraTest, ACommandNeverWaitsForTheCamera) {
    ScriptedCamera camera(hangsOn("ContinuousMove"));
    const auto steering = steer(camera);
    ASSERT_TRUE(found(*steering));
    for (int i = 0; i < 50; ++i) {
        const Stopwatch called;
        EXPECT_TRUE(steering->panTilt(0.01F * static_cast<float>(i + 1), 0));
        EXPECT_LT(called.passed(), 5ms * kSanitizerPatience);
    }
    ASSERT_TRUE(camera.until([&] { return camera.count("ContinuousMove") >= 2; }));
    EXPECT_EQ(camera.lastCall("ContinuousMove").after("PanTilt x=\""), "-0.5000") << "the newest speed alone";
}

TEST_F(SteeringCameraTest, ADeviceThatIsSwitchedOnLaterIsFound) {
    int port = 0;
    {
        const ScriptedCamera reserved;
        port = reserved.port();
    }
    auto steering = steer("http://127.0.0.1:" + std::to_string(port) + "/onvif/device_service");
    std::this_thread::sleep_for(100ms);
    EXPECT_FALSE(steering->isOver());
    const ScriptedCamera camera(nullptr, port);
    EXPECT_TRUE(found(*steering));
    EXPECT_EQ(m_changes, 1);
}

TEST_F(SteeringCameraTest, AUsualServiceThatIsNotThereIsAskedOnce) {
    auto steering = steer("http://127.0.0.1:1/onvif/device_service", false);
    EXPECT_TRUE(ScriptedCamera::until([&] { return steering->isOver(); }));
    EXPECT_FALSE(steering->isSupported());
    EXPECT_EQ(m_changes, 0);
}

} // namespace
} // namespace qivo::test
