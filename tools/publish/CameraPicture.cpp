#include "tools/publish/CameraPicture.h"

#include "tools/publish/PositionCode.h"
#include "tools/publish/TimeCode.h"

#include <algorithm>
#include <cstring>

namespace qivo {
namespace {

// Of the width; the rest is the clock's.
constexpr double nameShare = 0.55;
constexpr double clockShare = 0.35;

int marginOf(int width) {
    return width / 40;
}

int bandHeight(PictureSize size) {
    return positionCodeTop(size.height) - CameraPicture::sceneSize(size).height;
}

} // namespace

PictureSize CameraPicture::sceneSize(PictureSize picture) {
    return {picture.width, picture.height * bandTop / areaDivisor & ~1};
}

CameraPicture::CameraPicture(PictureSize size, const ColourSpace& space, const Look& look,
                             std::shared_ptr<const Camera> camera)
    : m_size(size), m_space(space), m_band(bandColour(look.hue)),
      m_name(renderText(look.name, static_cast<int>(size.width * nameShare), bandHeight(size))),
      m_clock(static_cast<int>(size.width * clockShare), bandHeight(size)), m_camera(std::move(camera)),
      m_view(Scene::shared(space), sceneSize(size)) {}

void CameraPicture::draw(const PicturePlanes& planes, std::chrono::system_clock::time_point time) {
    const auto now = std::chrono::floor<std::chrono::milliseconds>(time.time_since_epoch());
    const CameraState state = m_camera->state();
    m_view.draw(planes, state);
    drawBand(planes, now);
    for (std::size_t plane = 1; plane < 3; ++plane) {
        for (int y = positionCodeTop(m_size.height) / 2; y < m_size.height / 2; ++y) {
            std::memset(planes.data[plane] + y * planes.stride[plane], 128, m_size.width / 2);
        }
    }
    const auto& [direction, zoom] = state.position;
    writePositionCode(planes.data[0], m_size.width, m_size.height, planes.stride[0],
                      {direction.pan, direction.tilt, zoom, state.focus}, m_space.black(), m_space.white());
    writeTimeCode(planes.data[0], m_size.width, m_size.height, planes.stride[0], now.count(), m_space.black(),
                  m_space.white());
}

void CameraPicture::drawBand(const PicturePlanes& planes, std::chrono::milliseconds time) const {
    const int top = sceneSize(m_size).height;
    fillArea(planes, {0, top, m_size.width, positionCodeTop(m_size.height)}, m_band, m_space);
    drawText(planes, m_size, m_name, marginOf(m_size.width), top, m_space);
    const int left = m_size.width - marginOf(m_size.width) - m_clock.width();
    m_clock.draw(planes.data[0] + top * planes.stride[0] + left, planes.stride[0], time, toYCbCr(m_band, m_space)[0],
                 m_space.white());
}

} // namespace qivo
