#pragma once

#include <chrono>
#include <map>
#include <memory>
#include <mutex>
#include <set>
#include <string>

struct AvahiThreadedPoll;
struct AvahiServer;

namespace qivo::test {

/// What an announcement says.
struct Found {
    std::map<std::string, std::string> text; ///< TXT keys and values
    std::string host;
    std::string address;
    int port = 0;
};

/// Sees what is announced as `_rtsp._tcp`, with a multicast DNS stack of its own.
class Browser {
  public:
    Browser();
    ~Browser();
    Browser(const Browser&) = delete;
    Browser& operator=(const Browser&) = delete;

    /// Waits until a name is announced and resolved.
    bool waitFor(const std::string& name, std::chrono::milliseconds deadline = std::chrono::seconds(15)) const;
    /// Waits until a name is gone.
    bool waitForGone(const std::string& name, std::chrono::milliseconds deadline) const;
    [[nodiscard]] std::map<std::string, Found> found() const;

    /// Announces a service of its own, as another machine would.
    void announce(const std::string& name, int port);

    /// Waits until the host of an announced name has this IPv4 address.
    bool waitForAddress(const std::string& name, const std::string& address,
                        std::chrono::milliseconds deadline = std::chrono::seconds(15));

    struct Callbacks;

  private:
    AvahiThreadedPoll* m_poll = nullptr;
    AvahiServer* m_server = nullptr;
    mutable std::mutex m_mutex;
    std::map<std::string, Found> m_found; // under m_mutex
    std::set<std::string> m_addresses;    // under m_mutex; of the host asked about
};

} // namespace qivo::test
