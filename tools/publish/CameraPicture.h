#pragma once

#include "tools/publish/Camera.h"
#include "tools/publish/Planes.h"
#include "tools/publish/Scene.h"

#include <array>
#include <chrono>
#include <memory>
#include <string>
#include <vector>

namespace qivo {

/** The picture of a virtual camera: above what it sees; below a band of the source's hue with the source's name at the
 *  left and a running clock at the right, the position code of PositionCode.h and the time code of TimeCode.h.
 *  Not thread-safe. */
class CameraPicture {
  public:
    /** The row, in eighteenths of the height, at which the band begins. */
    static constexpr int bandTop = 14;
    static constexpr int areaDivisor = 18;

    struct Look {
        std::string name;
        std::size_t hue = 0; ///< number of the source
    };

    CameraPicture(PictureSize size, const ColourSpace& space, const Look& look, std::shared_ptr<const Camera> camera);

    /** Fills the planes, which have the size given at construction, with what the camera sees now. */
    void draw(const PicturePlanes& planes, std::chrono::system_clock::time_point time);

    /** The size of the part that shows the scene. */
    [[nodiscard]] static PictureSize sceneSize(PictureSize picture);

  private:
    void drawBand(const PicturePlanes& planes, std::chrono::milliseconds time) const;

    PictureSize m_size;
    ColourSpace m_space;
    Colour m_band;
    TextMask m_name;
    ClockFace m_clock;
    std::shared_ptr<const Camera> m_camera;
    SceneView m_view;
};

} // namespace qivo
