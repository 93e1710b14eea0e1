#pragma once

#include "platform/FairLock.h"
#include "platform/GLContext.h"
#include "platform/PixelFormat.h"

#include <QOffscreenSurface>
#include <QOpenGLContext>
#include <QWindow>
#include <mutex>

namespace qivo {

/// The context of a window of the window system.
///
/// The window's drawable may come and go (another parent, another screen, full screen on some systems). Without it the
/// context works on a small drawable that nobody sees, so that textures can still be filled; nothing is shown then.
///
/// Thread: any for what GLContext declares; the rest belongs to the main thread, and so does destruction.
class WindowGLContext final : public GLContext {
  public:
    /// Makes a context for a window that the window system already knows. Null, and a line in the system log, if the
    /// system offers no such context, or only one of a lower version or another profile than asked for.
    static std::shared_ptr<WindowGLContext> create(QWindow& window, const PixelFormat& format);
    ~WindowGLContext() override;

    void makeCurrentContext() override;
    void setSwapInterval(int interval) override;
    void lock() override;
    void unlock() override;
    void flushDrawable() override;
    void afterNextFlush(std::function<void()> done) override;
    std::shared_ptr<const DisplayRefresh> display() const override { return m_display; }

    /// The window's drawable is about to go, or has come back. Waits for the lock; the drawable is not in use after it.
    void setDrawable(bool exists);
    /// Whether anything of the window can be seen.
    void setVisible(bool visible);
    /// The display that the window is on shows so many pictures a second.
    void setRefreshRate(double refreshesPerSecond);

  private:
    WindowGLContext(QWindow& window, const QSurfaceFormat& format);
    void bind();
    void release();

    FairLock m_lock; // protects the context and everything down to the empty line
    QWindow& m_window;
    QOpenGLContext m_context;
    QOffscreenSurface m_offscreen;
    bool m_drawableExists = true;
    bool m_windowBound = false;
    int m_swapInterval = 1;
    bool m_swapIntervalApplied = true; // to the drawable that the window has now

    std::atomic<bool> m_visible{false};
    std::shared_ptr<DisplayRefresh> m_display = std::make_shared<DisplayRefresh>();
    std::mutex m_flushMutex; // protects m_afterFlush
    std::function<void()> m_afterFlush;
};

} // namespace qivo
