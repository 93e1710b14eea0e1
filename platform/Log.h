#pragma once

#include <functional>
#include <string>

namespace qivo {

/// Takes one record of the system log: a text that may contain newlines, but does not end with one of the log's own. A
/// record that ends with a newline therefore shows as a text and an empty line.
using LogSink = std::function<void(const std::string& record)>;

/// Writes one record to the system log, which adds the time and the process. The format is printf's.
///
/// Thread: any.
[[gnu::format(printf, 1, 2)]] void logLine(const char* format, ...);

/// Sends the records elsewhere, or to the system log again if `sink` is empty, and returns where they went before
/// (empty for the system log). The sink is called on the thread that logs, by several threads at a time if they do, and
/// may still be running when this returns.
///
/// Thread: any.
LogSink setLogSink(LogSink sink);

} // namespace qivo
