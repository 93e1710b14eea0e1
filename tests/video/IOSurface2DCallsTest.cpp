// Which calls the surface gets, in which order, and what becomes of those that fail.
#include "video/IOSurface2D.h"

#include "tests/video/FakeSurface.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>

namespace qivo {
namespace {

using testing::Each;
using testing::ElementsAre;
using testing::IsEmpty;

class IOSurface2DCalls : public testing::Test {
  protected:
    std::shared_ptr<IOSurface> memory = std::make_shared<IOSurface>("a");
    std::array<std::uint8_t, 16> pixels{};

    void SetUp() override {
        takeSurfaceCalls();
        fakeSurfaces() = {.created = {}, .next = memory};
        pixels.fill(7);
    }

    /// 2 x 2 pixels of 32 bits.
    IOSurface2D acquired;
    void acquire() {
        acquired.setWidth(2);
        acquired.setHeight(2);
        EXPECT_TRUE(acquired.acquire());
    }

    std::shared_ptr<const CGImage> picture() const {
        const CGImageLayout layout{.width = 2, .height = 2, .bytesPerRow = 8, .bitmapInfo = 1};
        return CGImage::create(layout, pixels.data(), pixels.size());
    }
};

TEST_F(IOSurface2DCalls, SurfaceIsMadeOfTheSixValuesInTheOrderOfTheKeys) {
    EXPECT_THAT(kIOSurface2DKeys, ElementsAre(kIOSurfaceWidth, kIOSurfaceHeight, kIOSurfacePixelFormat,
                                              kIOSurfaceBytesPerElement, kIOSurfaceBytesPerRow, kIOSurfaceAllocSize));
    acquire();
    EXPECT_THAT(fakeSurfaces().created, ElementsAre(ElementsAre(2, 2, 0x52474241, 4, 8, 16)));
    EXPECT_EQ(acquired.surface(), memory.get());
    EXPECT_THAT(takeSurfaceCalls(), IsEmpty());
}

TEST_F(IOSurface2DCalls, ReadingLocksAvoidWaitingUnlessToldOtherwise) {
    acquire();
    EXPECT_TRUE(acquired.lock(true));
    EXPECT_TRUE(acquired.unlock());
    acquired.setAvoidSync(false);
    EXPECT_TRUE(acquired.lock(true));
    EXPECT_TRUE(acquired.unlock());
    EXPECT_TRUE(acquired.lock(false));
    EXPECT_TRUE(acquired.unlock());
    EXPECT_THAT(takeSurfaceCalls(),
                ElementsAre("lock a 3", "unlock a 3", "lock a 1", "unlock a 1", "lock a 0", "unlock a 0"));
}

TEST_F(IOSurface2DCalls, UnlockUsesTheOptionsOfTheLastLockEvenIfItFailed) {
    acquire();
    EXPECT_TRUE(acquired.lock(false));
    memory->lockResult = kIOReturnError;
    EXPECT_FALSE(acquired.lock(true));
    EXPECT_TRUE(acquired.unlock());
    EXPECT_TRUE(acquired.unlock());
    EXPECT_THAT(takeSurfaceCalls(), ElementsAre("lock a 0", "lock a 3", "unlock a 3", "unlock a 3"));
}

TEST_F(IOSurface2DCalls, UnlockTellsThatItFailed) {
    acquire();
    memory->unlockResult = kIOReturnError;
    EXPECT_TRUE(acquired.lock(true));
    EXPECT_FALSE(acquired.unlock());
}

TEST_F(IOSurface2DCalls, UpdateWritesUnderALock) {
    acquire();
    EXPECT_TRUE(acquired.update(pixels.data()));
    EXPECT_THAT(memory->pixels, Each(7));
    EXPECT_THAT(takeSurfaceCalls(), ElementsAre("lock a 0", "unlock a 0"));
}

TEST_F(IOSurface2DCalls, UpdateIsFalseIfTheLockFails) {
    acquire();
    memory->lockResult = kIOReturnError;
    EXPECT_FALSE(acquired.update(pixels.data()));
    EXPECT_THAT(memory->pixels, Each(0));
    EXPECT_THAT(takeSurfaceCalls(), ElementsAre("lock a 0"));
}

TEST_F(IOSurface2DCalls, UpdateIsFalseWithoutAnAddressAndUnlocks) {
    acquire();
    memory->hasAddress = false;
    EXPECT_FALSE(acquired.update(pixels.data()));
    EXPECT_THAT(takeSurfaceCalls(), ElementsAre("lock a 0", "unlock a 0"));
}

TEST_F(IOSurface2DCalls, UpdateOfNullLocksNothing) {
    acquire();
    EXPECT_FALSE(acquired.update(nullptr));
    EXPECT_THAT(takeSurfaceCalls(), IsEmpty());
}

TEST_F(IOSurface2DCalls, PictureIsDrawnUnderALock) {
    const auto image = picture();
    const auto surface = IOSurface2D::initWithImageRef(image.get());
    EXPECT_EQ(surface->surface(), memory.get());
    EXPECT_THAT(memory->pixels, Each(7));
    EXPECT_THAT(takeSurfaceCalls(), ElementsAre("lock a 0", "unlock a 0"));
}

TEST_F(IOSurface2DCalls, SurfaceThatCannotBeLockedStaysUndrawn) {
    memory->lockResult = kIOReturnError;
    const auto surface = IOSurface2D::initWithImageRef(picture().get());
    EXPECT_EQ(surface->surface(), memory.get());
    EXPECT_THAT(memory->pixels, Each(0));
    EXPECT_THAT(takeSurfaceCalls(), ElementsAre("lock a 0"));
}

TEST_F(IOSurface2DCalls, SurfaceWithoutAddressStaysUndrawnAndIsUnlocked) {
    memory->hasAddress = false;
    EXPECT_TRUE(IOSurface2D::initWithImageRef(picture().get())->surface());
    EXPECT_THAT(memory->pixels, Each(0));
    EXPECT_THAT(takeSurfaceCalls(), ElementsAre("lock a 0", "unlock a 0"));
}

TEST_F(IOSurface2DCalls, AcquireIsTrueEvenIfThereIsNoSurfaceToBeHadAndCanBeTriedAgain) {
    fakeSurfaces().next = nullptr;
    acquire();
    EXPECT_EQ(acquired.surface(), nullptr);
    EXPECT_FALSE(acquired.lock(true));
    acquired.setWidth(1);
    EXPECT_EQ(acquired.width(), 1U) << "not frozen";
    fakeSurfaces().next = memory;
    EXPECT_TRUE(acquired.acquire());
    EXPECT_EQ(acquired.surface(), memory.get());
}

TEST_F(IOSurface2DCalls, PictureWithoutASurfaceToBeHadLeavesNone) {
    fakeSurfaces().next = nullptr;
    const auto surface = IOSurface2D::initWithImageRef(picture().get());
    EXPECT_EQ(surface->surface(), nullptr);
    EXPECT_THAT(takeSurfaceCalls(), IsEmpty());
}

TEST_F(IOSurface2DCalls, NothingIsAskedOfAnObjectWithoutSurface) {
    IOSurface2D none;
    EXPECT_FALSE(none.lock(true));
    EXPECT_FALSE(none.unlock());
    EXPECT_FALSE(none.update(pixels.data()));
    EXPECT_EQ(none.map(), nullptr);
    EXPECT_EQ(none.map({1, 1}), nullptr);
    EXPECT_FALSE(none.copy(memory.get()));
    EXPECT_THAT(takeSurfaceCalls(), IsEmpty());
}

TEST_F(IOSurface2DCalls, IsReleasedWithItsOwner) {
    auto surface = IOSurface2D::initWithImageRef(picture().get());
    const std::weak_ptr<IOSurface> watched = memory;
    memory.reset();
    EXPECT_FALSE(watched.expired());
    surface.reset();
    EXPECT_TRUE(watched.expired());
}

} // namespace
} // namespace qivo
