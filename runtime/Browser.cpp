#include "runtime/Browser.h"

#include <algorithm>
#include <array>
#include <cstring>
#include <sys/socket.h>
#include <utility>

#include <avahi-common/domain.h>
#include <avahi-common/error.h>
#include <avahi-common/malloc.h>
#include <avahi-core/log.h>

#include "runtime/LogOnce.h"

namespace qivo::runtime {
namespace {

constexpr const char* kServiceType = "_rtsp._tcp";
constexpr const char* kDomain = "local";
/// The stack's cache, per interface and address family: room for every record of every source, and for others.
constexpr unsigned kCacheEntries = kMaxSources * 8;

void logStack(AvahiLogLevel level, const char* text) {
    // It warns of every other stack on this machine, yet sharing the port with them is intended.
    const bool sharing = std::string_view(text).find("mDNS stack running on this host") != std::string_view::npos;
    if (level <= AVAHI_LOG_WARN && !sharing) {
        logOnce("multicast DNS: " + std::string(text));
    }
}

struct ServerConfig : AvahiServerConfig {
    ServerConfig() : AvahiServerConfig{} {
        avahi_server_config_init(this);
        avahi_free(host_name);
        host_name = avahi_strdup("qivo"); // never published; the machine's own name may be one the stack can't take
        disable_publishing = 1;
        publish_addresses = publish_hinfo = publish_workstation = publish_domain = 0;
        enable_wide_area = 0;
        allow_point_to_point = 1;
        n_cache_entries_max = kCacheEntries;
    }
    ServerConfig(const ServerConfig&) = delete;
    ServerConfig& operator=(const ServerConfig&) = delete;
    ~ServerConfig() { avahi_server_config_free(this); }
};

int familyOf(int descriptor) {
    sockaddr_storage address{};
    socklen_t size = sizeof address;
    return getsockname(descriptor, reinterpret_cast<sockaddr*>(&address), &size) == 0 ? address.ss_family : AF_UNSPEC;
}

bool isInternetSocket(int descriptor) {
    const int family = familyOf(descriptor);
    return family == AF_INET || family == AF_INET6;
}

/// Sockets of one user that share a port by SO_REUSEPORT form a group. Recent Linux (seen on 6.18) hands an IPv4
/// multicast packet that a single socket has joined for to any socket of the group, chosen by the sender's address. So
/// beside a program that listens on fewer interfaces than we do, some machines would never be heard. Without the
/// option our socket gets what is meant for it; the port stays shared by SO_REUSEADDR.
void leaveReusePortGroup(int descriptor) {
    constexpr int kOff = 0;
    if (familyOf(descriptor) == AF_INET) {
        setsockopt(descriptor, SOL_SOCKET, SO_REUSEPORT, &kOff, sizeof kOff);
    }
}

bool isChange(AvahiBrowserEvent event) {
    return event == AVAHI_BROWSER_NEW || event == AVAHI_BROWSER_REMOVE;
}

/// The stack keeps the strings last first.
std::vector<std::string> stringsOf(const AvahiStringList* list) {
    std::vector<std::string> strings;
    for (; list != nullptr; list = list->next) {
        strings.emplace_back(reinterpret_cast<const char*>(list->text), list->size);
    }
    std::reverse(strings.begin(), strings.end());
    return strings;
}

IpAddress addressOf(const AvahiRecord& record) {
    IpAddress address;
    if (record.key->type == AVAHI_DNS_TYPE_A) {
        std::memcpy(address.bytes.data(), &record.data.a.address, sizeof record.data.a.address);
    } else {
        address.version = 6;
        std::memcpy(address.bytes.data(), &record.data.aaaa.address, sizeof record.data.aaaa.address);
    }
    return address;
}

bool isHostName(const std::optional<DomainName>& name) {
    return name &&
           std::all_of(name->begin(), name->end(), [](const std::string& label) { return isSourceName(label); });
}

} // namespace

Browser::Browser(Publish publish)
    : m_publish(std::move(publish)),
      m_guard(
          {[this](const std::string& instance) { return m_table.size() < kMaxSources || m_table.hasService(instance); },
           [this](const DomainName& host) { return m_hostNames.count(host) > 0; }}) {
    m_loop.setOpened(leaveReusePortGroup);
    m_loop.setGate([this](int descriptor) { return !isInternetSocket(descriptor) || m_guard.clear(descriptor); });
    if (m_monitor.descriptor() >= 0) {
        m_loop.api()->watch_new(m_loop.api(), m_monitor.descriptor(), AVAHI_WATCH_IN, onNetwork, this);
    }
}

Browser::~Browser() {
    stop();
}

void Browser::requestStop() {
    m_stop = true;
    m_loop.wake();
}

void Browser::run() {
    m_network = LocalNetwork::read();
    while (!m_stop) {
        turn();
    }
    stop();
}

void Browser::turn() {
    if (!m_server && Clock::now() >= m_retryAt) {
        start();
    }
    m_loop.turn(pause());
    if (!m_failure.empty()) {
        fail(m_failure);
    }
    openLookups();
    publishIfSettled();
}

int Browser::pause() const {
    if (!m_servicesToOpen.empty() || !m_hostsToOpen.empty()) {
        return 0;
    }
    const auto deadline = std::min(m_publishAt, m_server ? Clock::time_point::max() : m_retryAt);
    if (deadline == Clock::time_point::max()) {
        return -1;
    }
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(deadline - Clock::now());
    return static_cast<int>(std::max<std::chrono::milliseconds::rep>(0, left.count()));
}

void Browser::start() {
    avahi_set_log_function(logStack);
    const ServerConfig config;
    int error = AVAHI_OK;
    m_failure.clear();
    m_server.reset(avahi_server_new(m_loop.api(), &config, onServer, this, &error));
    if (!m_server) {
        fail(avahi_strerror(error));
        return;
    }
    m_pointers = watch(std::string(kServiceType) + "." + kDomain, AVAHI_DNS_TYPE_PTR, onPointer, this);
    if (!m_pointers) {
        fail(avahi_strerror(avahi_server_errno(m_server.get())));
        return;
    }
    m_retryPause = kFirstRetryPause;
}

void Browser::stop() {
    m_services.clear();
    m_hosts.clear();
    m_pointers.reset();
    m_server.reset();
    m_hostsOfService.clear();
    m_servicesOfHost.clear();
    m_hostNames.clear();
    m_servicesToOpen.clear();
    m_hostsToOpen.clear();
    m_table.clear();
}

void Browser::fail(const std::string& reason) {
    logOnce("the network cannot be searched for sources, trying again: " + reason);
    stop();
    touch();
    m_failure.clear();
    m_retryAt = Clock::now() + m_retryPause;
    m_retryPause = std::min(2 * m_retryPause, kLongestRetryPause);
}

void Browser::networkChanged() {
    m_monitor.acknowledge();
    m_network = LocalNetwork::read();
    touch();
}

void Browser::touch() {
    if (m_publishAt == Clock::time_point::max()) {
        m_publishAt = Clock::now() + kSettleTime;
    }
}

void Browser::publishIfSettled() {
    if (Clock::now() >= m_publishAt) {
        m_publishAt = Clock::time_point::max();
        m_publish(m_table.announcements(m_network));
    }
}

void Browser::openLookups() {
    for (int i = 0; i < kLookupsPerTurn && !m_servicesToOpen.empty(); ++i) {
        openService(m_servicesToOpen.extract(m_servicesToOpen.begin()).value());
    }
    for (int i = 0; i < kLookupsPerTurn && !m_hostsToOpen.empty(); ++i) {
        openHost(m_hostsToOpen.extract(m_hostsToOpen.begin()).value());
    }
}

void Browser::openService(const std::string& key) {
    std::array<char, AVAHI_DOMAIN_NAME_MAX> name{};
    if (m_services.count(key) > 0 || !m_table.hasService(key) ||
        avahi_service_name_join(name.data(), name.size(), key.c_str(), kServiceType, kDomain) != AVAHI_OK) {
        return;
    }
    auto& lookups = m_services[key];
    lookups = std::make_unique<Lookups>();
    lookups->owner = this;
    lookups->key = key;
    lookups->first = watch(name.data(), AVAHI_DNS_TYPE_SRV, onService, lookups.get());
    lookups->second = watch(name.data(), AVAHI_DNS_TYPE_TXT, onService, lookups.get());
}

void Browser::openHost(const std::string& key) {
    if (m_hosts.count(key) > 0 || m_servicesOfHost.count(key) == 0) {
        return;
    }
    auto& lookups = m_hosts[key];
    lookups = std::make_unique<Lookups>();
    lookups->owner = this;
    lookups->key = key;
    lookups->first = watch(key, AVAHI_DNS_TYPE_A, onAddress, lookups.get());
    lookups->second = watch(key, AVAHI_DNS_TYPE_AAAA, onAddress, lookups.get());
}

Browser::RecordBrowser Browser::watch(const std::string& name, std::uint16_t type, AvahiSRecordBrowserCallback callback,
                                      void* data) {
    AvahiKey* key = avahi_key_new(name.c_str(), AVAHI_DNS_CLASS_IN, type);
    if (key == nullptr) {
        logOnce("skipping a name that cannot be looked up: " + name);
        return nullptr;
    }
    RecordBrowser browser(avahi_s_record_browser_new(m_server.get(), AVAHI_IF_UNSPEC, AVAHI_PROTO_UNSPEC, key,
                                                     AVAHI_LOOKUP_USE_MULTICAST, callback, data));
    avahi_key_unref(key);
    return browser;
}

void Browser::closeService(const std::string& key) {
    m_services.erase(key);
    m_servicesToOpen.erase(key);
    setHosts(key, {});
}

void Browser::setHosts(const std::string& serviceKey, std::vector<std::string> hosts) {
    for (const auto& host : hosts) {
        if (m_servicesOfHost[host].insert(serviceKey).second && m_hosts.count(host) == 0) {
            m_hostNames.insert(*parseEscapedName(host));
            m_hostsToOpen.insert(host);
        }
    }
    auto& before = m_hostsOfService[serviceKey];
    for (const auto& host : before) {
        if (std::find(hosts.begin(), hosts.end(), host) != hosts.end()) {
            continue;
        }
        auto& users = m_servicesOfHost[host];
        users.erase(serviceKey);
        if (users.empty()) {
            m_servicesOfHost.erase(host);
            m_hostNames.erase(*parseEscapedName(host));
            m_hostsToOpen.erase(host);
            m_hosts.erase(host);
            m_table.forgetHost(host);
        }
    }
    before = std::move(hosts);
    if (before.empty()) {
        m_hostsOfService.erase(serviceKey);
    }
}

void Browser::pointerChanged(int interface, bool added, const AvahiRecord& record) {
    const auto name = parseEscapedName(record.data.ptr.name);
    const auto instance = name ? instanceOf(*name) : std::nullopt;
    if (!instance || !isSourceName(*instance)) {
        logOnce(std::string("skipping a source with an unusable name: ") + record.data.ptr.name);
        return;
    }
    const std::string key = foldCase(*instance);
    if (!added) {
        m_table.removeService(interface, *instance);
        if (!m_table.hasService(key)) {
            closeService(key);
        }
    } else if (!m_table.addService(interface, *instance)) {
        logOnce("skipping sources beyond " + std::to_string(kMaxSources));
    } else if (m_services.count(key) == 0) {
        m_servicesToOpen.insert(key);
    }
    touch();
}

void Browser::serverChanged(int interface, bool added, const std::string& key, const AvahiRecord& record) {
    const auto& srv = record.data.srv;
    if (!isHostName(parseEscapedName(srv.name)) || srv.port == 0) {
        logOnce("skipping an unusable address of " + std::string(record.key->name) + ": " + srv.name + ":" +
                std::to_string(srv.port));
        return;
    }
    const ServiceServer server{foldCase(srv.name), srv.port, srv.priority};
    if (added) {
        m_table.addServer(interface, key, server);
    } else {
        m_table.removeServer(interface, key, server);
    }
    setHosts(key, m_table.hostsOf(key));
    touch();
}

void Browser::textChanged(int interface, bool added, const std::string& key, const AvahiRecord& record) {
    const auto text = parseServiceText(stringsOf(record.data.txt.string_list));
    if (!text) {
        logOnce("skipping an oversized description of " + std::string(record.key->name));
        return;
    }
    if (added) {
        m_table.addText(interface, key, *text);
    } else {
        m_table.removeText(interface, key, *text);
    }
    touch();
}

void Browser::addressChanged(int interface, bool added, const std::string& key, const AvahiRecord& record) {
    if (added) {
        m_table.addAddress(interface, key, addressOf(record));
    } else {
        m_table.removeAddress(interface, key, addressOf(record));
    }
    touch();
}

void Browser::onServer(AvahiServer* server, AvahiServerState state, void* self) {
    if (state == AVAHI_SERVER_FAILURE) {
        static_cast<Browser*>(self)->m_failure = avahi_strerror(avahi_server_errno(server));
    }
}

void Browser::onPointer(AvahiSRecordBrowser* /*browser*/, AvahiIfIndex interface, AvahiProtocol /*protocol*/,
                        AvahiBrowserEvent event, AvahiRecord* record, AvahiLookupResultFlags /*flags*/, void* self) {
    auto& browser = *static_cast<Browser*>(self);
    if (isChange(event)) {
        browser.pointerChanged(interface, event == AVAHI_BROWSER_NEW, *record);
    } else if (event == AVAHI_BROWSER_FAILURE) {
        browser.m_failure = "the query for sources failed";
    }
}

void Browser::onService(AvahiSRecordBrowser* /*browser*/, AvahiIfIndex interface, AvahiProtocol /*protocol*/,
                        AvahiBrowserEvent event, AvahiRecord* record, AvahiLookupResultFlags /*flags*/, void* lookups) {
    const auto& of = *static_cast<Lookups*>(lookups);
    if (!isChange(event)) {
        return;
    }
    if (record->key->type == AVAHI_DNS_TYPE_SRV) {
        of.owner->serverChanged(interface, event == AVAHI_BROWSER_NEW, of.key, *record);
    } else {
        of.owner->textChanged(interface, event == AVAHI_BROWSER_NEW, of.key, *record);
    }
}

void Browser::onAddress(AvahiSRecordBrowser* /*browser*/, AvahiIfIndex interface, AvahiProtocol /*protocol*/,
                        AvahiBrowserEvent event, AvahiRecord* record, AvahiLookupResultFlags /*flags*/, void* lookups) {
    const auto& of = *static_cast<Lookups*>(lookups);
    if (isChange(event)) {
        of.owner->addressChanged(interface, event == AVAHI_BROWSER_NEW, of.key, *record);
    }
}

void Browser::onNetwork(AvahiWatch* /*watch*/, int /*descriptor*/, AvahiWatchEvent /*events*/, void* self) {
    static_cast<Browser*>(self)->networkChanged();
}

} // namespace qivo::runtime
