#include "platform/Image.h"

#include "tests/platform/TemporaryDirectory.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <QImage>
#include <QImageIOHandler>
#include <QImageIOPlugin>
#include <QImageReader>
#include <QtPlugin>

#include <algorithm>
#include <cstring>
#include <fstream>
#include <iterator>
#include <sys/stat.h>
#include <vector>

namespace {

/// Draws whatever begins as a drawing of lines does, as a plugin of the toolkit would.
class DrawingHandler final : public QImageIOHandler {
  public:
    bool canRead() const override { return device() != nullptr && device()->peek(4) == "<svg"; }
    bool read(QImage* image) override {
        *image = QImage(3, 2, QImage::Format_RGBA8888);
        image->fill(Qt::red);
        return canRead();
    }
};

} // namespace

class DrawingPlugin final : public QImageIOPlugin {
    Q_OBJECT
    Q_PLUGIN_METADATA(IID QImageIOHandlerFactoryInterface_iid FILE "DrawingPlugin.json")

  public:
    Capabilities capabilities(QIODevice* device, const QByteArray& format) const override {
        return format == "svg" || (device != nullptr && device->isReadable() && device->peek(4) == "<svg")
                   ? CanRead
                   : Capabilities();
    }
    QImageIOHandler* create(QIODevice* device, const QByteArray& format) const override {
        auto* handler = new DrawingHandler; // NOLINT(cppcoreguidelines-owning-memory): the caller's
        handler->setDevice(device);
        handler->setFormat(format.isEmpty() ? QByteArray("svg") : format);
        return handler;
    }
};

Q_IMPORT_PLUGIN(DrawingPlugin)

namespace qivo {
namespace {

using testing::Each;
using testing::ElementsAre;

class ImageDecoding : public testing::Test {
  protected:
    TemporaryDirectory directory;
    std::shared_ptr<Image> image;

    /// The only representation of the picture in this file; null if it cannot be decoded.
    const BitmapImageRep* decode(const std::string& path) {
        image = Image::imageWithContentsOfFile(path.c_str());
        if (!image || image->representations().size() != 1) {
            return nullptr;
        }
        return dynamic_cast<const BitmapImageRep*>(image->representations().front().get());
    }

    const BitmapImageRep* decode(const QImage& picture, const char* name = "picture.png") {
        const std::string path = directory.path(name);
        return picture.save(QString::fromStdString(path)) ? decode(path) : nullptr;
    }
};

QImage filled(QImage::Format format, const QColor& colour, int width = 3, int height = 2) {
    QImage picture(width, height, format);
    picture.fill(colour);
    return picture;
}

template <typename Sample>
std::vector<Sample> samples(const BitmapImageRep& bitmap, int row, int count) {
    std::vector<Sample> values(static_cast<std::size_t>(count));
    std::memcpy(values.data(), bitmap.bitmapData() + std::ptrdiff_t{row} * bitmap.bytesPerRow(),
                values.size() * sizeof(Sample));
    return values;
}

TEST_F(ImageDecoding, GivesStraightRgbaOf8Bits) {
    const auto* bitmap = decode(filled(QImage::Format_RGBA8888, QColor(200, 100, 50, 128)));
    ASSERT_TRUE(bitmap);
    EXPECT_EQ(bitmap->layout(), (BitmapLayout{.pixelsWide = 3,
                                              .pixelsHigh = 2,
                                              .bitsPerSample = 8,
                                              .samplesPerPixel = 4,
                                              .hasAlpha = true,
                                              .isPlanar = false,
                                              .bytesPerRow = 12}));
    EXPECT_THAT(samples<std::uint8_t>(*bitmap, 1, 4), ElementsAre(200, 100, 50, 128));
    EXPECT_EQ(image->size(), (Size{3, 2}));
}

TEST_F(ImageDecoding, GivesThreeSamplesWithoutAlphaAndTheRowsTrueLength) {
    const auto* bitmap = decode(filled(QImage::Format_RGB888, QColor(1, 2, 3)));
    ASSERT_TRUE(bitmap);
    EXPECT_EQ(bitmap->samplesPerPixel(), 3);
    EXPECT_FALSE(bitmap->hasAlpha());
    EXPECT_EQ(bitmap->bytesPerRow(), 12) << "rows of 9 bytes, padded";
    EXPECT_THAT(samples<std::uint8_t>(*bitmap, 1, 9), ElementsAre(1, 2, 3, 1, 2, 3, 1, 2, 3));
}

TEST_F(ImageDecoding, KeepsTheFirstRowOnTop) {
    QImage picture = filled(QImage::Format_RGBA8888, QColor(0, 0, 0));
    picture.setPixelColor(0, 0, QColor(9, 0, 0));
    picture.setPixelColor(2, 1, QColor(0, 9, 0));
    const auto* bitmap = decode(picture);
    ASSERT_TRUE(bitmap);
    EXPECT_EQ(samples<std::uint8_t>(*bitmap, 0, 12)[0], 9);
    EXPECT_EQ(samples<std::uint8_t>(*bitmap, 1, 12)[9], 9);
}

TEST_F(ImageDecoding, KeepsTheSixteenBitsOfAPictureWithAlpha) {
    QImage picture(3, 2, QImage::Format_RGBA64);
    picture.fill(Qt::transparent);
    picture.setPixelColor(1, 1, QColor::fromRgba64(0x1234, 0x5678, 0x9ABC, 0xFEDC));
    const auto* bitmap = decode(picture);
    ASSERT_TRUE(bitmap);
    EXPECT_EQ(bitmap->bitsPerSample(), 16);
    EXPECT_EQ(bitmap->samplesPerPixel(), 4);
    EXPECT_EQ(bitmap->bytesPerRow(), 24);
    EXPECT_THAT(samples<std::uint16_t>(*bitmap, 1, 8), ElementsAre(0, 0, 0, 0, 0x1234, 0x5678, 0x9ABC, 0xFEDC));
}

TEST_F(ImageDecoding, KeepsTheSixteenBitsOfAPictureWithoutAlpha) {
    const auto* bitmap = decode(filled(QImage::Format_RGBX64, QColor::fromRgba64(0x1234, 0x5678, 0x9ABC)));
    ASSERT_TRUE(bitmap);
    EXPECT_EQ(bitmap->bitsPerSample(), 16);
    EXPECT_EQ(bitmap->samplesPerPixel(), 3);
    EXPECT_EQ(bitmap->bytesPerRow(), 18);
    EXPECT_THAT(samples<std::uint16_t>(*bitmap, 1, 6), ElementsAre(0x1234, 0x5678, 0x9ABC, 0x1234, 0x5678, 0x9ABC));
}

TEST_F(ImageDecoding, PutsAsManyZeroBytesBehind16BitPixels) {
    const auto* bitmap = decode(filled(QImage::Format_RGBA64, QColor(255, 255, 255, 255)));
    ASSERT_TRUE(bitmap);
    EXPECT_THAT(samples<std::uint8_t>(*bitmap, 1, 24), Each(255));
    EXPECT_THAT(samples<std::uint8_t>(*bitmap, 2, 2 * 24), Each(0));
}

TEST_F(ImageDecoding, TurnsPalettesIntoColours) {
    QImage picture(3, 2, QImage::Format_Indexed8);
    picture.setColorTable({qRgb(10, 20, 30), qRgb(40, 50, 60)});
    picture.fill(1);
    const auto* bitmap = decode(picture);
    ASSERT_TRUE(bitmap);
    EXPECT_EQ(bitmap->samplesPerPixel(), 3);
    EXPECT_THAT(samples<std::uint8_t>(*bitmap, 0, 3), ElementsAre(40, 50, 60));
}

TEST_F(ImageDecoding, KeepsTheSingleSampleOfAGreyPicture) {
    const auto* bitmap = decode(filled(QImage::Format_Grayscale8, QColor(77, 77, 77)));
    ASSERT_TRUE(bitmap);
    EXPECT_EQ(bitmap->samplesPerPixel(), 1);
    EXPECT_EQ(bitmap->bitsPerSample(), 8);
    EXPECT_THAT(samples<std::uint8_t>(*bitmap, 1, 3), Each(77));
}

TEST_F(ImageDecoding, KeepsTheSingleSampleOfAGreyPictureOf16Bits) {
    QImage picture(3, 2, QImage::Format_Grayscale16);
    for (int y = 0; y < 2; ++y) {
        std::fill_n(reinterpret_cast<std::uint16_t*>(picture.scanLine(y)), 3, std::uint16_t{0x1234});
    }
    const auto* bitmap = decode(picture);
    ASSERT_TRUE(bitmap);
    EXPECT_EQ(bitmap->samplesPerPixel(), 1);
    EXPECT_EQ(bitmap->bitsPerSample(), 16);
    EXPECT_THAT(samples<std::uint16_t>(*bitmap, 1, 3), Each(0x1234));
}

TEST_F(ImageDecoding, TurnsBlackAndWhiteIntoASingle8BitSample) {
    QImage picture(3, 2, QImage::Format_Mono);
    picture.setColorTable({qRgb(0, 0, 0), qRgb(255, 255, 255)});
    picture.fill(1);
    const auto* bitmap = decode(picture);
    ASSERT_TRUE(bitmap);
    EXPECT_EQ(bitmap->samplesPerPixel(), 1);
    EXPECT_THAT(samples<std::uint8_t>(*bitmap, 1, 3), Each(255));
}

TEST_F(ImageDecoding, JudgesAFileByItsContentNotItsName) {
    EXPECT_TRUE(filled(QImage::Format_RGBA8888, Qt::red).save(QString::fromStdString(directory.path("a")), "PNG"));
    EXPECT_TRUE(decode(directory.path("a")));
}

TEST_F(ImageDecoding, OutlivesItsFile) {
    const auto* bitmap = decode(filled(QImage::Format_RGBA8888, QColor(5, 6, 7, 8)));
    ASSERT_TRUE(bitmap);
    ASSERT_TRUE(std::filesystem::remove(directory.path("picture.png")));
    EXPECT_THAT(samples<std::uint8_t>(*bitmap, 1, 4), ElementsAre(5, 6, 7, 8));
}

TEST_F(ImageDecoding, OfAMissingFileIsNull) {
    EXPECT_EQ(Image::imageWithContentsOfFile(directory.path("none.png").c_str()), nullptr);
}

TEST_F(ImageDecoding, OfNullIsNull) {
    EXPECT_EQ(Image::imageWithContentsOfFile(nullptr), nullptr);
    EXPECT_EQ(Image::imageWithContentsOfURL(nullptr), nullptr);
}

TEST_F(ImageDecoding, OfATextIsNull) {
    EXPECT_EQ(Image::imageWithContentsOfFile(directory.write("picture.png", "no picture").c_str()), nullptr);
}

TEST_F(ImageDecoding, OfADrawingOfLinesIsNullEvenIfThereIsAPluginForIt) {
    const std::string path = directory.write("drawing.svg", "<svg/>");
    ASSERT_FALSE(QImageReader(QString::fromStdString(path)).read().isNull());
    EXPECT_EQ(Image::imageWithContentsOfFile(path.c_str()), nullptr);
    EXPECT_EQ(Image::imageWithContentsOfFile(directory.write("drawing.png", "<svg/>").c_str()), nullptr);
}

TEST_F(ImageDecoding, OfACutFileIsNull) {
    const auto whole = directory.path("whole.png");
    ASSERT_TRUE(filled(QImage::Format_RGBA8888, Qt::red, 64, 64).save(QString::fromStdString(whole)));
    std::ifstream file(whole, std::ios::binary);
    const std::string bytes((std::istreambuf_iterator<char>(file)), {});
    EXPECT_EQ(Image::imageWithContentsOfFile(directory.write("cut.png", bytes.substr(0, 30)).c_str()), nullptr);
}

TEST_F(ImageDecoding, OfADirectoryOrAPipeIsNull) {
    ASSERT_EQ(::mkfifo(directory.path("pipe").c_str(), 0600), 0);
    EXPECT_EQ(Image::imageWithContentsOfFile(directory.path("pipe").c_str()), nullptr);
    EXPECT_EQ(Image::imageWithContentsOfFile(directory.path().c_str()), nullptr);
}

/// A black and white picture, which takes a bit for each pixel.
std::string blackBitmap(std::int64_t width, std::int64_t height) {
    return "P4\n" + std::to_string(width) + " " + std::to_string(height) + "\n" +
           std::string(static_cast<std::size_t>((width + 7) / 8 * height), '\0');
}

TEST_F(ImageDecoding, DecodesUpToTheLimit) {
    static_assert(Image::maximumPixels % 8192 == 0);
    const auto* bitmap = decode(directory.write("limit.pbm", blackBitmap(8192, Image::maximumPixels / 8192)));
    ASSERT_TRUE(bitmap);
    EXPECT_EQ(bitmap->pixelsWide(), 8192);
}

TEST_F(ImageDecoding, OfAPictureLargerThanTheLimitIsNull) {
    EXPECT_EQ(decode(directory.write("huge.pbm", blackBitmap(8192, Image::maximumPixels / 8192 + 1))), nullptr);
}

TEST_F(ImageDecoding, OfAFileThatOnlyClaimsToBeHugeIsNull) {
    EXPECT_EQ(decode(directory.write("huge.ppm", "P6\n100000 100000\n255\n")), nullptr);
    EXPECT_EQ(decode(directory.write("huger.ppm", "P6\n2147483647 2147483647\n255\n")), nullptr);
}

TEST_F(ImageDecoding, ReadsFileUrls) {
    ASSERT_TRUE(decode(filled(QImage::Format_RGBA8888, Qt::red), "a b.png"));
    EXPECT_NE(Image::imageWithContentsOfURL(("file://" + directory.path("a%20b.png")).c_str()), nullptr);
}

TEST_F(ImageDecoding, RefusesOtherUrls) {
    EXPECT_EQ(Image::imageWithContentsOfURL("http://127.0.0.1/a.png"), nullptr);
    EXPECT_EQ(Image::imageWithContentsOfURL("no url"), nullptr);
}

} // namespace
} // namespace qivo

#include "ImageDecodingTest.moc"
