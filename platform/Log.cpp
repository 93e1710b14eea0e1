#include "platform/Log.h"

#include <QString>
#include <QtGlobal>

#include <algorithm>
#include <cstdarg>
#include <cstdio>
#include <memory>
#include <mutex>
#include <utility>

namespace qivo {

namespace {

std::mutex sinkLock;
std::shared_ptr<const LogSink> currentSink; // under sinkLock; null for the system log

void writeToSystemLog(const std::string& record) {
    static const bool patternIsSet =
        (qSetMessagePattern(QStringLiteral("%{time yyyy-MM-dd hh:mm:ss.zzz} %{appname}[%{pid}] %{message}")), true);
    static_cast<void>(patternIsSet);
    QMessageLogger().info("%s", record.c_str());
}

} // namespace

void logLine(const char* format, ...) {
    std::va_list arguments;
    va_start(arguments, format);
    const int length = std::vsnprintf(nullptr, 0, format, arguments);
    va_end(arguments);
    std::string record(static_cast<std::size_t>(std::max(length, 0)), '\0');
    va_start(arguments, format);
    std::vsnprintf(record.data(), record.size() + 1, format, arguments);
    va_end(arguments);

    std::shared_ptr<const LogSink> sink;
    {
        const std::lock_guard lock(sinkLock);
        sink = currentSink;
    }
    if (sink) {
        (*sink)(record);
    } else {
        writeToSystemLog(record);
    }
}

LogSink setLogSink(LogSink sink) {
    auto next = sink ? std::make_shared<const LogSink>(std::move(sink)) : nullptr;
    const std::lock_guard lock(sinkLock);
    std::swap(currentSink, next);
    return next ? *next : LogSink();
}

} // namespace qivo
