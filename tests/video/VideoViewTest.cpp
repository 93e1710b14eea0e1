#include "tests/video/ViewFixture.h"

#include <bit>
#include <limits>

namespace qivo::test {
namespace {

using testing::Contains;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::Not;
using testing::StartsWith;

class Closing : public QWidget {
    Q_OBJECT
  signals:
    void willClose();
};

class VideoViewTest : public ViewFixture {};

TEST_F(VideoViewTest, AsksForExactlyThisPixelFormat) {
    EXPECT_THAT(VideoView::defaultPixelFormat().attributes(), ElementsAre(5, 8, 24, 11, 8, 99, 0x4100, 0));
    EXPECT_EQ(view->pixelFormat().attributes(), VideoView::defaultPixelFormat().attributes());
}

TEST_F(VideoViewTest, BeginsWithAnAspectOf16To9) {
    EXPECT_EQ(std::bit_cast<std::uint32_t>(VideoView::kInitialAspect), 0x3FE38E39U);
    view->resize(1000, 1000);
    prepare();
    view->drawView();
    EXPECT_THAT(journal->take(), Contains(call("glViewport", 0, 218, 1000, 563)));
}

TEST_F(VideoViewTest, MadeWithAFrameItHasThatFrame) {
    const auto made = VideoView::initWithFrame({{10, 20}, {320, 180}});
    EXPECT_EQ(made->geometry(), QRect(10, 20, 320, 180));
    EXPECT_EQ(made->pixelFormat().attributes(), VideoView::defaultPixelFormat().attributes());
    const auto other = VideoView::initWithFrame({{0, 0}, {16, 9}}, OpenGLView::defaultPixelFormat());
    EXPECT_THAT(other->pixelFormat().attributes(), ElementsAre(0));
}

TEST_F(VideoViewTest, IsOpaqueAndTakesTheKeyboard) {
    EXPECT_TRUE(view->isOpaque());
    EXPECT_TRUE(view->acceptsFirstResponder());
    EXPECT_TRUE(view->becomeFirstResponder());
    EXPECT_TRUE(view->resignFirstResponder());
}

TEST_F(VideoViewTest, PreparesInThisOrder) {
    const auto context = std::make_shared<JournalContext>(*journal);
    view->setOpenGLContext(context);
    journal->take();
    view->prepareOpenGL();
    const Lines lines = journal->take();
    ASSERT_GT(lines.size(), 8U);
    EXPECT_THAT(Lines(lines.begin(), lines.begin() + 4),
                ElementsAre("makeCurrentContext", "setSwapInterval 1", call("glEnable", GL_BLEND),
                            call("glBlendFunc", GL_SRC_ALPHA, GL_ONE_MINUS_SRC_ALPHA)));
    EXPECT_THAT(Lines(lines.end() - 4, lines.end()),
                ElementsAre("link made", "link callback", "link display", "link start"));
    // Between the two, the quad and nothing else.
    EXPECT_THAT(Lines(lines.begin() + 4, lines.end() - 4), testing::Each(StartsWith("gl")));
    EXPECT_THAT(lines, Contains(call("glGenVertexArrays", 1)));
    EXPECT_THAT(lines, Not(Contains(StartsWith("glGenTextures"))));
    EXPECT_EQ(view->link->followed, context.get());
    EXPECT_THAT(view->link->followedFormat, ElementsAre(0)) << "not the format that the view itself asks for";
    EXPECT_TRUE(view->wantsBestResolutionOpenGLSurface());
}

TEST_F(VideoViewTest, DrawsInThisOrder) {
    prepare();
    showFirstFrame();
    view->drawView();
    const Lines lines = journal->take();
    ASSERT_GT(lines.size(), 6U);
    EXPECT_THAT(
        Lines(lines.begin(), lines.begin() + 4),
        ElementsAre("makeCurrentContext", "lock", call("glViewport", 0, 0, 1920, 1080), StartsWith("glClearBufferfv")));
    EXPECT_THAT(lines, Contains(call("glDrawArrays", GL_TRIANGLE_STRIP, 0, 4)));
    EXPECT_THAT(Lines(lines.end() - 3, lines.end()),
                ElementsAre(StartsWith("glUseProgram"), "flushDrawable", "unlock"));
}

TEST_F(VideoViewTest, WithoutAFrameItOnlyClears) {
    prepare();
    view->drawView();
    EXPECT_THAT(journal->take(), ElementsAre("makeCurrentContext", "lock", call("glViewport", 0, 0, 1920, 1080),
                                             StartsWith("glClearBufferfv"), "flushDrawable", "unlock"));
}

TEST_F(VideoViewTest, ClearsToTransparentBlack) {
    prepare();
    view->drawView();
    EXPECT_THAT(journal->take(), Contains(call("glClearBufferfv", GL_COLOR, 0, 0.0F, 0.0F, 0.0F, 0.0F)));
}

TEST_F(VideoViewTest, AFrameOfAnotherAspectIsLetterBoxedByTheNextDrawing) {
    prepare();
    showFirstFrame(64, 64, 1);
    view->drawView();
    EXPECT_THAT(journal->take(), Contains(call("glViewport", 420, 0, 1080, 1080)));
}

TEST_F(VideoViewTest, AnAspectOfZeroIsKeptAndShowsNothing) {
    prepare();
    showFirstFrame(64, 36, 0);
    view->drawView();
    EXPECT_THAT(journal->take(), Contains(call("glViewport", 960, 0, 0, 1080)));
}

TEST_F(VideoViewTest, AnAspectThatIsNoNumberUsesTheWholeArea) {
    view->resize(1000, 400);
    prepare();
    showFirstFrame(64, 36, std::numeric_limits<float>::quiet_NaN());
    view->drawView();
    EXPECT_THAT(journal->take(), Contains(call("glViewport", 0, 0, 1000, 400)));
    // It differs from itself, so it is fitted with every drawing; the outcome stays.
    view->drawView();
    EXPECT_THAT(journal->take(), Contains(call("glViewport", 0, 0, 1000, 400)));
}

TEST_F(VideoViewTest, AViewWithoutHeightShowsNothing) {
    view->resize(1000, 0);
    prepare();
    view->drawView();
    EXPECT_THAT(journal->take(), Contains(call("glViewport", 500, 0, 0, 0)));
}

TEST_F(VideoViewTest, ReshapeSetsTheViewportUnderTheLock) {
    prepare();
    view->resize(1000, 1000);
    journal->take();
    view->reshape();
    EXPECT_THAT(journal->take(), ElementsAre("lock", call("glViewport", 0, 218, 1000, 563), "unlock"));
}

TEST_F(VideoViewTest, DrawRectDraws) {
    prepare();
    view->drawRect({});
    EXPECT_THAT(journal->take(), Contains("flushDrawable"));
}

TEST_F(VideoViewTest, ARenewedDrawableHoldsTheWindowUntilTheNextFlush) {
    const auto context = std::make_shared<JournalContext>(*journal);
    view->setOpenGLContext(context);
    view->renewGState();
    EXPECT_FALSE(view->window()->updatesEnabled());
    context->afterFlush();
    QCoreApplication::processEvents();
    EXPECT_TRUE(view->window()->updatesEnabled());
}

TEST_F(VideoViewTest, ARefreshDrawsThenCapturesAndAnswersSuccess) {
    prepare();
    select();
    EXPECT_EQ(view->link->refresh(), 0);
    const Lines lines = journal->takeWithoutGL();
    EXPECT_THAT(lines, ElementsAre("makeCurrentContext", "lock", "flushDrawable", "unlock",
                                   StartsWith("recv_create_v3"), StartsWith("recv_capture_v2")));
}

TEST_F(VideoViewTest, ClosingTheWindowStopsTheLinkThenEndsTheReceiver) {
    Closing window;
    view->setParent(&window);
    prepare();
    showFirstFrame();
    testing::internal::CaptureStdout();
    emit window.willClose();
    EXPECT_EQ(testing::internal::GetCapturedStdout(),
              "Destroying the QIVO receiver \nThe QIVO receiver has been destroyed \n");
    EXPECT_THAT(journal->take(),
                ElementsAre("link stop", StartsWith("recv_free_video_v2(r1"), StartsWith("recv_destroy(r1")));
    EXPECT_FALSE(view->link->isRunning());
    view->setParent(nullptr);
}

TEST_F(VideoViewTest, TheLinkIsNotStartedAgainAfterClosing) {
    prepare();
    view->windowWillClose();
    journal->take();
    view->reshape();
    view->drawRect({});
    EXPECT_THAT(journal->take(), Not(Contains("link start")));
}

TEST_F(VideoViewTest, DestructionStopsAndReleasesTheLinkThenEndsTheReceiverThenGL) {
    prepare();
    showFirstFrame();
    testing::internal::CaptureStdout();
    view.reset();
    testing::internal::GetCapturedStdout();
    const Lines lines = journal->take();
    ASSERT_GT(lines.size(), 7U);
    EXPECT_THAT(Lines(lines.begin(), lines.begin() + 6),
                ElementsAre("link stop", "link released", StartsWith("recv_free_video_v2(r1"),
                            StartsWith("recv_destroy(r1"), "makeCurrentContext", "lock"));
    EXPECT_THAT(lines, Contains(StartsWith("glDeleteTextures")));
    EXPECT_EQ(lines.back(), "unlock");
}

TEST_F(VideoViewTest, AViewThatWasNeverPreparedGoesQuietly) {
    testing::internal::CaptureStdout();
    view->windowWillClose();
    view.reset();
    EXPECT_EQ(testing::internal::GetCapturedStdout(), "");
    EXPECT_THAT(journal->take(), IsEmpty());
}

} // namespace
} // namespace qivo::test

#include "VideoViewTest.moc"
