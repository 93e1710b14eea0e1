#include "platform/Image.h"

#include <utility>

namespace qivo {

BitmapImageRep::BitmapImageRep(const BitmapLayout& layout, const Planes& planes, std::shared_ptr<const void> owner)
    : ImageRep({static_cast<double>(layout.pixelsWide), static_cast<double>(layout.pixelsHigh)}), _layout(layout),
      _planes(planes), _owner(std::move(owner)) {}

void Image::addRepresentation(std::shared_ptr<const ImageRep> representation) {
    _representations.push_back(std::move(representation));
}

} // namespace qivo
