#include "FinderResponder.h"

#include <algorithm>
#include <arpa/inet.h>
#include <array>
#include <cerrno>
#include <cstring>
#include <net/if.h>
#include <netinet/in.h>
#include <poll.h>
#include <stdexcept>
#include <sys/socket.h>
#include <unistd.h>
#include <utility>

namespace qivo::test {
namespace {

constexpr const char* kGroup = "224.0.0.251";
constexpr const char* kGroup6 = "ff02::fb";
constexpr std::uint16_t kPort = 5353;
constexpr std::size_t kPacketBytes = 1400;

sockaddr_in endpoint(const char* address) {
    sockaddr_in to{};
    to.sin_family = AF_INET;
    to.sin_port = htons(kPort);
    inet_pton(AF_INET, address, &to.sin_addr);
    return to;
}

sockaddr_in6 endpoint6(const char* address) {
    sockaddr_in6 to{};
    to.sin6_family = AF_INET6;
    to.sin6_port = htons(kPort);
    inet_pton(AF_INET6, address, &to.sin6_addr);
    return to;
}

template <typename T>
void bindTo(int socket, const T& address) {
    if (bind(socket, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) {
        throw std::runtime_error(std::string("bind: ") + std::strerror(errno));
    }
}

template <typename T>
void option(int socket, int level, int name, const T& value) {
    if (setsockopt(socket, level, name, &value, sizeof value) != 0) {
        throw std::runtime_error(std::string("setsockopt: ") + std::strerror(errno));
    }
}

std::string wireRecord(const DnsRecord& record) {
    std::string wire = wireName(record.owner) + wireNumber(record.type) + wireNumber(record.flush ? 0x8001 : 1);
    wire += wireNumber(static_cast<std::uint16_t>(record.ttl >> 16U));
    wire += wireNumber(static_cast<std::uint16_t>(record.ttl));
    return wire + wireNumber(static_cast<std::uint16_t>(record.data.size())) + record.data;
}

std::uint16_t numberAt(const std::string& packet, std::size_t at) {
    return at + 1 < packet.size() ? static_cast<std::uint16_t>((static_cast<unsigned char>(packet[at]) << 8U) |
                                                               static_cast<unsigned char>(packet[at + 1]))
                                  : std::uint16_t{0};
}

/// Reads a name that the finder's stack wrote, and moves on behind it.
std::vector<std::string> readName(const std::string& packet, std::size_t& at) {
    std::vector<std::string> labels;
    std::size_t cursor = at;
    bool jumped = false;
    while (cursor < packet.size() && packet[cursor] != 0) {
        const auto length = static_cast<unsigned char>(packet[cursor]);
        if (length >= 0xc0) {
            at = jumped ? at : cursor + 2;
            jumped = true;
            cursor = numberAt(packet, cursor) & 0x3fffU;
            continue;
        }
        labels.push_back(packet.substr(cursor + 1, length));
        cursor += 1U + length;
    }
    at = jumped ? at : cursor + 1;
    return labels;
}

bool sameName(const std::vector<std::string>& a, const std::vector<std::string>& b) {
    return std::equal(a.begin(), a.end(), b.begin(), b.end(), [](const std::string& x, const std::string& y) {
        return x.size() == y.size() && strncasecmp(x.c_str(), y.c_str(), x.size()) == 0;
    });
}

} // namespace

std::string wireNumber(std::uint16_t value) {
    return {static_cast<char>(value >> 8U), static_cast<char>(value & 0xffU)};
}

std::string wireName(const std::vector<std::string>& labels) {
    std::string wire;
    for (const auto& label : labels) {
        wire += static_cast<char>(label.size());
        wire += label;
    }
    return wire + '\0';
}

std::string wireResponse(const std::vector<DnsRecord>& records) {
    std::string wire = wireNumber(0) + wireNumber(0x8400) + wireNumber(0);
    wire += wireNumber(static_cast<std::uint16_t>(records.size())) + wireNumber(0) + wireNumber(0);
    for (const auto& record : records) {
        wire += wireRecord(record);
    }
    return wire;
}

std::vector<std::string> serviceType() {
    return {"_rtsp", "_tcp", "local"};
}

std::vector<std::string> serviceName(const std::string& instance) {
    return {instance, "_rtsp", "_tcp", "local"};
}

DnsRecord pointer(const std::string& instance, std::uint32_t ttl) {
    return {serviceType(), kPtr, ttl, wireName(serviceName(instance)), false};
}

DnsRecord server(const std::string& instance, const std::string& host, std::uint16_t port, std::uint32_t ttl) {
    const std::string data = wireNumber(0) + wireNumber(0) + wireNumber(port) + wireName({host, "local"});
    return {serviceName(instance), kSrv, ttl, data, true};
}

DnsRecord text(const std::string& instance, const std::vector<std::string>& strings, std::uint32_t ttl) {
    std::string data;
    for (const auto& string : strings) {
        data += static_cast<char>(string.size());
        data += string;
    }
    return {serviceName(instance), kTxt, ttl, data.empty() ? std::string(1, '\0') : data, true};
}

DnsRecord address(const std::string& host, const std::string& address, std::uint32_t ttl) {
    std::array<char, 16> bytes{};
    if (inet_pton(AF_INET, address.c_str(), bytes.data()) == 1) {
        return {{host, "local"}, kA, ttl, {bytes.data(), 4}, true};
    }
    if (inet_pton(AF_INET6, address.c_str(), bytes.data()) != 1) {
        throw std::runtime_error("not an address: " + address);
    }
    return {{host, "local"}, kAaaa, ttl, {bytes.data(), 16}, true};
}

std::vector<DnsRecord> source(const std::string& instance, const std::string& host, const std::string& numeric,
                              std::uint16_t port, const std::vector<std::string>& strings, std::uint32_t ttl) {
    return {pointer(instance), server(instance, host, port, ttl), text(instance, strings), address(host, numeric, ttl)};
}

std::vector<DnsRecord> goodbye(std::vector<DnsRecord> records) {
    for (auto& record : records) {
        record.ttl = 0;
    }
    return records;
}

Responder::Responder(const std::string& interface, const std::string& address)
    : m_interface(static_cast<int>(if_nametoindex(interface.c_str()))), m_ipv6(address.find(':') != std::string::npos),
      m_socket(socket(m_ipv6 ? AF_INET6 : AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0)) {
    option(m_socket, SOL_SOCKET, SO_REUSEADDR, 1);
    option(m_socket, SOL_SOCKET, SO_REUSEPORT, 1);
    if (m_ipv6) {
        joinIpv6();
    } else {
        joinIpv4(address);
    }
    m_thread = std::thread([this] { run(); });
}

void Responder::joinIpv4(const std::string& address) const {
    ip_mreqn group{};
    inet_pton(AF_INET, kGroup, &group.imr_multiaddr);
    inet_pton(AF_INET, address.c_str(), &group.imr_address);
    group.imr_ifindex = m_interface;
    option(m_socket, IPPROTO_IP, IP_MULTICAST_IF, group);
    option(m_socket, IPPROTO_IP, IP_MULTICAST_TTL, 255);
    option(m_socket, IPPROTO_IP, IP_MULTICAST_ALL, 0);
    option(m_socket, IPPROTO_IP, IP_ADD_MEMBERSHIP, group);
    bindTo(m_socket, endpoint("0.0.0.0"));
}

void Responder::joinIpv6() const {
    ipv6_mreq group{};
    inet_pton(AF_INET6, kGroup6, &group.ipv6mr_multiaddr);
    group.ipv6mr_interface = static_cast<unsigned>(m_interface);
    option(m_socket, IPPROTO_IPV6, IPV6_V6ONLY, 1);
    option(m_socket, IPPROTO_IPV6, IPV6_MULTICAST_IF, m_interface);
    option(m_socket, IPPROTO_IPV6, IPV6_MULTICAST_HOPS, 255);
    option(m_socket, IPPROTO_IPV6, IPV6_ADD_MEMBERSHIP, group);
    bindTo(m_socket, endpoint6("::"));
}

Responder::~Responder() {
    m_stop = true;
    m_thread.join();
    close(m_socket);
}

void Responder::send(const std::string& packet) const {
    const sockaddr_in to4 = endpoint(kGroup);
    const sockaddr_in6 to6 = endpoint6(kGroup6);
    const auto* to = m_ipv6 ? reinterpret_cast<const sockaddr*>(&to6) : reinterpret_cast<const sockaddr*>(&to4);
    sendto(m_socket, packet.data(), packet.size(), 0, to, m_ipv6 ? sizeof to6 : sizeof to4);
}

void Responder::announce(const std::vector<DnsRecord>& records) const {
    std::vector<DnsRecord> batch;
    for (const auto& record : records) {
        batch.push_back(record);
        if (wireResponse(batch).size() > kPacketBytes && batch.size() > 1) {
            batch.pop_back();
            send(wireResponse(batch));
            batch = {record};
        }
    }
    if (!batch.empty()) {
        send(wireResponse(batch));
    }
}

void Responder::answerWith(std::vector<DnsRecord> records) {
    const std::lock_guard lock(m_mutex);
    m_records = std::move(records);
}

int Responder::questions(std::uint16_t type) const {
    const std::lock_guard lock(m_mutex);
    return static_cast<int>(std::count(m_questions.begin(), m_questions.end(), type));
}

void Responder::answer(const std::string& packet) {
    if (packet.size() < 12 || (numberAt(packet, 2) & 0x8000U) != 0) {
        return;
    }
    std::vector<DnsRecord> answers;
    const std::lock_guard lock(m_mutex);
    std::size_t at = 12;
    for (int left = numberAt(packet, 4); left > 0 && at < packet.size(); --left) {
        const auto name = readName(packet, at);
        const std::uint16_t type = numberAt(packet, at);
        at += 4;
        m_questions.push_back(type);
        std::copy_if(m_records.begin(), m_records.end(), std::back_inserter(answers),
                     [&](const DnsRecord& r) { return r.type == type && sameName(r.owner, name); });
    }
    announce(answers);
}

void Responder::run() {
    std::string buffer(9000, '\0');
    while (!m_stop) {
        pollfd input{m_socket, POLLIN, 0};
        if (poll(&input, 1, 20) > 0) {
            const auto size = recv(m_socket, buffer.data(), buffer.size(), 0);
            if (size > 0) {
                answer(buffer.substr(0, static_cast<std::size_t>(size)));
            }
        }
    }
}

} // namespace qivo::test
