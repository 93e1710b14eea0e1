#include "gl/InfoLog.h"

#include "platform/Log.h"

#include <string>

namespace qivo {

void logInfoLog(std::int32_t length, const InfoLogReader& read) {
    if (length < 0 || length > maximumInfoLogBytes) {
        return;
    }
    std::string text(static_cast<std::size_t>(length), '\0');
    read(length, text.data());
    logLine(">> ERROR: {\n%s\n}\n", text.c_str());
}

} // namespace qivo
