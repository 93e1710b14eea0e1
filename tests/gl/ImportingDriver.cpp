#include "tests/gl/ImportingDriver.h"

#include "platform/DmaBuf.h"

#include <cstdio>
#include <cstdlib>
#include <string>
#include <sys/mman.h>
#include <unistd.h>
#include <utility>

namespace qivo {

namespace {

ImportingDriver* current = nullptr;
EGLDisplay realDisplay = nullptr;
char displays[64]; // the address of each stands for a display
std::size_t nextDisplay = 0;

decltype(epoxy_eglQueryString) realQueryString;
decltype(epoxy_eglQueryContext) realQueryContext;
decltype(epoxy_eglChooseConfig) realChooseConfig;
decltype(epoxy_eglCreateContext) realCreateContext;
decltype(epoxy_eglDestroyContext) realDestroyContext;
decltype(epoxy_eglMakeCurrent) realMakeCurrent;
decltype(epoxy_glReadPixels) realReadPixels;

/// The memory of one image; the real size does not matter to who only looks at pixels that are there.
constexpr std::size_t mapped = std::size_t{64} * 64 * 4;

EGLint valueOf(const EGLint* attributes, EGLint name) {
    while (*attributes != EGL_NONE) {
        if (attributes[0] == name) {
            return attributes[1];
        }
        attributes += 2;
    }
    return 0;
}

} // namespace

template <typename Function>
void ImportingDriver::replace(Function& slot, std::type_identity_t<Function> replacement) {
    _restorations.emplace_back([&slot, original = slot] { slot = original; });
    slot = replacement;
}

ImportingDriver::ImportingDriver(Kind kind) : _kind(kind) {
    if (std::exchange(current, this)) {
        std::fputs("There is a driver already\n", stderr);
        std::abort();
    }
    realDisplay = eglGetCurrentDisplay();
    ++nextDisplay;
    // A slot finds the driver's function when it is first called, so each has to be called once before it is replaced.
    eglQueryString(realDisplay, EGL_VERSION);
    EGLint ignored = 0;
    eglQueryContext(realDisplay, eglGetCurrentContext(), EGL_CONFIG_ID, &ignored);
    eglDestroyContext(realDisplay, EGL_NO_CONTEXT);
    glReadPixels(0, 0, 0, 0, GL_RGBA, GL_UNSIGNED_BYTE, nullptr);
    realQueryString = epoxy_eglQueryString;
    realQueryContext = epoxy_eglQueryContext;
    realChooseConfig = epoxy_eglChooseConfig;
    realCreateContext = epoxy_eglCreateContext;
    realDestroyContext = epoxy_eglDestroyContext;
    realMakeCurrent = epoxy_eglMakeCurrent;
    realReadPixels = epoxy_glReadPixels;
    replace(epoxy_eglGetCurrentDisplay,
            [] { return static_cast<EGLDisplay>(&displays[nextDisplay % sizeof displays]); });
    replace(epoxy_eglQueryString, [](EGLDisplay, EGLint name) {
        static std::string extensions;
        const char* text = realQueryString(realDisplay, name);
        if (name != EGL_EXTENSIONS || current->_kind == Kind::offersNothing) {
            return text;
        }
        extensions = std::string(text) + " EGL_EXT_image_dma_buf_import";
        return extensions.c_str();
    });
    replace(epoxy_eglQueryContext, [](EGLDisplay, EGLContext context, EGLint name, EGLint* value) {
        return realQueryContext(realDisplay, context, name, value);
    });
    replace(epoxy_eglChooseConfig,
            [](EGLDisplay, const EGLint* attributes, EGLConfig* configs, EGLint size, EGLint* count) {
                return realChooseConfig(realDisplay, attributes, configs, size, count);
            });
    replace(epoxy_eglCreateContext, [](EGLDisplay, EGLConfig config, EGLContext shared, const EGLint* attributes) {
        return realCreateContext(realDisplay, config, shared, attributes);
    });
    replace(epoxy_eglDestroyContext,
            [](EGLDisplay, EGLContext context) { return realDestroyContext(realDisplay, context); });
    replace(epoxy_eglMakeCurrent, [](EGLDisplay, EGLSurface draw, EGLSurface read, EGLContext context) {
        return realMakeCurrent(realDisplay, draw, read, context);
    });
    replace(epoxy_eglCreateImageKHR, [](EGLDisplay, EGLContext, EGLenum, EGLClientBuffer, const EGLint* attributes) {
        return current->makeImage(attributes);
    });
    replace(epoxy_eglDestroyImageKHR, [](EGLDisplay, EGLImageKHR) {
        current->releaseImage();
        return EGLBoolean{EGL_TRUE};
    });
    replace(epoxy_glEGLImageTargetTexture2DOES, [](GLenum target, GLeglImageOES) { current->import(target); });
    replace(epoxy_glReadPixels,
            [](GLint x, GLint y, GLsizei width, GLsizei height, GLenum format, GLenum type, void* pixels) {
                current->bringUpToDate();
                realReadPixels(x, y, width, height, format, type, pixels);
            });
    // As the system would make it of memory.
    setDmaBufMaker([](IOSurfaceRef surface) { return FileDescriptor(::dup(IOSurfaceGetDescriptor(surface))); });
}

ImportingDriver::~ImportingDriver() {
    for (const auto& restore : _restorations) {
        restore();
    }
    setDmaBufMaker({});
    for (const auto& import : _imports) {
        ::munmap(import.memory, mapped);
    }
    current = nullptr;
}

EGLImageKHR ImportingDriver::makeImage(const EGLint* attributes) {
    ++_imagesMade;
    _attributes.clear();
    for (const EGLint* at = attributes; *at != EGL_NONE; at += 2) {
        if (*at != EGL_DMA_BUF_PLANE0_FD_EXT) {
            _attributes.insert(_attributes.end(), {at[0], at[1]});
        }
    }
    if (_kind == Kind::makesNoImages || valueOf(attributes, EGL_DMA_BUF_PLANE0_PITCH_EXT) == _refusedPitch) {
        return EGL_NO_IMAGE_KHR;
    }
    ++_imagesAlive;
    _pending = {.texture = 0,
                .memory =
                    ::mmap(nullptr, mapped, PROT_READ, MAP_SHARED, valueOf(attributes, EGL_DMA_BUF_PLANE0_FD_EXT), 0),
                .width = valueOf(attributes, EGL_WIDTH),
                .height = valueOf(attributes, EGL_HEIGHT)};
    return &_pending;
}

void ImportingDriver::releaseImage() {
    --_imagesAlive;
}

void ImportingDriver::import(GLenum target) {
    if (_kind == Kind::refusesTheTarget) {
        glEnable(target); // which a core profile refuses with the error that a driver would give
        ::munmap(_pending.memory, mapped);
        return;
    }
    GLint texture = 0;
    glGetIntegerv(GL_TEXTURE_BINDING_RECTANGLE, &texture);
    _pending.texture = static_cast<GLuint>(texture);
    glTexImage2D(target, 0, GL_RGBA8, _pending.width, _pending.height, 0, GL_RGBA, GL_UNSIGNED_BYTE, _pending.memory);
    _imports.push_back(_pending);
}

void ImportingDriver::bringUpToDate() {
    if (_kind != Kind::follows || _imports.empty()) {
        return;
    }
    const Import& import = _imports.back();
    glTexSubImage2D(GL_TEXTURE_RECTANGLE, 0, 0, 0, import.width, import.height, GL_RGBA, GL_UNSIGNED_BYTE,
                    import.memory);
}

std::vector<std::uint8_t> ImportingDriver::follow(GLuint texture) {
    glBindTexture(GL_TEXTURE_RECTANGLE, texture);
    bringUpToDate();
    const Import& import = _imports.back();
    std::vector<std::uint8_t> pixels(static_cast<std::size_t>(import.width * import.height * 4));
    glGetTexImage(GL_TEXTURE_RECTANGLE, 0, GL_RGBA, GL_UNSIGNED_BYTE, pixels.data());
    glBindTexture(GL_TEXTURE_RECTANGLE, 0);
    return pixels;
}

} // namespace qivo
