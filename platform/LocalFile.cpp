#include "platform/LocalFile.h"

#include "platform/FileDescriptor.h"

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <fcntl.h>
#include <string_view>
#include <sys/stat.h>
#include <system_error>
#include <unistd.h>

namespace qivo {

namespace {

std::string because(const char* path, int number) {
    return std::string(path) + ": " + std::generic_category().message(number);
}

/// Why this is not a regular file that could be read whole; empty if it is one.
std::string objection(const char* path, const FileDescriptor& file) {
    struct stat status {};
    if (!file.isOpen() || ::fstat(file.number(), &status) != 0) {
        return because(path, errno);
    }
    if (S_ISDIR(status.st_mode)) {
        return because(path, EISDIR);
    }
    return S_ISREG(status.st_mode) ? std::string() : std::string(path) + ": Not a regular file";
}

/// Reads up to `maximumBytes` and one more, by which a file that is too large is told; false on an error, in errno.
bool readUpTo(std::size_t maximumBytes, const FileDescriptor& file, std::string& bytes) {
    char chunk[16384];
    while (bytes.size() <= maximumBytes) {
        const auto wanted = std::min(sizeof chunk, maximumBytes + 1 - bytes.size());
        const auto count = ::read(file.number(), chunk, wanted);
        if (count < 0 && errno == EINTR) {
            continue;
        }
        if (count <= 0) {
            return count == 0;
        }
        bytes.append(chunk, static_cast<std::size_t>(count));
    }
    return true;
}

bool startsWith(std::string_view text, std::string_view lowerCasePrefix) {
    return text.size() >= lowerCasePrefix.size() &&
           std::equal(lowerCasePrefix.begin(), lowerCasePrefix.end(), text.begin(), [](char wanted, char found) {
               return wanted == std::tolower(static_cast<unsigned char>(found));
           });
}

int hexDigit(char digit) {
    constexpr std::string_view digits = "0123456789abcdef";
    const auto at = digits.find(static_cast<char>(std::tolower(static_cast<unsigned char>(digit))));
    return at == std::string_view::npos ? -1 : static_cast<int>(at);
}

/// Nothing if an escape is broken or stands for the NUL byte, which no path can hold.
std::optional<std::string> withoutPercentEncoding(std::string_view text) {
    std::string result;
    for (std::size_t at = 0; at < text.size(); ++at) {
        if (text[at] != '%') {
            result += text[at];
            continue;
        }
        if (text.size() - at < 3) {
            return std::nullopt;
        }
        const int high = hexDigit(text[at + 1]);
        const int low = hexDigit(text[at + 2]);
        if (high < 0 || low < 0 || high + low == 0) {
            return std::nullopt;
        }
        result += static_cast<char>(high * 16 + low);
        at += 2;
    }
    return result;
}

} // namespace

std::optional<std::string> readFile(const char* path, std::size_t maximumBytes, std::string& error) {
    if (!path) {
        error = "No file name was given";
        return std::nullopt;
    }
    // Opening a pipe that nobody writes to would wait for ever otherwise.
    const FileDescriptor file(::open(path, O_RDONLY | O_CLOEXEC | O_NONBLOCK));
    error = objection(path, file);
    if (!error.empty()) {
        return std::nullopt;
    }
    std::string bytes;
    if (!readUpTo(maximumBytes, file, bytes)) {
        error = because(path, errno);
    } else if (bytes.size() > maximumBytes) {
        error = std::string(path) + ": Larger than " + std::to_string(maximumBytes) + " bytes";
    }
    return error.empty() ? std::optional(std::move(bytes)) : std::nullopt;
}

std::optional<std::string> localPath(const char* url, std::string& error) {
    if (!url) {
        error = "No URL was given";
        return std::nullopt;
    }
    std::string_view rest = url;
    if (!startsWith(rest, "file:")) {
        error = std::string(url) + ": Only file URLs can be read";
        return std::nullopt;
    }
    rest.remove_prefix(std::string_view("file:").size());
    rest = rest.substr(0, rest.find_first_of("?#"));
    if (startsWith(rest, "//")) {
        rest.remove_prefix(2);
        if (startsWith(rest, "localhost/")) {
            rest.remove_prefix(std::string_view("localhost").size());
        }
    }
    auto path = withoutPercentEncoding(rest);
    if (!path || !startsWith(*path, "/")) {
        error = std::string(url) + ": Not the URL of a file on this machine";
        return std::nullopt;
    }
    return path;
}

} // namespace qivo
