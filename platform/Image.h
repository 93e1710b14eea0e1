#pragma once

#include "platform/Geometry.h"

#include <array>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <vector>

namespace qivo {

/// One way of depicting a picture: pixels, or something that has to be drawn first.
class ImageRep {
  public:
    explicit ImageRep(Size size) : _size(size) {}
    virtual ~ImageRep() = default;
    ImageRep(const ImageRep&) = delete;
    ImageRep& operator=(const ImageRep&) = delete;

    Size size() const { return _size; }

  private:
    Size _size;
};

/// How the pixels of a bitmap lie in memory.
struct BitmapLayout {
    std::int32_t pixelsWide = 0;
    std::int32_t pixelsHigh = 0;
    std::int32_t bitsPerSample = 8;
    std::int32_t samplesPerPixel = 4; ///< alpha included
    bool hasAlpha = true;             ///< the last sample is alpha
    bool isPremultiplied = false;     ///< the alpha is multiplied into the other samples
    bool isPlanar = false;            ///< each sample has a plane of its own
    std::int32_t bytesPerRow = 0;     ///< of one plane, padding included

    bool operator==(const BitmapLayout&) const = default;
};

/// Pixels in memory, first row on top, samples in the order R, G, B, (A) or grey, (A), each in the machine's byte
/// order.
///
/// Nothing is checked or copied: the layout is reported as it was given.
class BitmapImageRep : public ImageRep {
  public:
    static constexpr std::size_t maximumPlanes = 5;
    using Planes = std::array<const std::uint8_t*, maximumPlanes>;

    /// Wraps pixels that the caller owns and keeps in place for the life of the representation. A bitmap that is not
    /// planar has one plane.
    BitmapImageRep(const BitmapLayout& layout, const Planes& planes) : BitmapImageRep(layout, planes, nullptr) {}

    /// Wraps pixels that live as long as `owner`, which is held.
    BitmapImageRep(const BitmapLayout& layout, const Planes& planes, std::shared_ptr<const void> owner);

    const BitmapLayout& layout() const { return _layout; }
    std::int32_t pixelsWide() const { return _layout.pixelsWide; }
    std::int32_t pixelsHigh() const { return _layout.pixelsHigh; }
    std::int32_t bitsPerSample() const { return _layout.bitsPerSample; }
    std::int32_t samplesPerPixel() const { return _layout.samplesPerPixel; }
    bool hasAlpha() const { return _layout.hasAlpha; }
    bool isPremultiplied() const { return _layout.isPremultiplied; }
    bool isPlanar() const { return _layout.isPlanar; }
    std::int32_t bytesPerRow() const { return _layout.bytesPerRow; }

    /// The first plane.
    const std::uint8_t* bitmapData() const { return _planes.front(); }
    /// Null beyond the planes that were given.
    const Planes& bitmapDataPlanes() const { return _planes; }

  private:
    BitmapLayout _layout;
    Planes _planes;
    std::shared_ptr<const void> _owner;
};

/// A picture: its representations, in the order in which they were added.
class Image {
  public:
    using Representations = std::vector<std::shared_ptr<const ImageRep>>;

    /// Width times height of the largest picture that is decoded.
    static constexpr std::int64_t maximumPixels = std::int64_t{1} << 26;

    explicit Image(Size size) : _size(size) {}

    /// Decodes a picture file into one bitmap in the file's own precision: 8 or 16 bits, 3 samples, or 4 where the
    /// file has an alpha channel. Palettes become colours; a grey picture without alpha keeps its single sample. A file
    /// that is missing, broken, larger than `maximumPixels`, not a regular file or not of pixels, such as a drawing of
    /// lines, gives null; so does a null path.
    ///
    /// A 16-bit bitmap may be read for twice its size: behind it lie as many zero bytes as it has itself (see
    /// GLTexture::initWithImage).
    ///
    /// Thread: any; blocks for the input and the decoding.
    static std::shared_ptr<Image> imageWithContentsOfFile(const char* path);

    /// As imageWithContentsOfFile, for a `file:` URL; any other gives null.
    static std::shared_ptr<Image> imageWithContentsOfURL(const char* url);

    /// In pixels for a decoded picture.
    Size size() const { return _size; }
    const Representations& representations() const { return _representations; }
    void addRepresentation(std::shared_ptr<const ImageRep> representation);

  private:
    Size _size;
    Representations _representations;
};

} // namespace qivo
