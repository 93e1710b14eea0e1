#include "runtime/LogOnce.h"

#include "runtime/Log.h"

namespace qivo::runtime {

bool LogOnce::admits(std::string_view line, Clock::time_point now) {
    const std::lock_guard lock(m_mutex);
    if (now - m_began >= kLogOncePeriod) {
        m_began = now;
        m_lines.clear();
    }
    return m_lines.size() < kLogOnceLines && m_lines.emplace(line).second;
}

void logOnce(std::string_view line) {
    static LogOnce lines;
    if (lines.admits(line, LogOnce::Clock::now())) {
        log(line);
    }
}

} // namespace qivo::runtime
