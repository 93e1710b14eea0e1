#pragma once

#include <chrono>
#include <optional>
#include <string>
#include <string_view>

namespace qivo {

/** An XML Schema duration in days, hours, minutes and seconds, such as "PT0.5S" or "-P1DT2H", to the millisecond. Empty
 *  for anything else: years and months, whose length nobody knows, and what is longer than a year. */
[[nodiscard]] std::optional<std::chrono::milliseconds> durationIn(std::string_view text);

/** A moment as XML Schema writes it, in UTC, to the second. */
[[nodiscard]] std::string utcText(std::chrono::system_clock::time_point time);

} // namespace qivo
