#include "video/s2dcpy.h"

#include "tests/video/FakeSurface.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>

namespace qivo {
namespace {

using testing::Each;
using testing::ElementsAre;
using testing::IsEmpty;

class S2dcpy : public testing::Test {
  protected:
    IOSurface a{"a"};
    IOSurface b{"b"};
    IOReturn status = kIOReturnError;

    void SetUp() override {
        takeSurfaceCalls();
        std::fill(a.pixels.begin(), a.pixels.end(), std::uint8_t{7});
    }

    IOReturn copied(IOSurfaceRef src, IOSurfaceRef dst) {
        EXPECT_EQ(s2dcpy(src, dst, &status), dst);
        return status;
    }

    void expectUntouched() { EXPECT_THAT(b.pixels, Each(0)); }

    const std::vector<std::string> bothLocks = {"lock a 1", "lock b 0", "unlock b 0", "unlock a 0"};
};

TEST_F(S2dcpy, CopiesTheWholePlaneAndUnlocksTheSourceAsIfItHadBeenWritten) {
    EXPECT_EQ(copied(&a, &b), kIOReturnCpySuccess);
    EXPECT_EQ(b.pixels, a.pixels);
    EXPECT_EQ(takeSurfaceCalls(), bothLocks);
}

TEST_F(S2dcpy, WithANullSourceLocksNothing) {
    EXPECT_EQ(copied(nullptr, &b), kIOReturnCpyErrSrcRef);
    EXPECT_THAT(takeSurfaceCalls(), IsEmpty());
    expectUntouched();
}

TEST_F(S2dcpy, WithANullDestinationLocksNothing) {
    EXPECT_EQ(copied(&a, nullptr), kIOReturnCpyErrDstRef);
    EXPECT_THAT(takeSurfaceCalls(), IsEmpty());
}

TEST_F(S2dcpy, WithBothNullTheSourceIsToBlame) {
    EXPECT_EQ(copied(nullptr, nullptr), kIOReturnCpyErrSrcRef);
}

TEST_F(S2dcpy, ReportsTheResultOfTheSourcesLockAndUnlocksNothing) {
    a.lockResult = 0xE00002CC;
    EXPECT_EQ(copied(&a, &b), 0xE00002CCU);
    EXPECT_THAT(takeSurfaceCalls(), ElementsAre("lock a 1"));
    expectUntouched();
}

TEST_F(S2dcpy, ReportsTheResultOfTheDestinationsLockAndUnlocksTheSource) {
    b.lockResult = 0xE00002CC;
    EXPECT_EQ(copied(&a, &b), 0xE00002CCU);
    EXPECT_THAT(takeSurfaceCalls(), ElementsAre("lock a 1", "lock b 0", "unlock a 0"));
    expectUntouched();
}

TEST_F(S2dcpy, RefusesPlanesOfAnotherHeight) {
    a.plane.height = 1;
    a.plane.bytesPerRow = 4; // checked later
    EXPECT_EQ(copied(&a, &b), kIOReturnCpyErrHeight);
    EXPECT_EQ(takeSurfaceCalls(), bothLocks);
    expectUntouched();
}

TEST_F(S2dcpy, RefusesPlanesOfAnotherDistanceOfRows) {
    a.plane.bytesPerRow = 0; // a zero size is checked later
    EXPECT_EQ(copied(&a, &b), kIOReturnCpyErrRowBytes);
    EXPECT_EQ(takeSurfaceCalls(), bothLocks);
    expectUntouched();
}

TEST_F(S2dcpy, RefusesPlanesWithoutSize) {
    a.hasAddress = false; // checked later
    for (IOSurface* surface : {&a, &b}) {
        surface->plane.bytesPerRow = 0;
    }
    EXPECT_EQ(copied(&a, &b), kIOReturnCpyErrSize);
    EXPECT_EQ(takeSurfaceCalls(), bothLocks);
    for (IOSurface* surface : {&a, &b}) {
        surface->plane = {.bytesPerRow = 8};
    }
    EXPECT_EQ(copied(&a, &b), kIOReturnCpyErrSize);
}

TEST_F(S2dcpy, RefusesASourceWithoutAddress) {
    a.hasAddress = b.hasAddress = false;
    EXPECT_EQ(copied(&a, &b), kIOReturnCpyErrSrcPtr);
    EXPECT_EQ(takeSurfaceCalls(), bothLocks);
}

TEST_F(S2dcpy, RefusesADestinationWithoutAddress) {
    b.hasAddress = false;
    EXPECT_EQ(copied(&a, &b), kIOReturnCpyErrDstPtr);
    EXPECT_EQ(takeSurfaceCalls(), bothLocks);
    expectUntouched();
}

TEST_F(S2dcpy, DoesNotCompareWidths) {
    a.plane.width = 1;
    EXPECT_EQ(copied(&a, &b), kIOReturnCpySuccess);
}

TEST_F(S2dcpy, CopiesBetweenThePlanesThatAreNamed) {
    a.planeIndex = 3;
    b.planeIndex = 5;
    EXPECT_EQ(s2dcpy_ex(3, &a, 5, &b, &status), &b);
    EXPECT_EQ(status, kIOReturnCpySuccess);
    EXPECT_EQ(b.pixels, a.pixels);
    EXPECT_EQ(copied(&a, &b), kIOReturnCpyErrSize) << "neither has a plane 0";
    b.planeIndex = 0;
    EXPECT_EQ(copied(&a, &b), kIOReturnCpyErrHeight) << "only one has";
}

TEST_F(S2dcpy, CopiesASurfaceOntoItself) {
    EXPECT_EQ(copied(&a, &a), kIOReturnCpySuccess);
    EXPECT_THAT(takeSurfaceCalls(), ElementsAre("lock a 1", "lock a 0", "unlock a 0", "unlock a 0"));
    EXPECT_THAT(a.pixels, Each(7));
}

TEST_F(S2dcpy, CanDoWithoutAStatus) {
    EXPECT_EQ(s2dcpy(&a, &b, nullptr), &b);
    EXPECT_EQ(b.pixels, a.pixels);
    EXPECT_EQ(s2dcpy(nullptr, nullptr, nullptr), nullptr);
}

} // namespace
} // namespace qivo
