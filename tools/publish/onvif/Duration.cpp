#include "tools/publish/onvif/Duration.h"

#include "tools/publish/onvif/Xml.h"

#include <array>
#include <cmath>
#include <ctime>

namespace qivo {
namespace {

constexpr double longestSeconds = 366.0 * 24 * 3600;

struct Unit {
    char letter;
    bool ofTime; ///< stands behind the "T"
    double seconds;
};
constexpr std::array units{Unit{'D', false, 86400}, Unit{'H', true, 3600}, Unit{'M', true, 60}, Unit{'S', true, 1}};

bool isNumber(std::string_view text, bool fraction) {
    return !text.empty() && text.find_first_not_of(fraction ? "0123456789." : "0123456789") == std::string_view::npos;
}

} // namespace

std::optional<std::chrono::milliseconds> durationIn(std::string_view text) {
    const bool negative = !text.empty() && text.front() == '-';
    text.remove_prefix(negative ? 1 : 0);
    if (text.size() < 3 || text.front() != 'P') {
        return std::nullopt;
    }
    text.remove_prefix(1);
    double seconds = 0;
    bool timeBegun = false;
    for (std::size_t unit = 0; !text.empty(); ++unit) {
        if (!timeBegun && text.front() == 'T') {
            timeBegun = true;
            text.remove_prefix(1);
        }
        const std::size_t end = text.find_first_not_of("0123456789.");
        while (end != std::string_view::npos && unit < units.size() &&
               (units[unit].letter != text[end] || units[unit].ofTime != timeBegun)) {
            ++unit;
        }
        if (end == std::string_view::npos || unit >= units.size() ||
            !isNumber(text.substr(0, end), units[unit].letter == 'S')) {
            return std::nullopt;
        }
        const auto number = numberIn(text.substr(0, end));
        if (!number) {
            return std::nullopt;
        }
        seconds += *number * units[unit].seconds;
        text.remove_prefix(end + 1);
    }
    if (!(seconds <= longestSeconds)) {
        return std::nullopt;
    }
    return std::chrono::milliseconds(std::llround((negative ? -seconds : seconds) * 1000));
}

std::string utcText(std::chrono::system_clock::time_point time) {
    const std::time_t seconds = std::chrono::system_clock::to_time_t(time);
    std::tm utc{};
    gmtime_r(&seconds, &utc);
    std::array<char, 32> text{};
    std::strftime(text.data(), text.size(), "%Y-%m-%dT%H:%M:%SZ", &utc);
    return text.data();
}

} // namespace qivo
