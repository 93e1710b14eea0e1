#include "tests/tools/Canvas.h"
#include "tools/publish/CameraPicture.h"
#include "tools/publish/PositionCode.h"
#include "tools/publish/TimeCode.h"

#include <gtest/gtest.h>

#include <cmath>
#include <cstdlib>

namespace qivo {
namespace {

using test::Canvas;

const std::chrono::system_clock::time_point noon{std::chrono::milliseconds(1795230154682)};

CameraState looking(PanTilt direction, double zoom = 0, double focus = Camera::sharpFocus) {
    CameraState state;
    state.position = {direction, zoom};
    state.focus = focus;
    return state;
}

Canvas seen(PictureSize size, const CameraState& state) {
    Canvas canvas(size);
    SceneView(Scene::shared(bt709), size).draw(canvas.planes(), state);
    return canvas;
}

bool isColour(const std::array<std::uint8_t, 3>& sample, const Colour& colour) {
    const auto wanted = toYCbCr(colour, bt709);
    return std::abs(sample[0] - wanted[0]) < 12 && std::abs(sample[1] - wanted[1]) < 12 &&
           std::abs(sample[2] - wanted[2]) < 12;
}

// Where a landmark's colour is, and how much of it, in shares of the picture.
struct Patch {
    double x = 0;
    double y = 0;
    double share = 0;
};

Patch patchOf(const Canvas& canvas, const Colour& colour) {
    double sumX = 0;
    double sumY = 0;
    double count = 0;
    for (int y = 0; y < canvas.size.height; ++y) {
        for (int x = 0; x < canvas.size.width; ++x) {
            if (isColour(canvas.at(x, y), colour)) {
                sumX += x + 0.5;
                sumY += y + 0.5;
                ++count;
            }
        }
    }
    return {sumX / count / canvas.size.width, sumY / count / canvas.size.height,
            count / canvas.size.width / canvas.size.height};
}

// How much neighbours differ.
double detail(const Canvas& canvas) {
    double sum = 0;
    for (int y = 0; y < canvas.size.height; ++y) {
        for (int x = 1; x < canvas.size.width; ++x) {
            sum += std::abs(canvas.at(x, y)[0] - canvas.at(x - 1, y)[0]);
        }
    }
    return sum;
}

constexpr PictureSize wide{640, 360};

TEST(SceneTest, lookingAtALandmarkPutsItInTheMiddle) {
    for (const Scene::Landmark& landmark : Scene::landmarks) {
        const Patch patch = patchOf(seen(wide, looking(landmark.direction)), landmark.colour);
        EXPECT_NEAR(patch.x, 0.5, 0.01);
        EXPECT_NEAR(patch.y, 0.5, 0.01);
    }
}

TEST(SceneTest, nothingElseHasALandmarksColour) {
    const auto scene = Scene::shared(bt709);
    const auto& luma = scene->level(0, 1); // as large as the chroma planes
    for (const Scene::Landmark& landmark : Scene::landmarks) {
        double count = 0;
        for (std::size_t i = 0; i < luma.samples.size(); ++i) {
            count += isColour({luma.samples[i], scene->level(1, 0).samples[i], scene->level(2, 0).samples[i]},
                              landmark.colour)
                         ? 1
                         : 0;
        }
        const double disc = std::acos(-1.0) * std::pow(Scene::landmarkRadius / 2, 2);
        EXPECT_NEAR(count, disc, 0.03 * disc);
    }
}

TEST(SceneTest, lookingRightMovesWhatIsSeenToTheLeftAndLookingUpMovesItDown) {
    const Colour red = Scene::landmarks[0].colour;
    const Patch right = patchOf(seen(wide, looking({0.25, 0})), red);
    EXPECT_NEAR(right.x, 0.25, 0.01);
    EXPECT_NEAR(right.y, 0.5, 0.01);
    const Patch up = patchOf(seen(wide, looking({0, 0.25})), red);
    EXPECT_NEAR(up.x, 0.5, 0.01);
    EXPECT_NEAR(up.y, 0.75, 0.01);
}

TEST(SceneTest, movementsOfAPartOfAPixelShow) {
    const Canvas one = seen(wide, looking({0, 0}));
    const Canvas other = seen(wide, looking({0.0005, 0}));
    EXPECT_NE(one.samples[0], other.samples[0]);
}

TEST(SceneTest, zoomingInMagnifiesByTheStatedFactor) {
    const Colour red = Scene::landmarks[0].colour;
    const double far = patchOf(seen(wide, looking({}, 0)), red).share;
    const double near = patchOf(seen(wide, looking({}, 1)), red).share;
    EXPECT_NEAR(std::sqrt(near / far), Scene::magnification, 0.15);
}

TEST(SceneTest, everySizeShowsTheSamePart) {
    const Colour red = Scene::landmarks[0].colour;
    const CameraState state = looking({0.2, 0.1}, 0.3);
    const Patch large = patchOf(seen({1280, 720}, state), red);
    for (const PictureSize size : {PictureSize{640, 360}, PictureSize{320, 180}, PictureSize{160, 90}}) {
        const Patch patch = patchOf(seen(size, state), red);
        EXPECT_NEAR(patch.x, large.x, 0.01) << size.width;
        EXPECT_NEAR(patch.y, large.y, 0.01) << size.width;
        EXPECT_NEAR(patch.share, large.share, 0.15 * large.share) << size.width;
    }
}

TEST(SceneTest, whatIsOutOfFocusIsBlurredTheMoreTheFarther) {
    const double sharp = detail(seen(wide, looking({0.1, 0.1})));
    double last = sharp;
    for (const double focus : {0.6, 0.7, 0.8, 0.9, 1.0}) {
        const double blurred = detail(seen(wide, looking({0.1, 0.1}, 0, focus)));
        EXPECT_LT(blurred, last) << focus;
        last = blurred;
    }
    EXPECT_LT(last, 0.3 * sharp);
    EXPECT_LT(detail(seen(wide, looking({0.1, 0.1}, 0, 0))), 0.3 * sharp);
}

TEST(SceneTest, cornersAndOddShapesStayWithinTheScene) {
    for (const PictureSize size :
         {PictureSize{128, 72}, PictureSize{128, 4096}, PictureSize{4096, 72}, PictureSize{130, 74}}) {
        for (const double zoom : {0.0, 1.0}) {
            for (const double focus : {0.0, 0.5, 1.0}) {
                const Canvas canvas = seen(size, looking({1, -1}, zoom, focus));
                const ScenePart part = partOf({{1, -1}, zoom}, size);
                EXPECT_LE(part.left + part.width, Scene::width + 1e-6);
                EXPECT_LE(part.top + part.height, Scene::height + 1e-6);
                EXPECT_GE(canvas.at(size.width - 1, size.height - 1)[0], 16);
                EXPECT_EQ(canvas.samples[0][size.width], 1) << "padding";
                const Canvas opposite = seen(size, looking({-1, 1}, zoom, focus));
                EXPECT_GE(opposite.at(0, 0)[0], 16);
            }
        }
    }
}

TEST(SceneTest, isDrawnOnceForAllWhoHoldIt) {
    const auto one = Scene::shared(bt709);
    EXPECT_EQ(one, Scene::shared(bt709));
    EXPECT_NE(one, Scene::shared(bt601));
}

class CameraPictureTest : public testing::Test {
  protected:
    Canvas drawn(PictureSize size) {
        Canvas canvas(size);
        CameraPicture(size, bt709, {"Cam", 1}, m_camera).draw(canvas.planes(), noon);
        return canvas;
    }
    static std::optional<PositionCode> positionIn(const Canvas& canvas) {
        return readPositionCode(canvas.samples[0].data(), canvas.size.width, canvas.size.height, canvas.stride(0), 1);
    }

    Camera::Time m_now{};
    std::shared_ptr<Camera> m_camera = std::make_shared<Camera>([this] { return m_now; });
};

TEST_F(CameraPictureTest, saysWhenItWasDrawnAndWhereTheCameraStands) {
    ASSERT_TRUE(m_camera->moveTo(PanTilt{0.5, -0.25}, 0.75));
    ASSERT_TRUE(m_camera->setFocus(0.25));
    m_now += std::chrono::hours(1);
    for (const PictureSize size : {PictureSize{1280, 720}, PictureSize{320, 180}, PictureSize{128, 72}}) {
        const Canvas canvas = drawn(size);
        EXPECT_EQ(readTimeCode(canvas.samples[0].data(), size.width, size.height, canvas.stride(0), 1),
                  std::chrono::duration_cast<std::chrono::milliseconds>(noon.time_since_epoch()).count());
        const auto position = positionIn(canvas);
        ASSERT_TRUE(position) << size.width;
        EXPECT_NEAR(position->pan, 0.5, 0.001);
        EXPECT_NEAR(position->tilt, -0.25, 0.001);
        EXPECT_NEAR(position->zoom, 0.75, 0.002);
        EXPECT_NEAR(position->focus, 0.25, 0.002);
    }
}

TEST_F(CameraPictureTest, showsWhatTheCameraSeesAboveABandOfTheSourcesHue) {
    const PictureSize size{640, 360};
    ASSERT_TRUE(m_camera->moveTo(PanTilt{0.25, 0}, std::nullopt));
    m_now += std::chrono::hours(1);
    const Canvas canvas = drawn(size);
    const int sceneHeight = CameraPicture::sceneSize(size).height;
    EXPECT_TRUE(isColour(canvas.at(size.width / 4, sceneHeight / 2), Scene::landmarks[0].colour));
    const auto band = toYCbCr(bandColour(1), bt709);
    EXPECT_EQ(canvas.at(2, sceneHeight + 2), band);
    EXPECT_NE(band, toYCbCr(bandColour(0), bt709));
    bool written = false;
    for (int x = 0; x < size.width / 2; ++x) {
        written = written || canvas.at(x, (sceneHeight + positionCodeTop(size.height)) / 2)[0] > 200;
    }
    EXPECT_TRUE(written) << "the name";
    EXPECT_EQ(canvas.samples[0][size.width], 1) << "padding";
}

TEST(PositionCodeTest, readsWhatWasWrittenAtTheMiddleAndTheEndsOfEveryRange) {
    std::vector<std::uint8_t> plane(320 * 180);
    for (const PositionCode& wanted :
         {PositionCode{0, 0, 0, 0.5}, PositionCode{-1, 1, 0, 1}, PositionCode{1, -1, 1, 0}}) {
        writePositionCode(plane.data(), 320, 180, 320, wanted);
        const auto read = readPositionCode(plane.data(), 320, 180, 320, 1);
        ASSERT_TRUE(read);
        EXPECT_EQ(read->pan, wanted.pan);
        EXPECT_EQ(read->tilt, wanted.tilt);
        EXPECT_EQ(read->zoom, wanted.zoom);
        EXPECT_EQ(read->focus, wanted.focus);
    }
}

TEST(PositionCodeTest, aPictureWithoutTheStripHasNone) {
    const std::vector<std::uint8_t> plane(320 * 180, 100);
    EXPECT_FALSE(readPositionCode(plane.data(), 320, 180, 320, 1));
    EXPECT_FALSE(readPositionCode(nullptr, 320, 180, 320, 1));
}

} // namespace
} // namespace qivo
