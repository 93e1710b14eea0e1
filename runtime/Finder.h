#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include "runtime/Directory.h"
#include "sdk/qivo.h"

namespace qivo::runtime {

/// What stands behind a finder handle: a filtered view of the directory that remembers what it has reported.
///
/// Thread: any. A wait in one thread does not hold up the other operations.
class Finder {
  public:
    /// Null settings mean: local sources too. Null if the network cannot be used at all.
    static std::unique_ptr<Finder> create(const QIVOlib_find_create_t* settings);

    Finder(std::shared_ptr<Directory> directory, bool showLocalSources);

    /// Waits until the list differs from what this last reported, at most `timeout`. True exactly once for what
    /// changed since; a list that changed and changed back unseen is no change.
    bool wait(std::chrono::milliseconds timeout);

    /// The sources known now, sorted by name. The array and its strings stay until the next call or the finder's end;
    /// null with 0 for none.
    const QIVOlib_source_t* sources(std::uint32_t* count);

    /// Ends a wait that is going on, and every later one.
    void end();

  private:
    struct Entry {
        std::string name;
        std::string url;
        bool operator==(const Entry&) const = default;
    };
    std::vector<Entry> current() const;
    bool report(std::uint64_t generation);

    const std::shared_ptr<Directory> m_directory;
    const bool m_showLocalSources;
    std::atomic<bool> m_ended = false;

    std::mutex m_mutex; // guards all below
    std::vector<Entry> m_reported;
    std::optional<std::uint64_t> m_compared; // the directory's generation when m_reported was last compared with it
    bool m_unreported = false;               // sources() handed out a list that wait() has not reported
    std::vector<Entry> m_entries;
    std::vector<QIVOlib_source_t> m_array; // points into m_entries
};

} // namespace qivo::runtime
