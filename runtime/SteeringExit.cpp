#include "runtime/SteeringExit.h"

#include "runtime/Steering.h"

#include <algorithm>
#include <cstdlib>
#include <mutex>
#include <vector>

namespace qivo::runtime {
namespace {

/// How long the exit waits for cameras to take their stops.
constexpr std::chrono::milliseconds kExitLimit{700};

struct Running {
    std::mutex mutex; // protects the rest
    std::vector<std::weak_ptr<Steering>> all;
};

Running& running() {
    // Never taken apart: the exit handler and threads that outlast it look at it.
    static auto* const instance = new Running; // NOLINT(cppcoreguidelines-owning-memory)
    return *instance;
}

void stopAll() {
    std::vector<std::shared_ptr<Steering>> left;
    {
        const std::lock_guard guard(running().mutex);
        for (const auto& one : running().all) {
            left.push_back(one.lock());
        }
    }
    left.erase(std::remove(left.begin(), left.end(), nullptr), left.end());
    for (const auto& steering : left) {
        steering->end();
    }
    const auto deadline = Steering::Clock::now() + kExitLimit;
    for (const auto& steering : left) {
        steering->waitForEnd(deadline);
    }
}

} // namespace

void steeringBegan(const std::shared_ptr<Steering>& steering) {
    [[maybe_unused]] static const int registered = std::atexit(stopAll);
    const std::lock_guard guard(running().mutex);
    auto& all = running().all;
    all.erase(std::remove_if(all.begin(), all.end(), [](const auto& one) { return one.expired(); }), all.end());
    all.push_back(steering);
}

} // namespace qivo::runtime
