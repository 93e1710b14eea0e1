#include "platform/Image.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <memory>
#include <vector>

namespace qivo {
namespace {

TEST(BitmapImageRep, WrapsTheCallersPixelsWithoutCopying) {
    std::vector<std::uint8_t> pixels(2560 * 480);
    const BitmapLayout layout{.pixelsWide = 640, .pixelsHigh = 480, .bytesPerRow = 2560};
    const BitmapImageRep bitmap(layout, {pixels.data()});
    EXPECT_EQ(bitmap.bitmapData(), pixels.data());
    pixels[7] = 42;
    EXPECT_EQ(bitmap.bitmapData()[7], 42);
}

TEST(BitmapImageRep, ReportsTheLayoutAsGiven) {
    const BitmapLayout layout{.pixelsWide = 3,
                              .pixelsHigh = -2,
                              .bitsPerSample = 16,
                              .samplesPerPixel = 5,
                              .hasAlpha = false,
                              .isPremultiplied = true,
                              .isPlanar = true,
                              .bytesPerRow = 7};
    const BitmapImageRep bitmap(layout, {});
    EXPECT_EQ(bitmap.layout(), layout);
    EXPECT_EQ(bitmap.pixelsWide(), 3);
    EXPECT_EQ(bitmap.pixelsHigh(), -2);
    EXPECT_EQ(bitmap.bitsPerSample(), 16);
    EXPECT_EQ(bitmap.samplesPerPixel(), 5);
    EXPECT_FALSE(bitmap.hasAlpha());
    EXPECT_TRUE(bitmap.isPremultiplied());
    EXPECT_TRUE(bitmap.isPlanar());
    EXPECT_EQ(bitmap.bytesPerRow(), 7);
    EXPECT_EQ(bitmap.bitmapData(), nullptr);
}

TEST(BitmapImageRep, IsByDefaultFour8BitSamplesWithAlphaInOnePlane) {
    const BitmapLayout layout;
    EXPECT_EQ(layout.bitsPerSample, 8);
    EXPECT_EQ(layout.samplesPerPixel, 4);
    EXPECT_TRUE(layout.hasAlpha);
    EXPECT_FALSE(layout.isPremultiplied);
    EXPECT_FALSE(layout.isPlanar);
}

TEST(BitmapImageRep, KeepsItsPlanes) {
    const std::uint8_t planes[3] = {};
    const BitmapImageRep bitmap({.isPlanar = true}, {&planes[0], &planes[1], &planes[2]});
    EXPECT_EQ(bitmap.bitmapData(), &planes[0]);
    EXPECT_THAT(bitmap.bitmapDataPlanes(), testing::ElementsAre(&planes[0], &planes[1], &planes[2], nullptr, nullptr));
}

TEST(BitmapImageRep, HoldsTheOwnerOfItsPixels) {
    auto pixels = std::make_shared<std::vector<std::uint8_t>>(4);
    const std::weak_ptr<const void> watched = pixels;
    const auto* data = pixels->data();
    auto bitmap = std::make_unique<BitmapImageRep>(BitmapLayout{}, BitmapImageRep::Planes{data}, std::move(pixels));
    EXPECT_FALSE(watched.expired());
    bitmap.reset();
    EXPECT_TRUE(watched.expired());
}

TEST(BitmapImageRep, HasTheSizeOfItsPixels) {
    EXPECT_EQ(BitmapImageRep({.pixelsWide = 640, .pixelsHigh = 480}, {}).size(), (Size{640, 480}));
}

TEST(Image, KeepsItsRepresentationsInOrder) {
    Image image({640, 480});
    const auto vector = std::make_shared<ImageRep>(Size{1, 2});
    const auto bitmap = std::make_shared<BitmapImageRep>(BitmapLayout{}, BitmapImageRep::Planes{});
    EXPECT_THAT(image.representations(), testing::IsEmpty());
    image.addRepresentation(vector);
    image.addRepresentation(bitmap);
    EXPECT_THAT(image.representations(), testing::ElementsAre(vector, bitmap));
    EXPECT_EQ(image.size(), (Size{640, 480}));
}

} // namespace
} // namespace qivo
