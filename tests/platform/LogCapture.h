#pragma once

#include "platform/Log.h"

#include <mutex>
#include <string>
#include <utility>
#include <vector>

namespace qivo {

/// Keeps the system log's records for as long as it lives, instead of letting them be written.
class LogCapture {
  public:
    LogCapture()
        : _previous(setLogSink([this](const std::string& record) {
              const std::lock_guard lock(_lock);
              _records.push_back(record);
          })) {}
    ~LogCapture() { setLogSink(std::move(_previous)); }
    LogCapture(const LogCapture&) = delete;
    LogCapture& operator=(const LogCapture&) = delete;

    /// What was logged since the last call.
    std::vector<std::string> take() {
        const std::lock_guard lock(_lock);
        return std::exchange(_records, {});
    }

  private:
    std::mutex _lock;
    std::vector<std::string> _records; // under _lock
    LogSink _previous;
};

} // namespace qivo
