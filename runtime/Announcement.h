#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "sdk/WebAddress.h"

namespace qivo::runtime {

/// Longest name in bytes: one label of the domain name system.
inline constexpr std::size_t kMaxNameBytes = 63;
/// Longest TXT record in bytes, the length bytes included; announcements with a longer one are skipped.
inline constexpr std::size_t kMaxTxtBytes = 4096;
/// Longest path in bytes, after encoding.
inline constexpr std::size_t kMaxPathBytes = 512;

/// One source as it is announced on the network, checked and ready to be used.
struct Announcement {
    std::string name;   ///< DNS-SD instance name as it stands, valid UTF-8, e.g. "STUDIO (Cam 1)"
    std::string url;    ///< rtsp://host:port/path, host a numeric address, see SourceTable
    std::string lowUrl; ///< the low-bandwidth stream, on the same host and port; empty if none is announced
    std::string web;    ///< address of the control page, http or https; empty if none is announced
    std::string onvif;  ///< address of the device service, http or https; empty if none is announced
    bool local = false; ///< the source is on this machine

    bool operator==(const Announcement&) const = default;
};

/// What a source's TXT record says, checked.
struct ServiceText {
    std::string path;  ///< path of the stream, percent-encoded, begins with a slash
    std::string low;   ///< path of the low-bandwidth stream in the same form; empty if not announced
    std::string web;   ///< http or https address, empty if not announced or not one
    std::string onvif; ///< http or https address, empty if not announced or not one

    bool operator==(const ServiceText&) const = default;
};

/// Reads the strings of a TXT record ("key=value", keys without regard to case, the first of a key counts). Nothing if
/// the record is larger than kMaxTxtBytes or its path longer than kMaxPathBytes.
std::optional<ServiceText> parseServiceText(const std::vector<std::string>& strings);

/// Whether a source may have this name: valid UTF-8 without control characters, 1 to kMaxNameBytes bytes.
bool isSourceName(std::string_view name);

using qivo::isWebAddress;

/// The text as a URL's path and query: leading slash, everything that a URL cannot hold percent-encoded. An escape
/// that is already there stays. Empty text is "/".
std::string urlPath(std::string_view text);

/// The text with the letters A to Z in lower case, the way names of the domain name system are compared.
std::string foldCase(std::string_view text);

} // namespace qivo::runtime
