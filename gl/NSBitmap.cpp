#include "gl/NSBitmap.h"

namespace qivo {

namespace {

std::shared_ptr<const BitmapImageRep> firstBitmap(const Image* image) {
    if (image) {
        for (const auto& representation : image->representations()) {
            if (auto bitmap = std::dynamic_pointer_cast<const BitmapImageRep>(representation)) {
                return bitmap;
            }
        }
    }
    return nullptr;
}

} // namespace

std::unique_ptr<NSBitmap> NSBitmap::initWithImage(const Image* image) {
    auto bitmap = std::make_unique<NSBitmap>();
    bitmap->_bitmap = firstBitmap(image);
    return bitmap;
}

std::shared_ptr<NSBitmap> NSBitmap::bitmapWithImage(const Image* image) {
    return initWithImage(image);
}

} // namespace qivo
