#pragma once

#include "platform/CGImage.h"
#include "platform/Geometry.h"
#include "platform/Surface.h"

#include <array>
#include <cstdint>
#include <memory>

namespace qivo {

class Image;

/// What a surface is described by, in the order in which it is written down.
constexpr std::array<const char*, 6> kIOSurface2DKeys = {kIOSurfaceWidth,       kIOSurfaceHeight,
                                                         kIOSurfacePixelFormat, kIOSurfaceBytesPerElement,
                                                         kIOSurfaceBytesPerRow, kIOSurfaceAllocSize};

/// A picture in a surface.
///
/// The layout comes from a picture or from properties. It has 32 or 64 bits a pixel, "RGBA" or "RGhA", and rows without
/// padding; 24 and 48 bits are widened by a component that is skipped, which is all ones where a picture was drawn.
/// What lies in memory is what the layout says, not what the format's name suggests:
///
///   picture        bytes of a pixel in memory
///   24 bits        skipped, B, G, R: as a little-endian 32-bit word of R, G, B, skipped
///   32 bits        in the picture's own order; R, G, B, alpha for a picture that was decoded here
///   48 bits        R, G, B, skipped, each in 16 bits, the lesser byte first
///   64 bits        in the picture's own order; R, G, B, alpha, in the machine's byte order, if it was decoded here
///
/// Pictures that were decoded here have their alpha multiplied in. A picture whose layout cannot be drawn into, such as
/// alpha that is not multiplied in, leaves a surface of zeros.
///
/// An object whose picture could not be read has no `surface`; nothing is logged. Once there is a surface, the layout
/// is frozen. Locks are not counted: `unlock` ends what the last `lock` began.
///
/// Thread: one at a time. The memory is shared with whoever else has the surface, and lies between a lock and an
/// unlock.
class IOSurface2D {
  public:
    /// 1920 x 1080 with 32 bits a pixel, and no surface yet.
    IOSurface2D() = default;
    /// The class method `surface`, which cannot share the getter's name here.
    static std::shared_ptr<IOSurface2D> surfaceWithDefaults();

    /// From the picture's first bitmap, which must be in one plane.
    static std::unique_ptr<IOSurface2D> initWithImage(const Image* image);
    static std::shared_ptr<IOSurface2D> surfaceWithImage(const Image* image);
    static std::unique_ptr<IOSurface2D> initWithImageRef(CGImageRef image);
    static std::shared_ptr<IOSurface2D> surfaceWithImageRef(CGImageRef image);
    /// From the first picture of a file, given as a `file:` URL, by its path, or by its name, extension included, in
    /// the resource directory.
    static std::unique_ptr<IOSurface2D> initWithURL(const char* url);
    static std::shared_ptr<IOSurface2D> surfaceWithURL(const char* url);
    static std::unique_ptr<IOSurface2D> initWithFile(const char* path);
    static std::shared_ptr<IOSurface2D> surfaceWithFile(const char* path);
    static std::unique_ptr<IOSurface2D> initWithResource(const char* name);
    static std::shared_ptr<IOSurface2D> surfaceWithResource(const char* name);

    IOSurface2D(const IOSurface2D&) = delete;
    IOSurface2D& operator=(const IOSurface2D&) = delete;
    /// A new one made of this one's properties, with a surface of its own and a copy of the pixels, if it could be
    /// acquired. Bits of a layout that was widened count as they are now: the copy then has alpha where this one skips.
    std::unique_ptr<IOSurface2D> copyWithZone() const;

    /// Null until there is one. The object keeps it; `sharedSurface` lets it outlive the object.
    IOSurfaceRef surface() const { return _surface.get(); }
    std::shared_ptr<IOSurface> sharedSurface() const { return _surface; }
    std::uint64_t bytesPerRow() const { return _bytesPerRow; }
    std::uint64_t bytesPerPixel() const { return _bytesPerPixel; }
    /// Of the memory, in bytes.
    std::uint64_t size() const { return _size; }
    /// A code of four characters, the first in the highest byte.
    std::uint32_t format() const { return _format; }
    std::uint64_t samplesPerPixel() const { return _samplesPerPixel; }
    bool avoidSync() const { return _avoidSync; }
    std::uint64_t bitsPerComponent() const { return _bitsPerComponent; }
    std::uint64_t bitsPerPixel() const { return _bitsPerPixel; }
    std::uint32_t alphaInfo() const { return _alphaInfo; }
    std::uint64_t width() const { return _width; }
    std::uint64_t height() const { return _height; }

    // Ignored once there is a surface, save the first. What `acquire` needs are the bits per pixel and the size; it
    // derives the rest from them.
    void setAvoidSync(bool avoidSync) { _avoidSync = avoidSync; }
    void setBitsPerComponent(std::uint64_t bitsPerComponent);
    void setBitsPerPixel(std::uint64_t bitsPerPixel);
    void setAlphaInfo(std::uint32_t alphaInfo);
    void setWidth(std::uint64_t width);
    void setHeight(std::uint64_t height);

    /// Makes a blank surface. False if there is one already or the bits per pixel are not 24, 32, 48 or 64. True
    /// otherwise, also when the system refused the surface: look at `surface`.
    bool acquire();

    /// Replaces all pixels with `size` bytes from there. False without a surface or pixels.
    bool update(const void* pixels);
    /// Copies plane 0, or the plane of this index, of another surface over the pixels. See s2dcpy_ex for what must
    /// match.
    bool copy(IOSurfaceRef source) { return copy(source, 0); }
    bool copy(IOSurfaceRef source, std::size_t index);

    /// The pixels; null without a surface.
    void* map() const;
    /// The pixel at this point, counted from the top left and truncated; what is negative or no number counts as 0. No
    /// bounds are checked. Null without a surface.
    void* map(Point point) const;

    /// For reading alone, or for writing too. False without a surface or if the surface refuses.
    bool lock(bool readOnly);
    bool unlock();

  private:
    bool _checkBitsPerPixel(std::uint64_t bitsPerPixel) const;
    void _initSurfaceRGBA();
    void _initSurfaceInfo();
    void _initSurfaceSize();
    void _initSurfaceType();
    bool _initSurfaceProperties();
    bool _initSurfaceProperties(CGImageRef image);
    void _newSurface();
    bool _newSurface(CGImageRef image);
    bool _drawImage(CGImageRef image);
    bool _initSurfaceWithImage(const Image* image);
    bool _initSurfaceWithImageSource(const Image* source);
    void _initSurfaceWithURL(const char* url);
    void _initSurfaceWithFile(const char* path);
    void _initIOSurface2DWithResource(const char* name);

    bool _isRGBA = true;
    bool _avoidSync = true;
    std::uint64_t _bytesPerPixel = 0;
    std::uint64_t _width = 1920;
    std::uint64_t _height = 1080;
    std::uint64_t _samplesPerPixel = 0;
    std::uint64_t _bitsPerComponent = 8;
    std::uint64_t _bitsPerPixel = 32;
    std::uint64_t _bytesPerRow = 0;
    std::uint64_t _size = 0;
    std::uint32_t _byteOrder = 0;
    std::uint32_t _bitmapInfo = 0;
    std::uint32_t _format = 0;
    std::shared_ptr<IOSurface> _surface;
    std::uint32_t _alphaInfo = kCGImageAlphaPremultipliedLast;
    bool isFinalized = false;
    std::uint32_t seed = 0;
    std::uint32_t options = 0;
};

} // namespace qivo
