#pragma once

#include <atomic>
#include <cstdint>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

namespace qivo::test {

/// One resource record, its data as on the wire. Names are lists of labels, so that tests can write impossible ones.
struct DnsRecord {
    std::vector<std::string> owner;
    std::uint16_t type = 0;
    std::uint32_t ttl = 120; // seconds
    std::string data;
    bool flush = true; // the cache-flush bit: this record replaces older ones
};

inline constexpr std::uint16_t kA = 1;
inline constexpr std::uint16_t kCname = 5;
inline constexpr std::uint16_t kPtr = 12;
inline constexpr std::uint16_t kTxt = 16;
inline constexpr std::uint16_t kAaaa = 28;
inline constexpr std::uint16_t kSrv = 33;

std::string wireNumber(std::uint16_t value);
std::string wireName(const std::vector<std::string>& labels);
/// A response with these records as answers.
std::string wireResponse(const std::vector<DnsRecord>& records);

std::vector<std::string> serviceType();
std::vector<std::string> serviceName(const std::string& instance);
DnsRecord pointer(const std::string& instance, std::uint32_t ttl = 4500);
DnsRecord server(const std::string& instance, const std::string& host, std::uint16_t port, std::uint32_t ttl = 120);
DnsRecord text(const std::string& instance, const std::vector<std::string>& strings, std::uint32_t ttl = 4500);
DnsRecord address(const std::string& host, const std::string& address, std::uint32_t ttl = 120);
/// Everything that a well-behaved source announces.
std::vector<DnsRecord> source(const std::string& instance, const std::string& host, const std::string& address,
                              std::uint16_t port = 8554, const std::vector<std::string>& strings = {"path=/live"},
                              std::uint32_t ttl = 120);
/// The same records as their goodbyes.
std::vector<DnsRecord> goodbye(std::vector<DnsRecord> records);

/// A multicast DNS responder whose every packet is the test's own. Speaks one address family on one interface, from the
/// protocol's port.
class Responder {
  public:
    /// An IPv6 responder sends from the interface's link-local address; `address` then is "::".
    explicit Responder(const std::string& interface = "lo", const std::string& address = "127.0.0.1");
    Responder(const Responder&) = delete;
    Responder& operator=(const Responder&) = delete;
    ~Responder();

    /// Sends a packet as it is.
    void send(const std::string& packet) const;
    /// Sends the records unasked, in as many packets as they need.
    void announce(const std::vector<DnsRecord>& records) const;
    /// From now on answers questions from these records alone; none make it silent.
    void answerWith(std::vector<DnsRecord> records);
    /// Questions heard since the beginning for that type of record.
    int questions(std::uint16_t type) const;

  private:
    void run();
    void answer(const std::string& packet);

    void joinIpv4(const std::string& address) const;
    void joinIpv6() const;

    const int m_interface;
    const bool m_ipv6;
    const int m_socket;
    std::atomic<bool> m_stop = false;
    mutable std::mutex m_mutex; // guards the two below
    std::vector<DnsRecord> m_records;
    std::vector<std::uint16_t> m_questions;
    std::thread m_thread;
};

} // namespace qivo::test
