#include "tools/publish/TestPicture.h"

#include "tools/publish/TimeCode.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <ctime>

namespace qivo {
namespace {

constexpr const char* clockCharacters = "0123456789:.";
constexpr int clockLength = 12;
constexpr Colour darkGrey{0.1, 0.1, 0.1};

// Standard bars at 75 %, left to right.
constexpr std::array<Colour, 7> bars{
    {{0.75, 0.75, 0.75}, {0.75, 0.75, 0}, {0, 0.75, 0.75}, {0, 0.75, 0}, {0.75, 0, 0.75}, {0.75, 0, 0}, {0, 0, 0.75}}};

// Steps of the golden ratio around the circle of hues keep any few sources far apart.
constexpr double hueStep = 0.618034;
constexpr double firstHue = 0.58;

std::uint8_t blend(std::uint8_t under, std::uint8_t over, int coverage) {
    return static_cast<std::uint8_t>((under * (255 - coverage) + over * coverage + 127) / 255);
}

} // namespace

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

TestPicture::TestPicture(PictureSize size, const TestPictureLook& look) : m_size(size), m_space(look.space) {
    const std::size_t chroma = static_cast<std::size_t>(size.width / 2) * (size.height / 2);
    m_still[0].resize(static_cast<std::size_t>(size.width) * size.height);
    m_still[1].resize(chroma);
    m_still[2].resize(chroma);
    fill(0, 0, size.width, size.height, darkGrey);
    m_dark = toYCbCr(darkGrey, m_space)[0];
    if (look.note.empty()) {
        drawBars();
    } else {
        drawNote(look.note);
    }
    drawName(look);
    prepareClock();
}

int TestPicture::areaTop(int eighteenths) const {
    return m_size.height * eighteenths / areaDivisor & ~1;
}

void TestPicture::fill(int left, int top, int right, int bottom, const Colour& colour) {
    const auto samples = toYCbCr(colour, m_space);
    for (std::size_t plane = 0; plane < 3; ++plane) {
        const int shift = plane == 0 ? 0 : 1;
        const int width = m_size.width >> shift;
        for (int y = top >> shift; y < bottom >> shift; ++y) {
            std::memset(&m_still[plane][static_cast<std::size_t>(y) * width + (left >> shift)], samples[plane],
                        (right >> shift) - (left >> shift));
        }
    }
}

void TestPicture::drawBars() {
    const int count = static_cast<int>(bars.size());
    for (int i = 0; i < count; ++i) {
        fill(m_size.width * i / count & ~1, 0, m_size.width * (i + 1) / count & ~1, areaTop(runnerTop), bars[i]);
    }
}

void TestPicture::drawNote(const std::string& note) {
    const int margin = m_size.width / 20;
    const TextMask mask = renderText(note, m_size.width - 2 * margin, m_size.height * 2 / areaDivisor);
    drawText(mask, (m_size.width - mask.width) / 2, areaTop(runnerTop / 2) - mask.height / 2);
}

void TestPicture::drawName(const TestPictureLook& look) {
    const int top = areaTop(nameTop);
    const int bottom = areaTop(clockTop);
    fill(0, top, m_size.width, bottom, fromHue(firstHue + hueStep * static_cast<double>(look.hue), 0.85, 0.6));
    const int margin = m_size.width / 20;
    const TextMask mask = renderText(look.name, m_size.width - 2 * margin, bottom - top);
    drawText(mask, (m_size.width - mask.width) / 2, top);
}

void TestPicture::drawText(const TextMask& mask, int left, int top) {
    const int width = m_size.width;
    const int right = std::min(width, left + mask.width);
    const int bottom = std::min(m_size.height, top + mask.height);
    const auto coverage = [&](int x, int y) {
        return mask.coverage[static_cast<std::size_t>(y - top) * mask.width + (x - left)];
    };
    for (int y = top; y < bottom; ++y) {
        for (int x = left; x < right; ++x) {
            std::uint8_t& luma = m_still[0][static_cast<std::size_t>(y) * width + x];
            luma = blend(luma, m_space.white(), coverage(x, y));
            if (x % 2 == 0 && y % 2 == 0) {
                const std::size_t at = static_cast<std::size_t>(y / 2) * (width / 2) + x / 2;
                m_still[1][at] = blend(m_still[1][at], 128, coverage(x, y));
                m_still[2][at] = blend(m_still[2][at], 128, coverage(x, y));
            }
        }
    }
}

void TestPicture::prepareClock() {
    const int height = timeCodeTop(m_size.height) - areaTop(clockTop);
    for (std::size_t i = 0; i < m_glyphs.size(); ++i) {
        m_glyphs[i] = renderText(std::string(1, clockCharacters[i]), m_size.width / clockLength, height);
        m_glyphWidth = std::max(m_glyphWidth, m_glyphs[i].width);
    }
}

void TestPicture::draw(const PicturePlanes& planes, std::chrono::system_clock::time_point time) {
    for (std::size_t plane = 0; plane < 3; ++plane) {
        const int width = plane == 0 ? m_size.width : m_size.width / 2;
        const int height = plane == 0 ? m_size.height : m_size.height / 2;
        if (planes.stride[plane] == width) {
            std::memcpy(planes.data[plane], m_still[plane].data(), m_still[plane].size());
            continue;
        }
        for (int y = 0; y < height; ++y) {
            std::memcpy(planes.data[plane] + y * planes.stride[plane],
                        &m_still[plane][static_cast<std::size_t>(y) * width], width);
        }
    }
    const auto now = std::chrono::floor<std::chrono::milliseconds>(time.time_since_epoch());
    drawRunner(planes, now);
    drawClock(planes, now);
    for (std::size_t plane = 1; plane < 3; ++plane) {
        for (int y = timeCodeTop(m_size.height) / 2; y < m_size.height / 2; ++y) {
            std::memset(planes.data[plane] + y * planes.stride[plane], 128, m_size.width / 2);
        }
    }
    writeTimeCode(planes.data[0], m_size.width, m_size.height, planes.stride[0], now.count(), m_space.black(),
                  m_space.white());
}

// The runner's edges lie between pixels, so that it moves smoothly also where a step is less than one.
void TestPicture::drawRunner(const PicturePlanes& planes, std::chrono::milliseconds time) const {
    const double length = m_size.width / 24.0;
    const double phase = static_cast<double>(time.count() % crossing.count()) / static_cast<double>(crossing.count());
    const double left = phase * (m_size.width + length) - length;
    const int first = std::max(0, static_cast<int>(std::floor(left)));
    const int last = std::min(m_size.width - 1, static_cast<int>(std::floor(left + length)));
    const int top = areaTop(runnerTop);
    std::uint8_t* row = planes.data[0] + top * planes.stride[0];
    for (int x = first; x <= last; ++x) {
        const double covered = std::min(x + 1.0, left + length) - std::max<double>(x, left);
        row[x] = blend(m_dark, m_space.white(), static_cast<int>(std::clamp(covered, 0.0, 1.0) * 255));
    }
    for (int y = top + 1; y < areaTop(nameTop) && first <= last; ++y) {
        std::memcpy(planes.data[0] + y * planes.stride[0] + first, row + first, last - first + 1);
    }
}

void TestPicture::drawClock(const PicturePlanes& planes, std::chrono::milliseconds time) const {
    const int top = areaTop(clockTop);
    int left = (m_size.width - clockLength * m_glyphWidth) / 2;
    for (const char character : clockText(time)) {
        const TextMask& glyph = m_glyphs[std::strchr(clockCharacters, character) - clockCharacters];
        const int start = left + (m_glyphWidth - glyph.width) / 2;
        for (int y = 0; y < glyph.height; ++y) {
            std::uint8_t* row = planes.data[0] + (top + y) * planes.stride[0] + start;
            const std::uint8_t* coverage = &glyph.coverage[static_cast<std::size_t>(y) * glyph.width];
            for (int x = 0; x < glyph.width; ++x) {
                row[x] = blend(m_dark, m_space.white(), coverage[x]);
            }
        }
        left += m_glyphWidth;
    }
}

} // namespace qivo
