// Whatever a URL says: it either stands for an absolute path, which then comes back however it is spelled, or for none,
// with a reason. And a picture is found by every way of spelling its path. The input is a text and, for the spelling,
// one byte for each letter of the path.
#include "platform/LocalFile.h"
#include "video/IOSurface2D.h"

#include <cstdio>
#include <cstdlib>
#include <iterator>
#include <optional>
#include <string>
#include <string_view>
#include <sys/mman.h>
#include <unistd.h>

namespace {

/// A picture of one pixel in memory, kept for all runs, and its path.
const std::string& picture() {
    static const std::string path = [] {
        constexpr std::string_view content = "P6\n1 1\n255\nabc";
        const int number = ::memfd_create("picture", MFD_CLOEXEC);
        if (::write(number, content.data(), content.size()) != static_cast<ssize_t>(content.size())) {
            std::abort();
        }
        return "/proc/self/fd/" + std::to_string(number);
    }();
    return path;
}

/// Whether a letter may stand in a URL's path as it is.
bool isPlain(char letter) {
    return letter != '%' && letter != '?' && letter != '#';
}

/// A URL of the path, which the bytes spell: the scheme and the host in their forms, letters plain or escaped with
/// small or capital digits, what follows a path.
std::string spelled(const std::string& path, std::string_view bytes) {
    std::size_t next = 0;
    const auto byte = [&] { return next < bytes.size() ? static_cast<unsigned char>(bytes[next++]) : 0U; };
    static constexpr const char* beginnings[] = {"file://", "file:", "FILE://", "file://localhost", "File://LOCALHOST"};
    static constexpr const char* ends[] = {"", "?", "#", "?a=b#c", "#%"};
    std::string url = beginnings[byte() % std::size(beginnings)];
    for (std::size_t at = 0; at < path.size(); ++at) {
        const unsigned how = byte() % 3;
        // Two plain slashes at the beginning would begin a host.
        const bool isSecondSlash = at == 1 && path[at] == '/';
        if (at == 0 || (how == 0 && isPlain(path[at]) && !isSecondSlash)) {
            url += path[at];
            continue;
        }
        char escape[4];
        std::snprintf(escape, sizeof escape, how == 1 ? "%%%02x" : "%%%02X",
                      static_cast<unsigned>(static_cast<unsigned char>(path[at])));
        url += escape;
    }
    return url + ends[byte() % std::size(ends)];
}

std::optional<std::string> pathOf(const std::string& url) {
    std::string error;
    auto path = qivo::localPath(url.c_str(), error);
    if (path.has_value() != error.empty()) {
        std::abort();
    }
    return path;
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const unsigned char* data, std::size_t size) {
    const std::string text(reinterpret_cast<const char*>(data), size);
    for (const std::string& url : {text, "file:" + text, "file:///" + text}) {
        const auto path = pathOf(url);
        if (path && (path->empty() || path->front() != '/' || path->find('\0') != std::string::npos ||
                     pathOf(spelled(*path, text)) != path)) {
            std::abort();
        }
    }
    if (!qivo::IOSurface2D::initWithURL(spelled(picture(), text).c_str())->surface()) {
        std::abort();
    }
    return 0;
}
