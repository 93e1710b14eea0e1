#include "runtime/Announcement.h"

#include <algorithm>
#include <array>
#include <cstdint>
#include <numeric>
#include <utility>

namespace qivo::runtime {
namespace {

/// Takes one character off the front. Nothing if the text does not begin with a valid one; overlong forms, surrogates
/// and what lies beyond U+10FFFF are not valid.
std::optional<char32_t> takeCharacter(std::string_view& text) {
    const auto lead = static_cast<unsigned char>(text.front());
    const std::size_t length = lead < 0x80   ? 1
                               : lead < 0xc2 ? 0
                               : lead < 0xe0 ? 2
                               : lead < 0xf0 ? 3
                               : lead < 0xf5 ? 4
                                             : 0;
    if (length == 0 || text.size() < length) {
        return std::nullopt;
    }
    char32_t character = length == 1 ? lead : lead & (0x7fU >> length);
    for (std::size_t i = 1; i < length; ++i) {
        const auto next = static_cast<unsigned char>(text[i]);
        if ((next & 0xc0U) != 0x80) {
            return std::nullopt;
        }
        character = (character << 6U) | (next & 0x3fU);
    }
    constexpr std::array<char32_t, 5> kLeast{0, 0, 0x80, 0x800, 0x10000};
    if (character < kLeast.at(length) || character > 0x10ffff || (character >= 0xd800 && character < 0xe000)) {
        return std::nullopt;
    }
    text.remove_prefix(length);
    return character;
}

/// The value of the first string with that key; nothing if there is none.
std::optional<std::string_view> valueOf(const std::vector<std::string>& strings, std::string_view key) {
    for (const std::string& text : strings) {
        const std::string_view view = text;
        const auto equals = view.find('=');
        if (foldCase(view.substr(0, equals)) == key) {
            return equals == std::string_view::npos ? std::string_view{} : view.substr(equals + 1);
        }
    }
    return std::nullopt;
}

std::string webAddressOf(const std::vector<std::string>& strings, std::string_view key) {
    const auto value = valueOf(strings, key);
    return value && isWebAddress(*value) ? std::string(*value) : std::string();
}

} // namespace

std::string foldCase(std::string_view text) {
    std::string folded(text);
    for (char& c : folded) {
        c = c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
    }
    return folded;
}

bool isSourceName(std::string_view name) {
    if (name.empty() || name.size() > kMaxNameBytes) {
        return false;
    }
    while (!name.empty()) {
        const auto character = takeCharacter(name);
        if (!character || *character < 0x20 || (*character >= 0x7f && *character < 0xa0)) {
            return false;
        }
    }
    return true;
}

std::string urlPath(std::string_view text) {
    constexpr std::string_view kHex = "0123456789ABCDEF";
    std::string path = text.empty() || text.front() != '/' ? "/" : "";
    for (std::size_t i = 0; i < text.size(); ++i) {
        if (isUrlCharacter(text[i]) || isUrlEscape(text, i)) {
            path += text[i];
            continue;
        }
        const auto byte = static_cast<unsigned char>(text[i]);
        path += {'%', kHex[byte >> 4U], kHex[byte & 0xfU]};
    }
    return path;
}

std::optional<ServiceText> parseServiceText(const std::vector<std::string>& strings) {
    const auto bytes = std::accumulate(strings.begin(), strings.end(), std::size_t{0},
                                       [](std::size_t sum, const std::string& s) { return sum + 1 + s.size(); });
    if (bytes > kMaxTxtBytes) {
        return std::nullopt;
    }
    ServiceText text;
    text.path = urlPath(valueOf(strings, "path").value_or(""));
    const auto low = valueOf(strings, "low").value_or("");
    text.low = low.empty() ? "" : urlPath(low);
    text.web = webAddressOf(strings, "web");
    text.onvif = webAddressOf(strings, "onvif");
    if (text.path.size() > kMaxPathBytes || text.low.size() > kMaxPathBytes) {
        return std::nullopt;
    }
    return text;
}

} // namespace qivo::runtime
