#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>

namespace qivo {

class BitmapImageRep;

/// Where a pixel's alpha is, and what it means.
enum CGImageAlphaInfo : std::uint32_t {
    kCGImageAlphaNone = 0,
    kCGImageAlphaPremultipliedLast = 1,
    kCGImageAlphaPremultipliedFirst = 2,
    kCGImageAlphaLast = 3,
    kCGImageAlphaFirst = 4,
    kCGImageAlphaNoneSkipLast = 5, ///< a component without meaning where alpha would be
    kCGImageAlphaNoneSkipFirst = 6,
    kCGImageAlphaOnly = 7
};

/// A CGImageAlphaInfo plus a byte order.
///
/// Components are written down as R, G, B, alpha, or with alpha first, and alpha may be missing. That is also how they
/// lie in memory where the order is the default or big. `kCGBitmapByteOrder16Little` reverses the two bytes of each
/// 16-bit component. `kCGBitmapByteOrder32Little` reverses the four bytes of each 32 bits, which for 8-bit components
/// are those of a whole pixel: with alpha last they lie in memory as A, B, G, R, with alpha first as B, G, R, A.
using CGBitmapInfo = std::uint32_t;
constexpr CGBitmapInfo kCGBitmapAlphaInfoMask = 0x1F;
constexpr CGBitmapInfo kCGBitmapFloatComponents = 0x100;
constexpr CGBitmapInfo kCGBitmapByteOrderMask = 0x7000;
constexpr CGBitmapInfo kCGBitmapByteOrderDefault = 0;
constexpr CGBitmapInfo kCGBitmapByteOrder16Little = 0x1000;
constexpr CGBitmapInfo kCGBitmapByteOrder32Little = 0x2000;
constexpr CGBitmapInfo kCGBitmapByteOrder16Big = 0x3000;
constexpr CGBitmapInfo kCGBitmapByteOrder32Big = 0x4000;

/// How the pixels of a picture lie in memory, first row on top.
struct CGImageLayout {
    std::uint64_t width = 0;
    std::uint64_t height = 0;
    std::uint64_t bitsPerComponent = 8;
    std::uint64_t bitsPerPixel = 32;
    std::uint64_t bytesPerRow = 0;
    CGBitmapInfo bitmapInfo = kCGImageAlphaNone;

    CGBitmapInfo alphaInfo() const { return bitmapInfo & kCGBitmapAlphaInfoMask; }
    CGBitmapInfo byteOrder() const { return bitmapInfo & kCGBitmapByteOrderMask; }
    bool operator==(const CGImageLayout&) const = default;
};

/// A picture that can be drawn. Its colours are those of the device; no colour is ever converted.
class CGImage;
using CGImageRef = const CGImage*;

class CGImage {
  public:
    /// Wraps `bytes` bytes of pixels, which live as long as `owner`, or, without one, as long as the caller keeps them.
    /// Null if there are none, if width, height or row do not fit each other or `bytes`, or if a component has not 1,
    /// 2, 4, 8, 16 or 32 bits.
    static std::shared_ptr<const CGImage> create(const CGImageLayout& layout, const void* pixels, std::uint64_t bytes,
                                                 std::shared_ptr<const void> owner = nullptr);

    /// The picture of a bitmap in one plane, or null. Pixels without alpha, or with it multiplied in already, are
    /// wrapped: the bitmap must outlive the picture. Others are copied and multiplied by their alpha, to the nearest,
    /// as drawing needs them. Components are R, G, B, alpha; those of 16 bits are in the machine's byte order.
    static std::shared_ptr<const CGImage> imageWithBitmap(const BitmapImageRep* bitmap);

    CGImage(const CGImageLayout& layout, const std::byte* pixels, std::shared_ptr<const void> owner)
        : _layout(layout), _pixels(pixels), _owner(std::move(owner)) {}

    const CGImageLayout& layout() const { return _layout; }
    const std::byte* row(std::uint64_t y) const { return _pixels + y * _layout.bytesPerRow; }

  private:
    CGImageLayout _layout;
    const std::byte* _pixels;
    std::shared_ptr<const void> _owner;
};

// A null picture is allowed: it has no size, no bits and no alpha.
inline std::uint64_t CGImageGetWidth(CGImageRef image) {
    return image ? image->layout().width : 0;
}
inline std::uint64_t CGImageGetHeight(CGImageRef image) {
    return image ? image->layout().height : 0;
}
inline std::uint64_t CGImageGetBitsPerComponent(CGImageRef image) {
    return image ? image->layout().bitsPerComponent : 0;
}
inline std::uint64_t CGImageGetBitsPerPixel(CGImageRef image) {
    return image ? image->layout().bitsPerPixel : 0;
}
inline CGBitmapInfo CGImageGetBitmapInfo(CGImageRef image) {
    return image ? image->layout().bitmapInfo : kCGImageAlphaNone;
}
inline CGBitmapInfo CGImageGetAlphaInfo(CGImageRef image) {
    return image ? image->layout().alphaInfo() : kCGImageAlphaNone;
}

} // namespace qivo
