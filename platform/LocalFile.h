#pragma once

#include <cstddef>
#include <optional>
#include <string>

namespace qivo {

/// The whole of a regular file. A file that is missing, unreadable, larger than `maximumBytes` or anything but a
/// regular file gives nothing, and `error` then says of which file and why, in the system's words where it has some. A
/// null path is the name of no file.
///
/// Thread: any; blocks for the input.
std::optional<std::string> readFile(const char* path, std::size_t maximumBytes, std::string& error);

/// The path that a `file:` URL of this machine stands for: absolute, percent-encoding resolved, query and fragment left
/// out. Any other URL gives nothing, and `error` then says of which URL and why. Null is no URL.
std::optional<std::string> localPath(const char* url, std::string& error);

} // namespace qivo
