#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string_view>
#include <vector>

#include "runtime/Announcement.h"

namespace qivo::runtime {

/// The one view of the network that all finders and receivers of the process share.
///
/// Thread: any, for every member. Nothing here waits for the network but `waitForChange`.
class Directory {
    struct Private {}; // lets only acquire() construct

  public:
    class Subscription;

    /// The shared directory. The first reference starts looking, the last one ends it; it may be dropped on any
    /// thread, the directory's own included. While the network is away the list is empty and the directory keeps
    /// trying. Null if this machine has no internet sockets at all.
    static std::shared_ptr<Directory> acquire();

    explicit Directory(Private);
    Directory(const Directory&) = delete;
    Directory& operator=(const Directory&) = delete;
    ~Directory();

    /// Everything announced now, sorted by the bytes of the names, each name once.
    std::vector<Announcement> announcements() const;

    /// The source of that name, compared as it stands.
    std::optional<Announcement> findByName(std::string_view name) const;

    /// The source whose `url` or `lowUrl` this is; the first by name if several share it.
    std::optional<Announcement> findByUrl(std::string_view url) const;

    /// Grows with every change of any announcement.
    std::uint64_t generation() const;

    /// Waits until `generation()` differs from `seen`, at most `timeout`. True if it does.
    bool waitForChange(std::uint64_t seen, std::chrono::milliseconds timeout) const;

    /// The same, which also ends, with false, when `ended` has been set and `wakeWaits` was called since.
    bool waitForChange(std::uint64_t seen, std::chrono::milliseconds timeout, const std::atomic<bool>& ended) const;

    /// Makes every wait look whether it has ended.
    void wakeWaits() const;

    /// Has `changed` called after every change, on the directory's thread and without its lock, for as long as the
    /// subscription lives. It must not block. Ending the subscription waits for a call of it that is running, except
    /// from inside that call.
    [[nodiscard]] Subscription subscribe(std::function<void()> changed);

  private:
    struct Core;
    std::shared_ptr<Core> m_core;
};

/// Keeps a callback subscribed. Moving hands the subscription over; an empty one does nothing. It may outlive the
/// directory.
class Directory::Subscription {
  public:
    Subscription() = default;
    Subscription(Subscription&& other) noexcept;
    Subscription& operator=(Subscription&& other) noexcept;
    ~Subscription();

    /// Ends it now.
    void reset();

  private:
    friend class Directory;
    Subscription(std::weak_ptr<Core> core, std::uint64_t id);

    std::weak_ptr<Core> m_core;
    std::uint64_t m_id = 0;
};

} // namespace qivo::runtime
