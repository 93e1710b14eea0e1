#include "tools/publish/TimeCode.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstring>

namespace qivo {
namespace {

constexpr int levelCells = 4;
constexpr int checkBits = 16;
constexpr std::uint64_t timeMask = (std::uint64_t{1} << timeCodeBits) - 1;

// Less contrast than this between the white and black level cells is not a strip but a plain area.
constexpr int minimumContrast = 40;

static_assert(levelCells + timeCodeBits + checkBits == timeCodeCells);

std::uint16_t checksum(std::uint64_t time) {
    std::uint16_t crc = 0xFFFF;
    for (int shift = 40; shift >= 0; shift -= 8) {
        crc ^= static_cast<std::uint16_t>(((time >> shift) & 0xFF) << 8);
        for (int bit = 0; bit < 8; ++bit) {
            crc = static_cast<std::uint16_t>((crc & 0x8000) != 0 ? (crc << 1) ^ 0x1021 : crc << 1);
        }
    }
    return crc;
}

std::array<bool, timeCodeCells> cellsOf(std::uint64_t time) {
    std::array<bool, timeCodeCells> cells{true, false, true, false};
    for (int bit = 0; bit < timeCodeBits; ++bit) {
        cells[levelCells + bit] = (time >> (timeCodeBits - 1 - bit) & 1) != 0;
    }
    const std::uint16_t crc = checksum(time);
    for (int bit = 0; bit < checkBits; ++bit) {
        cells[levelCells + timeCodeBits + bit] = (crc >> (checkBits - 1 - bit) & 1) != 0;
    }
    return cells;
}

// The mean brightness, 0 to 255, around the middle of a cell.
int brightness(const std::uint8_t* pixels, int width, int height, std::ptrdiff_t stride, int bytesPerPixel, int cell) {
    const double cellWidth = static_cast<double>(width) / timeCodeCells;
    const int left = static_cast<int>((cell + 0.4) * cellWidth);
    const int right = std::max(left + 1, static_cast<int>(std::lround((cell + 0.6) * cellWidth)));
    const double stripHeight = static_cast<double>(height) / timeCodeRowDivisor;
    const int top = static_cast<int>(height - 0.7 * stripHeight);
    const int bottom = std::max(top + 1, static_cast<int>(height - 0.3 * stripHeight));
    const int channels = std::min(bytesPerPixel, 3);
    long sum = 0;
    for (int y = top; y < bottom; ++y) {
        for (int x = left; x < right; ++x) {
            const std::uint8_t* pixel = pixels + y * stride + static_cast<std::ptrdiff_t>(x) * bytesPerPixel;
            for (int channel = 0; channel < channels; ++channel) {
                sum += pixel[channel];
            }
        }
    }
    return static_cast<int>(sum / (static_cast<long>(bottom - top) * (right - left) * channels));
}

} // namespace

int timeCodeTop(int height) {
    return (height - height / timeCodeRowDivisor) & ~1;
}

void writeTimeCode(std::uint8_t* plane, int width, int height, std::ptrdiff_t stride, std::int64_t milliseconds,
                   std::uint8_t black, std::uint8_t white) {
    const auto cells = cellsOf(static_cast<std::uint64_t>(milliseconds) & timeMask);
    const int top = timeCodeTop(height);
    std::uint8_t* first = plane + top * stride;
    for (int x = 0; x < width; ++x) {
        first[x] = cells[static_cast<std::size_t>(x) * timeCodeCells / width] ? white : black;
    }
    for (int y = top + 1; y < height; ++y) {
        std::memcpy(plane + y * stride, first, width);
    }
}

std::optional<std::int64_t> readTimeCode(const std::uint8_t* pixels, int width, int height, std::ptrdiff_t stride,
                                         int bytesPerPixel) {
    if (pixels == nullptr || width < timeCodeMinimumWidth || height < timeCodeRowDivisor || bytesPerPixel < 1) {
        return std::nullopt;
    }
    std::array<int, timeCodeCells> levels{};
    for (int cell = 0; cell < timeCodeCells; ++cell) {
        levels[cell] = brightness(pixels, width, height, stride, bytesPerPixel, cell);
    }
    const int white = std::min(levels[0], levels[2]);
    const int black = std::max(levels[1], levels[3]);
    if (white - black < minimumContrast) {
        return std::nullopt;
    }
    const int threshold = (levels[0] + levels[1] + levels[2] + levels[3]) / 4;
    std::uint64_t bits = 0;
    for (int cell = levelCells; cell < timeCodeCells; ++cell) {
        bits = bits << 1 | (levels[cell] > threshold ? 1 : 0);
    }
    const std::uint64_t time = bits >> checkBits;
    if (checksum(time) != (bits & 0xFFFF)) {
        return std::nullopt;
    }
    return static_cast<std::int64_t>(time);
}

} // namespace qivo
