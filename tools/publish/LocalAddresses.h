#pragma once

#include <netinet/in.h>
#include <string>
#include <vector>

namespace qivo {

/** An IPv4 address of this machine. */
struct LocalAddress {
    int interface = 0; ///< its index
    in_addr address{};
    bool loopback = false;
    bool up = false;

    [[nodiscard]] std::string text() const;

    friend bool operator==(const LocalAddress& a, const LocalAddress& b) {
        return a.interface == b.interface && a.address.s_addr == b.address.s_addr;
    }
};

/** All of them, in the system's order; `loopbackOnly` leaves out those that others reach. Empty if the system does not
 *  tell. */
[[nodiscard]] std::vector<LocalAddress> localAddresses(bool loopbackOnly);

/** An address of this machine that others reach: the first IPv4 address that is not loopback, else 127.0.0.1. */
[[nodiscard]] std::string reachableAddress();

} // namespace qivo
