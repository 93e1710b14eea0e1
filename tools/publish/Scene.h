#pragma once

#include "tools/publish/Camera.h"
#include "tools/publish/Planes.h"

#include <array>
#include <cstdint>
#include <memory>
#include <vector>

namespace qivo {

/** What a virtual camera stands before: a wide board of labelled fields, A1 at the upper left to P9 at the lower right,
 *  with a landmark in the middle and one each far left, right, up and down, which nothing else equals in colour.
 *
 *  It is kept at several sizes, each half the one before, for small pictures and unsharp ones. Immutable. */
class Scene {
  public:
    static constexpr int width = 2560;
    static constexpr int height = 1440;
    static constexpr int columns = 16;
    static constexpr int rows = 9;

    /** The part of each side that is seen when zoomed out, and how many times smaller it is when zoomed in. */
    static constexpr double widestPart = 1.0 / 3;
    static constexpr double magnification = 4;

    /** A disc of one colour. */
    struct Landmark {
        PanTilt direction; ///< looking there puts it in the middle of the picture
        Colour colour;
    };
    static constexpr double landmarkRadius = height / 24.0;
    static constexpr std::array<Landmark, 5> landmarks{{{{0, 0}, {1, 0, 0}},
                                                        {{-0.75, 0}, {0, 1, 0}},
                                                        {{0.75, 0}, {0, 0, 1}},
                                                        {{0, 0.75}, {1, 1, 0}},
                                                        {{0, -0.75}, {1, 0, 1}}}};

    explicit Scene(const ColourSpace& space);

    /** The scene in these colours, drawn once for all who hold it. Thread-safe. */
    [[nodiscard]] static std::shared_ptr<const Scene> shared(const ColourSpace& space);

    /** A plane at one of its sizes. */
    struct Level {
        int width = 0;
        int height = 0;
        std::vector<std::uint8_t> samples;
    };
    static constexpr int levels = 7;
    [[nodiscard]] const Level& level(std::size_t plane, int number) const { return m_levels[plane][number]; }

  private:
    std::array<std::array<Level, levels>, 3> m_levels;
};

/** A part of the scene, in its pixels. */
struct ScenePart {
    double left = 0;
    double top = 0;
    double width = 0;
    double height = 0;
};

/** What a camera at this position shows in a picture of this size. */
[[nodiscard]] ScenePart partOf(const CameraPosition& position, PictureSize picture);

/** Draws what a camera sees. Not thread-safe. */
class SceneView {
  public:
    /** Pictures of `size`, both numbers even. */
    SceneView(std::shared_ptr<const Scene> scene, PictureSize size);

    /** Fills the upper left of the planes. */
    void draw(const PicturePlanes& planes, const CameraState& camera);

  private:
    // How a plane's columns lie in a level of the scene, and its two newest rows, scaled to them.
    struct Sampler {
        const Scene::Level* level = nullptr;
        double top = 0;  // of the part, in rows of the level
        double step = 0; // rows of the level for a row of the picture
        std::vector<int> columns;
        std::vector<std::uint16_t> weights; // of the column beyond, of 256
        std::array<int, 2> rows{-1, -1};    // numbers in the level
        std::array<std::vector<std::uint16_t>, 2> scaled;

        void aim(const Scene::Level& at, const ScenePart& part, int width, int height);
        const std::vector<std::uint16_t>& row(int number, int other);
        void sample(int y, std::uint8_t* destination);
    };

    void drawPlane(std::size_t plane, std::uint8_t* data, std::ptrdiff_t stride, const ScenePart& part,
                   double sharpness);

    std::shared_ptr<const Scene> m_scene;
    PictureSize m_size;
    std::array<Sampler, 2> m_samplers; // of the nearer and the coarser level
    std::vector<std::uint8_t> m_coarse;
};

} // namespace qivo
