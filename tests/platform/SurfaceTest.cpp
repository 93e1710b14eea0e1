#include "platform/Surface.h"

#include "platform/SurfaceMemory.h"
#include "tests/platform/SurfaceSocket.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <functional>
#include <limits>
#include <linux/capability.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <thread>
#include <unistd.h>

namespace qivo {
namespace {

using testing::Each;

IOSurfaceProperties smallProperties() {
    return {{kIOSurfaceWidth, 3},           {kIOSurfaceHeight, 2},       {kIOSurfacePixelFormat, 0x52474241},
            {kIOSurfaceBytesPerElement, 4}, {kIOSurfaceBytesPerRow, 12}, {kIOSurfaceAllocSize, 24}};
}

IOSurfaceProperties with(const char* key, std::int64_t value) {
    auto properties = smallProperties();
    properties[key] = value;
    return properties;
}

std::vector<std::uint8_t> bytesOf(IOSurfaceRef surface) {
    std::vector<std::uint8_t> bytes(IOSurfaceGetAllocSize(surface));
    std::memcpy(bytes.data(), IOSurfaceGetBaseAddress(surface), bytes.size());
    return bytes;
}

TEST(Surface, IsMadeOfTheSixProperties) {
    const auto surface = IOSurfaceCreate(smallProperties());
    ASSERT_TRUE(surface);
    EXPECT_EQ(IOSurfaceGetWidth(surface.get()), 3U);
    EXPECT_EQ(IOSurfaceGetHeight(surface.get()), 2U);
    EXPECT_EQ(IOSurfaceGetPixelFormat(surface.get()), 0x52474241U);
    EXPECT_EQ(IOSurfaceGetBytesPerElement(surface.get()), 4U);
    EXPECT_EQ(IOSurfaceGetBytesPerRow(surface.get()), 12U);
    EXPECT_EQ(IOSurfaceGetAllocSize(surface.get()), 24U);
    EXPECT_THAT(bytesOf(surface.get()), Each(0));
}

TEST(Surface, WithoutPlanesIsItsOwnPlane0) {
    const auto surface = IOSurfaceCreate(smallProperties());
    ASSERT_TRUE(surface);
    EXPECT_EQ(IOSurfaceGetPlaneCount(surface.get()), 0U);
    EXPECT_EQ(IOSurfaceGetWidthOfPlane(surface.get(), 0), 3U);
    EXPECT_EQ(IOSurfaceGetHeightOfPlane(surface.get(), 0), 2U);
    EXPECT_EQ(IOSurfaceGetBytesPerRowOfPlane(surface.get(), 0), 12U);
    EXPECT_EQ(IOSurfaceGetBytesPerElementOfPlane(surface.get(), 0), 4U);
    EXPECT_EQ(IOSurfaceGetBaseAddressOfPlane(surface.get(), 0), IOSurfaceGetBaseAddress(surface.get()));
    EXPECT_EQ(IOSurfaceGetHeightOfPlane(surface.get(), 1), 0U);
    EXPECT_EQ(IOSurfaceGetBytesPerRowOfPlane(surface.get(), 1), 0U);
    EXPECT_EQ(IOSurfaceGetBaseAddressOfPlane(surface.get(), 1), nullptr);
}

/// Full size and half size, one behind the other, as video often is.
const std::vector<IOSurfacePlane> twoPlanes = {
    {.width = 4, .height = 2, .bytesPerElement = 1, .bytesPerRow = 8, .offset = 0},
    {.width = 2, .height = 1, .bytesPerElement = 2, .bytesPerRow = 4, .offset = 16}};

IOSurfaceProperties planarProperties() {
    return {{kIOSurfaceWidth, 4},           {kIOSurfaceHeight, 2},      {kIOSurfacePixelFormat, 0},
            {kIOSurfaceBytesPerElement, 1}, {kIOSurfaceBytesPerRow, 8}, {kIOSurfaceAllocSize, 20}};
}

TEST(Surface, HasPlanesWithSizesAndAddressesOfTheirOwn) {
    const auto surface = IOSurfaceCreate(planarProperties(), twoPlanes);
    ASSERT_TRUE(surface);
    EXPECT_EQ(IOSurfaceGetPlaneCount(surface.get()), 2U);
    EXPECT_EQ(IOSurfaceGetWidthOfPlane(surface.get(), 1), 2U);
    EXPECT_EQ(IOSurfaceGetHeightOfPlane(surface.get(), 1), 1U);
    EXPECT_EQ(IOSurfaceGetBytesPerRowOfPlane(surface.get(), 1), 4U);
    EXPECT_EQ(IOSurfaceGetBytesPerElementOfPlane(surface.get(), 1), 2U);
    EXPECT_EQ(IOSurfaceGetBaseAddressOfPlane(surface.get(), 1),
              static_cast<char*>(IOSurfaceGetBaseAddress(surface.get())) + 16);
    EXPECT_EQ(IOSurfaceGetBaseAddressOfPlane(surface.get(), 2), nullptr);
    EXPECT_EQ(IOSurfaceGetBaseAddressOfPlane(surface.get(), ~std::uint64_t{0}), nullptr);
}

TEST(Surface, RefusesPlanesOutsideOfItsMemory) {
    for (const std::uint64_t offset : {std::uint64_t{17}, std::uint64_t{21}, ~std::uint64_t{0}}) {
        auto planes = twoPlanes;
        planes[1].offset = offset;
        EXPECT_FALSE(IOSurfaceCreate(planarProperties(), planes)) << offset;
    }
    auto planes = twoPlanes;
    planes[1].height = 2;
    EXPECT_FALSE(IOSurfaceCreate(planarProperties(), planes));
    planes = twoPlanes;
    planes[0].width = 9;
    EXPECT_FALSE(IOSurfaceCreate(planarProperties(), planes));
}

TEST(Surface, RefusesMorePlanesThanThereMayBe) {
    auto planes = std::vector<IOSurfacePlane>(SurfaceLayout::maximumPlanes, twoPlanes.front());
    EXPECT_TRUE(IOSurfaceCreate(planarProperties(), planes));
    planes.push_back(planes.front());
    EXPECT_FALSE(IOSurfaceCreate(planarProperties(), planes));
}

TEST(Surface, RefusesAPropertyThatIsMissing) {
    for (const auto& [key, value] : smallProperties()) {
        auto properties = smallProperties();
        properties.erase(key);
        EXPECT_FALSE(IOSurfaceCreate(properties)) << key;
    }
    EXPECT_FALSE(IOSurfaceCreate({}));
}

TEST(Surface, RefusesZeroAndNegativeSizes) {
    for (const auto& [key, value] : smallProperties()) {
        EXPECT_FALSE(IOSurfaceCreate(with(key.data(), -1))) << key;
        EXPECT_EQ(IOSurfaceCreate(with(key.data(), 0)) != nullptr, key == kIOSurfacePixelFormat) << key;
    }
}

TEST(Surface, RefusesSizesThatDoNotFitEachOther) {
    EXPECT_FALSE(IOSurfaceCreate(with(kIOSurfaceBytesPerRow, 11)));
    EXPECT_FALSE(IOSurfaceCreate(with(kIOSurfaceAllocSize, 23)));
    EXPECT_TRUE(IOSurfaceCreate(with(kIOSurfaceAllocSize, 25)));
    EXPECT_FALSE(IOSurfaceCreate(with(kIOSurfaceWidth, 4)));
    EXPECT_FALSE(IOSurfaceCreate(with(kIOSurfaceHeight, 3)));
}

TEST(Surface, RefusesSizesThatOverflow) {
    constexpr auto most = std::numeric_limits<std::int64_t>::max();
    for (const auto& [key, value] : smallProperties()) {
        EXPECT_EQ(IOSurfaceCreate(with(key.data(), most)) != nullptr, key == kIOSurfacePixelFormat) << key;
    }
    // Width times bytes, and rows times height, come to 0 in 64 bits.
    auto properties = with(kIOSurfaceWidth, std::int64_t{1} << 62);
    properties[kIOSurfaceBytesPerRow] = 0;
    properties[kIOSurfaceAllocSize] = 0;
    EXPECT_FALSE(IOSurfaceCreate(properties));
    properties = with(kIOSurfaceHeight, std::int64_t{1} << 62);
    EXPECT_FALSE(IOSurfaceCreate(properties));
}

TEST(Surface, RefusesMoreThanTheMachinesMemory) {
    const auto tooMuch = static_cast<std::int64_t>(IOSurface::maximumBytes()) + 1;
    EXPECT_FALSE(IOSurfaceCreate(with(kIOSurfaceAllocSize, tooMuch)));
}

TEST(Surface, SeedChangesWithEveryWritingLockAlone) {
    const auto surface = IOSurfaceCreate(smallProperties());
    ASSERT_TRUE(surface);
    std::uint32_t seed = 77;
    const auto before = IOSurfaceGetSeed(surface.get());
    EXPECT_EQ(IOSurfaceLock(surface.get(), kIOSurfaceLockReadOnly | kIOSurfaceLockAvoidSync, &seed), kIOReturnSuccess);
    EXPECT_EQ(seed, before);
    EXPECT_EQ(IOSurfaceUnlock(surface.get(), kIOSurfaceLockReadOnly, &seed), kIOReturnSuccess);
    EXPECT_EQ(seed, before);
    EXPECT_EQ(IOSurfaceLock(surface.get(), 0, &seed), kIOReturnSuccess);
    EXPECT_NE(seed, before);
    const auto during = seed;
    EXPECT_EQ(IOSurfaceUnlock(surface.get(), 0, &seed), kIOReturnSuccess);
    EXPECT_NE(seed, during);
    EXPECT_NE(seed, before);
    EXPECT_EQ(IOSurfaceGetSeed(surface.get()), seed);
}

TEST(Surface, AReadersUnlockAsIfItHadWrittenLeavesTheSeed) {
    const auto surface = IOSurfaceCreate(smallProperties());
    ASSERT_TRUE(surface);
    const auto before = IOSurfaceGetSeed(surface.get());
    IOSurfaceLock(surface.get(), kIOSurfaceLockReadOnly, nullptr);
    EXPECT_EQ(IOSurfaceUnlock(surface.get(), 0, nullptr), kIOReturnSuccess);
    EXPECT_EQ(IOSurfaceGetSeed(surface.get()), before);
}

TEST(Surface, LocksExcludeNobodyAndAreGivenBackOneByOne) {
    const auto surface = IOSurfaceCreate(smallProperties());
    ASSERT_TRUE(surface);
    EXPECT_EQ(IOSurfaceUnlock(surface.get(), 0, nullptr), kIOReturnNotPermitted);
    EXPECT_EQ(IOSurfaceLock(surface.get(), kIOSurfaceLockReadOnly, nullptr), kIOReturnSuccess);
    EXPECT_EQ(IOSurfaceLock(surface.get(), 0, nullptr), kIOReturnSuccess);
    EXPECT_EQ(IOSurfaceLock(surface.get(), 0, nullptr), kIOReturnSuccess);
    for (int count = 0; count < 3; ++count) {
        EXPECT_EQ(IOSurfaceUnlock(surface.get(), kIOSurfaceLockReadOnly, nullptr), kIOReturnSuccess);
    }
    EXPECT_EQ(IOSurfaceUnlock(surface.get(), kIOSurfaceLockReadOnly, nullptr), kIOReturnNotPermitted);
}

TEST(Surface, ThreadsMayLockAtOnceAndEveryLockCounts) {
    constexpr unsigned turns = 1000;
    const auto surface = IOSurfaceCreate(smallProperties());
    ASSERT_TRUE(surface);
    std::vector<std::thread> threads;
    for (int count = 0; count < 4; ++count) {
        threads.emplace_back([&] {
            for (unsigned turn = 0; turn < turns; ++turn) {
                const std::uint32_t options = turn % 2 * kIOSurfaceLockReadOnly;
                IOSurfaceLock(surface.get(), options, nullptr);
                IOSurfaceUnlock(surface.get(), options, nullptr);
            }
        });
    }
    for (auto& thread : threads) {
        thread.join();
    }
    EXPECT_EQ(IOSurfaceGetSeed(surface.get()), 4 * turns) << "half of the turns, each with two changes";
    EXPECT_EQ(IOSurfaceUnlock(surface.get(), 0, nullptr), kIOReturnNotPermitted) << "none is left over";
}

TEST(Surface, RefusesOptionsThatItDoesNotKnow) {
    const auto surface = IOSurfaceCreate(smallProperties());
    ASSERT_TRUE(surface);
    std::uint32_t seed = 77;
    EXPECT_EQ(IOSurfaceLock(surface.get(), 4, &seed), kIOReturnBadArgument);
    EXPECT_EQ(IOSurfaceUnlock(surface.get(), 4, &seed), kIOReturnBadArgument);
    EXPECT_EQ(seed, 77U);
}

TEST(Surface, NullHasNothing) {
    EXPECT_EQ(IOSurfaceLock(nullptr, 0, nullptr), kIOReturnBadArgument);
    EXPECT_EQ(IOSurfaceUnlock(nullptr, 0, nullptr), kIOReturnBadArgument);
    EXPECT_EQ(IOSurfaceGetSeed(nullptr), 0U);
    EXPECT_EQ(IOSurfaceGetWidth(nullptr), 0U);
    EXPECT_EQ(IOSurfaceGetHeight(nullptr), 0U);
    EXPECT_EQ(IOSurfaceGetBytesPerElement(nullptr), 0U);
    EXPECT_EQ(IOSurfaceGetBytesPerRow(nullptr), 0U);
    EXPECT_EQ(IOSurfaceGetAllocSize(nullptr), 0U);
    EXPECT_EQ(IOSurfaceGetPixelFormat(nullptr), 0U);
    EXPECT_EQ(IOSurfaceGetBaseAddress(nullptr), nullptr);
    EXPECT_EQ(IOSurfaceGetPlaneCount(nullptr), 0U);
    EXPECT_EQ(IOSurfaceGetWidthOfPlane(nullptr, 0), 0U);
    EXPECT_EQ(IOSurfaceGetHeightOfPlane(nullptr, 0), 0U);
    EXPECT_EQ(IOSurfaceGetBytesPerRowOfPlane(nullptr, 0), 0U);
    EXPECT_EQ(IOSurfaceGetBytesPerElementOfPlane(nullptr, 0), 0U);
    EXPECT_EQ(IOSurfaceGetBaseAddressOfPlane(nullptr, 0), nullptr);
    EXPECT_EQ(IOSurfaceGetDescriptor(nullptr), -1);
}

TEST(Surface, NobodyCanMakeItsMemorySmallerOrLarger) {
    const auto surface = IOSurfaceCreate(smallProperties());
    ASSERT_TRUE(surface);
    const int file = IOSurfaceGetDescriptor(surface.get());
    EXPECT_EQ(::ftruncate(file, 0), -1);
    EXPECT_EQ(errno, EPERM);
    EXPECT_EQ(::ftruncate(file, 1 << 20), -1);
    EXPECT_EQ(errno, EPERM);
    EXPECT_EQ(::fcntl(file, F_ADD_SEALS, F_SEAL_WRITE), -1) << "more seals would lock writers out";
    EXPECT_EQ(::fcntl(file, F_GET_SEALS) & IOSurface::seals, F_SEAL_SHRINK | F_SEAL_GROW | F_SEAL_SEAL);
}

TEST(Surface, GivesItsMemoryBack) {
    auto surface = IOSurfaceCreate(smallProperties());
    ASSERT_TRUE(surface);
    const int file = IOSurfaceGetDescriptor(surface.get());
    auto* const base = static_cast<std::uint8_t*>(IOSurfaceGetBaseAddress(surface.get()));
    unsigned char resident = 0;
    ASSERT_EQ(::mincore(base, 1, &resident), 0);
    surface.reset();
    EXPECT_EQ(::fcntl(file, F_GETFD), -1);
    EXPECT_EQ(::mincore(base, 1, &resident), -1);
}

class SurfaceTransfer : public testing::Test {
  protected:
    SurfaceSocket socket;
    std::string error;
    std::shared_ptr<IOSurface> sent = IOSurfaceCreate(planarProperties(), twoPlanes);

    std::shared_ptr<IOSurface> transferred(SurfaceAccess access = SurfaceAccess::readWrite) {
        EXPECT_TRUE(IOSurfaceSend(socket.here(), sent.get(), access, error)) << error;
        return IOSurfaceReceive(socket.there(), error);
    }
};

TEST_F(SurfaceTransfer, SharesLayoutPixelsAndSeed) {
    const auto received = transferred();
    ASSERT_TRUE(received) << error;
    EXPECT_EQ(received->layout(), sent->layout());
    EXPECT_EQ(IOSurfaceLock(sent.get(), 0, nullptr), kIOReturnSuccess);
    std::memset(IOSurfaceGetBaseAddress(sent.get()), 0x5A, 20);
    EXPECT_EQ(IOSurfaceUnlock(sent.get(), 0, nullptr), kIOReturnSuccess);
    EXPECT_THAT(bytesOf(received.get()), Each(0x5A));
    EXPECT_EQ(IOSurfaceGetSeed(received.get()), IOSurfaceGetSeed(sent.get()));
    EXPECT_NE(IOSurfaceGetSeed(received.get()), 0U);

    std::memset(IOSurfaceGetBaseAddress(received.get()), 0x11, 20);
    EXPECT_THAT(bytesOf(sent.get()), Each(0x11));
}

TEST_F(SurfaceTransfer, OutlivesTheSender) {
    const auto received = transferred();
    ASSERT_TRUE(received) << error;
    std::memset(IOSurfaceGetBaseAddress(sent.get()), 0x5A, 20);
    sent.reset();
    EXPECT_THAT(bytesOf(received.get()), Each(0x5A));
}

TEST_F(SurfaceTransfer, ForReadingCannotBeLockedForWriting) {
    const auto received = transferred(SurfaceAccess::readOnly);
    ASSERT_TRUE(received) << error;
    std::uint32_t seed = 77;
    EXPECT_EQ(IOSurfaceLock(received.get(), 0, &seed), kIOReturnNotWritable);
    EXPECT_EQ(seed, 77U);
    EXPECT_EQ(IOSurfaceLock(received.get(), kIOSurfaceLockReadOnly, &seed), kIOReturnSuccess);
    EXPECT_THAT(bytesOf(received.get()), Each(0));
    EXPECT_EQ(IOSurfaceUnlock(received.get(), kIOSurfaceLockReadOnly, nullptr), kIOReturnSuccess);
}

/// Does something in a thread for which permissions count, whoever runs the tests.
void withoutPrivileges(const std::function<void()>& work) {
    std::thread([&] {
        __user_cap_header_struct version{.version = _LINUX_CAPABILITY_VERSION_3, .pid = 0};
        __user_cap_data_struct none[_LINUX_CAPABILITY_U32S_3] = {}; // NOLINT(modernize-avoid-c-arrays): the system's
        ASSERT_EQ(::syscall(SYS_capset, &version, static_cast<void*>(none)), 0);
        work();
    }).join();
}

FileDescriptor openedOnceMore(int file, int access) {
    return FileDescriptor(::open(("/proc/self/fd/" + std::to_string(file)).c_str(), access | O_CLOEXEC));
}

TEST_F(SurfaceTransfer, ForReadingCannotBeOpenedForWriting) {
    const auto received = transferred(SurfaceAccess::readOnly);
    ASSERT_TRUE(received) << error;
    const int file = IOSurfaceGetDescriptor(received.get());
    withoutPrivileges([&] {
        EXPECT_TRUE(openedOnceMore(file, O_RDONLY));
        for (const int access : {O_RDWR, O_WRONLY}) {
            errno = 0;
            EXPECT_FALSE(openedOnceMore(file, access)) << access;
            EXPECT_EQ(errno, EACCES);
        }
    });
}

TEST_F(SurfaceTransfer, ForReadingCanBeSentOnWhereItCannotBeOpenedAtAll) {
    const auto received = transferred(SurfaceAccess::readOnly);
    ASSERT_TRUE(received) << error;
    ASSERT_EQ(::fchmod(IOSurfaceGetDescriptor(sent.get()), 0), 0);
    bool sentOn = false;
    withoutPrivileges([&] {
        EXPECT_FALSE(openedOnceMore(IOSurfaceGetDescriptor(received.get()), O_RDONLY));
        sentOn = IOSurfaceSend(socket.here(), received.get(), SurfaceAccess::readOnly, error);
    });
    ASSERT_TRUE(sentOn) << error;
    const auto third = IOSurfaceReceive(socket.there(), error);
    ASSERT_TRUE(third) << error;
    EXPECT_EQ(IOSurfaceLock(third.get(), 0, nullptr), kIOReturnNotWritable);
}

TEST_F(SurfaceTransfer, CanBeSentOn) {
    const auto received = transferred(SurfaceAccess::readOnly);
    ASSERT_TRUE(received) << error;
    ASSERT_TRUE(IOSurfaceSend(socket.here(), received.get(), SurfaceAccess::readWrite, error)) << error;
    const auto third = IOSurfaceReceive(socket.there(), error);
    ASSERT_TRUE(third) << error;
    EXPECT_EQ(IOSurfaceLock(third.get(), 0, nullptr), kIOReturnNotWritable);
}

TEST_F(SurfaceTransfer, GoesOverDatagramsToo) {
    socket = SurfaceSocket(SOCK_SEQPACKET);
    EXPECT_TRUE(transferred()) << error;
    socket = SurfaceSocket(SOCK_DGRAM);
    EXPECT_TRUE(transferred()) << error;
}

TEST_F(SurfaceTransfer, OfNullIsRefused) {
    EXPECT_FALSE(IOSurfaceSend(socket.here(), nullptr, SurfaceAccess::readWrite, error));
    EXPECT_EQ(error, "There is no surface to send");
}

TEST_F(SurfaceTransfer, ToNobodyFailsAndSaysWhy) {
    socket.closeThere();
    EXPECT_FALSE(IOSurfaceSend(socket.here(), sent.get(), SurfaceAccess::readWrite, error));
    EXPECT_EQ(error, "Sending a surface: Broken pipe");
    EXPECT_FALSE(IOSurfaceSend(-1, sent.get(), SurfaceAccess::readWrite, error));
    EXPECT_EQ(error, "Sending a surface: Bad file descriptor");
}

TEST_F(SurfaceTransfer, FromNobodyIsNullAndSaysWhy) {
    socket.closeHere();
    EXPECT_FALSE(IOSurfaceReceive(socket.there(), error));
    EXPECT_EQ(error, "The connection has ended");
    EXPECT_FALSE(IOSurfaceReceive(-1, error));
    EXPECT_EQ(error, "Receiving a surface: Bad file descriptor");
}

/// A peer that sends what it likes.
class HostileSurfacePeer : public SurfaceTransfer {
  protected:
    SurfaceMessage message{.layout = sent->layout()};

    static constexpr std::size_t soundBytes = 8192;

    /// As a surface's file is made, but for what the test wants to be different.
    static FileDescriptor file(std::size_t bytes = soundBytes, int seals = IOSurface::seals, unsigned flags = 0) {
        FileDescriptor made(::memfd_create("hostile", MFD_ALLOW_SEALING | flags));
        EXPECT_EQ(::ftruncate(made.number(), static_cast<off_t>(bytes)), 0);
        EXPECT_EQ(::fcntl(made.number(), F_ADD_SEALS, seals), 0);
        return made;
    }

    /// What receiving says to this descriptor.
    std::string answer(int descriptor) {
        socket.send(message, {descriptor});
        error.clear();
        EXPECT_FALSE(IOSurfaceReceive(socket.there(), error));
        return error;
    }
};

TEST_F(HostileSurfacePeer, IsBelievedWhatItsMemoryProves) {
    const FileDescriptor sound = file();
    socket.send(message, {sound.number()});
    EXPECT_TRUE(IOSurfaceReceive(socket.there(), error)) << error;
}

TEST_F(HostileSurfacePeer, WithoutSealsIsRefused) {
    constexpr auto text = "The memory of the surface that was received is not sealed";
    EXPECT_EQ(answer(file(soundBytes, 0).number()), text);
    EXPECT_EQ(answer(file(soundBytes, F_SEAL_GROW | F_SEAL_SEAL).number()), text);
    EXPECT_EQ(answer(file(soundBytes, F_SEAL_SHRINK | F_SEAL_SEAL).number()), text);
    EXPECT_EQ(answer(file(soundBytes, F_SEAL_SHRINK | F_SEAL_GROW).number()), text);
}

TEST_F(HostileSurfacePeer, WithMemoryOfAnotherSizeIsRefused) {
    constexpr auto text = "The memory of the surface that was received has another size";
    EXPECT_EQ(answer(file(4096).number()), text);
    EXPECT_EQ(answer(file(0).number()), text);
    EXPECT_EQ(answer(file(12288).number()), text);
}

TEST_F(HostileSurfacePeer, WithAnotherKindOfFileIsRefused) {
    constexpr auto text = "The surface that was received is not shared memory";
    EXPECT_EQ(answer(FileDescriptor(::open("/proc/self/exe", O_RDONLY)).number()), text);
    EXPECT_EQ(answer(FileDescriptor(::open("/", O_RDONLY)).number()), text);
    EXPECT_EQ(answer(socket.here()), text);
}

TEST_F(HostileSurfacePeer, WithHugePagesIsRefused) {
    const FileDescriptor huge(::memfd_create("hostile", MFD_ALLOW_SEALING | MFD_HUGETLB));
    if (!huge) {
        GTEST_SKIP() << "This system has no huge pages";
    }
    EXPECT_EQ(answer(huge.number()), "The surface that was received is not shared memory");
}

TEST_F(HostileSurfacePeer, WhoseMemoryCannotBeMappedIsRefused) {
    EXPECT_EQ(answer(file(soundBytes, IOSurface::seals | F_SEAL_WRITE).number()),
              "Mapping a surface: Operation not permitted");
}

TEST_F(HostileSurfacePeer, WithSizesThatDoNotFitIsRefused) {
    constexpr auto text = "The sizes of the surface that was received do not fit each other or this machine";
    const SurfaceLayout sound = message.layout;
    message.layout.allocSize = ~std::uint64_t{0};
    EXPECT_EQ(answer(file().number()), text);
    message.layout = sound;
    message.layout.planeCount = SurfaceLayout::maximumPlanes + 1;
    EXPECT_EQ(answer(file().number()), text);
    message.layout = sound;
    message.layout.whole.offset = 4;
    EXPECT_EQ(answer(file().number()), text);
    message.layout = sound;
    message.layout.planes[1].offset = ~std::uint64_t{0} - 3;
    EXPECT_EQ(answer(file().number()), text);
    message.layout = sound;
    message.layout.whole.bytesPerRow = 0;
    EXPECT_EQ(answer(file().number()), text);
}

TEST_F(HostileSurfacePeer, WithAnythingButOneDescriptorIsRefusedAndLeavesNoneOpen) {
    constexpr auto text = "What was received is no surface";
    const FileDescriptor sound = file();
    const int next = ::dup(sound.number());
    ::close(next);
    for (const auto& descriptors :
         {std::vector<int>{}, std::vector<int>{sound.number(), sound.number()}, std::vector<int>(20, sound.number())}) {
        socket.send(message, descriptors);
        EXPECT_FALSE(IOSurfaceReceive(socket.there(), error));
        EXPECT_EQ(error, text) << descriptors.size();
    }
    const int afterwards = ::dup(sound.number());
    EXPECT_EQ(afterwards, next) << "a descriptor was left open";
    ::close(afterwards);
}

TEST_F(HostileSurfacePeer, WithAnotherMarkOrHalfAMessageIsRefused) {
    const FileDescriptor sound = file();
    message.mark.back() = '0';
    EXPECT_EQ(answer(sound.number()), "What was received is no surface");
    message.mark.back() = '1';
    socket.send(message, {sound.number()}, sizeof message - 1);
    socket.closeHere();
    EXPECT_FALSE(IOSurfaceReceive(socket.there(), error));
    EXPECT_EQ(error, "What was received is no surface");
}

TEST_F(HostileSurfacePeer, CannotMakeAReaderFault) {
    const auto received = transferred();
    ASSERT_TRUE(received) << error;
    std::memset(IOSurfaceGetBaseAddress(received.get()), 0x5A, 20);
    const int file = IOSurfaceGetDescriptor(sent.get());
    EXPECT_EQ(::ftruncate(file, 0), -1);
    ASSERT_EQ(::fallocate(file, FALLOC_FL_PUNCH_HOLE | FALLOC_FL_KEEP_SIZE, 0, soundBytes), 0);
    EXPECT_THAT(bytesOf(received.get()), Each(0)) << "memory that was taken away reads as zeros";
}

} // namespace
} // namespace qivo
