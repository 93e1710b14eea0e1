#include "tools/publish/Announcer.h"

#include "tools/publish/LocalAddresses.h"
#include "tools/publish/Names.h"

#include <algorithm>
#include <array>
#include <avahi-common/address.h>
#include <avahi-common/alternative.h>
#include <avahi-common/domain.h>
#include <avahi-common/error.h>
#include <avahi-common/malloc.h>
#include <avahi-common/thread-watch.h>
#include <avahi-common/timeval.h>
#include <avahi-core/core.h>
#include <avahi-core/log.h>
#include <avahi-core/publish.h>
#include <chrono>
#include <linux/netlink.h>
#include <linux/rtnetlink.h>
#include <optional>
#include <sys/socket.h>
#include <unistd.h>
#include <utility>

namespace qivo {
namespace {

struct FreePoll {
    void operator()(AvahiThreadedPoll* poll) const { avahi_threaded_poll_free(poll); }
};
struct FreeServer {
    void operator()(AvahiServer* server) const { avahi_server_free(server); }
};
struct FreeStrings {
    void operator()(AvahiStringList* strings) const { avahi_string_list_free(strings); }
};
using Strings = std::unique_ptr<AvahiStringList, FreeStrings>;

/// The poll as the stack sees it: its IPv4 sockets leave the group of those that share the port by SO_REUSEPORT. Recent
/// Linux (seen on 6.18) hands a multicast packet that a single socket has joined for to any socket of the same user's
/// group, so that beside a program that listens on fewer interfaces some questions would never be heard. The port stays
/// shared by SO_REUSEADDR.
struct ListeningPoll : AvahiPoll {
    explicit ListeningPoll(const AvahiPoll& poll) : AvahiPoll(poll), original(poll.watch_new) {
        watch_new = leaveGroupAndWatch;
    }

    static AvahiWatch* leaveGroupAndWatch(const AvahiPoll* api, int descriptor, AvahiWatchEvent events,
                                          AvahiWatchCallback callback, void* data) {
        constexpr int off = 0;
        int family = AF_UNSPEC;
        socklen_t length = sizeof(family);
        if (getsockopt(descriptor, SOL_SOCKET, SO_DOMAIN, &family, &length) == 0 && family == AF_INET) {
            setsockopt(descriptor, SOL_SOCKET, SO_REUSEPORT, &off, sizeof(off));
        }
        return static_cast<const ListeningPoll*>(api)->original(api, descriptor, events, callback, data);
    }

    AvahiWatch* (*original)(const AvahiPoll*, int, AvahiWatchEvent, AvahiWatchCallback, void*);
};

constexpr const char* serviceType = "_rtsp._tcp";

// Names that are tried before a source gives up being announced.
constexpr int maximumAttempts = 50;

// Pause before the network is tried again; doubles up to the second.
constexpr std::chrono::milliseconds firstRetryPause{250};
constexpr std::chrono::milliseconds longestRetryPause{8000};

// A name of this process's own for the machine's addresses. Another stack of the same machine, which announces the
// host's name, ends one day and says goodbye to that; these sources must not lose their addresses by it.
std::string hostLabel(std::uint16_t port) {
    std::array<char, 256> name{};
    gethostname(name.data(), name.size() - 1);
    std::string label = name.data();
    label.resize(std::min(label.find('.'), label.size()));
    const std::string end = "-" + std::to_string(port);
    return std::string(cutUtf8(label.empty() ? "qivo" : label, AVAHI_LABEL_MAX - 1 - end.size())) + end;
}

// A descriptor that becomes readable when an interface or one of its addresses comes or goes; -1 if the system has
// none.
int openAddressNews() {
    const int news = socket(AF_NETLINK, SOCK_RAW | SOCK_CLOEXEC | SOCK_NONBLOCK, NETLINK_ROUTE);
    sockaddr_nl groups{};
    groups.nl_family = AF_NETLINK;
    groups.nl_groups = RTMGRP_LINK | RTMGRP_IPV4_IFADDR;
    if (news >= 0 && bind(news, reinterpret_cast<const sockaddr*>(&groups), sizeof groups) != 0) {
        close(news);
        return -1;
    }
    return news;
}

std::string onThisMachine(const std::string& address, const std::string& host) {
    return address.rfind(':', 0) == 0 ? "http://" + host + address : address;
}

bool namesThisMachine(const Announcement& announcement) {
    return announcement.web.rfind(':', 0) == 0 || announcement.onvif.rfind(':', 0) == 0;
}

Strings textRecords(const Announcement& announcement, const std::string& host) {
    Strings strings(avahi_string_list_add_pair(nullptr, "path", announcement.path.c_str()));
    strings.reset(avahi_string_list_add_pair(strings.release(), "low", announcement.low.c_str()));
    for (const auto& [key, value] : {std::pair{"web", &announcement.web}, std::pair{"onvif", &announcement.onvif}}) {
        if (!value->empty()) {
            strings.reset(avahi_string_list_add_pair(strings.release(), key, onThisMachine(*value, host).c_str()));
        }
    }
    return strings;
}

} // namespace

// Everything below runs on the poll's thread, or before it starts or after it has stopped.
class Announcer::Implementation {
  public:
    Implementation(std::vector<Announcement> announcements, std::uint16_t port, bool loopbackOnly, Say say)
        : m_port(port), m_loopbackOnly(loopbackOnly), m_say(std::move(say)) {
        for (Announcement& announcement : announcements) {
            m_entries.push_back(std::make_unique<Entry>(Entry{this, std::move(announcement)}));
        }
    }
    ~Implementation();
    Implementation(const Implementation&) = delete;
    Implementation& operator=(const Implementation&) = delete;

    std::string start();

  private:
    struct Entry {
        Implementation* owner = nullptr;
        Announcement announcement;
        AvahiSEntryGroup* group = nullptr; // the server's
        std::string name{};
        int attempt = 1;
    };

    static void onServer(AvahiServer* server, AvahiServerState state, void* self);
    static void onGroup(AvahiServer* server, AvahiSEntryGroup* group, AvahiEntryGroupState state, void* entry);
    static void onHost(AvahiServer* server, AvahiSEntryGroup* group, AvahiEntryGroupState state, void* self);
    static void onAddressNews(AvahiWatch* watch, int news, AvahiWatchEvent event, void* self);
    static void onRetry(AvahiTimeout* timeout, void* self);
    void open();
    void retryLater(const std::string& reason);
    void watchAddresses();
    [[nodiscard]] std::string host() const;
    void serverChanged(AvahiServer* server, AvahiServerState state);
    void takeNextHostName(AvahiServer* server);
    void announceHost(AvahiServer* server);
    void announceAll(AvahiServer* server);
    void renewTexts(AvahiServer* server);
    void announce(AvahiServer* server, Entry& entry);
    int tryName(AvahiServer* server, Entry& entry);
    bool takeNextName(Entry& entry);
    void failed(const Entry& entry, const char* reason);

    std::uint16_t m_port;
    bool m_loopbackOnly;
    Say m_say;
    std::vector<std::unique_ptr<Entry>> m_entries;
    std::vector<LocalAddress> m_addresses;   // announced for the host
    AvahiSEntryGroup* m_hostGroup = nullptr; // the server's
    int m_addressNews = -1;                  // owned
    AvahiWatch* m_addressWatch = nullptr;    // owned
    AvahiTimeout* m_retry = nullptr;         // owned; set while there is to be another try
    std::chrono::milliseconds m_retryPause = firstRetryPause;
    std::string m_reported; // why the network could not be used, as last told
    std::string m_host;     // in the addresses announced
    std::unique_ptr<AvahiThreadedPoll, FreePoll> m_poll;
    std::optional<ListeningPoll> m_listeningPoll; // the server's view of it
    std::unique_ptr<AvahiServer, FreeServer> m_server;
};

std::string Announcer::Implementation::start() {
    avahi_set_log_function([](AvahiLogLevel, const char*) {}); // what a user needs to know is said by state
    m_poll.reset(avahi_threaded_poll_new());
    if (!m_poll) {
        return "cannot announce on the network: no memory";
    }
    m_listeningPoll.emplace(*avahi_threaded_poll_get(m_poll.get()));
    open();
    watchAddresses();
    if (avahi_threaded_poll_start(m_poll.get()) < 0) {
        return "cannot announce on the network: the system gives no thread";
    }
    return {};
}

void Announcer::Implementation::open() {
    AvahiServerConfig config;
    avahi_server_config_init(&config);
    avahi_free(config.host_name);
    config.host_name = avahi_strdup(hostLabel(m_port).c_str());
    config.use_ipv6 = 0; // the server listens on IPv4
    config.publish_aaaa_on_ipv4 = 0;
    config.publish_hinfo = 0;
    config.publish_workstation = 0;
    config.publish_domain = 0;
    config.publish_addresses = 0; // would also claim the reverse names, which are the machine's own stack's to give
    if (m_loopbackOnly) {
        config.allow_interfaces = avahi_string_list_new("lo", nullptr);
    }
    int error = AVAHI_OK;
    m_server.reset(avahi_server_new(&*m_listeningPoll, &config, onServer, this, &error));
    avahi_server_config_free(&config);
    if (!m_server) {
        retryLater(avahi_strerror(error));
    }
}

// The server cannot be freed in its own callback. A reason is said once, until sources are announced again.
void Announcer::Implementation::retryLater(const std::string& reason) {
    if (std::exchange(m_reported, reason) != reason) {
        m_say("cannot announce on the network: " + reason +
              "; it is tried again, the addresses above are served all the same");
    }
    if (m_retry != nullptr) {
        return;
    }
    timeval when{};
    avahi_elapse_time(&when, static_cast<unsigned>(m_retryPause.count()), 0);
    m_retryPause = std::min(2 * m_retryPause, longestRetryPause);
    const AvahiPoll* poll = avahi_threaded_poll_get(m_poll.get());
    m_retry = poll->timeout_new(poll, &when, onRetry, this);
}

void Announcer::Implementation::onRetry(AvahiTimeout* timeout, void* data) {
    auto& self = *static_cast<Implementation*>(data);
    avahi_threaded_poll_get(self.m_poll.get())->timeout_free(timeout);
    self.m_retry = nullptr;
    self.m_hostGroup = nullptr;
    for (const auto& entry : self.m_entries) {
        entry->group = nullptr;
        entry->attempt = 1;
    }
    self.m_server.reset();
    self.open();
}

// Freeing the server sends the goodbyes of everything that is still registered.
Announcer::Implementation::~Implementation() {
    if (m_poll) {
        avahi_threaded_poll_stop(m_poll.get());
    }
    m_server.reset();
    if (m_retry != nullptr) {
        avahi_threaded_poll_get(m_poll.get())->timeout_free(m_retry);
    }
    if (m_addressWatch != nullptr) {
        avahi_threaded_poll_get(m_poll.get())->watch_free(m_addressWatch);
    }
    if (m_addressNews >= 0) {
        close(m_addressNews);
    }
}

void Announcer::Implementation::watchAddresses() {
    m_addressNews = m_poll && !m_loopbackOnly ? openAddressNews() : -1;
    if (m_addressNews >= 0) {
        const AvahiPoll* poll = avahi_threaded_poll_get(m_poll.get());
        m_addressWatch = poll->watch_new(poll, m_addressNews, AVAHI_WATCH_IN, onAddressNews, this);
    }
}

void Announcer::Implementation::onAddressNews(AvahiWatch*, int news, AvahiWatchEvent, void* data) {
    std::array<char, 4096> ignored{};
    while (recv(news, ignored.data(), ignored.size(), 0) > 0) {
    }
    auto& self = *static_cast<Implementation*>(data);
    AvahiServer* server = self.m_server.get();
    if (server == nullptr || avahi_server_get_state(server) != AVAHI_SERVER_RUNNING) {
        return;
    }
    if (!(localAddresses(self.m_loopbackOnly) == self.m_addresses)) {
        self.announceHost(server);
    }
    // Also without another address: that an interface has come up or gone down decides, too, where others reach this
    // machine.
    self.renewTexts(server);
}

std::string Announcer::Implementation::host() const {
    return m_loopbackOnly ? "127.0.0.1" : reachableAddress();
}

void Announcer::Implementation::onServer(AvahiServer* server, AvahiServerState state, void* self) {
    static_cast<Implementation*>(self)->serverChanged(server, state);
}

void Announcer::Implementation::serverChanged(AvahiServer* server, AvahiServerState state) {
    switch (state) {
    case AVAHI_SERVER_RUNNING:
        m_retryPause = firstRetryPause;
        m_reported.clear();
        announceHost(server);
        announceAll(server);
        break;
    case AVAHI_SERVER_COLLISION:
        takeNextHostName(server);
        break;
    case AVAHI_SERVER_FAILURE:
        retryLater(avahi_strerror(avahi_server_errno(server)));
        break;
    case AVAHI_SERVER_REGISTERING:
    case AVAHI_SERVER_INVALID:
        break;
    }
}

// The server runs anew under the new name, which announces everything again.
void Announcer::Implementation::takeNextHostName(AvahiServer* server) {
    char* other = avahi_alternative_host_name(avahi_server_get_host_name(server));
    avahi_server_set_host_name(server, other);
    avahi_free(other);
}

void Announcer::Implementation::announceHost(AvahiServer* server) {
    if (m_hostGroup == nullptr) {
        m_hostGroup = avahi_s_entry_group_new(server, onHost, this);
    }
    avahi_s_entry_group_reset(m_hostGroup);
    m_addresses = localAddresses(m_loopbackOnly);
    for (const LocalAddress& local : m_addresses) {
        AvahiAddress address{};
        address.proto = AVAHI_PROTO_INET;
        address.data.ipv4.address = local.address.s_addr;
        avahi_server_add_address(server, m_hostGroup, local.interface, AVAHI_PROTO_INET, AVAHI_PUBLISH_NO_REVERSE,
                                 nullptr, &address);
    }
    avahi_s_entry_group_commit(m_hostGroup);
}

void Announcer::Implementation::onHost(AvahiServer* server, AvahiSEntryGroup*, AvahiEntryGroupState state, void* data) {
    if (state == AVAHI_ENTRY_GROUP_COLLISION) {
        static_cast<Implementation*>(data)->takeNextHostName(server);
    }
}

// Also after the host's name has changed: the announcements name the host and are made anew.
void Announcer::Implementation::announceAll(AvahiServer* server) {
    m_host = host();
    for (const auto& entry : m_entries) {
        announce(server, *entry);
    }
}

// In place: the source itself stays, nobody hears a goodbye.
void Announcer::Implementation::renewTexts(AvahiServer* server) {
    if (std::exchange(m_host, host()) == m_host) {
        return;
    }
    for (const auto& entry : m_entries) {
        if (entry->group != nullptr && namesThisMachine(entry->announcement)) {
            const Strings strings = textRecords(entry->announcement, m_host);
            avahi_server_update_service_txt_strlst(server, entry->group, AVAHI_IF_UNSPEC, AVAHI_PROTO_UNSPEC,
                                                   static_cast<AvahiPublishFlags>(0), entry->name.c_str(), serviceType,
                                                   nullptr, strings.get());
        }
    }
}

void Announcer::Implementation::announce(AvahiServer* server, Entry& entry) {
    if (entry.group == nullptr) {
        entry.group = avahi_s_entry_group_new(server, onGroup, &entry);
    }
    if (entry.group == nullptr) {
        failed(entry, avahi_strerror(avahi_server_errno(server)));
        return;
    }
    int result = tryName(server, entry);
    while (result == AVAHI_ERR_COLLISION && takeNextName(entry)) {
        result = tryName(server, entry);
    }
    if (result < 0) {
        failed(entry, avahi_strerror(result));
    }
}

int Announcer::Implementation::tryName(AvahiServer* server, Entry& entry) {
    const Announcement& what = entry.announcement;
    entry.name = entry.attempt == 1 ? instanceName(what.machine, what.source)
                                    : alternativeInstanceName(what.machine, what.source, entry.attempt);
    avahi_s_entry_group_reset(entry.group);
    const Strings strings = textRecords(what, m_host);
    const int result = avahi_server_add_service_strlst(server, entry.group, AVAHI_IF_UNSPEC, AVAHI_PROTO_UNSPEC,
                                                       static_cast<AvahiPublishFlags>(0), entry.name.c_str(),
                                                       serviceType, nullptr, nullptr, m_port, strings.get());
    return result < 0 ? result : avahi_s_entry_group_commit(entry.group);
}

bool Announcer::Implementation::takeNextName(Entry& entry) {
    return ++entry.attempt <= maximumAttempts;
}

void Announcer::Implementation::onGroup(AvahiServer* server, AvahiSEntryGroup* group, AvahiEntryGroupState state,
                                        void* data) {
    auto& entry = *static_cast<Entry*>(data);
    entry.group = group;
    Implementation& self = *entry.owner;
    if (state == AVAHI_ENTRY_GROUP_COLLISION) {
        if (self.takeNextName(entry)) {
            self.announce(server, entry);
        } else {
            self.failed(entry, "its name and all its alternatives are taken");
        }
    } else if (state == AVAHI_ENTRY_GROUP_ESTABLISHED && entry.attempt > 1) {
        const std::string wanted = instanceName(entry.announcement.machine, entry.announcement.source);
        self.m_say("\"" + wanted + "\" is taken by another on the network; announced as \"" + entry.name + "\"");
    } else if (state == AVAHI_ENTRY_GROUP_FAILURE) {
        self.failed(entry, avahi_strerror(avahi_server_errno(server)));
    }
}

void Announcer::Implementation::failed(const Entry& entry, const char* reason) {
    m_say("cannot announce \"" + instanceName(entry.announcement.machine, entry.announcement.source) + "\": " + reason +
          "; it is still served at its address");
}

Announcer::Announcer(std::vector<Announcement> announcements, std::uint16_t port, bool loopbackOnly, Say say)
    : m_implementation(std::make_unique<Implementation>(std::move(announcements), port, loopbackOnly, std::move(say))) {
}

Announcer::~Announcer() = default;

std::string Announcer::start() {
    return m_implementation->start();
}

} // namespace qivo
