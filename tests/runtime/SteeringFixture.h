#pragma once

#include "runtime/Steering.h"
#include "tests/runtime/Patience.h"
#include "tests/runtime/ScriptedCamera.h"
#include "tests/runtime/Stopwatch.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <memory>
#include <string>

namespace qivo::test {

using namespace std::chrono_literals;
using Clock = std::chrono::steady_clock;

/// From the call of a stop to its arrival at the camera.
inline constexpr std::chrono::milliseconds kStopOnWire = 50ms * kSanitizerPatience;

/// Whether the request proves the login ann:secret by WS-Security, made within ten seconds by the camera's clock.
bool provesToken(const CameraCall& call, const ScriptedCamera& camera);

/// Steers scripted cameras.
class SteeringCameraTest : public testing::Test {
  protected:
    ~SteeringCameraTest() override;

    /// Steers what is announced at the address, or, not announced, is looked for there.
    std::shared_ptr<runtime::Steering> steer(const std::string& device, bool announced = true,
                                             const std::string& login = "");
    std::shared_ptr<runtime::Steering> steer(const ScriptedCamera& camera, const std::string& login = "");
    /// Waits for the camera. False if there is none.
    static bool found(const runtime::Steering& steering);
    /// Whether the camera stands, and is not asked anything any more.
    static bool settled(const ScriptedCamera& camera);

    std::atomic<int> m_changes = 0; ///< how often support was found
    std::vector<std::weak_ptr<runtime::Steering>> m_steerings;
};

} // namespace qivo::test
