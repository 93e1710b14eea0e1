#pragma once

#include <algorithm>
#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <ctime>
#include <thread>
#include <utility>
#include <vector>

/// When the machine itself stood still. A virtual machine's host may slow its memory down by an order of magnitude, for
/// a quarter of a second at a time, and the machine is told nothing of it. A thread copies little memory now and then:
/// when that takes much more than usual of its own processor time, which has no part in what others use, it is the
/// machine. Processors that are merely busy, with caches that others use, make it two or three times as long.
class Stalls {
  public:
    Stalls() : m_thread([this] { watch(); }) {}
    ~Stalls() { stop(); }
    Stalls(const Stalls&) = delete;
    Stalls& operator=(const Stalls&) = delete;

    /// Ends watching. Call it before the others.
    void stop() {
        m_stopped = true;
        if (m_thread.joinable()) {
            m_thread.join();
        }
        find();
    }

    /// How often it stood still.
    std::size_t count() const { return m_stalls.size(); }

    /// Whether a picture that was drawn at that moment, in milliseconds since 1970, was under way in one, or came in
    /// the time after it in which programs catch up.
    bool cover(std::int64_t moment) const {
        return std::any_of(m_stalls.begin(), m_stalls.end(), [moment](const auto& stall) {
            return moment >= stall.first - kUnderWay && moment <= stall.second + kCatchingUp;
        });
    }

  private:
    static constexpr std::size_t kBytes = std::size_t{256} << 10U;
    static constexpr std::chrono::milliseconds kPause{4};
    static constexpr double kMuchMore = 5;
    static constexpr std::int64_t kOneStall = 200; // what is as close together as this in ms
    static constexpr std::int64_t kUnderWay = 100;
    static constexpr std::int64_t kCatchingUp = 250;

    struct Copy {
        std::int64_t moment = 0; // in milliseconds since 1970
        double microseconds = 0;
    };

    static double ownTime() {
        timespec time{};
        clock_gettime(CLOCK_THREAD_CPUTIME_ID, &time);
        return static_cast<double>(time.tv_sec) * 1e6 + static_cast<double>(time.tv_nsec) * 1e-3;
    }

    void watch() {
        using namespace std::chrono;
        std::vector<char> from(kBytes, 1);
        std::vector<char> to(kBytes, 2);
        while (!m_stopped) {
            const double before = ownTime();
            std::memcpy(to.data(), from.data(), kBytes);
            from[0] = to[kBytes - 1]; // so that nobody leaves the copy out
            const double took = ownTime() - before;
            m_copies.push_back({duration_cast<milliseconds>(system_clock::now().time_since_epoch()).count(), took});
            std::this_thread::sleep_for(kPause);
        }
    }

    void find() {
        m_stalls.clear();
        std::vector<double> times;
        for (const Copy& copy : m_copies) {
            times.push_back(copy.microseconds);
        }
        if (times.empty()) {
            return;
        }
        std::nth_element(times.begin(), times.begin() + static_cast<std::ptrdiff_t>(times.size() / 2), times.end());
        const double usual = times[times.size() / 2];
        for (const Copy& copy : m_copies) {
            if (copy.microseconds <= kMuchMore * usual) {
                continue;
            }
            if (!m_stalls.empty() && copy.moment - m_stalls.back().second <= kOneStall) {
                m_stalls.back().second = copy.moment;
            } else {
                m_stalls.emplace_back(copy.moment, copy.moment);
            }
        }
    }

    std::atomic<bool> m_stopped = false;
    std::vector<Copy> m_copies; // the thread's until it has ended
    std::vector<std::pair<std::int64_t, std::int64_t>> m_stalls;
    std::thread m_thread; // last, as it uses the others
};
