#pragma once

#include <cstddef>
#include <deque>
#include <mutex>
#include <string>

namespace qivo::runtime {

/// Which sources are received over TCP because UDP brought nothing, for the life of the process.
///
/// Thread: any.
class TransportMemory {
  public:
    /// Sources that are kept; beyond, the oldest is forgotten.
    static constexpr std::size_t kLimit = 1024;

    bool needsTcp(const std::string& source) const;
    void remember(const std::string& source);
    void forget(const std::string& source);

  private:
    mutable std::mutex m_mutex; // protects the rest
    std::deque<std::string> m_sources;
};

} // namespace qivo::runtime
