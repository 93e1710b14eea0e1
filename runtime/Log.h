#pragma once

#include <string>
#include <string_view>

namespace qivo::runtime {

/// Lines written in any one second; what comes beyond is counted, and the count is told with the next line.
inline constexpr int kLogLinesPerSecond = 10;
/// Bytes of a line after which it is cut.
inline constexpr std::size_t kLogLineLimit = 512;

/// Writes one line to standard error, prefixed "libqivo: ". Logins in URLs are taken out, control characters become
/// blanks, so that text from the network can be part of it.
/// Thread: any.
void log(std::string_view text);

/// The text with every "//user:password@" made "//". Works on URLs and on sentences that contain them.
std::string withoutLogins(std::string_view text);

/// The text as `log` would write it, without the prefix and the end of the line.
std::string logLine(std::string_view text);

} // namespace qivo::runtime
