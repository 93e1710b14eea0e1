#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <set>
#include <string>
#include <vector>

#include <avahi-core/core.h>
#include <avahi-core/lookup.h>

#include "runtime/Announcement.h"
#include "runtime/EventLoop.h"
#include "runtime/LocalNetwork.h"
#include "runtime/PacketGuard.h"
#include "runtime/SourceTable.h"

namespace qivo::runtime {

/// Changes within this time are published together.
inline constexpr std::chrono::milliseconds kSettleTime{50};
/// Sources and hosts whose records begin to be watched at once, so that a flood of names can't keep the thread from
/// its other work.
inline constexpr int kLookupsPerTurn = 64;
/// Pause before the network is tried again; doubles up to the second.
inline constexpr std::chrono::milliseconds kFirstRetryPause{250};
inline constexpr std::chrono::milliseconds kLongestRetryPause{8000};

/// Listens to multicast DNS with an embedded stack and keeps the table of sources.
///
/// The stack shares the protocol's port with others on this machine and publishes nothing. Records are watched rather
/// than resolved once: for each source its SRV and TXT record, for each host its addresses, for as long as the source
/// is announced. So an expired record, a goodbye and a changed or returning record are all seen as what they are.
///
/// Thread: run on one, the destructor after it has returned, requestStop from any.
class Browser {
  public:
    /// Called on the browser's thread with the whole list, also when it is the same as before.
    using Publish = std::function<void(std::vector<Announcement>)>;

    explicit Browser(Publish publish);
    Browser(const Browser&) = delete;
    Browser& operator=(const Browser&) = delete;
    ~Browser();

    /// Works until requestStop. While the network cannot be used, it is tried again with growing pauses.
    void run();

    /// Makes run return soon, also if it has not begun.
    void requestStop();

  private:
    using Clock = std::chrono::steady_clock;
    struct RecordBrowserFree {
        void operator()(AvahiSRecordBrowser* browser) const { avahi_s_record_browser_free(browser); }
    };
    using RecordBrowser = std::unique_ptr<AvahiSRecordBrowser, RecordBrowserFree>;
    struct ServerFree {
        void operator()(AvahiServer* server) const { avahi_server_free(server); }
    };

    /// What is watched for one source (key: its folded name) or one host (key: its name, escaped and folded).
    struct Lookups {
        Browser* owner = nullptr;
        std::string key;
        RecordBrowser first;  // SRV or A
        RecordBrowser second; // TXT or AAAA
    };
    using LookupMap = std::map<std::string, std::unique_ptr<Lookups>>;

    void start();
    void stop();
    void fail(const std::string& reason);
    void turn();
    int pause() const;
    void networkChanged();
    void touch();
    void publishIfSettled();

    void openLookups();
    void openService(const std::string& key);
    void openHost(const std::string& key);
    RecordBrowser watch(const std::string& name, std::uint16_t type, AvahiSRecordBrowserCallback callback, void* data);
    void closeService(const std::string& key);
    void setHosts(const std::string& serviceKey, std::vector<std::string> hosts);

    void pointerChanged(int interface, bool added, const AvahiRecord& record);
    void serverChanged(int interface, bool added, const std::string& key, const AvahiRecord& record);
    void textChanged(int interface, bool added, const std::string& key, const AvahiRecord& record);
    void addressChanged(int interface, bool added, const std::string& key, const AvahiRecord& record);

    static void onServer(AvahiServer* server, AvahiServerState state, void* self);
    static void onPointer(AvahiSRecordBrowser*, AvahiIfIndex, AvahiProtocol, AvahiBrowserEvent, AvahiRecord*,
                          AvahiLookupResultFlags, void* self);
    static void onService(AvahiSRecordBrowser*, AvahiIfIndex, AvahiProtocol, AvahiBrowserEvent, AvahiRecord*,
                          AvahiLookupResultFlags, void* lookups);
    static void onAddress(AvahiSRecordBrowser*, AvahiIfIndex, AvahiProtocol, AvahiBrowserEvent, AvahiRecord*,
                          AvahiLookupResultFlags, void* lookups);
    static void onNetwork(AvahiWatch*, int, AvahiWatchEvent, void* self);

    const Publish m_publish;
    std::atomic<bool> m_stop = false;
    EventLoop m_loop;

    // All below: run's thread only.
    LocalNetworkMonitor m_monitor;
    LocalNetwork m_network;
    PacketGuard m_guard;
    SourceTable m_table;
    std::unique_ptr<AvahiServer, ServerFree> m_server;
    RecordBrowser m_pointers; // all lookups go before the server
    LookupMap m_services;
    LookupMap m_hosts;
    std::map<std::string, std::vector<std::string>> m_hostsOfService;
    std::map<std::string, std::set<std::string>> m_servicesOfHost;
    std::set<DomainName> m_hostNames;
    std::set<std::string> m_servicesToOpen;
    std::set<std::string> m_hostsToOpen;
    std::string m_failure; // why the server has to be started anew; empty while it works
    Clock::time_point m_retryAt{};
    std::chrono::milliseconds m_retryPause = kFirstRetryPause;
    Clock::time_point m_publishAt = Clock::time_point::max();
};

} // namespace qivo::runtime
