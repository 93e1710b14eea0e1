#include "runtime/BackgroundThreads.h"

#include <condition_variable>
#include <memory>
#include <mutex>
#include <system_error>
#include <thread>
#include <utility>

namespace qivo::runtime {
namespace {

struct Count {
    std::mutex mutex; // protects running
    std::condition_variable ended;
    int running = 0;
};

/// Shared with the threads, so that one which outlives the wait does not touch what the process has taken apart.
std::shared_ptr<Count> count() {
    static const auto instance = std::make_shared<Count>();
    return instance;
}

void finish(Count& counted) {
    {
        const std::lock_guard guard(counted.mutex);
        --counted.running;
    }
    counted.ended.notify_all();
}

} // namespace

bool BackgroundThreads::start(std::function<void()> work) {
    const std::shared_ptr<Count> counted = count();
    {
        const std::lock_guard guard(counted->mutex);
        ++counted->running;
    }
    try {
        std::thread([counted, work = std::move(work)]() mutable {
            work();
            work = nullptr; // what it holds ends before the thread counts as finished
            finish(*counted);
        }).detach();
    } catch (const std::system_error&) {
        finish(*counted);
        return false;
    }
    return true;
}

bool BackgroundThreads::waitForAll(std::chrono::milliseconds limit) {
    const std::shared_ptr<Count> counted = count();
    std::unique_lock lock(counted->mutex);
    return counted->ended.wait_for(lock, limit, [&] { return counted->running == 0; });
}

} // namespace qivo::runtime
