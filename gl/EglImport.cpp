#include "gl/EglImport.h"

#include "platform/DmaBuf.h"

#include <epoxy/egl.h>
#include <epoxy/gl.h>

#include <array>
#include <cstring>
#include <map>
#include <memory>
#include <mutex>
#include <vector>

namespace qivo {

namespace {

constexpr EGLint drmFormat(char a, char b, char c, char d) {
    return a | b << 8 | c << 16 | d << 24;
}

// Named from the highest byte or word of a pixel down, so these are R, G, B, A in memory.
constexpr EGLint rgba8 = drmFormat('A', 'B', '2', '4');
constexpr EGLint rgba16 = drmFormat('A', 'B', '4', '8');

/// A context like the current one, sharing nothing with it, that is current in its place for as long as it lives.
class ContextForTrial {
  public:
    ContextForTrial();
    ~ContextForTrial();
    ContextForTrial(const ContextForTrial&) = delete;
    ContextForTrial& operator=(const ContextForTrial&) = delete;

    bool isCurrent() const { return _isCurrent; }

  private:
    EGLConfig config() const;

    EGLDisplay _display = eglGetCurrentDisplay();
    EGLContext _before = eglGetCurrentContext();
    EGLSurface _drawBefore = eglGetCurrentSurface(EGL_DRAW);
    EGLSurface _readBefore = eglGetCurrentSurface(EGL_READ);
    EGLContext _context = EGL_NO_CONTEXT;
    bool _isCurrent = false;
};

EGLConfig ContextForTrial::config() const {
    EGLint id = 0;
    EGLint count = 0;
    EGLConfig config = nullptr;
    eglQueryContext(_display, _before, EGL_CONFIG_ID, &id);
    const EGLint attributes[] = {EGL_CONFIG_ID, id, EGL_NONE};
    return eglChooseConfig(_display, attributes, &config, 1, &count) && count == 1 ? config : nullptr;
}

ContextForTrial::ContextForTrial() {
    constexpr EGLint attributes[] = {EGL_CONTEXT_MAJOR_VERSION, 3, EGL_CONTEXT_MINOR_VERSION, 2, EGL_NONE};
    EGLint api = 0;
    if (eglQueryContext(_display, _before, EGL_CONTEXT_CLIENT_TYPE, &api) && api == EGL_OPENGL_API) {
        _context = eglCreateContext(_display, config(), EGL_NO_CONTEXT, attributes);
    }
    _isCurrent = _context && eglMakeCurrent(_display, EGL_NO_SURFACE, EGL_NO_SURFACE, _context);
}

ContextForTrial::~ContextForTrial() {
    if (_isCurrent) {
        eglMakeCurrent(_display, _drawBefore, _readBefore, _before);
    }
    if (_context) {
        eglDestroyContext(_display, _context);
    }
}

/// A surface whose contents can be compared with what a texture shows.
class Trial {
  public:
    static constexpr std::int32_t side = 64;

    Trial();
    ~Trial();
    Trial(const Trial&) = delete;
    Trial& operator=(const Trial&) = delete;

    /// Whether the texture shows what is written into the surface, now and when that changes.
    bool succeeds();

  private:
    void write(unsigned first);
    bool shows() const;

    std::vector<std::uint8_t> _pixels = std::vector<std::uint8_t>(std::size_t{4} * side * side);
    std::shared_ptr<IOSurface> _surface;
    GLuint _texture = 0;
    GLuint _frameBuffer = 0;
};

Trial::Trial()
    : _surface(IOSurfaceCreate({{kIOSurfaceWidth, side},
                                {kIOSurfaceHeight, side},
                                {kIOSurfacePixelFormat, 0},
                                {kIOSurfaceBytesPerElement, 4},
                                {kIOSurfaceBytesPerRow, 4 * side},
                                {kIOSurfaceAllocSize, 4 * side * side}})) {
    glGenTextures(1, &_texture);
    glBindTexture(GL_TEXTURE_RECTANGLE, _texture);
    glGenFramebuffers(1, &_frameBuffer);
    glBindFramebuffer(GL_FRAMEBUFFER, _frameBuffer);
}

Trial::~Trial() {
    glDeleteFramebuffers(1, &_frameBuffer);
    glDeleteTextures(1, &_texture);
}

void Trial::write(unsigned first) {
    for (std::size_t at = 0; at < _pixels.size(); ++at) {
        _pixels[at] = static_cast<std::uint8_t>(first + at * 7 + at / 251);
    }
    std::memcpy(IOSurfaceGetBaseAddress(_surface.get()), _pixels.data(), _pixels.size());
}

bool Trial::shows() const {
    std::vector<std::uint8_t> shown(_pixels.size());
    glReadPixels(0, 0, side, side, GL_RGBA, GL_UNSIGNED_BYTE, shown.data());
    return shown == _pixels;
}

bool Trial::succeeds() {
    if (!_surface) {
        return false;
    }
    write(0);
    if (!eglImport(GL_TEXTURE_RECTANGLE, _surface.get(), 0)) {
        return false;
    }
    glFramebufferTexture2D(GL_FRAMEBUFFER, GL_COLOR_ATTACHMENT0, GL_TEXTURE_RECTANGLE, _texture, 0);
    if (!shows()) {
        return false;
    }
    write(100);
    return shows();
}

bool isOffered(EGLDisplay display) {
    constexpr std::array extensions = {"EGL_KHR_image_base", "EGL_EXT_image_dma_buf_import",
                                       "EGL_KHR_surfaceless_context"};
    for (const char* extension : extensions) {
        if (!epoxy_has_egl_extension(display, extension)) {
            return false;
        }
    }
    return epoxy_has_gl_extension("GL_OES_EGL_image");
}

bool tryOut(EGLDisplay display) {
    if (!isOffered(display)) {
        return false;
    }
    const ContextForTrial context;
    return context.isCurrent() && Trial().succeeds();
}

EGLImageKHR imageOf(EGLDisplay display, IOSurfaceRef surface, std::uint32_t plane) {
    const FileDescriptor buffer = IOSurfaceCreateDmaBuf(surface);
    if (!buffer) {
        return EGL_NO_IMAGE_KHR;
    }
    const auto number = [](std::uint64_t value) { return static_cast<EGLint>(value); };
    const auto offset = static_cast<const char*>(IOSurfaceGetBaseAddressOfPlane(surface, plane)) -
                        static_cast<const char*>(IOSurfaceGetBaseAddress(surface));
    const EGLint attributes[] = {EGL_WIDTH,
                                 number(IOSurfaceGetWidthOfPlane(surface, plane)),
                                 EGL_HEIGHT,
                                 number(IOSurfaceGetHeightOfPlane(surface, plane)),
                                 EGL_LINUX_DRM_FOURCC_EXT,
                                 IOSurfaceGetBytesPerElementOfPlane(surface, plane) == 8 ? rgba16 : rgba8,
                                 EGL_DMA_BUF_PLANE0_FD_EXT,
                                 buffer.number(),
                                 EGL_DMA_BUF_PLANE0_OFFSET_EXT,
                                 number(static_cast<std::uint64_t>(offset)),
                                 EGL_DMA_BUF_PLANE0_PITCH_EXT,
                                 number(IOSurfaceGetBytesPerRowOfPlane(surface, plane)),
                                 EGL_NONE};
    return eglCreateImageKHR(display, EGL_NO_CONTEXT, EGL_LINUX_DMA_BUF_EXT, nullptr, attributes);
}

} // namespace

bool eglImportWorks() {
    static std::mutex lock;
    static std::map<EGLDisplay, bool> known; // under lock
    const std::lock_guard guard(lock);
    const EGLDisplay display = eglGetCurrentDisplay();
    const auto found = known.find(display);
    if (found != known.end()) {
        return found->second;
    }
    return known[display] = tryOut(display);
}

bool eglImport(std::uint32_t target, IOSurfaceRef surface, std::uint32_t plane) {
    const EGLDisplay display = eglGetCurrentDisplay();
    const EGLImageKHR image = imageOf(display, surface, plane);
    if (image == EGL_NO_IMAGE_KHR) {
        return false;
    }
    glEGLImageTargetTexture2DOES(target, image);
    eglDestroyImageKHR(display, image);
    GLint width = 0;
    glGetTexLevelParameteriv(target, 0, GL_TEXTURE_WIDTH, &width);
    return static_cast<std::uint64_t>(width) == IOSurfaceGetWidthOfPlane(surface, plane);
}

} // namespace qivo
