#include "tools/publish/Planes.h"

#include <algorithm>
#include <cstring>
#include <ctime>

namespace qivo {
namespace {

constexpr const char* clockCharacters = "0123456789:.";

// Steps of the golden ratio around the circle of hues keep any few sources far apart.
constexpr double hueStep = 0.618034;
constexpr double firstHue = 0.58;

} // namespace

void fillArea(const PicturePlanes& planes, const PictureArea& area, const Colour& colour, const ColourSpace& space) {
    const auto samples = toYCbCr(colour, space);
    for (std::size_t plane = 0; plane < 3; ++plane) {
        const int shift = plane == 0 ? 0 : 1;
        for (int y = area.top >> shift; y < area.bottom >> shift; ++y) {
            std::memset(planes.data[plane] + y * planes.stride[plane] + (area.left >> shift), samples[plane],
                        (area.right >> shift) - (area.left >> shift));
        }
    }
}

void drawText(const PicturePlanes& planes, PictureSize size, const TextMask& mask, int left, int top,
              const ColourSpace& space) {
    const int right = std::min(size.width, left + mask.width);
    const int bottom = std::min(size.height, top + mask.height);
    for (int y = top; y < bottom; ++y) {
        const std::uint8_t* coverage = &mask.coverage[static_cast<std::size_t>(y - top) * mask.width];
        std::uint8_t* luma = planes.data[0] + y * planes.stride[0];
        for (int x = left; x < right; ++x) {
            luma[x] = blend(luma[x], space.white(), coverage[x - left]);
            if (x % 2 == 0 && y % 2 == 0) {
                for (const std::size_t plane : {1U, 2U}) {
                    std::uint8_t& chroma = planes.data[plane][y / 2 * planes.stride[plane] + x / 2];
                    chroma = blend(chroma, 128, coverage[x - left]);
                }
            }
        }
    }
}

std::string clockText(std::chrono::milliseconds sinceEpoch) {
    const std::time_t seconds = std::chrono::floor<std::chrono::seconds>(sinceEpoch).count();
    std::tm local{};
    localtime_r(&seconds, &local);
    std::array<char, 16> text{};
    std::strftime(text.data(), text.size(), "%H:%M:%S.", &local);
    const auto thousandths = static_cast<int>(sinceEpoch.count() - seconds * 1000);
    std::string result = text.data();
    for (const int divisor : {100, 10, 1}) {
        result += static_cast<char>('0' + thousandths / divisor % 10);
    }
    return result;
}

ClockFace::ClockFace(int width, int height) {
    for (std::size_t i = 0; i < m_glyphs.size(); ++i) {
        m_glyphs[i] = renderText(std::string(1, clockCharacters[i]), width / length, height);
        m_glyphWidth = std::max(m_glyphWidth, m_glyphs[i].width);
    }
}

void ClockFace::draw(std::uint8_t* corner, std::ptrdiff_t stride, std::chrono::milliseconds sinceEpoch,
                     std::uint8_t dark, std::uint8_t white) const {
    int left = 0;
    for (const char character : clockText(sinceEpoch)) {
        const TextMask& glyph = m_glyphs[std::strchr(clockCharacters, character) - clockCharacters];
        const int start = left + (m_glyphWidth - glyph.width) / 2;
        for (int y = 0; y < glyph.height; ++y) {
            std::uint8_t* row = corner + y * stride + start;
            const std::uint8_t* coverage = &glyph.coverage[static_cast<std::size_t>(y) * glyph.width];
            for (int x = 0; x < glyph.width; ++x) {
                row[x] = blend(dark, white, coverage[x]);
            }
        }
        left += m_glyphWidth;
    }
}

Colour bandColour(std::size_t source) {
    return fromHue(firstHue + hueStep * static_cast<double>(source), 0.85, 0.6);
}

} // namespace qivo
