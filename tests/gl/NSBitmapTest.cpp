#include "gl/NSBitmap.h"

#include <gtest/gtest.h>

#include <memory>

namespace qivo {
namespace {

class SpecialBitmap : public BitmapImageRep {
  public:
    SpecialBitmap() : BitmapImageRep(BitmapLayout{}, Planes{}) {}
};

std::shared_ptr<BitmapImageRep> someBitmap() {
    return std::make_shared<BitmapImageRep>(BitmapLayout{}, BitmapImageRep::Planes{});
}

TEST(NSBitmap, IsTheFirstBitmapInTheOrderOfTheRepresentations) {
    const auto first = someBitmap();
    Image image({1, 1});
    image.addRepresentation(std::make_shared<ImageRep>(Size{1, 1}));
    image.addRepresentation(first);
    image.addRepresentation(someBitmap());
    EXPECT_EQ(NSBitmap::initWithImage(&image)->bitmap(), first.get());
    EXPECT_EQ(NSBitmap::bitmapWithImage(&image)->bitmap(), first.get());
}

TEST(NSBitmap, MayBeOfASpecialKind) {
    const auto special = std::make_shared<SpecialBitmap>();
    Image image({1, 1});
    image.addRepresentation(special);
    image.addRepresentation(someBitmap());
    EXPECT_EQ(NSBitmap::initWithImage(&image)->bitmap(), special.get());
}

TEST(NSBitmap, OfAnImageWithoutBitmapIsNull) {
    Image image({1, 1});
    image.addRepresentation(std::make_shared<ImageRep>(Size{1, 1}));
    EXPECT_EQ(NSBitmap::initWithImage(&image)->bitmap(), nullptr);
}

TEST(NSBitmap, OfAnImageWithoutRepresentationsIsNull) {
    const Image image({1, 1});
    EXPECT_EQ(NSBitmap::initWithImage(&image)->bitmap(), nullptr);
}

TEST(NSBitmap, OfNoImageIsNull) {
    EXPECT_EQ(NSBitmap::initWithImage(nullptr)->bitmap(), nullptr);
    EXPECT_EQ(NSBitmap::bitmapWithImage(nullptr)->bitmap(), nullptr);
}

TEST(NSBitmap, KeepsTheBitmapAlive) {
    auto bitmap = someBitmap();
    const std::weak_ptr<BitmapImageRep> watched = bitmap;
    auto image = std::make_unique<Image>(Size{1, 1});
    image->addRepresentation(std::move(bitmap));
    auto holder = NSBitmap::initWithImage(image.get());
    image.reset();
    EXPECT_FALSE(watched.expired());
    holder.reset();
    EXPECT_TRUE(watched.expired());
}

} // namespace
} // namespace qivo
