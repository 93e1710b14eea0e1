#include "tests/runtime/SteeringFixture.h"

#include "runtime/BackgroundThreads.h"
#include "runtime/OnvifLogin.h"

#include <glib.h>
#include <thread>

namespace qivo::test {

using runtime::Steering;
using runtime::SteeringTarget;

bool provesToken(const CameraCall& call, const ScriptedCamera& camera) {
    const std::chrono::seconds ahead = camera.clockAhead;
    gsize length = 0;
    guchar* bytes = g_base64_decode(call.after("#Base64Binary\">").c_str(), &length);
    const std::string nonce(reinterpret_cast<const char*>(bytes), length);
    g_free(bytes);
    const std::string created = call.after("Created>");
    bool fresh = false;
    for (int second = -10; second <= 10; ++second) {
        fresh = fresh ||
                created == runtime::timeText(std::chrono::system_clock::now() + ahead + std::chrono::seconds(second));
    }
    return fresh && call.after("Username>") == "ann" &&
           call.after("#PasswordDigest\">") == runtime::passwordDigest(nonce, created, "secret");
}

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
