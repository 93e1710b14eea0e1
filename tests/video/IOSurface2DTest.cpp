#include "video/IOSurface2D.h"

#include "platform/Image.h"
#include "tests/gl/Pictures.h"
#include "tests/gl/ResourceDirectory.h"
#include "tests/platform/LogCapture.h"
#include "video/s2dcpy.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <QImage>

#include <bit>
#include <cmath>
#include <cstring>
#include <limits>
#include <type_traits>

namespace qivo {
namespace {

using testing::Each;
using testing::ElementsAre;
using testing::IsEmpty;

static_assert(!std::is_copy_constructible_v<IOSurface2D> && !std::is_move_constructible_v<IOSurface2D>);
static_assert(std::endian::native == std::endian::little, "what follows writes 16-bit components as bytes");

constexpr std::uint32_t codeRGBA = 0x52474241;
constexpr std::uint32_t codeRGhA = 0x52476841;

using Bytes = std::vector<std::uint8_t>;

Bytes bytesOf(IOSurface2D& surface) {
    Bytes bytes(surface.size());
    EXPECT_TRUE(surface.lock(true));
    std::memcpy(bytes.data(), surface.map(), bytes.size());
    EXPECT_TRUE(surface.unlock());
    return bytes;
}

class IOSurface2DTest : public testing::Test {
  protected:
    LogCapture log;

    void TearDown() override { EXPECT_THAT(log.take(), IsEmpty()); }

    static std::unique_ptr<IOSurface2D> ofPixels(const CGImageLayout& layout, const Bytes& pixels) {
        const auto image = CGImage::create(layout, pixels.data(), pixels.size());
        EXPECT_TRUE(image);
        return IOSurface2D::initWithImageRef(image.get());
    }

    static std::unique_ptr<IOSurface2D> acquired(std::uint64_t bitsPerPixel, std::uint64_t width,
                                                 std::uint64_t height) {
        auto surface = std::make_unique<IOSurface2D>();
        surface->setBitsPerPixel(bitsPerPixel);
        surface->setWidth(width);
        surface->setHeight(height);
        EXPECT_TRUE(surface->acquire());
        EXPECT_TRUE(surface->surface());
        return surface;
    }
};

TEST_F(IOSurface2DTest, InitDescribesAndMakesNoSurface) {
    const IOSurface2D surface;
    EXPECT_EQ(surface.surface(), nullptr);
    EXPECT_EQ(surface.width(), 1920U);
    EXPECT_EQ(surface.height(), 1080U);
    EXPECT_EQ(surface.bitsPerComponent(), 8U);
    EXPECT_EQ(surface.bitsPerPixel(), 32U);
    EXPECT_EQ(surface.alphaInfo(), kCGImageAlphaPremultipliedLast);
    EXPECT_TRUE(surface.avoidSync());
    EXPECT_EQ(surface.bytesPerPixel(), 0U);
    EXPECT_EQ(surface.samplesPerPixel(), 0U);
    EXPECT_EQ(surface.bytesPerRow(), 0U);
    EXPECT_EQ(surface.size(), 0U);
    EXPECT_EQ(surface.format(), 0U);
    EXPECT_EQ(IOSurface2D::surfaceWithDefaults()->width(), 1920U);
}

TEST_F(IOSurface2DTest, InitFollowedByAcquireMakesAFullHdSurfaceOnce) {
    IOSurface2D surface;
    EXPECT_TRUE(surface.acquire());
    EXPECT_EQ(surface.bytesPerRow(), 7680U);
    EXPECT_EQ(surface.size(), 8294400U);
    EXPECT_EQ(surface.format(), codeRGBA);
    EXPECT_EQ(surface.samplesPerPixel(), 4U);
    EXPECT_EQ(surface.alphaInfo(), kCGImageAlphaPremultipliedLast);
    IOSurfaceRef memory = surface.surface();
    EXPECT_EQ(IOSurfaceGetWidth(memory), 1920U);
    EXPECT_EQ(IOSurfaceGetHeight(memory), 1080U);
    EXPECT_EQ(IOSurfaceGetPixelFormat(memory), codeRGBA);
    EXPECT_EQ(IOSurfaceGetBytesPerElement(memory), 4U);
    EXPECT_EQ(IOSurfaceGetBytesPerRow(memory), 7680U);
    EXPECT_EQ(IOSurfaceGetAllocSize(memory), 8294400U);
    EXPECT_EQ(bytesOf(surface), Bytes(8294400, 0));
    EXPECT_FALSE(surface.acquire());
    EXPECT_EQ(surface.surface(), memory);
}

struct Derived {
    std::uint64_t asked, bitsPerComponent, bitsPerPixel, bytesPerPixel;
    std::uint32_t alphaInfo, format;
};

TEST_F(IOSurface2DTest, AcquireDerivesTheLayoutFromTheBitsPerPixel) {
    for (const Derived& expected : {Derived{24, 8, 32, 4, 5, codeRGBA}, Derived{32, 8, 32, 4, 1, codeRGBA},
                                    Derived{48, 16, 64, 8, 5, codeRGhA}, Derived{64, 16, 64, 8, 1, codeRGhA}}) {
        IOSurface2D surface;
        surface.setWidth(3);
        surface.setHeight(2);
        surface.setBitsPerPixel(expected.asked);
        surface.setBitsPerComponent(5);
        surface.setAlphaInfo(kCGImageAlphaFirst);
        EXPECT_TRUE(surface.acquire()) << expected.asked;
        EXPECT_EQ(surface.bitsPerComponent(), expected.bitsPerComponent) << expected.asked;
        EXPECT_EQ(surface.bitsPerPixel(), expected.bitsPerPixel) << expected.asked;
        EXPECT_EQ(surface.samplesPerPixel(), 4U) << expected.asked;
        EXPECT_EQ(surface.bytesPerPixel(), expected.bytesPerPixel) << expected.asked;
        EXPECT_EQ(surface.bytesPerRow(), 3 * expected.bytesPerPixel) << expected.asked;
        EXPECT_EQ(surface.size(), 6 * expected.bytesPerPixel) << expected.asked;
        EXPECT_EQ(surface.alphaInfo(), expected.alphaInfo) << expected.asked;
        EXPECT_EQ(surface.format(), expected.format) << expected.asked;
        EXPECT_EQ(IOSurfaceGetPixelFormat(surface.surface()), expected.format) << expected.asked;
    }
}

TEST_F(IOSurface2DTest, AcquireRefusesOtherBitsPerPixelAndKeepsTheProperties) {
    for (const std::uint64_t bits : {0, 1, 8, 16, 23, 25, 40, 56, 96, 128}) {
        IOSurface2D surface;
        surface.setBitsPerPixel(bits);
        EXPECT_FALSE(surface.acquire()) << bits;
        EXPECT_EQ(surface.surface(), nullptr) << bits;
        EXPECT_EQ(surface.bitsPerPixel(), bits);
        EXPECT_EQ(surface.bytesPerRow(), 0U) << bits;
        surface.setBitsPerPixel(32);
        EXPECT_TRUE(surface.acquire()) << "tried again";
    }
}

TEST_F(IOSurface2DTest, AcquireOfAnImpossibleSizeIsTrueWithoutASurface) {
    constexpr auto most = std::numeric_limits<std::uint64_t>::max();
    for (const auto& [width, height] : {std::pair<std::uint64_t, std::uint64_t>{0, 1080},
                                        {1920, 0},
                                        {most, 1080},
                                        {1920, most},
                                        {std::uint64_t{1} << 62, 4},
                                        {4, std::uint64_t{1} << 60},
                                        {std::uint64_t{1} << 31, std::uint64_t{1} << 31}}) {
        IOSurface2D surface;
        surface.setWidth(width);
        surface.setHeight(height);
        EXPECT_TRUE(surface.acquire()) << width << " x " << height;
        EXPECT_EQ(surface.surface(), nullptr) << width << " x " << height;
        EXPECT_EQ(surface.map(), nullptr);
    }
}

TEST_F(IOSurface2DTest, SettersAreIgnoredOnceThereIsASurface) {
    const auto surface = acquired(32, 3, 2);
    surface->setWidth(5);
    surface->setHeight(5);
    surface->setBitsPerPixel(64);
    surface->setBitsPerComponent(16);
    surface->setAlphaInfo(kCGImageAlphaNoneSkipFirst);
    surface->setAvoidSync(false);
    EXPECT_EQ(surface->width(), 3U);
    EXPECT_EQ(surface->height(), 2U);
    EXPECT_EQ(surface->bitsPerPixel(), 32U);
    EXPECT_EQ(surface->bitsPerComponent(), 8U);
    EXPECT_EQ(surface->alphaInfo(), kCGImageAlphaPremultipliedLast);
    EXPECT_FALSE(surface->avoidSync()) << "save this one";
}

TEST_F(IOSurface2DTest, TwentyFourBitImageBecomesAThirtyTwoBitSurfaceThatSkips) {
    const auto surface = ofPixels({.width = 2, .height = 2, .bitsPerPixel = 24, .bytesPerRow = 7},
                                  {1, 2, 3, 4, 5, 6, 99, 7, 8, 9, 10, 11, 12, 99});
    ASSERT_TRUE(surface->surface());
    EXPECT_EQ(surface->bitsPerPixel(), 32U);
    EXPECT_EQ(surface->samplesPerPixel(), 4U);
    EXPECT_EQ(surface->format(), codeRGBA);
    EXPECT_EQ(surface->alphaInfo(), kCGImageAlphaNoneSkipLast);
    EXPECT_EQ(surface->bytesPerRow(), 4 * surface->width());
    EXPECT_THAT(bytesOf(*surface), ElementsAre(255, 3, 2, 1, 255, 6, 5, 4, 255, 9, 8, 7, 255, 12, 11, 10))
        << "a little-endian word of R, G, B, skipped";
}

TEST_F(IOSurface2DTest, FortyEightBitImageBecomesASixtyFourBitSurfaceOfLittleComponents) {
    CGImageLayout layout{.width = 1, .height = 2, .bitsPerComponent = 16, .bitsPerPixel = 48, .bytesPerRow = 6};
    const Bytes big = {1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12};
    const Bytes little = {2, 1, 4, 3, 6, 5, 255, 255, 8, 7, 10, 9, 12, 11, 255, 255};
    for (const auto order : {kCGBitmapByteOrderDefault, kCGBitmapByteOrder16Big}) {
        layout.bitmapInfo = order;
        const auto surface = ofPixels(layout, big);
        ASSERT_TRUE(surface->surface());
        EXPECT_EQ(surface->bitsPerPixel(), 64U);
        EXPECT_EQ(surface->format(), codeRGhA);
        EXPECT_EQ(surface->alphaInfo(), kCGImageAlphaNoneSkipLast);
        EXPECT_EQ(bytesOf(*surface), little);
    }
    layout.bitmapInfo = kCGBitmapByteOrder16Little;
    EXPECT_EQ(bytesOf(*ofPixels(layout, {2, 1, 4, 3, 6, 5, 8, 7, 10, 9, 12, 11})), little);
}

TEST_F(IOSurface2DTest, ThirtyTwoBitImageKeepsItsOwnOrderAndAlpha) {
    const Bytes pixels = {1, 2, 3, 4, 5, 6, 7, 8};
    for (const auto alpha : {kCGImageAlphaPremultipliedLast, kCGImageAlphaPremultipliedFirst}) {
        for (const auto order : {kCGBitmapByteOrderDefault, kCGBitmapByteOrder32Little, kCGBitmapByteOrder32Big}) {
            const auto surface =
                ofPixels({.width = 2, .height = 1, .bytesPerRow = 8, .bitmapInfo = alpha | order}, pixels);
            ASSERT_TRUE(surface->surface());
            EXPECT_EQ(surface->alphaInfo(), alpha);
            EXPECT_EQ(surface->format(), codeRGBA);
            EXPECT_EQ(bytesOf(*surface), pixels) << alpha << " " << order;
        }
    }
}

TEST_F(IOSurface2DTest, SkippedComponentsBecomeAllOnesWhereverTheyLie) {
    const auto drawn = [](std::uint32_t bitmapInfo) {
        return bytesOf(*ofPixels({.width = 1, .height = 1, .bytesPerRow = 4, .bitmapInfo = bitmapInfo}, {1, 2, 3, 4}));
    };
    EXPECT_THAT(drawn(kCGImageAlphaNoneSkipLast), ElementsAre(1, 2, 3, 255));
    EXPECT_THAT(drawn(kCGImageAlphaNoneSkipFirst), ElementsAre(255, 2, 3, 4));
    EXPECT_THAT(drawn(kCGImageAlphaNoneSkipLast | kCGBitmapByteOrder32Little), ElementsAre(255, 2, 3, 4));
    EXPECT_THAT(drawn(kCGImageAlphaNoneSkipFirst | kCGBitmapByteOrder32Little), ElementsAre(1, 2, 3, 255));
}

TEST_F(IOSurface2DTest, SixtyFourBitImageKeepsItsOwnOrderAndAlpha) {
    const Bytes pixels = {1, 2, 3, 4, 5, 6, 7, 8};
    for (const auto order : {kCGBitmapByteOrderDefault, kCGBitmapByteOrder16Little, kCGBitmapByteOrder16Big}) {
        const auto surface = ofPixels({.width = 1,
                                       .height = 1,
                                       .bitsPerComponent = 16,
                                       .bitsPerPixel = 64,
                                       .bytesPerRow = 8,
                                       .bitmapInfo = kCGImageAlphaPremultipliedLast | order},
                                      pixels);
        ASSERT_TRUE(surface->surface());
        EXPECT_EQ(surface->format(), codeRGhA);
        EXPECT_EQ(surface->samplesPerPixel(), 4U);
        EXPECT_EQ(bytesOf(*surface), pixels) << order;
    }
}

TEST_F(IOSurface2DTest, LayoutThatCannotBeDrawnIntoLeavesABlankSurface) {
    const Bytes pixels = {1, 2, 3, 4, 5, 6, 7, 8};
    for (const CGImageLayout& layout :
         {CGImageLayout{.width = 2, .height = 1, .bytesPerRow = 8, .bitmapInfo = kCGImageAlphaLast},
          CGImageLayout{.width = 2, .height = 1, .bytesPerRow = 8, .bitmapInfo = kCGImageAlphaFirst},
          CGImageLayout{.width = 2, .height = 1, .bytesPerRow = 8, .bitmapInfo = kCGImageAlphaNone},
          CGImageLayout{.width = 2, .height = 1, .bytesPerRow = 8, .bitmapInfo = kCGImageAlphaOnly},
          CGImageLayout{.width = 2, .height = 1, .bytesPerRow = 8, .bitmapInfo = 1 | kCGBitmapByteOrder16Little},
          CGImageLayout{.width = 2, .height = 1, .bitsPerComponent = 16, .bytesPerRow = 8, .bitmapInfo = 1},
          CGImageLayout{.width = 1,
          .height = 1,
          .bitsPerComponent = 16,
          .bitsPerPixel = 64,
          .bytesPerRow = 8,
          .bitmapInfo = 1 | kCGBitmapFloatComponents},
          CGImageLayout{
              .width = 2, .height = 1, .bitsPerPixel = 24, .bytesPerRow = 8, .bitmapInfo = kCGBitmapByteOrder32Little},
          CGImageLayout{.width = 2, .height = 1, .bitsPerComponent = 32, .bytesPerRow = 8}}) {
        const auto surface = ofPixels(layout, pixels);
        ASSERT_TRUE(surface->surface()) << layout.bitmapInfo;
        EXPECT_THAT(bytesOf(*surface), Each(0)) << layout.bitmapInfo;
    }
}

TEST_F(IOSurface2DTest, FormatFollowsTheBytesPerPixelWhateverTheComponents) {
    const auto formatOf = [](std::uint64_t bitsPerComponent, std::uint64_t bitsPerPixel) {
        return ofPixels({.width = 1,
                         .height = 1,
                         .bitsPerComponent = bitsPerComponent,
                         .bitsPerPixel = bitsPerPixel,
                         .bytesPerRow = 8},
                        Bytes(8))
            ->format();
    };
    EXPECT_EQ(formatOf(4, 24), 24U) << "six components of 4 bits";
    EXPECT_EQ(formatOf(8, 48), 0x62343872U) << "six of 8 bits";
    EXPECT_EQ(formatOf(32, 32), codeRGBA) << "one of 32 bits, which becomes four";
}

TEST_F(IOSurface2DTest, OtherBitsPerPixelOfAnImageLeaveTheDefaults) {
    for (const std::uint64_t bits : {8, 16, 96, 128}) {
        const auto surface = ofPixels({.width = 1, .height = 1, .bitsPerPixel = bits, .bytesPerRow = 16}, Bytes(16));
        EXPECT_EQ(surface->surface(), nullptr) << bits;
        EXPECT_EQ(surface->bitsPerPixel(), 32U);
        EXPECT_EQ(surface->width(), 1920U);
        EXPECT_TRUE(surface->acquire()) << "which make a surface";
    }
}

TEST_F(IOSurface2DTest, LoadersTakeNull) {
    EXPECT_EQ(IOSurface2D::initWithImage(nullptr)->surface(), nullptr);
    EXPECT_EQ(IOSurface2D::initWithImageRef(nullptr)->surface(), nullptr);
    EXPECT_EQ(IOSurface2D::initWithURL(nullptr)->surface(), nullptr);
    EXPECT_EQ(IOSurface2D::initWithFile(nullptr)->surface(), nullptr);
    EXPECT_EQ(IOSurface2D::initWithResource(nullptr)->surface(), nullptr);
    EXPECT_EQ(IOSurface2D::surfaceWithImage(nullptr)->surface(), nullptr);
    EXPECT_EQ(IOSurface2D::surfaceWithImageRef(nullptr)->surface(), nullptr);
    EXPECT_EQ(IOSurface2D::surfaceWithURL(nullptr)->surface(), nullptr);
    EXPECT_EQ(IOSurface2D::surfaceWithFile(nullptr)->surface(), nullptr);
    EXPECT_EQ(IOSurface2D::surfaceWithResource(nullptr)->surface(), nullptr);
}

TEST_F(IOSurface2DTest, NoPictureHasNeitherSizeNorBits) {
    EXPECT_EQ(CGImageGetWidth(nullptr), 0U);
    EXPECT_EQ(CGImageGetHeight(nullptr), 0U);
    EXPECT_EQ(CGImageGetBitsPerComponent(nullptr), 0U);
    EXPECT_EQ(CGImageGetBitsPerPixel(nullptr), 0U);
    EXPECT_EQ(CGImageGetBitmapInfo(nullptr), kCGImageAlphaNone);
    EXPECT_EQ(CGImageGetAlphaInfo(nullptr), kCGImageAlphaNone);
}

TEST_F(IOSurface2DTest, EveryLoaderReadsAPicture) {
    const ResourceDirectory directory;
    QImage picture(3, 2, QImage::Format_RGBA8888);
    picture.fill(QColor(255, 0, 0));
    ASSERT_TRUE(picture.save(QString::fromStdString(directory.path("red.png"))));
    const std::string path = directory.path("red.png");
    const std::string url = "file://" + path;
    const auto image = Image::imageWithContentsOfFile(path.c_str());
    const std::shared_ptr<IOSurface2D> surfaces[] = {
        IOSurface2D::initWithImage(image.get()),  IOSurface2D::surfaceWithImage(image.get()),
        IOSurface2D::initWithURL(url.c_str()),    IOSurface2D::surfaceWithURL(url.c_str()),
        IOSurface2D::initWithFile(path.c_str()),  IOSurface2D::surfaceWithFile(path.c_str()),
        IOSurface2D::initWithResource("red.png"), IOSurface2D::surfaceWithResource("red.png")};
    for (const auto& surface : surfaces) {
        ASSERT_TRUE(surface->surface());
        EXPECT_EQ(surface->width(), 3U);
        EXPECT_EQ(surface->height(), 2U);
    }
    EXPECT_EQ(IOSurface2D::initWithResource("red")->surface(), nullptr) << "the extension belongs to the name";
    EXPECT_EQ(IOSurface2D::initWithURL(("http" + url.substr(4)).c_str())->surface(), nullptr);
    EXPECT_EQ(IOSurface2D::initWithFile(directory.path("none.png").c_str())->surface(), nullptr);
}

TEST_F(IOSurface2DTest, PlanarBitmapAndImageWithoutBitmapGiveNone) {
    const Bytes pixels(64, 1);
    const Image planar =
        pictureOf({.pixelsWide = 2, .pixelsHigh = 2, .isPlanar = true, .bytesPerRow = 8}, pixels.data());
    EXPECT_EQ(IOSurface2D::initWithImage(&planar)->surface(), nullptr);
    Image vector({2, 2});
    vector.addRepresentation(std::make_shared<ImageRep>(Size{2, 2}));
    EXPECT_EQ(IOSurface2D::initWithImage(&vector)->surface(), nullptr);
}

TEST_F(IOSurface2DTest, BitmapThatCannotBeSoGivesNone) {
    const Bytes pixels(64, 1);
    const BitmapLayout sound{.pixelsWide = 2, .pixelsHigh = 2, .bytesPerRow = 8};
    const auto surfaceOf = [](const BitmapLayout& layout, const void* data) {
        const Image image = pictureOf(layout, data);
        return IOSurface2D::initWithImage(&image)->sharedSurface();
    };
    EXPECT_TRUE(surfaceOf(sound, pixels.data()));
    EXPECT_FALSE(surfaceOf(sound, nullptr));
    for (const auto spoil :
         {+[](BitmapLayout& layout) { layout.pixelsWide = 0; }, +[](BitmapLayout& layout) { layout.pixelsWide = -2; },
          +[](BitmapLayout& layout) { layout.pixelsHigh = -2; }, +[](BitmapLayout& layout) { layout.bytesPerRow = 7; },
          +[](BitmapLayout& layout) { layout.bytesPerRow = -8; },
          +[](BitmapLayout& layout) { layout.bitsPerSample = 0; },
          +[](BitmapLayout& layout) { layout.bitsPerSample = -8; },
          +[](BitmapLayout& layout) { layout.samplesPerPixel = 0; },
          +[](BitmapLayout& layout) { layout.samplesPerPixel = 1; }}) {
        BitmapLayout layout = sound;
        spoil(layout);
        EXPECT_FALSE(surfaceOf(layout, pixels.data()));
    }
}

TEST_F(IOSurface2DTest, AlphaIsMultipliedInOnceAtMost) {
    const Bytes pixels = {200, 100, 50, 128};
    BitmapLayout layout{.pixelsWide = 1, .pixelsHigh = 1, .bytesPerRow = 4};
    const Image straight = pictureOf(layout, pixels.data());
    EXPECT_THAT(bytesOf(*IOSurface2D::initWithImage(&straight)), ElementsAre(100, 50, 25, 128));
    layout.isPremultiplied = true;
    const Image multiplied = pictureOf(layout, pixels.data());
    EXPECT_THAT(bytesOf(*IOSurface2D::initWithImage(&multiplied)), ElementsAre(200, 100, 50, 128));
}

TEST_F(IOSurface2DTest, UpdateReplacesAllPixels) {
    const auto surface = acquired(32, 3, 2);
    Bytes pixels(24);
    for (std::size_t at = 0; at < pixels.size(); ++at) {
        pixels[at] = static_cast<std::uint8_t>(at + 1);
    }
    EXPECT_TRUE(surface->update(pixels.data()));
    EXPECT_EQ(bytesOf(*surface), pixels);
    EXPECT_FALSE(surface->update(nullptr));
}

TEST_F(IOSurface2DTest, MapOfAPointCountsFromTheTopLeft) {
    IOSurface2D surface;
    surface.acquire();
    ASSERT_EQ(surface.bytesPerRow(), 7680U);
    auto* base = static_cast<char*>(surface.map());
    ASSERT_TRUE(base);
    EXPECT_EQ(surface.map({2, 3}), base + 8 + 23040);
    EXPECT_EQ(surface.map({2.9, 3.9}), base + 8 + 23040) << "truncated";
    EXPECT_EQ(surface.map({0, 0}), base);
    EXPECT_EQ(surface.map({-1, std::nan("")}), base);
    EXPECT_NE(surface.map({1e300, 1e300}), nullptr) << "no bounds are checked, but nothing overflows";
}

TEST_F(IOSurface2DTest, CopySucceedsBetweenSurfacesOfEqualHeightAndStrideButOfDifferentWidth) {
    const auto narrow = acquired(64, 2, 3);
    const auto wide = acquired(32, 4, 3);
    ASSERT_EQ(narrow->bytesPerRow(), wide->bytesPerRow());
    EXPECT_TRUE(narrow->update(Bytes(48, 9).data()));
    EXPECT_TRUE(wide->copy(narrow->surface()));
    EXPECT_THAT(bytesOf(*wide), Each(9));
}

TEST_F(IOSurface2DTest, CopyRefusesWhatDoesNotMatch) {
    const auto surface = acquired(32, 4, 3);
    EXPECT_FALSE(surface->copy(acquired(32, 4, 2)->surface()));
    EXPECT_FALSE(surface->copy(acquired(32, 5, 3)->surface()));
    EXPECT_FALSE(surface->copy(nullptr));
    EXPECT_FALSE(surface->copy(acquired(32, 4, 3)->surface(), 1)) << "it has no second plane";
    EXPECT_FALSE(IOSurface2D().copy(surface->surface())) << "there is nothing to copy to";
    EXPECT_THAT(bytesOf(*surface), Each(0));
}

TEST_F(IOSurface2DTest, CopyTakesThePlaneThatIsNamed) {
    const std::vector<IOSurfacePlane> planes = {
        {.width = 4, .height = 3, .bytesPerElement = 4, .bytesPerRow = 16, .offset = 0},
        {.width = 4, .height = 3, .bytesPerElement = 4, .bytesPerRow = 16, .offset = 48}};
    const auto source = IOSurfaceCreate({{kIOSurfaceWidth, 4},
                                         {kIOSurfaceHeight, 3},
                                         {kIOSurfacePixelFormat, 0},
                                         {kIOSurfaceBytesPerElement, 4},
                                         {kIOSurfaceBytesPerRow, 16},
                                         {kIOSurfaceAllocSize, 96}},
                                        planes);
    ASSERT_TRUE(source);
    std::memset(IOSurfaceGetBaseAddressOfPlane(source.get(), 0), 1, 48);
    std::memset(IOSurfaceGetBaseAddressOfPlane(source.get(), 1), 2, 48);
    const auto surface = acquired(32, 4, 3);
    EXPECT_TRUE(surface->copy(source.get()));
    EXPECT_THAT(bytesOf(*surface), Each(1));
    EXPECT_TRUE(surface->copy(source.get(), 1));
    EXPECT_THAT(bytesOf(*surface), Each(2));
    EXPECT_FALSE(surface->copy(source.get(), 2));
}

TEST_F(IOSurface2DTest, CopyOntoItselfSucceeds) {
    const auto surface = acquired(32, 4, 3);
    EXPECT_TRUE(surface->update(Bytes(48, 9).data()));
    EXPECT_TRUE(surface->copy(surface->surface()));
    EXPECT_THAT(bytesOf(*surface), Each(9));
}

TEST_F(IOSurface2DTest, CopiedObjectHasASurfaceAndPixelsOfItsOwn) {
    const auto surface = acquired(64, 3, 2);
    surface->setAvoidSync(false);
    EXPECT_TRUE(surface->update(Bytes(48, 9).data()));
    const auto copy = surface->copyWithZone();
    ASSERT_TRUE(copy->surface());
    EXPECT_NE(copy->surface(), surface->surface());
    EXPECT_FALSE(copy->avoidSync());
    EXPECT_EQ(copy->width(), 3U);
    EXPECT_EQ(copy->height(), 2U);
    EXPECT_EQ(copy->bitsPerPixel(), 64U);
    EXPECT_THAT(bytesOf(*copy), Each(9));
    EXPECT_TRUE(surface->update(Bytes(48, 1).data()));
    EXPECT_THAT(bytesOf(*copy), Each(9));
}

TEST_F(IOSurface2DTest, CopyOfAWidenedSurfaceHasAlphaWhereThatSkips) {
    const auto surface = ofPixels({.width = 1, .height = 1, .bitsPerPixel = 24, .bytesPerRow = 3}, {1, 2, 3});
    const auto copy = surface->copyWithZone();
    EXPECT_EQ(copy->alphaInfo(), kCGImageAlphaPremultipliedLast);
    EXPECT_EQ(bytesOf(*copy), bytesOf(*surface));
}

TEST_F(IOSurface2DTest, CopyOfAnObjectWithoutSurfaceHasOneOfItsOwnThatIsBlank) {
    IOSurface2D surface;
    surface.setWidth(3);
    surface.setHeight(2);
    const auto copy = surface.copyWithZone();
    ASSERT_TRUE(copy->surface());
    EXPECT_EQ(copy->width(), 3U);
    EXPECT_THAT(bytesOf(*copy), Each(0));
    surface.setBitsPerPixel(96);
    EXPECT_EQ(surface.copyWithZone()->surface(), nullptr);
    EXPECT_EQ(surface.copyWithZone()->bitsPerPixel(), 96U);
}

TEST_F(IOSurface2DTest, SharedSurfaceOutlivesTheObject) {
    auto surface = acquired(32, 3, 2);
    surface->update(Bytes(24, 9).data());
    const auto memory = surface->sharedSurface();
    surface.reset();
    EXPECT_EQ(static_cast<std::uint8_t*>(IOSurfaceGetBaseAddress(memory.get()))[23], 9);
}

TEST_F(IOSurface2DTest, SeedTellsThatAPictureWasWritten) {
    const auto surface = acquired(32, 3, 2);
    const auto before = IOSurfaceGetSeed(surface->surface());
    bytesOf(*surface);
    EXPECT_TRUE(acquired(32, 3, 2)->copy(surface->surface())) << "which reads";
    EXPECT_EQ(IOSurfaceGetSeed(surface->surface()), before);
    surface->update(Bytes(24, 9).data());
    EXPECT_NE(IOSurfaceGetSeed(surface->surface()), before);
}

} // namespace
} // namespace qivo
