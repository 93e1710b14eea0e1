#include "tools/record/Progress.h"

#include <array>
#include <cinttypes>
#include <cstdio>

namespace qivo::record {

std::string timeText(Nanoseconds time) {
    constexpr std::int64_t msPerSecond = 1000;
    constexpr std::int64_t secondsPerMinute = 60;
    const std::int64_t ms = time.count() / (std::nano::den / msPerSecond);
    const std::int64_t seconds = ms / msPerSecond;
    const std::int64_t minutes = seconds / secondsPerMinute;
    std::array<char, 48> text{};
    std::snprintf(text.data(), text.size(), "%02" PRId64 ":%02" PRId64 ":%02" PRId64 ".%03" PRId64,
                  minutes / secondsPerMinute, minutes % secondsPerMinute, seconds % secondsPerMinute, ms % msPerSecond);
    return text.data();
}

std::string progressLine(const Progress& progress) {
    return "time " + timeText(progress.length) + " pictures " + std::to_string(progress.pictures) + " dropped " +
           std::to_string(progress.dropped) + " bytes " + std::to_string(progress.bytes) +
           (progress.soundLost == Nanoseconds(0) ? "" : " sound lost " + timeText(progress.soundLost)) +
           (progress.waiting.empty() ? "" : " waiting for " + progress.waiting);
}

} // namespace qivo::record
