#pragma once

#include <cstdint>
#include <functional>

namespace qivo {

/// The longest compiler's or linker's log that is shown, in bytes; a longer one counts as one that there is no memory
/// for.
constexpr std::int32_t maximumInfoLogBytes = std::int32_t{1} << 24;

/// Fills a buffer of this many bytes with a NUL-terminated log.
using InfoLogReader = std::function<void(std::int32_t bytes, char* buffer)>;

/// Reads a GL info log of `length` bytes, terminating NUL included, and logs it as an error. Nothing is read or logged
/// if there is no memory for it.
void logInfoLog(std::int32_t length, const InfoLogReader& read);

} // namespace qivo
