#include "platform/CGBitmapContext.h"

#include <array>
#include <cstring>

namespace qivo {

namespace {

bool isSkipped(const CGImageLayout& layout) {
    return layout.alphaInfo() == kCGImageAlphaNoneSkipLast || layout.alphaInfo() == kCGImageAlphaNoneSkipFirst;
}

bool isMultiplied(const CGImageLayout& layout) {
    return layout.alphaInfo() == kCGImageAlphaPremultipliedLast ||
           layout.alphaInfo() == kCGImageAlphaPremultipliedFirst;
}

bool isFirst(const CGImageLayout& layout) {
    return layout.alphaInfo() == kCGImageAlphaPremultipliedFirst || layout.alphaInfo() == kCGImageAlphaNoneSkipFirst;
}

/// Whether the byte order is one for components of this depth, and nothing but order and alpha is asked for.
bool isOrdered(const CGImageLayout& layout) {
    const CGBitmapInfo order = layout.byteOrder();
    if (layout.bitmapInfo != (order | layout.alphaInfo())) {
        return false;
    }
    if (layout.bitsPerComponent == 8) {
        return order == kCGBitmapByteOrderDefault || order == kCGBitmapByteOrder32Little ||
               order == kCGBitmapByteOrder32Big;
    }
    return layout.bitsPerComponent == 16 && (order == kCGBitmapByteOrderDefault ||
                                             order == kCGBitmapByteOrder16Little || order == kCGBitmapByteOrder16Big);
}

/// Three bytes are no 32 bits that could be turned round.
bool hasThreeComponents(const CGImageLayout& layout) {
    return layout.bitsPerPixel == 3 * layout.bitsPerComponent && layout.alphaInfo() == kCGImageAlphaNone &&
           layout.byteOrder() != kCGBitmapByteOrder32Little;
}

/// Where the bytes of a pixel's R, G, B and, if it has one, fourth component are.
struct PixelShape {
    std::uint64_t pixelBytes;
    std::uint64_t componentBytes;
    std::array<std::uint64_t, 4> at; ///< the first byte of each component
    bool reversed;                   ///< whether a component's first byte is its least significant one

    explicit PixelShape(const CGImageLayout& layout)
        : pixelBytes(layout.bitsPerPixel / 8), componentBytes(layout.bitsPerComponent / 8), at(),
          reversed(layout.byteOrder() == kCGBitmapByteOrder16Little) {
        const std::uint64_t first = isFirst(layout) ? 1 : 0;
        for (std::uint64_t component = 0; component < 4; ++component) {
            const std::uint64_t place = (component + first) % 4;
            // The four bytes of a pixel are turned round as a whole.
            at[component] = layout.byteOrder() == kCGBitmapByteOrder32Little ? 3 - place : place * componentBytes;
        }
    }
};

/// Components of one row, from pixels of three to pixels of four.
template <std::size_t componentBytes>
void widenRow(const std::byte* source, const PixelShape& from, std::byte* target, const PixelShape& to,
              std::uint64_t width) {
    const std::size_t swap = from.reversed != to.reversed ? componentBytes - 1 : 0;
    for (std::uint64_t x = 0; x < width; ++x, source += from.pixelBytes, target += to.pixelBytes) {
        for (std::size_t component = 0; component < 3; ++component) {
            for (std::size_t byte = 0; byte < componentBytes; ++byte) {
                target[to.at[component] + (byte ^ swap)] = source[from.at[component] + byte];
            }
        }
        std::memset(target + to.at[3], 0xFF, componentBytes);
    }
}

void fillSkipped(std::byte* row, const PixelShape& shape, std::uint64_t width) {
    for (std::uint64_t x = 0; x < width; ++x) {
        std::memset(row + x * shape.pixelBytes + shape.at[3], 0xFF, shape.componentBytes);
    }
}

} // namespace

std::optional<CGBitmapContext> CGBitmapContext::create(void* memory, const CGImageLayout& layout) {
    const bool supported = layout.bitsPerPixel == 4 * layout.bitsPerComponent && isOrdered(layout) &&
                           (isMultiplied(layout) || isSkipped(layout));
    if (!memory || !supported || layout.bytesPerRow / (layout.bitsPerPixel / 8) < layout.width) {
        return std::nullopt;
    }
    return CGBitmapContext(static_cast<std::byte*>(memory), layout);
}

bool CGBitmapContext::draw(CGImageRef image) const {
    if (!image || image->layout().width != _layout.width || image->layout().height != _layout.height ||
        image->layout().bitsPerComponent != _layout.bitsPerComponent || !isOrdered(image->layout())) {
        return false;
    }
    const bool widened = hasThreeComponents(image->layout()) && isSkipped(_layout);
    if (!widened &&
        (image->layout().bitsPerPixel != _layout.bitsPerPixel || image->layout().bitmapInfo != _layout.bitmapInfo)) {
        return false;
    }
    const PixelShape from(image->layout());
    const PixelShape to(_layout);
    const auto widen = to.componentBytes == 1 ? widenRow<1> : widenRow<2>;
    for (std::uint64_t y = 0; y < _layout.height; ++y) {
        std::byte* row = _memory + y * _layout.bytesPerRow;
        if (widened) {
            widen(image->row(y), from, row, to, _layout.width);
            continue;
        }
        std::memcpy(row, image->row(y), _layout.width * to.pixelBytes);
        if (isSkipped(_layout)) {
            fillSkipped(row, to, _layout.width);
        }
    }
    return true;
}

} // namespace qivo
