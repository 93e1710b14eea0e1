#include "tests/tools/Prober.h"

#include <algorithm>
#include <arpa/inet.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

namespace qivo::test {
namespace {

constexpr const char* group = "239.255.255.250";
constexpr int discoveryPort = 3702;

sockaddr_in placeOf(const char* address, int port) {
    sockaddr_in place{};
    place.sin_family = AF_INET;
    place.sin_port = htons(static_cast<std::uint16_t>(port));
    inet_pton(AF_INET, address, &place.sin_addr);
    return place;
}

} // namespace

Prober::Prober(bool member) : m_socket(socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0)) {
    const int on = 1;
    const sockaddr_in place = member ? placeOf(group, discoveryPort) : placeOf("0.0.0.0", 0);
    EXPECT_EQ(setsockopt(m_socket, SOL_SOCKET, SO_REUSEADDR, &on, sizeof(on)), 0);
    EXPECT_EQ(bind(m_socket, reinterpret_cast<const sockaddr*>(&place), sizeof(place)), 0);
    if (member) {
        ip_mreq membership{};
        membership.imr_multiaddr = place.sin_addr;
        membership.imr_interface = placeOf("127.0.0.1", 0).sin_addr;
        EXPECT_EQ(setsockopt(m_socket, IPPROTO_IP, IP_ADD_MEMBERSHIP, &membership, sizeof(membership)), 0);
    }
}

Prober::~Prober() {
    close(m_socket);
}

void Prober::send(const std::string& text, const char* address) const {
    const sockaddr_in place = placeOf(address, discoveryPort);
    EXPECT_EQ(sendto(m_socket, text.data(), text.size(), 0, reinterpret_cast<const sockaddr*>(&place), sizeof(place)),
              static_cast<ssize_t>(text.size()));
}

void Prober::probe(const std::string& text) const {
    send(text, group);
}

void Prober::probeDirectly(const std::string& text) const {
    send(text, "127.0.0.1");
}

std::optional<std::string> Prober::next(std::chrono::milliseconds deadline) const {
    pollfd ready{m_socket, POLLIN, 0};
    if (poll(&ready, 1, static_cast<int>(deadline.count())) != 1) {
        return std::nullopt;
    }
    std::string text(65536, '\0');
    text.resize(std::max<ssize_t>(0, recv(m_socket, text.data(), text.size(), 0)));
    return text;
}

} // namespace qivo::test
