#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace qivo {

/// Samples of 8 or 16 bits, R, G, B and perhaps alpha, row after row.
struct RawPicture {
    std::uint32_t width = 0;
    std::uint32_t height = 0;
    int bits = 8;
    int samples = 3;
    bool multiplied = false; ///< whether alpha is multiplied into the other samples
    std::vector<std::uint16_t> values{};

    bool operator==(const RawPicture&) const = default;

    /// Of values that all differ as far as there are enough, the extremes among them.
    static RawPicture patterned(std::uint32_t width, std::uint32_t height, int bits, int samples);
};

// Files written and read by the formats' own libraries. Reading gives what lies in the file.
void writePng(const std::string& path, const RawPicture& picture);
RawPicture readPng(const std::string& path);
/// `order` is "b" for files in big-endian and "l" for files in little-endian order.
void writeTiff(const std::string& path, const RawPicture& picture, const char* order);
RawPicture readTiff(const std::string& path);
/// Keeps the library, which writes to standard error what it thinks of a file, from doing so.
void silenceTiff();
void writeJpeg(const std::string& path, const RawPicture& picture);
RawPicture readJpeg(const std::string& path);

} // namespace qivo
