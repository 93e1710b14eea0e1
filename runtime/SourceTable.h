#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <variant>
#include <vector>

#include "runtime/Announcement.h"
#include "runtime/LocalNetwork.h"

namespace qivo::runtime {

/// Most sources that are kept; further ones are skipped until one goes.
inline constexpr std::size_t kMaxSources = 4096;
/// Most records of a kind that are kept for one source or host. Honest ones have one SRV and one TXT record on each
/// interface.
inline constexpr std::size_t kMaxRecords = 32;

/// Where a source is to be reached, as its SRV record says.
struct ServiceServer {
    std::string host; ///< in lower case
    std::uint16_t port = 0;
    std::uint16_t priority = 0; ///< the lowest counts

    bool operator==(const ServiceServer&) const = default;
};

/// The records that were heard, and what they say together.
///
/// A source is listed while one interface has all of its records: PTR, SRV, TXT and an address that makes sense there.
/// Records may contradict each other, and a host may have many addresses; the choice is the same for the same records
/// whatever their order across interfaces, and what was chosen stays for as long as nothing better in kind is there:
/// routable IPv4, then other IPv4, IPv6, link-local IPv6 (with its zone as "%25zone") and loopback last. Within a kind,
/// addresses in a network of the interface come first, and the newest record of an interface replaces older ones.
///
/// Thread: one at a time. Records are counted, since the same may be heard over IPv4 and IPv6.
class SourceTable {
  public:
    /// The name is valid. False if the table is full.
    bool addService(int interface, const std::string& name);
    void removeService(int interface, const std::string& name);

    /// Whether the service is heard on any interface. The key of a service is its folded name.
    bool hasService(const std::string& key) const;
    std::size_t size() const { return m_services.size(); }

    void addServer(int interface, const std::string& key, const ServiceServer& server);
    void removeServer(int interface, const std::string& key, const ServiceServer& server);
    void addText(int interface, const std::string& key, const ServiceText& text);
    void removeText(int interface, const std::string& key, const ServiceText& text);
    /// The hosts that the service's servers name.
    std::vector<std::string> hostsOf(const std::string& key) const;

    void addAddress(int interface, const std::string& host, const IpAddress& address);
    void removeAddress(int interface, const std::string& host, const IpAddress& address);
    void forgetHost(const std::string& host);

    void clear();

    /// The sources that are complete, sorted by the bytes of their names. Remembers the choices.
    std::vector<Announcement> announcements(const LocalNetwork& network);

  private:
    /// A record and where it was heard.
    template <typename T>
    struct Heard {
        int interface = 0;
        T value{};
        int count = 0;             // of the address families it was heard over
        std::uint64_t arrival = 0; // order of first hearing
    };
    template <typename T>
    using Records = std::vector<Heard<T>>;

    struct Choice {
        int interface = 0;
        IpAddress address;
        int rank = 0; // kind of address, the lowest is the best
        std::uint16_t priority = 0;
        std::uint16_t port = 0;
        std::uint64_t serverArrival = 0;
        std::uint64_t addressArrival = 0;
        const ServiceText* text = nullptr;
    };
    struct Service {
        std::string name; // as first heard
        Records<std::monostate> pointers;
        Records<ServiceServer> servers;
        Records<ServiceText> texts;
        int lastInterface = 0;
    };

    template <typename T>
    void add(Records<T>& records, int interface, const T& value);
    template <typename T>
    static void remove(Records<T>& records, int interface, const T& value);
    template <typename T>
    static const Heard<T>* newest(const Records<T>& records, int interface);

    std::optional<Choice> choose(const Service& service, const LocalNetwork& network) const;
    std::optional<Choice> chooseOn(int interface, const Service& service, const LocalNetwork& network) const;
    static std::optional<int> rank(int interface, const IpAddress& address, const LocalNetwork& network);
    static Announcement announce(const std::string& name, const Choice& choice, const LocalNetwork& network);

    std::map<std::string, Service, std::less<>> m_services;
    std::map<std::string, Records<IpAddress>, std::less<>> m_hosts;
    std::uint64_t m_arrivals = 0;
};

} // namespace qivo::runtime
