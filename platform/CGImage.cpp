#include "platform/CGImage.h"

#include "platform/Image.h"

#include <bit>
#include <cstring>
#include <limits>
#include <vector>

namespace qivo {

namespace {

constexpr CGBitmapInfo machineOrder16 =
    std::endian::native == std::endian::little ? kCGBitmapByteOrder16Little : kCGBitmapByteOrder16Big;

bool isSound(const CGImageLayout& layout, std::uint64_t bytes) {
    const std::uint64_t bits = layout.bitsPerComponent;
    if (!std::has_single_bit(bits) || bits > 32 || layout.bitsPerPixel < bits || layout.bitsPerPixel > 1024) {
        return false;
    }
    const std::uint64_t rowBits = bytes < std::numeric_limits<std::uint64_t>::max() / 8 ? layout.bytesPerRow * 8 : 0;
    return layout.width > 0 && layout.height > 0 && layout.bytesPerRow > 0 && layout.bytesPerRow <= bytes &&
           rowBits / layout.bitsPerPixel >= layout.width && bytes / layout.bytesPerRow >= layout.height;
}

/// To the nearest: the exact quotient is never halfway, as the divisor is odd.
template <typename Sample>
Sample multiplied(Sample colour, Sample alpha) {
    constexpr std::uint32_t one = std::numeric_limits<Sample>::max();
    return static_cast<Sample>((std::uint32_t{colour} * alpha + one / 2) / one);
}

template <typename Sample>
void multiplyRow(const std::uint8_t* source, std::byte* target, std::uint64_t width) {
    Sample pixel[4];
    for (std::uint64_t x = 0; x < width; ++x) {
        std::memcpy(pixel, source + x * sizeof pixel, sizeof pixel);
        for (int colour = 0; colour < 3; ++colour) {
            pixel[colour] = multiplied(pixel[colour], pixel[3]);
        }
        std::memcpy(target + x * sizeof pixel, pixel, sizeof pixel);
    }
}

std::shared_ptr<const CGImage> multipliedImage(CGImageLayout layout, const std::uint8_t* source) {
    const std::uint64_t sourceRow = layout.bytesPerRow;
    layout.bytesPerRow = layout.width * layout.bitsPerPixel / 8;
    auto pixels = std::make_shared<std::vector<std::byte>>(layout.bytesPerRow * layout.height);
    for (std::uint64_t y = 0; y < layout.height; ++y) {
        const auto multiply = layout.bitsPerComponent == 16 ? multiplyRow<std::uint16_t> : multiplyRow<std::uint8_t>;
        multiply(source + y * sourceRow, pixels->data() + y * layout.bytesPerRow, layout.width);
    }
    const auto* data = pixels->data();
    const std::uint64_t bytes = pixels->size();
    return CGImage::create(layout, data, bytes, std::move(pixels));
}

} // namespace

std::shared_ptr<const CGImage> CGImage::create(const CGImageLayout& layout, const void* pixels, std::uint64_t bytes,
                                               std::shared_ptr<const void> owner) {
    if (!pixels || !isSound(layout, bytes)) {
        return nullptr;
    }
    return std::make_shared<const CGImage>(layout, static_cast<const std::byte*>(pixels), std::move(owner));
}

std::shared_ptr<const CGImage> CGImage::imageWithBitmap(const BitmapImageRep* bitmap) {
    if (!bitmap || bitmap->isPlanar() || bitmap->pixelsWide() <= 0 || bitmap->pixelsHigh() <= 0 ||
        bitmap->bytesPerRow() <= 0 || bitmap->bitsPerSample() <= 0 || bitmap->samplesPerPixel() <= 0) {
        return nullptr;
    }
    CGImageLayout layout;
    layout.width = static_cast<std::uint64_t>(bitmap->pixelsWide());
    layout.height = static_cast<std::uint64_t>(bitmap->pixelsHigh());
    layout.bitsPerComponent = static_cast<std::uint64_t>(bitmap->bitsPerSample());
    layout.bitsPerPixel = layout.bitsPerComponent * static_cast<std::uint64_t>(bitmap->samplesPerPixel());
    layout.bytesPerRow = static_cast<std::uint64_t>(bitmap->bytesPerRow());
    layout.bitmapInfo = (bitmap->hasAlpha() ? kCGImageAlphaPremultipliedLast : kCGImageAlphaNone) |
                        (layout.bitsPerComponent == 16 ? machineOrder16 : kCGBitmapByteOrderDefault);
    const auto wrapped = create(layout, bitmap->bitmapData(), layout.bytesPerRow * layout.height);
    const bool isColourWithAlpha = layout.bitsPerPixel == 4 * layout.bitsPerComponent &&
                                   (layout.bitsPerComponent == 8 || layout.bitsPerComponent == 16);
    const bool isToBeMultiplied = bitmap->hasAlpha() && !bitmap->isPremultiplied() && isColourWithAlpha;
    return wrapped && isToBeMultiplied ? multipliedImage(layout, bitmap->bitmapData()) : wrapped;
}

} // namespace qivo
