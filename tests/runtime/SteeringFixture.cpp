#include "tests/runtime/SteeringFixture.h"

#include "runtime/BackgroundThreads.h"

#include <thread>

namespace qivo::test {

using runtime::Steering;
using runtime::SteeringTarget;

SteeringCameraTest::~SteeringCameraTest() {
    for (const auto& one : m_steerings) {
        if (const auto steering = one.lock()) {
            steering->end();
        }
    }
    EXPECT_TRUE(runtime::BackgroundThreads::waitForAll(5s * kSanitizerPatience)) << "a thread does not end";
}

std::shared_ptr<Steering> SteeringCameraTest::steer(const std::string& device, bool announced,
                                                    const std::string& login) {
    SteeringTarget target;
    target.device = device;
    target.announced = announced;
    target.hosts = {"127.0.0.1"};
    target.streams = {"rtsp://127.0.0.1:554/live"};
    if (!login.empty()) {
        target.login = runtime::urlParts("http://" + login + "@127.0.0.1")->login;
        target.loginHost = "127.0.0.1";
    }
    auto steering = Steering::start(target, [this] { ++m_changes; });
    m_steerings.push_back(steering);
    return steering;
}

std::shared_ptr<Steering> SteeringCameraTest::steer(const ScriptedCamera& camera, const std::string& login) {
    return steer(camera.url(), true, login);
}

bool SteeringCameraTest::found(const Steering& steering) {
    ScriptedCamera::until([&] { return steering.isSupported() || steering.isOver(); }, 8s);
    return steering.isSupported();
}

bool SteeringCameraTest::settled(const ScriptedCamera& camera) {
    return ScriptedCamera::until([&] {
        const std::size_t before = camera.calls().size();
        std::this_thread::sleep_for(runtime::PtzCommands::kStopPause + 50ms);
        return camera.calls().size() == before && !camera.moves();
    });
}

} // namespace qivo::test
