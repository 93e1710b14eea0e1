#include "runtime/UrlParts.h"

#include "runtime/Announcement.h"
#include "runtime/GstHandles.h"

#include <algorithm>
#include <array>
#include <charconv>

#include <arpa/inet.h>

namespace qivo::runtime {
namespace {

std::string unescaped(std::string_view text) {
    const GstOwned<gchar> plain(g_uri_unescape_segment(text.data(), text.data() + text.size(), nullptr));
    return plain ? std::string(plain.get()) : std::string(text);
}

Login loginOf(std::string_view text) {
    const std::size_t colon = std::min(text.find(':'), text.size());
    const std::string_view password = text.substr(std::min(colon + 1, text.size()));
    return {unescaped(text.substr(0, colon)), unescaped(password)};
}

/// Takes ":port" or nothing.
bool readPort(std::string_view text, int& port) {
    if (text.empty()) {
        return true;
    }
    const char* const end = text.data() + text.size();
    const auto [last, error] = std::from_chars(text.data() + 1, end, port);
    return text.front() == ':' && error == std::errc() && last == end && port > 0 && port <= 0xffff;
}

bool readHost(std::string_view authority, UrlParts& parts) {
    const bool bracketed = !authority.empty() && authority.front() == '[';
    const std::size_t end = std::min(authority.find(bracketed ? ']' : ':'), authority.size());
    if (bracketed && end == authority.size()) {
        return false;
    }
    parts.host = authority.substr(bracketed ? 1 : 0, bracketed ? end - 1 : end);
    return !parts.host.empty() && readPort(authority.substr(bracketed ? end + 1 : end), parts.port);
}

/// The bytes of a numeric address after its family; empty for a name.
std::string numericAddress(const std::string& host) {
    for (const int family : {AF_INET, AF_INET6}) {
        std::array<char, sizeof(in6_addr)> bytes{};
        if (inet_pton(family, host.c_str(), bytes.data()) == 1) {
            return std::to_string(family) + std::string(bytes.data(), bytes.size());
        }
    }
    return {};
}

} // namespace

std::optional<UrlParts> urlParts(std::string_view url) {
    const std::size_t slashes = url.find("://");
    if (slashes == std::string_view::npos || slashes == 0) {
        return std::nullopt;
    }
    UrlParts parts;
    parts.scheme = foldCase(url.substr(0, slashes));
    const std::string_view rest = url.substr(slashes + 3);
    const std::size_t end = std::min(rest.find_first_of("/?#"), rest.size());
    std::string_view authority = rest.substr(0, end);
    // The last @ counts: a password may contain one that was not escaped.
    const std::size_t at = authority.rfind('@');
    if (at != std::string_view::npos) {
        parts.login = loginOf(authority.substr(0, at));
        authority.remove_prefix(at + 1);
    }
    const std::string_view path = rest.substr(end, rest.find('#', end) - end);
    parts.path = path.empty() || path.front() != '/' ? "/" + std::string(path) : std::string(path);
    return readHost(authority, parts) ? std::optional(parts) : std::nullopt;
}

std::string urlOf(const UrlParts& parts) {
    const bool brackets = parts.host.find(':') != std::string::npos;
    const std::string port = parts.port > 0 ? ":" + std::to_string(parts.port) : "";
    return parts.scheme + "://" + (brackets ? "[" + parts.host + "]" : parts.host) + port + parts.path;
}

bool sameHost(std::string_view one, std::string_view other) {
    const std::string first = numericAddress(std::string(one));
    const std::string second = numericAddress(std::string(other));
    return first.empty() && second.empty() ? foldCase(one) == foldCase(other) : first == second;
}

} // namespace qivo::runtime
