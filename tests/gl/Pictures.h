#pragma once

#include "platform/Image.h"

#include <memory>

namespace qivo {

/// A picture with one bitmap, which wraps these pixels.
inline Image pictureOf(const BitmapLayout& layout, const void* pixels) {
    auto bitmap =
        std::make_shared<BitmapImageRep>(layout, BitmapImageRep::Planes{static_cast<const std::uint8_t*>(pixels)});
    Image image(bitmap->size());
    image.addRepresentation(std::move(bitmap));
    return image;
}

} // namespace qivo
