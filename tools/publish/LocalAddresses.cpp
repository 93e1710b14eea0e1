#include "tools/publish/LocalAddresses.h"

#include <arpa/inet.h>
#include <array>
#include <ifaddrs.h>
#include <memory>
#include <net/if.h>

namespace qivo {

std::string LocalAddress::text() const {
    std::array<char, INET_ADDRSTRLEN> text{};
    inet_ntop(AF_INET, &address, text.data(), text.size());
    return text.data();
}

std::vector<LocalAddress> localAddresses(bool loopbackOnly) {
    std::vector<LocalAddress> addresses;
    ifaddrs* list = nullptr;
    if (getifaddrs(&list) != 0) {
        return addresses;
    }
    const std::unique_ptr<ifaddrs, void (*)(ifaddrs*)> owned(list, freeifaddrs);
    for (const ifaddrs* entry = list; entry != nullptr; entry = entry->ifa_next) {
        const bool loopback = (entry->ifa_flags & IFF_LOOPBACK) != 0;
        if (entry->ifa_addr != nullptr && entry->ifa_addr->sa_family == AF_INET && (loopback || !loopbackOnly)) {
            addresses.push_back({static_cast<int>(if_nametoindex(entry->ifa_name)),
                                 reinterpret_cast<const sockaddr_in*>(entry->ifa_addr)->sin_addr, loopback,
                                 (entry->ifa_flags & IFF_UP) != 0});
        }
    }
    return addresses;
}

std::string reachableAddress() {
    for (const LocalAddress& local : localAddresses(false)) {
        if (local.up && !local.loopback) {
            return local.text();
        }
    }
    return "127.0.0.1";
}

} // namespace qivo
