#include "runtime/Log.h"

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <mutex>

namespace qivo::runtime {
namespace {

using Clock = std::chrono::steady_clock;

struct Throttle {
    std::mutex mutex; // protects the rest
    Clock::time_point second{};
    int lines = 0;
    int suppressed = 0;

    /// Whether a line may go out now; `missed` receives how many did not before it.
    bool admits(Clock::time_point now, int& missed) {
        const std::lock_guard guard(mutex);
        if (now - second >= std::chrono::seconds(1)) {
            second = now;
            lines = 0;
        }
        if (lines == kLogLinesPerSecond) {
            ++suppressed;
            return false;
        }
        ++lines;
        missed = suppressed;
        suppressed = 0;
        return true;
    }
};

Throttle& throttle() {
    static Throttle instance;
    return instance;
}

} // namespace

std::string withoutLogins(std::string_view text) {
    std::string result;
    result.reserve(text.size());
    std::size_t at = 0;
    while (at < text.size()) {
        const std::size_t authority = text.find("//", at);
        if (authority == std::string_view::npos) {
            break;
        }
        result += text.substr(at, authority + 2 - at);
        at = authority + 2;
        // The last @ of the authority counts: a password may contain one that was not escaped.
        const std::size_t end = std::min(text.find_first_of("/?# \t\r\n\"'<>", at), text.size());
        const std::size_t login = text.substr(at, end - at).rfind('@');
        if (login != std::string_view::npos) {
            at += login + 1;
        }
    }
    result += text.substr(std::min(at, text.size()));
    return result;
}

std::string logLine(std::string_view text) {
    std::string line = withoutLogins(text);
    if (line.size() > kLogLineLimit) {
        line.resize(kLogLineLimit);
        line += "...";
    }
    std::replace_if(
        line.begin(), line.end(), [](char c) { return static_cast<unsigned char>(c) < 0x20 || c == 0x7f; }, ' ');
    return line;
}

void log(std::string_view text) {
    int missed = 0;
    if (!throttle().admits(Clock::now(), missed)) {
        return;
    }
    std::string line = "libqivo: " + logLine(text);
    if (missed > 0) {
        line += " (" + std::to_string(missed) + " lines before this one left out)";
    }
    line += '\n';
    std::fwrite(line.data(), 1, line.size(), stderr);
}

} // namespace qivo::runtime
