// A capture pass of unchanged geometry at 1920 x 1080 against one memcpy of the frame, turn by turn in the same run.
// The frames come from a libqivo that does nothing; the context is a real one on software GL, without a window.
//
//   bench-capture [ROUNDS]
#include "app/AppData.h"
#include "bench/Timing.h"
#include "platform/FairLock.h"
#include "tests/gl/EglContext.h"
#include "video/VideoView.h"

#include <QApplication>
#include <algorithm>
#include <array>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <epoxy/gl.h>
#include <functional>
#include <vector>

namespace {

constexpr int kWidth = 1920;
constexpr int kHeight = 1080;
constexpr std::size_t kBytes = std::size_t{4} * kWidth * kHeight;
constexpr double kTarget = 1.15;
constexpr int kDefaultRounds = 300;

using Ring = std::array<std::vector<std::uint8_t>, 4>;

/// Pictures that a decoder would deliver in turn.
Ring pictures;
std::size_t next = 0;

void fill(Ring& ring) {
    for (auto& picture : ring) {
        picture.assign(kBytes, static_cast<std::uint8_t>(&picture - ring.data()));
    }
}

} // namespace

// A libqivo that always has a frame and costs nothing.
extern "C" {
QIVOlib_recv_instance_t QIVOlib_recv_create_v3(const QIVOlib_recv_create_v3_t* /*settings*/) {
    return reinterpret_cast<QIVOlib_recv_instance_t>(&next);
}
void QIVOlib_recv_destroy(QIVOlib_recv_instance_t /*instance*/) {}
int32_t QIVOlib_recv_capture_v2(QIVOlib_recv_instance_t /*instance*/, QIVOlib_video_frame_v2_t* video,
                                QIVOlib_audio_frame_v2_t* /*audio*/, QIVOlib_metadata_frame_t* /*metadata*/,
                                uint32_t /*timeout*/) {
    video->xres = kWidth;
    video->yres = kHeight;
    video->picture_aspect_ratio = 16.0F / 9.0F;
    video->line_stride_in_bytes = 4 * kWidth;
    video->p_data = pictures[next++ % pictures.size()].data();
    return QIVOlib_frame_type_video;
}
void QIVOlib_recv_free_video_v2(QIVOlib_recv_instance_t /*instance*/, const QIVOlib_video_frame_v2_t* /*video*/) {}
void QIVOlib_recv_free_string(QIVOlib_recv_instance_t /*instance*/, const char* /*string*/) {}
const char* QIVOlib_recv_get_web_control(QIVOlib_recv_instance_t /*instance*/) {
    return nullptr;
}
bool QIVOlib_recv_ptz_is_supported(QIVOlib_recv_instance_t /*instance*/) {
    return false;
}
}

namespace {

using qivo::EglContext;

class WindowlessContext final : public qivo::GLContext {
  public:
    explicit WindowlessContext(EglContext& egl) : m_egl(egl) {}
    void makeCurrentContext() override {}
    void setSwapInterval(int /*interval*/) override {}
    // As a window's context does it: current for as long as the lock is held.
    void lock() override {
        m_lock.lock();
        if (m_lock.depth() == 1) {
            m_egl.makeCurrent();
        }
    }
    void unlock() override {
        if (m_lock.depth() == 1) {
            m_egl.releaseCurrent();
        }
        m_lock.unlock();
    }
    void flushDrawable() override { glFinish(); }
    void afterNextFlush(std::function<void()> /*done*/) override {}
    std::shared_ptr<const qivo::DisplayRefresh> display() const override { return m_display; }

  private:
    EglContext& m_egl;
    qivo::FairLock m_lock;
    std::shared_ptr<qivo::DisplayRefresh> m_display = std::make_shared<qivo::DisplayRefresh>();
};

class UnlinkedView final : public qivo::VideoView {
  protected:
    std::unique_ptr<qivo::DisplayLink> newDisplayLink() override { return nullptr; }
};

void report(const char* what, const std::vector<double>& pass, const std::vector<double>& copy) {
    const double ratio = medianRatio(pass, copy);
    std::printf("%-34s %8.0f us, memcpy %8.0f us, ratio %.3f (target at most %.2f)%s\n", what, median(pass),
                median(copy), ratio, kTarget, ratio <= kTarget ? "" : " MISSED");
}

} // namespace

int main(int argc, char** argv) {
    qputenv("QT_QPA_PLATFORM", "offscreen");
    const QApplication application(argc, argv);
    const int rounds = argc > 1 ? std::max(1, std::atoi(argv[1])) : kDefaultRounds;
    fill(pictures);
    std::string error;
    const auto egl = EglContext::create(kWidth, kHeight, error);
    if (!egl) {
        std::fprintf(stderr, "bench-capture: %s\n", error.c_str());
        return 1;
    }
    std::printf("%s\n", reinterpret_cast<const char*>(glGetString(GL_RENDERER)));
    qivo::AppData::inst()->setQIVOSourceInfoNamed("STUDIO (Cam 1)", "bench://");
    const auto context = std::make_shared<WindowlessContext>(*egl);
    UnlinkedView view;
    view.setOpenGLContext(context);
    view.resize(kWidth, kHeight);
    context->lock();
    view.prepareOpenGL();
    context->unlock();
    view.captureNewVideoSample();

    // A ring of its own: neither side may find in the cache what the other has just read, and each comes back to a
    // picture after as many others.
    Ring copied;
    fill(copied);
    std::size_t nextCopied = 0;
    std::vector<std::uint8_t> target(kBytes);
    const auto copyOnce = [&] {
        std::memcpy(target.data(), copied[nextCopied++ % copied.size()].data(), kBytes);
        asm volatile("" : : "r"(target.data()) : "memory"); // the copy has a reader
    };
    std::array<std::vector<double>, 4> times;
    for (int round = 0; round < rounds; ++round) {
        times[0].push_back(microseconds([&] { view.captureNewVideoSample(); }));
        times[1].push_back(microseconds(copyOnce));
    }
    // As in use: each pass follows a drawing that has read the texture.
    for (int round = 0; round < rounds / 4 + 1; ++round) {
        view.drawView();
        times[2].push_back(microseconds([&] { view.captureNewVideoSample(); }));
        view.drawView();
        times[3].push_back(microseconds(copyOnce));
    }
    report("capture pass", times[0], times[1]);
    report("capture pass after a drawing", times[2], times[3]);
    return 0;
}
