#include "tools/publish/Scene.h"

#include <algorithm>
#include <cmath>
#include <map>
#include <mutex>

namespace qivo {
namespace {

constexpr int fieldWidth = Scene::width / Scene::columns;
constexpr int fieldHeight = Scene::height / Scene::rows;
constexpr int lineWidth = 4;

static_assert(fieldWidth * Scene::columns == Scene::width && fieldHeight * Scene::rows == Scene::height);

// Steps of the scene's pixels to one of the picture beyond which the next smaller size is taken.
constexpr double largestStep = 1.25;

// Sizes further down that a picture wholly out of focus is taken from.
constexpr double strongestBlur = 4.5;

constexpr int weightOne = 256;

Scene::Level makeLevel(int width, int height) {
    return {width, height, std::vector<std::uint8_t>(static_cast<std::size_t>(width) * height)};
}

PicturePlanes planesOf(std::array<Scene::Level*, 3> levels) {
    PicturePlanes planes;
    for (std::size_t plane = 0; plane < 3; ++plane) {
        planes.data[plane] = levels[plane]->samples.data();
        planes.stride[plane] = levels[plane]->width;
    }
    return planes;
}

// Muted, so that no field is taken for a landmark.
Colour fieldColour(int column, int row) {
    return fromHue(static_cast<double>(column) / Scene::columns, 0.3, 0.35 + 0.4 * row / (Scene::rows - 1));
}

std::string fieldLabel(int column, int row) {
    return std::string(1, static_cast<char>('A' + column)) + std::to_string(row + 1);
}

void drawFields(const PicturePlanes& planes, const ColourSpace& space) {
    constexpr Colour line{0.1, 0.1, 0.1};
    fillArea(planes, {0, 0, Scene::width, Scene::height}, line, space);
    for (int row = 0; row < Scene::rows; ++row) {
        for (int column = 0; column < Scene::columns; ++column) {
            const int left = column * fieldWidth;
            const int top = row * fieldHeight;
            fillArea(planes, {left + lineWidth, top + lineWidth, left + fieldWidth, top + fieldHeight},
                     fieldColour(column, row), space);
            const TextMask label = renderText(fieldLabel(column, row), fieldWidth, fieldHeight / 2);
            drawText(planes, {Scene::width, Scene::height}, label, left + (fieldWidth - label.width) / 2,
                     top + fieldHeight / 4, space);
        }
    }
}

// Squares the colour of the disc at its place; the edge is sharp.
void drawLandmark(const PicturePlanes& planes, const Scene::Landmark& landmark, const ColourSpace& space) {
    const double centreX = Scene::width / 2.0 + landmark.direction.pan * Scene::width * (1 - Scene::widestPart) / 2;
    const double centreY = Scene::height / 2.0 - landmark.direction.tilt * Scene::height * (1 - Scene::widestPart) / 2;
    const int radius = static_cast<int>(Scene::landmarkRadius);
    for (int dy = -radius & ~1; dy < radius; dy += 2) {
        const double half = std::sqrt(std::max(0.0, Scene::landmarkRadius * Scene::landmarkRadius - dy * dy));
        const int top = static_cast<int>(centreY + dy) & ~1;
        const PictureArea line{static_cast<int>(centreX - half) & ~1, top, static_cast<int>(centreX + half) & ~1,
                               top + 2};
        fillArea(planes, line, landmark.colour, space);
    }
}

Scene::Level halved(const Scene::Level& from) {
    Scene::Level to = makeLevel(from.width / 2, from.height / 2);
    for (int y = 0; y < to.height; ++y) {
        const std::uint8_t* upper = &from.samples[static_cast<std::size_t>(2 * y) * from.width];
        const std::uint8_t* lower = upper + from.width;
        std::uint8_t* row = &to.samples[static_cast<std::size_t>(y) * to.width];
        for (int x = 0; x < to.width; ++x, upper += 2, lower += 2) {
            row[x] = static_cast<std::uint8_t>((upper[0] + upper[1] + lower[0] + lower[1] + 2) / 4);
        }
    }
    return to;
}

double unsharpness(const CameraState& camera) {
    return std::abs(camera.focus - Camera::sharpFocus) / std::max(Camera::sharpFocus, 1 - Camera::sharpFocus);
}

} // namespace

Scene::Scene(const ColourSpace& space) {
    m_levels[0][0] = makeLevel(width, height);
    m_levels[1][0] = makeLevel(width / 2, height / 2);
    m_levels[2][0] = makeLevel(width / 2, height / 2);
    const PicturePlanes planes = planesOf({&m_levels[0][0], &m_levels[1][0], &m_levels[2][0]});
    drawFields(planes, space);
    for (const Landmark& landmark : landmarks) {
        drawLandmark(planes, landmark, space);
    }
    for (auto& plane : m_levels) {
        for (std::size_t number = 1; number < plane.size(); ++number) {
            plane[number] = halved(plane[number - 1]);
        }
    }
}

std::shared_ptr<const Scene> Scene::shared(const ColourSpace& space) {
    static std::mutex mutex;
    static std::map<std::string, std::weak_ptr<const Scene>> scenes;
    const std::lock_guard lock(mutex);
    auto& known = scenes[space.colorimetry];
    std::shared_ptr<const Scene> scene = known.lock();
    if (!scene) {
        scene = std::make_shared<const Scene>(space);
        known = scene;
    }
    return scene;
}

ScenePart partOf(const CameraPosition& position, PictureSize picture) {
    const double scale =
        std::min(Scene::width * Scene::widestPart / picture.width, Scene::height * Scene::widestPart / picture.height) /
        std::pow(Scene::magnification, position.zoom);
    const double width = picture.width * scale;
    const double height = picture.height * scale;
    const double centreX = Scene::width / 2.0 + position.direction.pan * Scene::width * (1 - Scene::widestPart) / 2;
    const double centreY = Scene::height / 2.0 - position.direction.tilt * Scene::height * (1 - Scene::widestPart) / 2;
    return {centreX - width / 2, centreY - height / 2, width, height};
}

SceneView::SceneView(std::shared_ptr<const Scene> scene, PictureSize size)
    : m_scene(std::move(scene)), m_size(size), m_coarse(static_cast<std::size_t>(size.width)) {}

void SceneView::draw(const PicturePlanes& planes, const CameraState& camera) {
    const ScenePart part = partOf(camera.position, m_size);
    const double step = part.width / m_size.width;
    const double size = std::max(0.0, std::ceil(std::log2(step / largestStep)));
    const double number = std::min<double>(Scene::levels - 1, size + strongestBlur * unsharpness(camera));
    for (std::size_t plane = 0; plane < 3; ++plane) {
        drawPlane(plane, planes.data[plane], planes.stride[plane], part, number);
    }
}

void SceneView::drawPlane(std::size_t plane, std::uint8_t* data, std::ptrdiff_t stride, const ScenePart& part,
                          double number) {
    const int width = plane == 0 ? m_size.width : m_size.width / 2;
    const int height = plane == 0 ? m_size.height : m_size.height / 2;
    const int nearer = static_cast<int>(number);
    const int share = static_cast<int>(std::lround((number - nearer) * weightOne)); // of the coarser level
    m_samplers[0].aim(m_scene->level(plane, nearer), part, width, height);
    if (share != 0) {
        m_samplers[1].aim(m_scene->level(plane, nearer + 1), part, width, height);
    }
    for (int y = 0; y < height; ++y) {
        std::uint8_t* row = data + y * stride;
        m_samplers[0].sample(y, row);
        if (share != 0) {
            m_samplers[1].sample(y, m_coarse.data());
            for (int x = 0; x < width; ++x) {
                row[x] = static_cast<std::uint8_t>(
                    (row[x] * (weightOne - share) + m_coarse[x] * share + weightOne / 2) / weightOne);
            }
        }
    }
}

void SceneView::Sampler::aim(const Scene::Level& at, const ScenePart& part, int width, int height) {
    level = &at;
    const double scaleX = static_cast<double>(at.width) / Scene::width;
    const double scaleY = static_cast<double>(at.height) / Scene::height;
    top = part.top * scaleY;
    step = part.height * scaleY / height;
    rows = {-1, -1};
    columns.resize(width);
    weights.resize(width);
    for (int x = 0; x < width; ++x) {
        const double place =
            std::clamp((part.left + (x + 0.5) * part.width / width) * scaleX - 0.5, 0.0, at.width - 1.001);
        columns[x] = static_cast<int>(place);
        weights[x] = static_cast<std::uint16_t>((place - columns[x]) * weightOne);
    }
    for (auto& buffer : scaled) {
        buffer.resize(width);
    }
}

// One of the two kept rows; `other` is the number of the one that must stay.
const std::vector<std::uint16_t>& SceneView::Sampler::row(int number, int other) {
    for (const std::size_t kept : {0U, 1U}) {
        if (rows[kept] == number) {
            return scaled[kept];
        }
    }
    const std::size_t place = rows[0] == other ? 1 : 0;
    rows[place] = number;
    const std::uint8_t* from = &level->samples[static_cast<std::size_t>(number) * level->width];
    for (std::size_t x = 0; x < columns.size(); ++x) {
        const std::uint8_t* pair = from + columns[x];
        scaled[place][x] = static_cast<std::uint16_t>(pair[0] * (weightOne - weights[x]) + pair[1] * weights[x]);
    }
    return scaled[place];
}

void SceneView::Sampler::sample(int y, std::uint8_t* destination) {
    const double place = std::clamp(top + (y + 0.5) * step - 0.5, 0.0, level->height - 1.001);
    const int number = static_cast<int>(place);
    const auto weight = static_cast<std::uint32_t>((place - number) * weightOne);
    const std::uint16_t* upper = row(number, number + 1).data();
    const std::uint16_t* lower = row(number + 1, number).data();
    constexpr std::uint32_t half = weightOne * weightOne / 2;
    for (std::size_t x = 0; x < columns.size(); ++x) {
        destination[x] = static_cast<std::uint8_t>((upper[x] * (weightOne - weight) + lower[x] * weight + half) >> 16);
    }
}

} // namespace qivo
