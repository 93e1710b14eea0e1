#pragma once

#include "platform/CGImage.h"

#include <optional>

namespace qivo {

/// Draws into memory that the caller keeps, in the device's RGB.
class CGBitmapContext {
  public:
    /// Where pictures are drawn: rows of four components, of 8 bits in one of the 32-bit byte orders, or of 16 bits in
    /// one of the 16-bit ones, or in the default order. The fourth component must be alpha that is multiplied into the
    /// others, or skipped. There is no context for any other layout, alpha that is not multiplied in among them, nor
    /// for null memory or rows too short for their pixels. `layout` tells no size of the memory: it must be height
    /// times bytesPerRow.
    static std::optional<CGBitmapContext> create(void* memory, const CGImageLayout& layout);

    /// Draws a picture of three components, or of the same layout as the memory, over the whole memory, which must be
    /// blank: then what shows is the picture itself, bit for bit. Skipped components become all ones. False, and
    /// nothing is drawn, for a null picture or one of another size or layout.
    bool draw(CGImageRef image) const;

  private:
    CGBitmapContext(std::byte* memory, const CGImageLayout& layout) : _memory(memory), _layout(layout) {}

    std::byte* _memory;
    CGImageLayout _layout;
};

} // namespace qivo
