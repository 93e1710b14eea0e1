#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace qivo::runtime {

/// Largest multicast DNS message in bytes, as the protocol has it.
inline constexpr std::size_t kMaxPacketBytes = 9000;

/// A domain name as its labels, unescaped, in lower case.
using DomainName = std::vector<std::string>;

/// Reads the escaped form of the multicast DNS stack ("\." for a dot, "\032" for the byte 32). Nothing if it is no name
/// or a label holds a zero byte. Keeps the case.
std::optional<DomainName> parseEscapedName(std::string_view text);

/// The name of an instance of the service type for RTSP, or nothing if the labels are not one's.
std::optional<std::string> instanceOf(const DomainName& name);

/// Decides which packets the multicast DNS stack may see.
///
/// The stack trusts packets more than it should: aliases (CNAME), which announcements of services never need, can stop
/// the whole process, and records that nobody asked for fill its cache until there is no room for sources. So it is
/// shown only well-formed responses that tell of a source. Questions are kept from it altogether, as there is nothing
/// here to answer.
class PacketGuard {
  public:
    /// What is of interest, beside the services themselves.
    struct Interests {
        std::function<bool(const std::string& instance)> service; ///< a source of that name, in lower case
        std::function<bool(const DomainName& host)> host;         ///< the addresses of that host
    };

    explicit PacketGuard(Interests interests);

    bool admits(const std::uint8_t* data, std::size_t size) const;

    /// Takes refused packets off a socket until one comes that is admitted, which stays. False if none did. Looks at
    /// no more packets than a reader may spend time on at once.
    bool clear(int socket) const;

  private:
    Interests m_interests;
};

} // namespace qivo::runtime
