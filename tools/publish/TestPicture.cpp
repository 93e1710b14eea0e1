#include "tools/publish/TestPicture.h"

#include "tools/publish/TimeCode.h"

#include <algorithm>
#include <cmath>
#include <cstring>

namespace qivo {
namespace {

constexpr Colour darkGrey{0.1, 0.1, 0.1};

// Standard bars at 75 %, left to right.
constexpr std::array<Colour, 7> bars{
    {{0.75, 0.75, 0.75}, {0.75, 0.75, 0}, {0, 0.75, 0.75}, {0, 0.75, 0}, {0.75, 0, 0.75}, {0.75, 0, 0}, {0, 0, 0.75}}};

} // namespace

TestPicture::TestPicture(PictureSize size, const TestPictureLook& look)
    : m_size(size), m_space(look.space), m_clock(size.width, timeCodeTop(size.height) - areaTop(clockTop)),
      m_dark(toYCbCr(darkGrey, look.space)[0]) {
    const std::size_t chroma = static_cast<std::size_t>(size.width / 2) * (size.height / 2);
    m_still[0].resize(static_cast<std::size_t>(size.width) * size.height);
    m_still[1].resize(chroma);
    m_still[2].resize(chroma);
    fillArea(still(), {0, 0, size.width, size.height}, darkGrey, m_space);
    if (look.note.empty()) {
        drawBars();
    } else {
        drawNote(look.note);
    }
    drawName(look);
}

int TestPicture::areaTop(int eighteenths) const {
    return m_size.height * eighteenths / areaDivisor & ~1;
}

PicturePlanes TestPicture::still() {
    return {{m_still[0].data(), m_still[1].data(), m_still[2].data()},
            {m_size.width, m_size.width / 2, m_size.width / 2}};
}

void TestPicture::drawBars() {
    const int count = static_cast<int>(bars.size());
    for (int i = 0; i < count; ++i) {
        const PictureArea area{m_size.width * i / count & ~1, 0, m_size.width * (i + 1) / count & ~1,
                               areaTop(runnerTop)};
        fillArea(still(), area, bars[i], m_space);
    }
}

void TestPicture::drawNote(const std::string& note) {
    const int margin = m_size.width / 20;
    const TextMask mask = renderText(note, m_size.width - 2 * margin, m_size.height * 2 / areaDivisor);
    drawText(still(), m_size, mask, (m_size.width - mask.width) / 2, areaTop(runnerTop / 2) - mask.height / 2, m_space);
}

void TestPicture::drawName(const TestPictureLook& look) {
    const int top = areaTop(nameTop);
    const int bottom = areaTop(clockTop);
    fillArea(still(), {0, top, m_size.width, bottom}, bandColour(look.hue), m_space);
    const int margin = m_size.width / 20;
    const TextMask mask = renderText(look.name, m_size.width - 2 * margin, bottom - top);
    drawText(still(), m_size, mask, (m_size.width - mask.width) / 2, top, m_space);
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
    const int left = (m_size.width - m_clock.width()) / 2;
    m_clock.draw(planes.data[0] + areaTop(clockTop) * planes.stride[0] + left, planes.stride[0], time, m_dark,
                 m_space.white());
}

} // namespace qivo
