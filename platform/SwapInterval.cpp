#include "platform/SwapInterval.h"

#include <QOpenGLContext>
#include <QtGui/qopenglcontext_platform.h>

namespace qivo {
namespace {

template <typename Function>
Function resolve(const QOpenGLContext& context, const char* name) {
    return reinterpret_cast<Function>(context.getProcAddress(name));
}

#if QT_CONFIG(xcb_glx_plugin)
void applyToGlx(const QOpenGLContext& context, int interval) {
    using CurrentDisplay = void* (*)();
    using CurrentDrawable = unsigned long (*)();
    using SwapIntervalExt = void (*)(void*, unsigned long, int);
    const auto display = resolve<CurrentDisplay>(context, "glXGetCurrentDisplay");
    const auto drawable = resolve<CurrentDrawable>(context, "glXGetCurrentDrawable");
    const auto set = resolve<SwapIntervalExt>(context, "glXSwapIntervalEXT");
    if (display != nullptr && drawable != nullptr && set != nullptr && display() != nullptr) {
        set(display(), drawable(), interval);
    }
}
#endif

#if QT_CONFIG(egl)
void applyToEgl(const QOpenGLContext& context, int interval) {
    using CurrentDisplay = void* (*)();
    using SwapInterval = unsigned int (*)(void*, int);
    const auto display = resolve<CurrentDisplay>(context, "eglGetCurrentDisplay");
    const auto set = resolve<SwapInterval>(context, "eglSwapInterval");
    if (display != nullptr && set != nullptr && display() != nullptr) {
        set(display(), interval);
    }
}
#endif

} // namespace

void applySwapInterval(QOpenGLContext& context, int interval) {
#if QT_CONFIG(xcb_glx_plugin)
    if (context.nativeInterface<QNativeInterface::QGLXContext>() != nullptr) {
        applyToGlx(context, interval);
        return;
    }
#endif
#if QT_CONFIG(egl)
    if (context.nativeInterface<QNativeInterface::QEGLContext>() != nullptr) {
        applyToEgl(context, interval);
    }
#endif
}

} // namespace qivo
