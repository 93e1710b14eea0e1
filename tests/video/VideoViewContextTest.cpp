// What the view draws, in a context without a window.

#include "app/AppData.h"
#include "platform/FairLock.h"
#include "tests/fake/FakeQivo.h"
#include "tests/gl/EglContext.h"
#include "video/VideoView.h"

#include <QApplication>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace qivo::test {
namespace {

constexpr float kWide = 16.0F / 9.0F;
constexpr Pixel kClear = {0, 0, 0, 0};
constexpr Pixel kRed = {255, 0, 0, 255};
constexpr Pixel kGreen = {0, 255, 0, 255};

/// The windowless context as a view's.
class WindowlessContext final : public GLContext {
  public:
    explicit WindowlessContext(EglContext& egl) : m_egl(egl) {}
    void makeCurrentContext() override { m_egl.makeCurrent(); }
    void setSwapInterval(int /*interval*/) override {}
    void lock() override { m_lock.lock(); }
    void unlock() override { m_lock.unlock(); }
    void flushDrawable() override {}
    void afterNextFlush(std::function<void()> /*done*/) override {}
    std::shared_ptr<const DisplayRefresh> display() const override { return m_display; }

  private:
    EglContext& m_egl;
    FairLock m_lock;
    std::shared_ptr<DisplayRefresh> m_display = std::make_shared<DisplayRefresh>();
};

class UnlinkedView final : public VideoView {
  protected:
    std::unique_ptr<DisplayLink> newDisplayLink() override { return nullptr; }
};

class VideoViewContextTest : public testing::Test {
  protected:
    static constexpr int kWidth = 160;
    static constexpr int kHeight = 90;

    static void SetUpTestSuite() {
        static int count = 1;
        static char name[] = "video-view-context-test"; // NOLINT(modernize-avoid-c-arrays): argv is an array
        static char* arguments[] = {name, nullptr};
        qputenv("QT_QPA_PLATFORM", "offscreen");
        s_application = std::make_unique<QApplication>(count, static_cast<char**>(arguments));
    }
    static void TearDownTestSuite() { s_application.reset(); }

    void SetUp() override {
        fake.reset();
        std::string error;
        egl = EglContext::create(kWidth, kHeight, error);
        ASSERT_TRUE(egl) << error;
        AppData::inst()->setIsLowBandwidth(false);
        AppData::inst()->setQIVOSourceInfoNamed("STUDIO (Cam 1)", "fake://one");
        view = std::make_unique<UnlinkedView>();
        view->setOpenGLContext(std::make_shared<WindowlessContext>(*egl));
        view->resize(kWidth, kHeight);
        view->prepareOpenGL();
        EXPECT_THAT(takeGlErrors(), testing::IsEmpty());
    }

    void TearDown() override {
        view.reset();
        EXPECT_THAT(takeGlErrors(), testing::IsEmpty());
        EXPECT_EQ(fake.misuse(), std::vector<std::string>());
        fake.reset();
    }

    /// A core profile refuses to enable a texture target; nothing else may go wrong.
    static void expectOnlyTheKeptErrors() {
        EXPECT_THAT(takeGlErrors(), testing::Each(testing::Eq("GL_INVALID_ENUM")));
    }

    void capture() {
        EXPECT_TRUE(view->captureNewVideoSample());
        expectOnlyTheKeptErrors();
    }

    void draw() {
        view->drawView();
        expectOnlyTheKeptErrors();
    }

    /// Pixels that are not as a box of one colour on the clear colour would have them; rows from the top.
    int differences(int left, int top, int width, int height, Pixel colour) const {
        const auto pixels = egl->pixels();
        int wrong = 0;
        for (int y = 0; y < kHeight; ++y) {
            for (int x = 0; x < kWidth; ++x) {
                const bool inside = x >= left && x < left + width && y >= top && y < top + height;
                wrong += pixels[static_cast<std::size_t>(y * kWidth + x)] != (inside ? colour : kClear) ? 1 : 0;
            }
        }
        return wrong;
    }

    /// Four quarters of different colours, in rows with padding that must never be seen.
    static FakeQivo::Capture quarters(int width, int height, int stride) {
        FakeQivo::Capture capture;
        capture.type = QIVOlib_frame_type_video;
        capture.pixels.assign(static_cast<std::size_t>(stride) * static_cast<std::size_t>(height), 0x77);
        for (int y = 0; y < height; ++y) {
            for (int x = 0; x < width; ++x) {
                std::uint8_t* pixel = capture.pixels.data() + static_cast<std::ptrdiff_t>(y) * stride + 4 * x;
                pixel[0] = y < height / 2 ? 255 : 0;
                pixel[1] = x < width / 2 ? 255 : 0;
                pixel[2] = 128;
                pixel[3] = 255;
            }
        }
        capture.video.xres = width;
        capture.video.yres = height;
        capture.video.picture_aspect_ratio = kWide;
        capture.video.line_stride_in_bytes = stride;
        return capture;
    }

    void expectQuarters() const {
        EXPECT_EQ(egl->pixel(kWidth / 4, kHeight / 4), (Pixel{255, 255, 128, 255}));
        EXPECT_EQ(egl->pixel(3 * kWidth / 4, kHeight / 4), (Pixel{255, 0, 128, 255}));
        EXPECT_EQ(egl->pixel(kWidth / 4, 3 * kHeight / 4), (Pixel{0, 255, 128, 255}));
        EXPECT_EQ(egl->pixel(3 * kWidth / 4, 3 * kHeight / 4), (Pixel{0, 0, 128, 255}));
    }

    FakeQivo& fake = FakeQivo::instance();
    std::unique_ptr<EglContext> egl;
    std::unique_ptr<UnlinkedView> view;

  private:
    inline static std::unique_ptr<QApplication> s_application;
};

TEST_F(VideoViewContextTest, WithoutAFrameAllIsTransparentBlack) {
    egl->clear({9, 9, 9, 9});
    draw();
    EXPECT_EQ(differences(0, 0, 0, 0, kClear), 0);
}

TEST_F(VideoViewContextTest, AFrameOfTheViewsShapeFillsIt) {
    fake.addVideo(64, 36, 0xff0000ff, kWide);
    capture();
    draw();
    EXPECT_EQ(differences(0, 0, kWidth, kHeight, kRed), 0);
}

TEST_F(VideoViewContextTest, TheNextFrameOfTheSameGeometryReplacesIt) {
    fake.addVideo(64, 36, 0xff0000ff, kWide);
    capture();
    fake.addVideo(64, 36, 0x00ff00ff, kWide);
    capture();
    draw();
    EXPECT_EQ(differences(0, 0, kWidth, kHeight, kGreen), 0);
}

TEST_F(VideoViewContextTest, AFrameOfAnotherSizeReplacesIt) {
    fake.addVideo(64, 36, 0xff0000ff, kWide);
    capture();
    fake.addVideo(31, 17, 0x00ff00ff, kWide);
    capture();
    draw();
    EXPECT_EQ(differences(0, 0, kWidth, kHeight, kGreen), 0);
}

TEST_F(VideoViewContextTest, ANarrowPictureHasClearBarsAtTheSides) {
    fake.addVideo(64, 64, 0xff0000ff, 1);
    capture();
    draw();
    EXPECT_EQ(differences(35, 0, 90, kHeight, kRed), 0);
}

TEST_F(VideoViewContextTest, AWidePictureHasClearBarsAboveAndBelow) {
    fake.addVideo(64, 16, 0xff0000ff, 4);
    capture();
    draw();
    EXPECT_EQ(differences(0, 25, kWidth, 40, kRed), 0);
}

TEST_F(VideoViewContextTest, BarsAreClearedWhereAPictureWasBefore) {
    fake.addVideo(64, 36, 0xff0000ff, kWide);
    capture();
    draw();
    fake.addVideo(64, 36, 0xff0000ff, 1);
    capture();
    draw();
    EXPECT_EQ(differences(35, 0, 90, kHeight, kRed), 0);
}

TEST_F(VideoViewContextTest, AnAspectOfZeroShowsNothing) {
    fake.addVideo(64, 36, 0xff0000ff, 0);
    capture();
    draw();
    EXPECT_EQ(differences(0, 0, 0, 0, kRed), 0);
}

TEST_F(VideoViewContextTest, TheFirstRowIsOnTop) {
    fake.addCapture(quarters(64, 36, 256));
    capture();
    draw();
    expectQuarters();
}

TEST_F(VideoViewContextTest, PaddingBetweenRowsIsSkippedAlsoInUpdates) {
    fake.addCapture(quarters(64, 36, 256 + 64));
    capture();
    draw();
    expectQuarters();
    fake.addVideo(64, 36, 0xff0000ff, kWide, 256 + 64);
    capture();
    fake.addCapture(quarters(64, 36, 256 + 64));
    capture();
    draw();
    expectQuarters();
}

TEST_F(VideoViewContextTest, ATransparentPictureIsBlendedOverTheClearColour) {
    fake.addVideo(64, 36, 0xff000080, kWide);
    capture();
    draw();
    const Pixel pixel = egl->pixel(kWidth / 2, kHeight / 2);
    EXPECT_NEAR(pixel[0], 128, 1);
    EXPECT_EQ(pixel[1], 0);
}

TEST_F(VideoViewContextTest, ResizingMovesTheViewport) {
    fake.addVideo(64, 36, 0xff0000ff, kWide);
    capture();
    view->resize(90, 90);
    view->reshape();
    draw();
    // 90 x 51 in the lower left 90 x 90 of the drawable, which is 90 high.
    EXPECT_EQ(differences(0, 90 - 19 - 51, 90, 51, kRed), 0);
}

} // namespace
} // namespace qivo::test
