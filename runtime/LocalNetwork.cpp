#include "runtime/LocalNetwork.h"

#include <algorithm>
#include <arpa/inet.h>
#include <bit>
#include <cstring>
#include <ifaddrs.h>
#include <linux/netlink.h>
#include <linux/rtnetlink.h>
#include <memory>
#include <net/if.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

namespace qivo::runtime {
namespace {

std::optional<IpAddress> fromSocketAddress(const sockaddr* from) {
    IpAddress address;
    if (from != nullptr && from->sa_family == AF_INET) {
        sockaddr_in v4{};
        std::memcpy(&v4, from, sizeof v4);
        std::memcpy(address.bytes.data(), &v4.sin_addr, sizeof v4.sin_addr);
        return address;
    }
    if (from != nullptr && from->sa_family == AF_INET6) {
        sockaddr_in6 v6{};
        std::memcpy(&v6, from, sizeof v6);
        address.version = 6;
        std::memcpy(address.bytes.data(), &v6.sin6_addr, sizeof v6.sin6_addr);
        return address;
    }
    return std::nullopt;
}

int bitsOf(const std::optional<IpAddress>& mask) {
    int bits = 0;
    for (const auto byte : mask ? mask->bytes : std::array<std::uint8_t, 16>{}) {
        bits += std::popcount(byte);
    }
    return bits;
}

bool bitAt(const IpAddress& address, int bit) {
    return ((address.bytes.at(static_cast<std::size_t>(bit) / 8) >> (7 - bit % 8)) & 1U) != 0;
}

bool samePrefix(const IpAddress& a, const IpAddress& b, int bits) {
    for (int bit = 0; bit < bits; ++bit) {
        if (bitAt(a, bit) != bitAt(b, bit)) {
            return false;
        }
    }
    return a.version == b.version;
}

} // namespace

std::optional<IpAddress> IpAddress::parse(const std::string& text) {
    IpAddress address;
    if (inet_pton(AF_INET, text.c_str(), address.bytes.data()) == 1) {
        return address;
    }
    address.version = 6;
    return inet_pton(AF_INET6, text.c_str(), address.bytes.data()) == 1 ? std::optional(address) : std::nullopt;
}

std::string IpAddress::text() const {
    std::array<char, INET6_ADDRSTRLEN> buffer{};
    inet_ntop(version == 4 ? AF_INET : AF_INET6, bytes.data(), buffer.data(), buffer.size());
    return buffer.data();
}

bool IpAddress::isLoopback() const {
    if (version == 4) {
        return bytes[0] == 127;
    }
    return std::all_of(bytes.begin(), bytes.end() - 1, [](auto byte) { return byte == 0; }) && bytes[15] == 1;
}

bool IpAddress::isLinkLocal() const {
    return version == 4 ? bytes[0] == 169 && bytes[1] == 254 : bytes[0] == 0xfe && (bytes[1] & 0xc0U) == 0x80;
}

bool IpAddress::isUnicast() const {
    if (version == 4) {
        return bytes[0] != 0 && bytes[0] < 224;
    }
    // The first 80 bits being zero covers the unspecified address and every form that wraps an IPv4 address.
    const bool wrapped = std::all_of(bytes.begin(), bytes.begin() + 10, [](auto byte) { return byte == 0; });
    return bytes[0] != 0xff && (!wrapped || isLoopback());
}

LocalNetwork LocalNetwork::read() {
    LocalNetwork network;
    ifaddrs* list = nullptr;
    if (getifaddrs(&list) != 0) {
        return network;
    }
    const std::unique_ptr<ifaddrs, decltype(&freeifaddrs)> owner(list, freeifaddrs);
    for (const ifaddrs* entry = list; entry != nullptr; entry = entry->ifa_next) {
        const int index = static_cast<int>(if_nametoindex(entry->ifa_name));
        if (index > 0 && network.find(index) == nullptr) {
            network.interfaces.push_back({index, entry->ifa_name, (entry->ifa_flags & IFF_LOOPBACK) != 0});
        }
        if (const auto address = fromSocketAddress(entry->ifa_addr)) {
            network.addresses.push_back({index, *address, bitsOf(fromSocketAddress(entry->ifa_netmask))});
        }
    }
    return network;
}

const LocalNetwork::Interface* LocalNetwork::find(int index) const {
    const auto found =
        std::find_if(interfaces.begin(), interfaces.end(), [index](const Interface& i) { return i.index == index; });
    return found != interfaces.end() ? &*found : nullptr;
}

bool LocalNetwork::has(const IpAddress& address) const {
    return std::any_of(addresses.begin(), addresses.end(), [&](const Address& a) { return a.address == address; });
}

bool LocalNetwork::isOnLink(int interface, const IpAddress& address) const {
    return std::any_of(addresses.begin(), addresses.end(), [&](const Address& a) {
        return a.interface == interface && samePrefix(a.address, address, a.prefixBits);
    });
}

bool LocalNetwork::isBroadcast(int interface, const IpAddress& address) const {
    const auto allOnesAfter = [&](int bits) {
        for (int bit = bits; bit < 32; ++bit) {
            if (!bitAt(address, bit)) {
                return false;
            }
        }
        return true;
    };
    // Networks of one or two addresses have no broadcast address.
    return address.version == 4 && std::any_of(addresses.begin(), addresses.end(), [&](const Address& a) {
               return a.interface == interface && a.prefixBits < 31 && samePrefix(a.address, address, a.prefixBits) &&
                      allOnesAfter(a.prefixBits);
           });
}

LocalNetworkMonitor::LocalNetworkMonitor()
    : m_socket(socket(AF_NETLINK, SOCK_RAW | SOCK_CLOEXEC | SOCK_NONBLOCK, NETLINK_ROUTE)) {
    sockaddr_nl address{};
    address.nl_family = AF_NETLINK;
    address.nl_groups = RTMGRP_LINK | RTMGRP_IPV4_IFADDR | RTMGRP_IPV6_IFADDR;
    if (m_socket >= 0 && bind(m_socket, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) {
        close(m_socket);
        m_socket = -1;
    }
}

LocalNetworkMonitor::~LocalNetworkMonitor() {
    if (m_socket >= 0) {
        close(m_socket);
    }
}

void LocalNetworkMonitor::acknowledge() {
    std::array<char, 8192> buffer{};
    // An overrun is an error once and then no longer; the state is read anew in any case.
    while (recv(m_socket, buffer.data(), buffer.size(), 0) > 0) {
    }
}

} // namespace qivo::runtime
