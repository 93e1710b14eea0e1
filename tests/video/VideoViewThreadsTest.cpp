// The view with a link that runs, while the main thread does to it what a user and the window system do. Made for the
// thread sanitizer: no driver, no window, and all that is written down lies under the lock that is to be proved.

#include "app/AppData.h"
#include "platform/FairLock.h"
#include "platform/ThreadDisplayLink.h"
#include "tests/fake/FakeQivo.h"
#include "tests/gl/RecordingGL.h"
#include "video/VideoView.h"

#include <QApplication>
#include <atomic>
#include <gtest/gtest.h>
#include <mutex>
#include <thread>

namespace qivo::test {
namespace {

using namespace std::chrono_literals;

/// A context without OpenGL behind it, on a display that refreshes fast.
class LockOnly final : public GLContext {
  public:
    LockOnly() { refresh->rate = RefreshPacer::kFastestRate; }
    void makeCurrentContext() override {}
    void setSwapInterval(int /*interval*/) override {}
    void lock() override { fair.lock(); }
    void unlock() override { fair.unlock(); }
    void flushDrawable() override { ++flushes; }
    void afterNextFlush(std::function<void()> /*done*/) override {}
    std::shared_ptr<const DisplayRefresh> display() const override { return refresh; }

    FairLock fair;
    std::atomic<int> flushes{0};
    std::shared_ptr<DisplayRefresh> refresh = std::make_shared<DisplayRefresh>();
};

class VideoViewThreadsTest : public testing::Test {
  protected:
    static void SetUpTestSuite() {
        static int count = 1;
        static char name[] = "video-view-threads-test"; // NOLINT(modernize-avoid-c-arrays): argv is an array
        static char* arguments[] = {name, nullptr};
        qputenv("QT_QPA_PLATFORM", "offscreen");
        s_application = std::make_unique<QApplication>(count, static_cast<char**>(arguments));
    }
    static void TearDownTestSuite() { s_application.reset(); }

    void SetUp() override {
        fake.reset();
        model->setIsLowBandwidth(false);
        gl.hook = [this] {
            calls += 1;
            outsideTheLock += context->fair.depth() == 0 ? 1 : 0;
        };
        view->setOpenGLContext(context);
        view->resize(640, 360);
        const std::lock_guard guard(*context);
        view->prepareOpenGL();
    }

    void TearDown() override {
        view.reset();
        EXPECT_EQ(outsideTheLock, 0) << "of " << calls;
        EXPECT_EQ(fake.misuse(), std::vector<std::string>());
        EXPECT_EQ(fake.openReceivers(), 0);
        EXPECT_EQ(fake.framesOut(), 0);
        fake.reset();
    }

    /// Until the link has drawn so often once more.
    void waitForDrawings(int count) const {
        const int before = context->flushes;
        const auto end = std::chrono::steady_clock::now() + 20s;
        while (context->flushes < before + count && std::chrono::steady_clock::now() < end) {
            std::this_thread::sleep_for(1ms);
        }
        EXPECT_GE(context->flushes, before + count);
    }

    /// What a source sends: a change of its properties, and pictures of two sizes and shapes.
    void send() {
        fake.addStatusChange();
        for (const int width : {64, 64, 32}) {
            fake.addVideo(width, 36, 0xff0000ff, static_cast<float>(width) / 36);
        }
    }

    FakeQivo& fake = FakeQivo::instance();
    AppData* model = AppData::inst();
    RecordingGL gl; // what it writes down is guarded by the context's lock
    std::atomic<int> calls{0};
    std::atomic<int> outsideTheLock{0};
    std::shared_ptr<LockOnly> context = std::make_shared<LockOnly>();
    std::unique_ptr<VideoView> view = VideoView::initWithFrame({{0, 0}, {640, 360}});

  private:
    inline static std::unique_ptr<QApplication> s_application;
};

TEST_F(VideoViewThreadsTest, TheMainThreadWorksOnItWhileItIsDrawnAndCaptured) {
    fake.setWebControl("http://127.0.0.1/");
    fake.setPtzSupported(true);
    for (int turn = 0; turn < 40; ++turn) {
        send();
        model->setQIVOSourceInfoNamed(QString("STUDIO (Cam %1)").arg(turn), "fake://one");
        view->resize(300 + 10 * turn, 200);
        view->reshape();
        view->drawRect({});
        model->setIsLowBandwidth(turn % 2 == 0);
        if (turn % 4 == 0) {
            waitForDrawings(2);
        }
    }
    waitForDrawings(5);
    EXPECT_GT(fake.callsOf("recv_create_v3").size(), 5U);
    EXPECT_GT(fake.callsOf("recv_free_video_v2").size(), 5U);
    view->windowWillClose();
    EXPECT_EQ(fake.openReceivers(), 0);
    const int drawn = context->flushes;
    view->drawRect({});
    view->reshape();
    EXPECT_EQ(context->flushes, drawn + 1) << "by the main thread alone";
}

TEST_F(VideoViewThreadsTest, ItIsDestroyedWhileItIsDrawnAndCaptured) {
    send();
    model->setQIVOSourceInfoNamed("STUDIO (Cam 1)", "fake://one");
    waitForDrawings(3);
    view.reset();
    const int drawn = context->flushes;
    std::this_thread::sleep_for(20ms);
    EXPECT_EQ(context->flushes, drawn);
}

} // namespace
} // namespace qivo::test
