#include "tests/runtime/Stopwatch.h"

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <system_error>

namespace qivo::test {
namespace {

/// For how long the threads of this process, taken together, have waited for a processor.
std::chrono::nanoseconds waitedForProcessor() {
    std::chrono::nanoseconds all{0};
    std::error_code failed;
    for (const auto& thread : std::filesystem::directory_iterator("/proc/self/task", failed)) {
        std::ifstream file(thread.path() / "schedstat"); // nanoseconds of running, nanoseconds of waiting, turns
        std::chrono::nanoseconds::rep ran = 0;
        std::chrono::nanoseconds::rep waited = 0;
        if (file >> ran >> waited) {
            all += std::chrono::nanoseconds(waited);
        }
    }
    return all;
}

} // namespace

Stopwatch::Stopwatch() : m_waited(waitedForProcessor()), m_began(Clock::now()) {}

Stopwatch::Clock::duration Stopwatch::until(Clock::time_point end) const {
    // A thread that has ended since takes what it waited with it.
    return end - m_began - std::max(Clock::duration::zero(), Clock::duration(waitedForProcessor() - m_waited));
}

} // namespace qivo::test
