// What the window system is told about buffer swaps, and what it says about threads.

#include "tests/platform/LogCapture.h"
#include "tests/video/WindowFixture.h"

#include <QOpenGLContext>
#include <mutex>
#include <string_view>
#include <utility>

namespace {

/// A swap interval that was set: for which drawable, 0 where the interface does not name it, and how many retraces.
using Interval = std::pair<unsigned long, int>;

std::mutex lock;
std::vector<Interval> intervals; // under lock
std::atomic<bool> threaded = true;

void record(unsigned long drawable, int interval) {
    const std::lock_guard guard(lock);
    intervals.emplace_back(drawable, interval);
}

std::vector<Interval> takeIntervals() {
    const std::lock_guard guard(lock);
    return std::exchange(intervals, {});
}

void recordGlx(void* /*display*/, unsigned long drawable, int interval) {
    record(drawable, interval);
}

unsigned int recordEgl(void* /*display*/, int interval) {
    record(0, interval);
    return 1;
}

} // namespace

// In the place of the toolkit's: hands out recorders of what the view sets.
QFunctionPointer QOpenGLContext::getProcAddress(const char* name) const {
    if (std::string_view(name) == "glXSwapIntervalEXT") {
        return reinterpret_cast<QFunctionPointer>(recordGlx);
    }
    if (std::string_view(name) == "eglSwapInterval") {
        return reinterpret_cast<QFunctionPointer>(recordEgl);
    }
    // The other of the toolkit's two, which is its own.
    return getProcAddress(QByteArray(name));
}

bool QOpenGLContext::supportsThreadedOpenGL() {
    return threaded;
}

namespace qivo::test {
namespace {

class VideoWindowSwapTest : public WindowFixture {
  protected:
    void SetUp() override {
        WindowFixture::SetUp();
        takeIntervals();
        threaded = true;
    }

    /// What is set for a drawable as the one that the window has now.
    Interval expected() const { return {NAMES_DRAWABLE ? picture().value().id : 0, 1}; }
};

TEST_F(VideoWindowSwapTest, SwapsWaitForOneRetraceAlsoOfADrawableThatWasMadeAnew) {
    showRed(640, 360);
    EXPECT_EQ(takeIntervals(), std::vector{expected()});
    for (int i = 0; i < 3; ++i) {
        const unsigned long before = picture().value().id;
        window->makeAnew();
        ASSERT_TRUE(runUntil([&] { return picture() && picture()->id != before; }));
        ASSERT_TRUE(waitForColour(640, 360, 320, 180, kRed));
        EXPECT_EQ(takeIntervals(), std::vector{expected()}) << "once for each drawable";
    }
}

TEST_F(VideoWindowSwapTest, OpenGLThatIsNotMadeForThreadsIsReportedAndTried) {
    threaded = false;
    LogCapture log;
    showRed(640, 360);
    EXPECT_EQ(log.take(), std::vector<std::string>{">> MESSAGE[0]: OpenGL is not made for several threads on this "
                                                   "display, the picture may fail!"});
}

TEST_F(VideoWindowSwapTest, OpenGLThatIsMadeForThreadsNeedsNoLine) {
    LogCapture log;
    showRed(640, 360);
    EXPECT_EQ(log.take(), std::vector<std::string>());
}

} // namespace
} // namespace qivo::test
