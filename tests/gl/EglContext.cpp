#include "tests/gl/EglContext.h"

#include <epoxy/egl.h>
#include <epoxy/gl.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>

namespace qivo {

namespace {

std::string failure(const char* step) {
    char text[128];
    std::snprintf(text, sizeof text, "%s failed with EGL error 0x%X: is a software OpenGL driver installed?", step,
                  static_cast<unsigned>(eglGetError()));
    return text;
}

EGLContext coreContext(EGLDisplay display) {
    constexpr EGLint configAttributes[] = {EGL_RENDERABLE_TYPE, EGL_OPENGL_BIT, EGL_SURFACE_TYPE, 0, EGL_NONE};
    constexpr EGLint contextAttributes[] = {
        EGL_CONTEXT_MAJOR_VERSION,           4,       EGL_CONTEXT_MINOR_VERSION, 1, EGL_CONTEXT_OPENGL_PROFILE_MASK,
        EGL_CONTEXT_OPENGL_CORE_PROFILE_BIT, EGL_NONE};
    EGLConfig config = nullptr;
    EGLint count = 0;
    if (!eglBindAPI(EGL_OPENGL_API) || !eglChooseConfig(display, configAttributes, &config, 1, &count) || count == 0) {
        return EGL_NO_CONTEXT;
    }
    return eglCreateContext(display, config, EGL_NO_CONTEXT, contextAttributes);
}

} // namespace

std::unique_ptr<EglContext> EglContext::create(int width, int height, std::string& error) {
    std::unique_ptr<EglContext> context(new EglContext(width, height));
    if (!context->initialize(error) || !context->makeFrameBuffer(error)) {
        context.reset();
    }
    return context;
}

bool EglContext::initialize(std::string& error) {
    // The same pixels on every machine, also on one with a GPU.
    ::setenv("LIBGL_ALWAYS_SOFTWARE", "1", 1);
    if (!epoxy_has_egl() || !epoxy_has_egl_extension(EGL_NO_DISPLAY, "EGL_MESA_platform_surfaceless")) {
        error = "There is no EGL that can do without a window: is a software OpenGL driver installed?";
        return false;
    }
    _display = eglGetPlatformDisplayEXT(EGL_PLATFORM_SURFACELESS_MESA, EGL_DEFAULT_DISPLAY, nullptr);
    if (!_display || !eglInitialize(_display, nullptr, nullptr)) {
        error = failure("Opening the windowless display");
        return false;
    }
    _context = coreContext(_display);
    if (!_context) {
        error = failure("Making an OpenGL 4.1 core context");
        return false;
    }
    if (!makeCurrent()) {
        error = failure("Making the context current");
        return false;
    }
    return true;
}

bool EglContext::makeFrameBuffer(std::string& error) {
    glGenFramebuffers(1, &_frameBuffer);
    glBindFramebuffer(GL_FRAMEBUFFER, _frameBuffer);
    glGenRenderbuffers(1, &_renderBuffer);
    glBindRenderbuffer(GL_RENDERBUFFER, _renderBuffer);
    glRenderbufferStorage(GL_RENDERBUFFER, GL_RGBA8, _width, _height);
    glFramebufferRenderbuffer(GL_FRAMEBUFFER, GL_COLOR_ATTACHMENT0, GL_RENDERBUFFER, _renderBuffer);
    glViewport(0, 0, _width, _height);
    if (glCheckFramebufferStatus(GL_FRAMEBUFFER) != GL_FRAMEBUFFER_COMPLETE || glGetError() != GL_NO_ERROR) {
        error = "The frame buffer is not complete";
        return false;
    }
    return true;
}

EglContext::~EglContext() {
    if (_context) {
        makeCurrent();
        glDeleteFramebuffers(1, &_frameBuffer);
        glDeleteRenderbuffers(1, &_renderBuffer);
        releaseCurrent();
        eglDestroyContext(_display, _context);
    }
    // The display is one for the whole process and stays open: others may have contexts on it, and leaks of a driver
    // that is unloaded already could not be told from ours.
}

bool EglContext::makeCurrent() {
    return eglMakeCurrent(_display, EGL_NO_SURFACE, EGL_NO_SURFACE, _context);
}

bool EglContext::releaseCurrent() {
    return eglMakeCurrent(_display, EGL_NO_SURFACE, EGL_NO_SURFACE, EGL_NO_CONTEXT);
}

std::vector<Pixel> EglContext::pixels() const {
    std::vector<Pixel> upward(static_cast<std::size_t>(_width) * static_cast<std::size_t>(_height));
    GLint bound = 0;
    glGetIntegerv(GL_READ_FRAMEBUFFER_BINDING, &bound);
    glBindFramebuffer(GL_READ_FRAMEBUFFER, _frameBuffer);
    glReadPixels(0, 0, _width, _height, GL_RGBA, GL_UNSIGNED_BYTE, upward.data());
    glBindFramebuffer(GL_READ_FRAMEBUFFER, static_cast<GLuint>(bound));
    std::vector<Pixel> downward;
    downward.reserve(upward.size());
    for (int row = _height - 1; row >= 0; --row) {
        const auto start = upward.begin() + std::ptrdiff_t{row} * _width;
        downward.insert(downward.end(), start, start + _width);
    }
    return downward;
}

Pixel EglContext::pixel(int x, int y) const {
    return pixels().at(static_cast<std::size_t>(y) * static_cast<std::size_t>(_width) + static_cast<std::size_t>(x));
}

void EglContext::clear(Pixel colour) const {
    GLfloat components[4];
    std::transform(colour.begin(), colour.end(), components, [](std::uint8_t byte) { return byte / 255.0F; });
    glClearBufferfv(GL_COLOR, 0, components);
}

std::string glErrorName(std::uint32_t error) {
    switch (error) {
    case GL_INVALID_ENUM:
        return "GL_INVALID_ENUM";
    case GL_INVALID_VALUE:
        return "GL_INVALID_VALUE";
    case GL_INVALID_OPERATION:
        return "GL_INVALID_OPERATION";
    case GL_OUT_OF_MEMORY:
        return "GL_OUT_OF_MEMORY";
    case GL_INVALID_FRAMEBUFFER_OPERATION:
        return "GL_INVALID_FRAMEBUFFER_OPERATION";
    default:
        return "GL error " + std::to_string(error);
    }
}

std::vector<std::string> takeGlErrors() {
    std::vector<std::string> errors;
    while (const GLenum error = glGetError()) {
        errors.push_back(glErrorName(error));
        if (error == GL_CONTEXT_LOST) {
            break;
        }
    }
    return errors;
}

} // namespace qivo
