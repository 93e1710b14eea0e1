#pragma once

#include "gl/SurfaceBinding.h"
#include "platform/Geometry.h"

#include <cstdint>
#include <memory>

namespace qivo {

class IOSurface2D;
class Image;

/// One GL texture and the description of its storage.
///
/// A texture is described first and then made: while there is no storage the description can be changed, afterwards it
/// is frozen. GL errors are never queried; that making it failed shows in `acquire` and `update` answering false and,
/// if GL gave no name, in `texture` being 0.
///
/// Thread: the one that has the GL context current, for every operation, destruction included.
class GLTexture {
    struct Blank {
        explicit Blank() = default;
    };

  public:
    /// Where `update` draws the line for the coordinates of its point, in pixels either way.
    static constexpr std::int32_t farthestOffset = std::int32_t{1} << 30;

    /// Description alone, without a GL call: RGBA, 16 bits, `GL_TEXTURE_2D`, 1920 x 1080.
    GLTexture();

    /// Makes a `GL_TEXTURE_RECTANGLE` texture of a surface of 3 or 4 samples a pixel, for the calling thread's context
    /// or for a given one, which must be the thread's. Without surface or context there is no GL call.
    ///
    /// Where OpenGL can show the surface's memory where it is, the texture does, and follows what is written into it.
    /// Elsewhere a line of the log says so, and the texture is a copy of the surface as it was, taken while that was
    /// locked; `update` brings it up to date. If the surface cannot be locked, there is no storage.
    ///
    /// The copy is read with the row length that the context has, which is not set here: 0, or the one that a picture
    /// left behind. One that exceeds the surface's width makes GL read beyond the surface.
    static std::unique_ptr<GLTexture> initWithSurface(IOSurface2D* surface);
    static std::unique_ptr<GLTexture> initWithSurface(IOSurface2D* surface, CGLContextObj context);

    /// Makes a `GL_TEXTURE_2D` texture of the picture's first bitmap, with one upload. The bitmap must not be planar
    /// and must have 3 or 4 samples; otherwise there is no storage and no GL call. Its samples are taken as R, G, B, A
    /// in memory order, whatever its alpha means.
    ///
    /// The row length that is set for the upload (`bytesPerRow` / `samplesPerPixel`, in pixels) stays in the context
    /// and governs later updates. It counts bytes as samples: the rows of a 16-bit picture are read at twice their
    /// distance, so that its pixels must be readable for twice their size. GL refuses the pixels of an 8-bit picture
    /// with 3 samples, and the texture is left without storage although it counts as made.
    static std::unique_ptr<GLTexture> initWithImage(const Image* image);

    /// As initWithImage, with a picture from a file, from a `file:` URL, or from the file of the resource directory
    /// that has this name, extension included.
    static std::unique_ptr<GLTexture> initWithFile(const char* path);
    static std::unique_ptr<GLTexture> initWithURL(const char* url);
    static std::unique_ptr<GLTexture> initWithResource(const char* name);

    /// For the initialisers: nothing described yet.
    explicit GLTexture(Blank) {}
    ~GLTexture();
    GLTexture(const GLTexture&) = delete;
    GLTexture& operator=(const GLTexture&) = delete;

    std::uint32_t texture() const { return _texture; }
    std::int32_t internal() const { return _internal; }
    std::uint32_t format() const { return _format; }
    std::uint32_t type() const { return _type; }
    std::uint32_t target() const { return _target; }
    std::uint64_t samplesPerPixel() const { return _samplesPerPixel; }
    std::uint64_t bitsPerComponent() const { return _bitsPerComponent; }
    std::int32_t width() const { return _width; }
    std::int32_t height() const { return _height; }
    /// What `setBind` and `setEnable` were last given.
    bool bind() const { return _bind; }
    bool enable() const { return _enable; }

    // The description. Ignored once there is storage; `internal`, `format` and `type` follow when it is made.

    /// `GL_TEXTURE_2D` or `GL_TEXTURE_RECTANGLE`; any other counts as `GL_TEXTURE_2D`.
    void setTarget(std::uint32_t target);
    /// 3 or 4; any other counts as 4.
    void setSamplesPerPixel(std::uint64_t samplesPerPixel);
    /// 8 or 16; any other counts as 16.
    void setBitsPerComponent(std::uint64_t bitsPerComponent);
    /// In pixels; 0 counts as 1920.
    void setWidth(std::int32_t width);
    /// In pixels; 0 counts as 1080.
    void setHeight(std::int32_t height);

    /// Makes the storage, with these pixels or, if null, without any. True if there is storage; there may have been
    /// before, and then nothing is done. Leaves the target unbound and disabled.
    bool acquire(const void* pixels);
    bool acquire() { return acquire(nullptr); }

    /// Replaces all pixels of the texture that is bound to the target: bind it first. False, and nothing is done, if
    /// there is no storage or `pixels` is null.
    bool update(const void* pixels);
    /// As `update`, at an offset in pixels, truncated toward zero. The region keeps the size of the whole texture, so
    /// that GL refuses any offset but (0, 0); the answer is true nevertheless.
    bool update(const void* pixels, Point point);

    /// Binds the texture to its target, or nothing.
    void setBind(bool bind);
    /// `glEnable` or `glDisable` of the target, which a core profile rejects with `GL_INVALID_ENUM`.
    void setEnable(bool enable);

  private:
    void _initProperties();
    bool _initTextureWithSurface(IOSurface2D* surface, CGLContextObj context);
    bool _initTextureWithSurface(IOSurface2D* surface);
    bool _initTextureWithImage(const Image* image);
    bool _initTextureWithFile(const char* path);
    bool _initTextureWithURL(const char* url);
    bool _initTextureWithResource(const char* name);
    bool _newTexture(const void* pixels);
    bool _newTexture(IOSurface2D* surface, CGLContextObj context);
    bool copySurface(IOSurface2D* surface) const;
    void beginStorage();
    void setParameters() const;
    void endStorage() const;

    bool isFinalized = false;
    bool _bind = false;
    bool _enable = false;
    std::uint32_t _texture = 0;
    std::int32_t _internal = 0;
    std::uint32_t _target = 0;
    std::uint32_t _format = 0;
    std::uint32_t _type = 0;
    std::int32_t _width = 0;
    std::int32_t _height = 0;
    std::uint64_t _samplesPerPixel = 0;
    std::uint64_t _bitsPerComponent = 0;
    std::int32_t _bytesPerRow = 0;
};

} // namespace qivo
