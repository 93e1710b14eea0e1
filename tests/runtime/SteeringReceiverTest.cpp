// From the announcement to the camera: what an application sees of steering, and what the camera sees of its end.

#include "runtime/ReceiverLoop.h"
#include "tests/runtime/ReceiverFixture.h"
#include "tests/runtime/SteeringFixture.h"
#include "tests/support/Process.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <csignal>
#include <memory>
#include <regex>
#include <string>

namespace qivo::test {
namespace {

using runtime::Announcement;

const std::string kPicture = "width=160,height=120,framerate=25/1";
constexpr int kUsualPort = 80;
constexpr auto kWatched = 1200ms; // by then a receiver knows from the pictures how fast they come
/// Twice what it takes where the machine was too busy for pictures to come steadily: missed late, and taken apart.
constexpr auto kComesBack = 2 * (runtime::kFirstStallLimit + runtime::kEndingLimit);

class SteeringReceiverTest : public ReceiverFixture {
  protected:
    void announce(const std::string& onvif, const std::string& web = "") {
        m_view->announce({Announcement{"STUDIO (Dome)", m_source.url(), "", web, onvif, false}});
    }

    /// Captures until the camera is found, as an application does. Counts the status changes on the way.
    bool offersSteering(runtime::Receiver& receiver, std::chrono::milliseconds limit = 8s) {
        const auto deadline = Clock::now() + limit;
        while (Clock::now() < deadline) {
            if (statusChanges(receiver, 100ms) && receiver.steering()) {
                return true;
            }
        }
        return false;
    }

    static std::string webControl(runtime::Receiver& receiver) {
        const char* text = receiver.webControl();
        const std::string address = text != nullptr ? text : "";
        receiver.freeString(text);
        return address;
    }

    /// Sends nothing until the receiver has connected anew, and then pictures again.
    void comeBack(runtime::Receiver& receiver) {
        // A source whose pace is known is missed sooner.
        const auto known = Clock::now() + kWatched;
        while (Clock::now() < known) {
            ASSERT_TRUE(nextPicture(receiver));
        }
        const int connections = m_source.connections();
        m_source.setSilent(true);
        ASSERT_TRUE(ScriptedCamera::until([&] { return m_source.connections() > connections; }, kComesBack));
        m_source.setSilent(false);
        ASSERT_TRUE(nextPicture(receiver));
    }

    RtspServer m_source{{.launch = h264(kPicture)}};
};

TEST_F(SteeringReceiverTest, TheFindingOfACameraIsAStatusChange) {
    const ScriptedCamera camera;
    const auto receiver = receive("", "STUDIO (Dome)");
    announce(camera.url());
    ASSERT_TRUE(offersSteering(*receiver));
    const auto steering = receiver->steering();
    ASSERT_TRUE(steering);
    EXPECT_TRUE(steering->panTilt(0.5F, 0));
    EXPECT_TRUE(camera.until([&] { return camera.speed().pan == -0.5F; }));
    EXPECT_TRUE(nextPicture(*receiver));
}

TEST_F(SteeringReceiverTest, ACameraWithoutAControlPageGetsTheOneOfItsHost) {
    const ScriptedCamera camera;
    const auto receiver = receive("", "STUDIO (Dome)");
    announce(camera.url("/onvif/device_service", "ann:secret"));
    ASSERT_TRUE(offersSteering(*receiver));
    EXPECT_EQ(webControl(*receiver), camera.url("/")) << "applications ask for steering only where there is one";
    announce(camera.url("/onvif/device_service", "ann:secret"), "http://127.0.0.1/page");
    ASSERT_TRUE(statusChanges(*receiver));
    EXPECT_EQ(webControl(*receiver), "http://127.0.0.1/page");
    EXPECT_TRUE(receiver->steering()) << "the camera is still the same";
}

TEST_F(SteeringReceiverTest, AnAnnouncementMayNameAnotherHost) {
    const ScriptedCamera camera;
    const auto receiver = receive("", "STUDIO (Dome)");
    announce("http://localhost:" + std::to_string(camera.port()) + "/onvif/device_service");
    EXPECT_TRUE(offersSteering(*receiver));
}

TEST_F(SteeringReceiverTest, ASourceThatAnnouncesNothingIsAskedAtTheUsualPlace) {
    const ScriptedCamera camera(nullptr, kUsualPort);
    const auto receiver = receive(m_source.url());
    ASSERT_TRUE(offersSteering(*receiver));
    EXPECT_EQ(camera.call("GetCapabilities").path, "/onvif/device_service");
}

TEST_F(SteeringReceiverTest, AnotherCameraOnTheSourcesHostIsNotTaken) {
    ScriptedCamera camera(nullptr, kUsualPort);
    camera.streamPath = "/other";
    const auto receiver = receive(m_source.url());
    ASSERT_TRUE(nextPicture(*receiver));
    ASSERT_TRUE(camera.until([&] { return camera.count("GetStreamUri") == 2; }));
    EXPECT_FALSE(offersSteering(*receiver, 300ms));
    EXPECT_EQ(webControl(*receiver), "");
}

TEST_F(SteeringReceiverTest, AnAnnouncementThatLeadsElsewhereStopsTheCameraThatWas) {
    ScriptedCamera first;
    first.ignoresRunOut = true;
    const ScriptedCamera second;
    const auto receiver = receive("", "STUDIO (Dome)");
    announce(first.url());
    ASSERT_TRUE(offersSteering(*receiver));
    auto steering = receiver->steering();
    ASSERT_TRUE(steering);
    EXPECT_TRUE(steering->zoom(0.5F));
    ASSERT_TRUE(first.until([&] { return first.moves(); }));
    announce(second.url());
    ASSERT_TRUE(first.until([&] { return !first.moves(); }));
    ASSERT_TRUE(first.until([&] { return (steering = receiver->steering()) != nullptr; }));
    EXPECT_TRUE(steering->zoom(-0.5F));
    EXPECT_TRUE(second.until([&] { return second.moves(); }));
    EXPECT_FALSE(first.moves());
}

/// As after a restart with other settings.
ScriptedCamera::Quirk renamingItsProfile(const std::shared_ptr<std::atomic<bool>>& renamed) {
    return [renamed](ScriptedCamera& self, Connection& connection, const CameraCall& call) {
        if (!*renamed) {
            return false;
        }
        const bool isOld = call.body.find("ProfileToken>dome<") != std::string::npos;
        const std::string answer = isOld ? self.fault("no such profile", "ter:NoProfile") : self.answerTo(call);
        return connection.send(self.http(std::regex_replace(answer, std::regex("token=\"dome\""), "token=\"dome2\"")));
    };
}

/// It was switched off meanwhile, and what it told of itself may be out of date.
TEST_F(SteeringReceiverTest, ACameraIsAskedAnewWhenItsSourceHasComeBack) {
    auto restarted = std::make_shared<std::atomic<bool>>(false);
    ScriptedCamera camera(renamingItsProfile(restarted));
    const auto receiver = receive("", "STUDIO (Dome)");
    announce(camera.url());
    ASSERT_TRUE(offersSteering(*receiver));
    ASSERT_TRUE(nextPicture(*receiver));
    *restarted = true;
    ASSERT_NO_FATAL_FAILURE(comeBack(*receiver));
    EXPECT_TRUE(receiver->steering()) << "it was never without";
    ASSERT_TRUE(camera.until([&] { return camera.count("GetMoveOptions") >= 2; }));
    EXPECT_TRUE(camera.until([&] {
        const auto steering = receiver->steering();
        return steering && steering->panTilt(0.5F, 0) && camera.until([&] { return camera.moves(); }, 200ms);
    }));
    EXPECT_EQ(camera.lastCall("ContinuousMove").after("ProfileToken>"), "dome2");
}

TEST_F(SteeringReceiverTest, ARecallGoesOnWhenItsSourceHasComeBack) {
    ScriptedCamera camera;
    camera.setPreset("7", "QIVO 7");
    const auto receiver = receive("", "STUDIO (Dome)");
    announce(camera.url());
    ASSERT_TRUE(offersSteering(*receiver));
    ASSERT_TRUE(nextPicture(*receiver));
    const auto before = receiver->steering();
    ASSERT_TRUE(before);
    EXPECT_TRUE(before->recall(7, 0.25F));
    ASSERT_TRUE(camera.until([&] { return camera.glides(); }));
    ASSERT_NO_FATAL_FAILURE(comeBack(*receiver));
    ASSERT_TRUE(camera.until([&] { return camera.count("GetMoveOptions") >= 2; }));
    EXPECT_FALSE(camera.until([&] { return receiver->steering() != before; }, 500ms));
    EXPECT_TRUE(before->recall(7, 0.25F));
    ASSERT_TRUE(camera.until([&] { return camera.count("GotoPreset") == 2; }));
    EXPECT_FALSE(camera.until([&] { return camera.count("Stop") != 0; }, 500ms)) << "it ended half way";
    EXPECT_TRUE(before->panTilt(0, 0));
    EXPECT_TRUE(before->zoom(0));
    EXPECT_TRUE(camera.until([&] { return receiver->steering() != before; })) << "the camera stands";
}

/// The first return is not over yet where the camera still moves.
TEST_F(SteeringReceiverTest, ACameraIsAskedAnewAtEveryReturnOfItsSource) {
    auto restarted = std::make_shared<std::atomic<bool>>(false);
    ScriptedCamera camera(renamingItsProfile(restarted));
    const auto receiver = receive("", "STUDIO (Dome)");
    announce(camera.url());
    ASSERT_TRUE(offersSteering(*receiver));
    ASSERT_TRUE(nextPicture(*receiver));
    const auto before = receiver->steering();
    ASSERT_TRUE(before);
    EXPECT_TRUE(before->panTilt(0.5F, 0));
    // On a busy machine a source may also go and return unasked.
    ASSERT_NO_FATAL_FAILURE(comeBack(*receiver));
    ASSERT_TRUE(camera.until([&] { return camera.count("GetMoveOptions") >= 2; }));
    EXPECT_EQ(receiver->steering(), before);
    *restarted = true;
    const int asked = camera.count("GetMoveOptions");
    ASSERT_NO_FATAL_FAILURE(comeBack(*receiver));
    ASSERT_TRUE(camera.until([&] { return camera.count("GetMoveOptions") > asked; }));
    EXPECT_TRUE(camera.until([&] {
        const auto steering = receiver->steering();
        return steering && steering->zoom(0.5F) && camera.until([&] { return camera.speed().zoom == 0.5F; }, 200ms);
    }));
    // Not necessarily the last one: what steered before stops the camera beside it.
    const auto moves = camera.calls("ContinuousMove");
    EXPECT_TRUE(std::any_of(moves.begin(), moves.end(), [](const auto& move) {
        return move.after("ProfileToken>") == "dome2" && move.body.find("Zoom") != std::string::npos;
    }));
}

TEST_F(SteeringReceiverTest, SoundAloneIsNotSteered) {
    const ScriptedCamera camera;
    const auto receiver = receive("", "STUDIO (Dome)", QIVOlib_recv_bandwidth_audio_only);
    announce(camera.url());
    EXPECT_FALSE(offersSteering(*receiver, 300ms));
    EXPECT_TRUE(camera.calls().empty());
}

TEST_F(SteeringReceiverTest, ADeadDeviceServiceDisturbsNeitherThePictureNorTheEnd) {
    const RawServer dead;
    auto receiver = receive("", "STUDIO (Dome)");
    announce("http://127.0.0.1:" + std::to_string(dead.port()) + "/onvif/device_service");
    ASSERT_TRUE(nextPicture(*receiver));
    ASSERT_TRUE(ScriptedCamera::until([&] { return dead.connections() > 0; }));
    EXPECT_TRUE(nextPicture(*receiver, 1s * kSanitizerPatience));
    EXPECT_EQ(receiver->steering(), nullptr);
    EXPECT_LT(costOf([&] { receiver.reset(); }), 20ms * kSanitizerPatience);
}

/// How the process of an application ends while its camera turns.
struct End {
    std::string name;
    int signal = 0;              ///< that ends it
    std::string itself = "hold"; ///< or what it does by itself
    bool ignoresRunOut = false;  ///< whether a camera stands that does not stop by itself
};

std::ostream& operator<<(std::ostream& out, const End& end) {
    return out << end.name;
}

class SteeringEnds : public testing::TestWithParam<End> {};

TEST_P(SteeringEnds, LeaveTheCameraStanding) {
    const End& end = GetParam();
    ScriptedCamera camera(nullptr, kUsualPort);
    camera.ignoresRunOut = end.ignoresRunOut;
    const RtspServer source{{.launch = h264(kPicture)}};
    const auto child = Process::start({STEER_CHILD, source.url(), end.itself});
    ASSERT_TRUE(child);
    ASSERT_TRUE(child->waitForOutput("turning")) << child->output() << child->errors();
    ASSERT_TRUE(camera.until([&] { return camera.moves(); }));
    if (end.signal == 0) {
        ASSERT_TRUE(child->waitForOutput("ending"));
    } else {
        child->signal(end.signal);
        // Until it is gone it may still ask for a move, and on a busy machine a signal takes its time as well.
        ASSERT_TRUE(camera.until([&] { return !child->running(); }));
    }
    const Stopwatch ended;
    ASSERT_TRUE(camera.until([&] { return !camera.moves(); }, 3s * kSanitizerPatience));
    EXPECT_LT(ended.passed(), 1s + 50ms * kSanitizerPatience);
}

class SteeringRecallEnds : public testing::TestWithParam<const char*> {};

TEST_P(SteeringRecallEnds, LeaveTheCameraStanding) {
    ScriptedCamera camera(nullptr, kUsualPort);
    camera.setPreset("7", "QIVO 7");
    const RtspServer source{{.launch = h264(kPicture)}};
    const auto child = Process::start({STEER_CHILD, source.url(), GetParam(), "7"});
    ASSERT_TRUE(child);
    ASSERT_TRUE(child->waitForOutput("turning")) << child->output() << child->errors();
    ASSERT_TRUE(camera.until([&] { return camera.glides(); }));
    ASSERT_TRUE(child->waitForOutput("ending"));
    const Stopwatch ended;
    ASSERT_TRUE(camera.until([&] { return !camera.glides(); }, 3s * kSanitizerPatience));
    EXPECT_LT(ended.passed(), 1s + 50ms * kSanitizerPatience);
}

INSTANTIATE_TEST_SUITE_P(Process, SteeringRecallEnds, testing::Values("receiver", "library", "exit"),
                         [](const auto& one) { return std::string(one.param); });

INSTANTIATE_TEST_SUITE_P(
    Process, SteeringEnds,
    testing::Values(End{.name = "DestroyingTheReceiver", .itself = "receiver", .ignoresRunOut = true},
                    End{.name = "DestroyingTheLibrary", .itself = "library", .ignoresRunOut = true},
                    End{.name = "Exiting", .itself = "exit", .ignoresRunOut = true},
                    End{.name = "Terminated", .signal = SIGTERM}, End{.name = "Interrupted", .signal = SIGINT},
                    End{.name = "Killed", .signal = SIGKILL}, End{.name = "Crashed", .signal = SIGSEGV}),
    [](const auto& one) { return one.param.name; });

} // namespace
} // namespace qivo::test
