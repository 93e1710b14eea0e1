#include "runtime/Directory.h"

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <condition_variable>
#include <map>
#include <mutex>
#include <sys/socket.h>
#include <system_error>
#include <thread>
#include <unistd.h>
#include <utility>

#include "runtime/Browser.h"
#include "runtime/Log.h"

namespace qivo::runtime {

namespace {

/// Everything short of this may pass: no interface, no address, a port that another holds alone.
bool hasInternetSockets() {
    for (const int family : {AF_INET, AF_INET6}) {
        const int descriptor = socket(family, SOCK_DGRAM | SOCK_CLOEXEC, 0);
        if (descriptor >= 0) {
            close(descriptor);
            return true;
        }
        if (errno != EAFNOSUPPORT && errno != EPROTONOSUPPORT) {
            return true;
        }
    }
    return false;
}

} // namespace

struct Directory::Core {
    struct Subscriber {
        std::function<void()> changed;
        std::mutex running; // held while `changed` runs
        std::atomic<bool> ended = false;
    };

    Core();
    /// Looks for sources until told to end.
    static void run(const std::shared_ptr<Core>& core);
    /// Directory's thread. The list is sorted by name.
    void publish(std::vector<Announcement> announcements);

    mutable std::mutex mutex; // guards all below
    mutable std::condition_variable changed;
    std::vector<Announcement> announcements;
    std::uint64_t generation = 0;
    std::uint64_t nextSubscriber = 1;
    std::map<std::uint64_t, std::shared_ptr<Subscriber>> subscribers;
    std::thread::id caller; // the thread that calls subscribers

    Browser browser;    // runs on `thread`
    std::thread thread; // the directory's alone
};

Directory::Core::Core() : browser([this](std::vector<Announcement> list) { publish(std::move(list)); }) {}

void Directory::Core::run(const std::shared_ptr<Core>& core) {
    core->browser.run();
}

void Directory::Core::publish(std::vector<Announcement> list) {
    std::vector<std::shared_ptr<Subscriber>> toCall;
    {
        const std::lock_guard lock(mutex);
        if (list == announcements) {
            return;
        }
        announcements = std::move(list);
        ++generation;
        caller = std::this_thread::get_id();
        for (const auto& [id, subscriber] : subscribers) {
            toCall.push_back(subscriber);
        }
    }
    changed.notify_all();
    for (const auto& subscriber : toCall) {
        const std::lock_guard running(subscriber->running);
        if (!subscriber->ended) {
            subscriber->changed();
        }
    }
}

std::shared_ptr<Directory> Directory::acquire() {
    static std::mutex mutex;
    static std::weak_ptr<Directory> shared;
    const std::lock_guard lock(mutex);
    auto directory = shared.lock();
    if (!directory && hasInternetSockets()) {
        try {
            directory = std::make_shared<Directory>(Private{});
        } catch (const std::system_error& error) {
            log(std::string("no thread to look for sources: ") + error.what());
        }
        shared = directory;
    }
    return directory;
}

Directory::Directory(Private) : m_core(std::make_shared<Core>()) {
    // The thread shares the core, so that it can outlast a directory that is dropped in one of its own callbacks.
    m_core->thread = std::thread([core = m_core] { Core::run(core); });
}

Directory::~Directory() {
    m_core->browser.requestStop();
    if (m_core->thread.get_id() == std::this_thread::get_id()) {
        m_core->thread.detach();
    } else {
        m_core->thread.join();
    }
}

std::vector<Announcement> Directory::announcements() const {
    const std::lock_guard lock(m_core->mutex);
    return m_core->announcements;
}

std::optional<Announcement> Directory::findByName(std::string_view name) const {
    const std::lock_guard lock(m_core->mutex);
    const auto& list = m_core->announcements;
    const auto found = std::lower_bound(list.begin(), list.end(), name,
                                        [](const Announcement& a, std::string_view n) { return a.name < n; });
    return found != list.end() && found->name == name ? std::optional(*found) : std::nullopt;
}

std::optional<Announcement> Directory::findByUrl(std::string_view url) const {
    const std::lock_guard lock(m_core->mutex);
    const auto& list = m_core->announcements;
    const auto found = std::find_if(list.begin(), list.end(),
                                    [url](const Announcement& a) { return a.url == url || a.lowUrl == url; });
    return found != list.end() && !url.empty() ? std::optional(*found) : std::nullopt;
}

std::uint64_t Directory::generation() const {
    const std::lock_guard lock(m_core->mutex);
    return m_core->generation;
}

bool Directory::waitForChange(std::uint64_t seen, std::chrono::milliseconds timeout) const {
    return waitForChange(seen, timeout, false);
}

void Directory::wakeWaits() const {
    // Whoever has looked and not yet begun to wait holds the lock.
    { const std::lock_guard lock(m_core->mutex); }
    m_core->changed.notify_all();
}

bool Directory::waitForChange(std::uint64_t seen, std::chrono::milliseconds timeout,
                              const std::atomic<bool>& ended) const {
    std::unique_lock lock(m_core->mutex);
    const auto differs = [&] { return m_core->generation != seen || ended; };
    // Bounded, because a time-out near the clock's end would overflow inside the wait.
    const auto bounded = std::min<std::chrono::milliseconds>(timeout, std::chrono::hours(24 * 365));
    return m_core->changed.wait_until(lock, std::chrono::steady_clock::now() + bounded, differs) &&
           m_core->generation != seen;
}

Directory::Subscription Directory::subscribe(std::function<void()> changed) {
    auto subscriber = std::make_shared<Core::Subscriber>();
    subscriber->changed = std::move(changed);
    const std::lock_guard lock(m_core->mutex);
    const auto id = m_core->nextSubscriber++;
    m_core->subscribers.emplace(id, std::move(subscriber));
    return {m_core, id};
}

Directory::Subscription::Subscription(std::weak_ptr<Core> core, std::uint64_t id) : m_core(std::move(core)), m_id(id) {}

Directory::Subscription::Subscription(Subscription&& other) noexcept
    : m_core(std::move(other.m_core)), m_id(std::exchange(other.m_id, 0)) {}

Directory::Subscription& Directory::Subscription::operator=(Subscription&& other) noexcept {
    if (this != &other) {
        reset();
        m_core = std::move(other.m_core);
        m_id = std::exchange(other.m_id, 0);
    }
    return *this;
}

Directory::Subscription::~Subscription() {
    reset();
}

void Directory::Subscription::reset() {
    const auto core = std::exchange(m_core, {}).lock();
    const auto id = std::exchange(m_id, 0);
    if (!core || id == 0) {
        return;
    }
    std::shared_ptr<Core::Subscriber> subscriber;
    bool onCaller = false;
    {
        const std::lock_guard lock(core->mutex);
        const auto found = core->subscribers.find(id);
        if (found == core->subscribers.end()) {
            return;
        }
        subscriber = std::move(found->second);
        core->subscribers.erase(found);
        onCaller = core->caller == std::this_thread::get_id();
    }
    subscriber->ended = true;
    if (!onCaller) {
        const std::lock_guard running(subscriber->running);
    }
}

} // namespace qivo::runtime
