#include "platform/Image.h"
#include "platform/LocalFile.h"

#include <QFile>
#include <QImage>
#include <QImageReader>

#include <algorithm>
#include <cstring>
#include <filesystem>
#include <iterator>
#include <string>
#include <string_view>
#include <system_error>
#include <utility>

namespace qivo {

namespace {

bool isTooLarge(QSize size) {
    return static_cast<std::int64_t>(size.width()) * size.height() > Image::maximumPixels;
}

/// Formats of pixels. A plugin of the toolkit may draw others, in a size and at a cost that the file decides.
bool isOfPixels(const QByteArray& format) {
    constexpr std::string_view known[] = {"bmp", "dib", "gif", "icns", "ico",  "jpeg", "jpg",  "pbm", "pgm",
                                          "png", "ppm", "tga", "tif",  "tiff", "wbmp", "webp", "xbm", "xpm"};
    return std::find(std::begin(known), std::end(known), format.toStdString()) != std::end(known);
}

QImage decoded(const char* path) {
    std::error_code error;
    if (!path || !std::filesystem::is_regular_file(path, error)) {
        return {};
    }
    // Qt's own bound is lower and counts mebibytes: here those of the deepest layout.
    QImageReader::setAllocationLimit(static_cast<int>(Image::maximumPixels * 8 >> 20));
    QImageReader reader(QFile::decodeName(path));
    reader.setDecideFormatFromContent(true);
    if (!isOfPixels(reader.format()) || isTooLarge(reader.size())) {
        return {};
    }
    QImage image = reader.read();
    return isTooLarge(image.size()) ? QImage() : image;
}

bool isGrey(const QImage& image) {
    switch (image.format()) {
    case QImage::Format_Grayscale8:
    case QImage::Format_Grayscale16:
        return true;
    case QImage::Format_Mono:
    case QImage::Format_MonoLSB:
        return image.allGray();
    default:
        return false;
    }
}

/// Whether a sample has more than 8 bits.
bool isDeep(const QImage& image) {
    switch (image.format()) {
    case QImage::Format_Grayscale16:
    case QImage::Format_BGR30:
    case QImage::Format_A2BGR30_Premultiplied:
    case QImage::Format_RGB30:
    case QImage::Format_A2RGB30_Premultiplied:
        return true;
    default:
        return image.depth() > 32;
    }
}

std::shared_ptr<BitmapImageRep> bitmapOf8Bits(const QImage& image, std::int32_t samples) {
    constexpr QImage::Format formats[] = {QImage::Format_Grayscale8, QImage::Format_RGB888, QImage::Format_RGBA8888};
    auto pixels = std::make_shared<const QImage>(image.convertToFormat(formats[samples / 2]));
    if (pixels->isNull()) {
        return nullptr;
    }
    const BitmapLayout layout{.pixelsWide = pixels->width(),
                              .pixelsHigh = pixels->height(),
                              .bitsPerSample = 8,
                              .samplesPerPixel = samples,
                              .hasAlpha = samples == 4,
                              .bytesPerRow = static_cast<std::int32_t>(pixels->bytesPerLine())};
    const auto* data = pixels->constBits();
    return std::make_shared<BitmapImageRep>(layout, BitmapImageRep::Planes{data}, std::move(pixels));
}

/// Copies rows whose pixels are `stride` samples apart, dropping what a pixel has beyond `samples`.
void copyRow(const std::uint16_t* source, std::int32_t stride, std::uint16_t* target, std::int32_t samples,
             std::int32_t width) {
    for (std::int32_t x = 0; x < width; ++x) {
        std::memcpy(target + std::ptrdiff_t{x} * samples, source + std::ptrdiff_t{x} * stride,
                    sizeof(std::uint16_t) * static_cast<std::size_t>(samples));
    }
}

std::shared_ptr<BitmapImageRep> bitmapOf16Bits(const QImage& image, std::int32_t samples) {
    constexpr QImage::Format formats[] = {QImage::Format_Grayscale16, QImage::Format_RGBX64, QImage::Format_RGBA64};
    const QImage source = image.convertToFormat(formats[samples / 2]);
    if (source.isNull()) {
        return nullptr;
    }
    const auto rowSamples = static_cast<std::size_t>(source.width()) * static_cast<std::size_t>(samples);
    auto pixels =
        std::make_shared<std::vector<std::uint16_t>>(2 * rowSamples * static_cast<std::size_t>(source.height()));
    for (int y = 0; y < source.height(); ++y) {
        copyRow(reinterpret_cast<const std::uint16_t*>(source.constScanLine(y)), samples == 1 ? 1 : 4,
                pixels->data() + rowSamples * static_cast<std::size_t>(y), samples, source.width());
    }
    const BitmapLayout layout{.pixelsWide = source.width(),
                              .pixelsHigh = source.height(),
                              .bitsPerSample = 16,
                              .samplesPerPixel = samples,
                              .hasAlpha = samples == 4,
                              .bytesPerRow = static_cast<std::int32_t>(rowSamples * sizeof(std::uint16_t))};
    const auto* data = reinterpret_cast<const std::uint8_t*>(pixels->data());
    return std::make_shared<BitmapImageRep>(layout, BitmapImageRep::Planes{data}, std::move(pixels));
}

} // namespace

std::shared_ptr<Image> Image::imageWithContentsOfFile(const char* path) {
    const QImage picture = decoded(path);
    if (picture.isNull()) {
        return nullptr;
    }
    const std::int32_t samples = isGrey(picture) ? 1 : picture.hasAlphaChannel() ? 4 : 3;
    const auto bitmap = isDeep(picture) ? bitmapOf16Bits(picture, samples) : bitmapOf8Bits(picture, samples);
    if (!bitmap) {
        return nullptr;
    }
    auto image = std::make_shared<Image>(bitmap->size());
    image->addRepresentation(bitmap);
    return image;
}

std::shared_ptr<Image> Image::imageWithContentsOfURL(const char* url) {
    std::string error;
    const auto path = localPath(url, error);
    return path ? imageWithContentsOfFile(path->c_str()) : nullptr;
}

} // namespace qivo
