#pragma once

#include "platform/Image.h"

#include <memory>

namespace qivo {

/// Finds the bitmap of a picture and keeps it alive.
class NSBitmap {
  public:
    /// Takes the first bitmap among the image's representations, of whatever kind of bitmap it is. Nothing is drawn or
    /// converted: an image without one, or a null image, leaves `bitmap` null.
    static std::unique_ptr<NSBitmap> initWithImage(const Image* image);
    static std::shared_ptr<NSBitmap> bitmapWithImage(const Image* image);

    const BitmapImageRep* bitmap() const { return _bitmap.get(); }

  private:
    std::shared_ptr<const BitmapImageRep> _bitmap;
};

} // namespace qivo
