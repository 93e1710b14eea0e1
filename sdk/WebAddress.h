#pragma once

#include <algorithm>
#include <charconv>
#include <string_view>

// What libqivo takes for the address of a web page, so that whoever announces one can tell.
namespace qivo {

/// Whether a URL may hold the character as it stands; what introduces an escape or a fragment is none of them.
inline bool isUrlCharacter(char c) {
    constexpr std::string_view punctuation = "-._~:/?[]@!$&'()*+,;=";
    return (c >= '0' && c <= '9') || (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') ||
           punctuation.find(c) != std::string_view::npos;
}

/// Whether a percent-encoded byte begins there.
inline bool isUrlEscape(std::string_view text, std::size_t at) {
    const auto isHexDigit = [](char c) {
        return (c >= '0' && c <= '9') || (c >= 'a' && c <= 'f') || (c >= 'A' && c <= 'F');
    };
    return at + 2 < text.size() && text[at] == '%' && isHexDigit(text[at + 1]) && isHexDigit(text[at + 2]);
}

/// Whether this is a host, a numeric IPv6 address in brackets, with a login before it or not and a port from 1 to 65535
/// behind it or not: what stands in a URL between "//" and the path.
inline bool isUrlAuthority(std::string_view text) {
    text.remove_prefix(text.rfind('@') + 1); // npos is one less than 0
    const bool bracketed = !text.empty() && text.front() == '[';
    const std::size_t end = text.find(bracketed ? ']' : ':');
    if (text.empty() || text.front() == ':' || (bracketed && (end == std::string_view::npos || end == 1))) {
        return false;
    }
    std::string_view port = text.substr(bracketed ? end + 1 : std::min(end, text.size()));
    if (port.empty()) {
        return true;
    }
    int number = 0;
    const char* last = port.data() + port.size();
    const bool whole = port.size() > 1 && port.size() <= 6 && port[1] != '-' &&
                       std::from_chars(port.data() + 1, last, number).ptr == last;
    return port.front() == ':' && whole && number > 0 && number <= 0xffff;
}

/// Whether this is an http or https address with a host and, if any, a valid port, in the characters of a URL.
inline bool isWebAddress(std::string_view address) {
    const auto begins = [address](std::string_view scheme) {
        return address.size() > scheme.size() &&
               std::equal(scheme.begin(), scheme.end(), address.begin(),
                          [](char a, char b) { return a == (b >= 'A' && b <= 'Z' ? b - 'A' + 'a' : b); });
    };
    const std::size_t start = begins("https://") ? 8 : begins("http://") ? 7 : 0;
    for (std::size_t i = 0; i < address.size(); ++i) {
        if (!isUrlCharacter(address[i]) && address[i] != '#' && !isUrlEscape(address, i)) {
            return false;
        }
    }
    const std::string_view rest = address.substr(start);
    return start > 0 && isUrlAuthority(rest.substr(0, rest.find_first_of("/?#")));
}

} // namespace qivo
