#include "tools/publish/onvif/WsDiscovery.h"

#include <algorithm>
#include <arpa/inet.h>
#include <array>
#include <cerrno>
#include <cstring>
#include <glib-unix.h>
#include <optional>
#include <sys/socket.h>
#include <unistd.h>

namespace qivo {
namespace {

// Interfaces that come later are joined within this time.
constexpr guint joinSeconds = 5;

// Datagrams that are read before others on this thread get their turn.
constexpr int datagramsAtOnce = 32;

sockaddr_in groupAddress() {
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(WsDiscovery::port);
    inet_pton(AF_INET, WsDiscovery::group, &address.sin_addr);
    return address;
}

// The address of this machine from which a peer is reached.
std::optional<std::string> addressTowards(const sockaddr_in& peer) {
    const int probe = socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0);
    sockaddr_in local{};
    socklen_t length = sizeof(local);
    const bool known = probe >= 0 && connect(probe, reinterpret_cast<const sockaddr*>(&peer), sizeof(peer)) == 0 &&
                       getsockname(probe, reinterpret_cast<sockaddr*>(&local), &length) == 0;
    if (probe >= 0) {
        close(probe);
    }
    return known ? std::optional(LocalAddress{0, local.sin_addr, false, true}.text()) : std::nullopt;
}

template <typename T>
bool set(int socket, int level, int option, const T& value) {
    return setsockopt(socket, level, option, &value, sizeof(value)) == 0;
}

} // namespace

WsDiscovery::WsDiscovery(std::vector<const OnvifCamera*> cameras, int httpPort, bool loopbackOnly)
    : m_cameras(std::move(cameras)), m_httpPort(httpPort), m_loopbackOnly(loopbackOnly) {}

WsDiscovery::~WsDiscovery() {
    if (m_socket < 0) {
        return;
    }
    g_source_remove(m_readable);
    g_source_remove(m_timer);
    sayBye();
    close(m_socket);
}

std::string WsDiscovery::start() {
    if (!open()) {
        return std::string("cameras cannot be found by WS-Discovery: ") + std::strerror(errno);
    }
    const auto readable = [](int, GIOCondition, gpointer self) -> gboolean {
        static_cast<WsDiscovery*>(self)->read();
        return G_SOURCE_CONTINUE;
    };
    const auto time = [](gpointer self) -> gboolean {
        static_cast<WsDiscovery*>(self)->join();
        return G_SOURCE_CONTINUE;
    };
    m_readable = g_unix_fd_add(m_socket, G_IO_IN, readable, this);
    m_timer = g_timeout_add_seconds(joinSeconds, time, this);
    join();
    return {};
}

// Bound to the group, the socket hears nothing that was sent to this machine alone: answers are longer than questions
// and must not be sent wherever a forged sender from far away points. The port is shared with others by SO_REUSEADDR.
bool WsDiscovery::open() {
    m_socket = socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0);
    const sockaddr_in address = groupAddress();
    const int on = 1;
    const int off = 0;
    const bool ready = m_socket >= 0 && set(m_socket, SOL_SOCKET, SO_REUSEADDR, on) &&
                       set(m_socket, IPPROTO_IP, IP_MULTICAST_ALL, off) &&
                       bind(m_socket, reinterpret_cast<const sockaddr*>(&address), sizeof(address)) == 0;
    if (!ready && m_socket >= 0) {
        close(m_socket);
        m_socket = -1;
    }
    return ready;
}

void WsDiscovery::join() {
    std::vector<LocalAddress> present;
    for (const LocalAddress& local : localAddresses(m_loopbackOnly)) {
        if (!local.up) {
            continue;
        }
        present.push_back(local);
        if (std::find(m_joined.begin(), m_joined.end(), local) == m_joined.end()) {
            ip_mreqn membership{};
            membership.imr_multiaddr = groupAddress().sin_addr;
            membership.imr_ifindex = local.interface;
            set(m_socket, IPPROTO_IP, IP_ADD_MEMBERSHIP, membership); // fails where it is a member already
            sayHello(local);
        }
    }
    m_joined = std::move(present);
}

void WsDiscovery::read() {
    std::string text(XmlDocument::maximumBytes + 1, '\0');
    for (int i = 0; i < datagramsAtOnce; ++i) {
        sockaddr_in peer{};
        socklen_t length = sizeof(peer);
        const ssize_t size =
            recvfrom(m_socket, text.data(), text.size(), 0, reinterpret_cast<sockaddr*>(&peer), &length);
        if (size < 0) {
            return;
        }
        const auto local = addressTowards(peer);
        if (!local) {
            continue;
        }
        const auto answers =
            m_messages.answers(text.substr(0, static_cast<std::size_t>(size)), m_cameras, {*local, m_httpPort});
        for (const std::string& answer : answers) {
            sendto(m_socket, answer.data(), answer.size(), 0, reinterpret_cast<const sockaddr*>(&peer), length);
        }
    }
}

void WsDiscovery::sayHello(const LocalAddress& local) {
    for (const OnvifCamera* camera : m_cameras) {
        multicast(local, m_messages.hello(*camera, {local.text(), m_httpPort}));
    }
}

void WsDiscovery::sayBye() {
    for (const LocalAddress& local : m_joined) {
        for (const OnvifCamera* camera : m_cameras) {
            multicast(local, m_messages.bye(*camera));
        }
    }
}

void WsDiscovery::multicast(const LocalAddress& from, const std::string& text) const {
    ip_mreqn sender{};
    sender.imr_ifindex = from.interface;
    sender.imr_address = from.address;
    const sockaddr_in to = groupAddress();
    if (set(m_socket, IPPROTO_IP, IP_MULTICAST_IF, sender)) {
        sendto(m_socket, text.data(), text.size(), 0, reinterpret_cast<const sockaddr*>(&to), sizeof(to));
    }
}

} // namespace qivo
