#pragma once

#include <array>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace qivo::runtime {

/// An IPv4 or IPv6 address in network byte order.
struct IpAddress {
    int version = 4;                      ///< 4 or 6
    std::array<std::uint8_t, 16> bytes{}; ///< the first four for IPv4, the others 0

    static std::optional<IpAddress> parse(const std::string& text);
    std::string text() const;
    bool isLoopback() const;
    bool isLinkLocal() const;
    /// A single machine can have this address: not unspecified, multicast, reserved, broadcast or IPv4 in disguise.
    bool isUnicast() const;

    auto operator<=>(const IpAddress&) const = default;
};

/// This machine's interfaces and addresses at one moment.
struct LocalNetwork {
    struct Address {
        int interface = 0; ///< index
        IpAddress address;
        int prefixBits = 0;
    };
    struct Interface {
        int index = 0;
        std::string name;
        bool loopback = false;
    };

    std::vector<Interface> interfaces;
    std::vector<Address> addresses;

    /// Empty if the system does not tell.
    static LocalNetwork read();

    const Interface* find(int index) const;
    bool has(const IpAddress& address) const;
    /// Whether the address lies in a network that the interface is in.
    bool isOnLink(int interface, const IpAddress& address) const;
    /// Whether it is the broadcast address of a network that the interface is in.
    bool isBroadcast(int interface, const IpAddress& address) const;
};

/// Tells when the addresses or interfaces of this machine change.
class LocalNetworkMonitor {
  public:
    LocalNetworkMonitor();
    LocalNetworkMonitor(const LocalNetworkMonitor&) = delete;
    LocalNetworkMonitor& operator=(const LocalNetworkMonitor&) = delete;
    ~LocalNetworkMonitor();

    /// Readable after a change; below 0 if the system does not tell of changes.
    int descriptor() const { return m_socket; }

    /// Makes the descriptor unreadable again.
    void acknowledge();

  private:
    int m_socket = -1;
};

} // namespace qivo::runtime
