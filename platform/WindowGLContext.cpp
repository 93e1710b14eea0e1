#include "platform/WindowGLContext.h"

#include "platform/Log.h"
#include "platform/SwapInterval.h"

#include <QThread>
#include <utility>

namespace qivo {
namespace {

QString nameOf(const QSurfaceFormat& format) {
    const bool core = format.profile() == QSurfaceFormat::CoreProfile;
    return QStringLiteral("OpenGL %1.%2%3")
        .arg(format.majorVersion())
        .arg(format.minorVersion())
        .arg(core ? QStringLiteral(" core") : QString());
}

bool satisfies(const QSurfaceFormat& offered, const QSurfaceFormat& wanted) {
    return offered.renderableType() != QSurfaceFormat::OpenGLES && offered.version() >= wanted.version() &&
           (wanted.profile() == QSurfaceFormat::NoProfile || offered.profile() == wanted.profile());
}

} // namespace

std::shared_ptr<WindowGLContext> WindowGLContext::create(QWindow& window, const PixelFormat& format) {
    const QSurfaceFormat wanted = format.surfaceFormat();
    std::shared_ptr<WindowGLContext> context(new WindowGLContext(window, wanted)); // NOLINT: private constructor
    if (!context->m_context.isValid()) {
        logLine(">> ERROR: %s is not available on this display, the picture stays black", qPrintable(nameOf(wanted)));
        return nullptr;
    }
    if (const QSurfaceFormat offered = context->m_context.format(); !satisfies(offered, wanted)) {
        logLine(">> ERROR: %s is needed, but this display offers %s, the picture stays black",
                qPrintable(nameOf(wanted)), qPrintable(nameOf(offered)));
        return nullptr;
    }
    if (!QOpenGLContext::supportsThreadedOpenGL()) {
        logLine(">> MESSAGE[%d]: OpenGL is not made for several threads on this display, the picture may fail!", 0);
    }
    return context;
}

WindowGLContext::WindowGLContext(QWindow& window, const QSurfaceFormat& format) : m_window(window) {
    m_context.setFormat(format);
    if (!m_context.create()) {
        return;
    }
    m_offscreen.setFormat(m_context.format());
    m_offscreen.setScreen(window.screen());
    m_offscreen.create();
    // A context may move to the thread that asks for it only if it belongs to none.
    m_context.moveToThread(nullptr);
}

WindowGLContext::~WindowGLContext() {
    if (m_context.thread() == nullptr) {
        m_context.moveToThread(QThread::currentThread());
    }
}

void WindowGLContext::makeCurrentContext() {
    if (m_lock.depth() > 0 && QOpenGLContext::currentContext() != &m_context) {
        bind();
    }
}

void WindowGLContext::setSwapInterval(int interval) {
    m_swapInterval = interval;
    if (m_windowBound) {
        applySwapInterval(m_context, interval);
    }
    m_swapIntervalApplied = m_windowBound;
}

void WindowGLContext::lock() {
    m_lock.lock();
    if (m_lock.depth() == 1) {
        bind();
    }
}

void WindowGLContext::unlock() {
    if (m_lock.depth() == 1) {
        release();
    }
    m_lock.unlock();
}

void WindowGLContext::bind() {
    if (m_context.thread() == nullptr) {
        m_context.moveToThread(QThread::currentThread());
    }
    m_windowBound = m_drawableExists && m_context.makeCurrent(&m_window);
    if (!m_windowBound) {
        m_context.makeCurrent(&m_offscreen);
    } else if (!m_swapIntervalApplied) {
        applySwapInterval(m_context, m_swapInterval);
        m_swapIntervalApplied = true;
    }
}

void WindowGLContext::release() {
    m_context.doneCurrent();
    m_windowBound = false;
    m_context.moveToThread(nullptr);
}

void WindowGLContext::flushDrawable() {
    if (m_windowBound && m_visible) {
        m_context.swapBuffers(&m_window);
    }
    std::function<void()> done;
    {
        const std::lock_guard guard(m_flushMutex);
        done = std::exchange(m_afterFlush, nullptr);
    }
    if (done) {
        done();
    }
}

void WindowGLContext::afterNextFlush(std::function<void()> done) {
    const std::lock_guard guard(m_flushMutex);
    m_afterFlush = std::move(done);
}

void WindowGLContext::setDrawable(bool exists) {
    m_lock.lock();
    if (m_lock.depth() > 1 && m_windowBound && !exists) {
        m_context.makeCurrent(&m_offscreen);
        m_windowBound = false;
    }
    m_drawableExists = exists;
    m_swapIntervalApplied = false;
    m_lock.unlock();
    ++m_display->generation;
}

void WindowGLContext::setVisible(bool visible) {
    if (m_visible.exchange(visible) != visible) {
        ++m_display->generation;
    }
}

void WindowGLContext::setRefreshRate(double refreshesPerSecond) {
    m_display->rate = refreshesPerSecond;
    ++m_display->generation;
}

} // namespace qivo
