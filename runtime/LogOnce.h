#pragma once

#include <chrono>
#include <cstddef>
#include <mutex>
#include <set>
#include <string>
#include <string_view>

namespace qivo::runtime {

/// Different lines that are written within one kLogOncePeriod.
inline constexpr std::size_t kLogOnceLines = 100;
inline constexpr std::chrono::hours kLogOncePeriod{1};

/// Keeps what the network makes us say from filling a disk: the same line once an hour, so many different ones an hour.
/// Thread: any.
class LogOnce {
  public:
    using Clock = std::chrono::steady_clock;

    /// Whether the line may be written now.
    bool admits(std::string_view line, Clock::time_point now);

  private:
    std::mutex m_mutex; // guards all below
    Clock::time_point m_began{};
    std::set<std::string, std::less<>> m_lines;
};

/// Writes the line through log() if the process's LogOnce admits it. Thread: any.
void logOnce(std::string_view line);

} // namespace qivo::runtime
