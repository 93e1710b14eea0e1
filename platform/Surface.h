#pragma once

#include "platform/SurfaceLayout.h"

#include <cstdint>
#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

namespace qivo {

/// Pixels in memory that several processes can share.
///
/// The memory is sealed: nobody, whoever it was handed to, can make it smaller or larger, so that reading it never
/// faults. What lies in it may change at any time, as every process that it was handed to may write.
///
/// Thread: any, for all functions here. A null surface is allowed everywhere and has neither pixels nor size.
class IOSurface;
using IOSurfaceRef = IOSurface*;

using IOReturn = std::uint32_t;
constexpr IOReturn kIOReturnSuccess = 0;
constexpr IOReturn kIOReturnError = 0xE00002BC;
constexpr IOReturn kIOReturnBadArgument = 0xE00002C2;
constexpr IOReturn kIOReturnNotWritable = 0xE00002CF;
constexpr IOReturn kIOReturnNotPermitted = 0xE00002E2;

enum IOSurfaceLockOptions : std::uint32_t {
    kIOSurfaceLockReadOnly = 1,
    kIOSurfaceLockAvoidSync = 2 ///< nothing is ever waited for here
};

// What a surface is made of. All have to be there, and all but the pixel format must be positive.
constexpr const char* kIOSurfaceWidth = "IOSurfaceWidth";
constexpr const char* kIOSurfaceHeight = "IOSurfaceHeight";
constexpr const char* kIOSurfacePixelFormat = "IOSurfacePixelFormat";
constexpr const char* kIOSurfaceBytesPerElement = "IOSurfaceBytesPerElement";
constexpr const char* kIOSurfaceBytesPerRow = "IOSurfaceBytesPerRow";
constexpr const char* kIOSurfaceAllocSize = "IOSurfaceAllocSize";
using IOSurfaceProperties = std::map<std::string_view, std::int64_t>;

/// A surface of zeros. Null if a property is missing, the sizes do not fit each other, overflow or exceed the memory of
/// this machine, there are more planes than `SurfaceLayout::maximumPlanes`, or the system has no more memory to give.
std::shared_ptr<IOSurface> IOSurfaceCreate(const IOSurfaceProperties& properties,
                                           const std::vector<IOSurfacePlane>& planes = {});

/// Begins access to the pixels. It excludes nobody: several locks may be held, in one process or in several. The seed
/// changes when a writing lock is taken and when it is given back, for all processes, so that a reader can tell whether
/// what it read was new. `options` are IOSurfaceLockOptions; `seed`, if not null, receives the seed.
///
/// kIOReturnBadArgument for a null surface or unknown options, kIOReturnNotWritable for a writing lock of a surface
/// that was handed over for reading; `seed` is left alone then.
IOReturn IOSurfaceLock(IOSurfaceRef surface, std::uint32_t options, std::uint32_t* seed);
/// Ends the access. Where this process holds no lock of the kind that `options` say, one of the other kind is given
/// back; kIOReturnNotPermitted where it holds none at all.
IOReturn IOSurfaceUnlock(IOSurfaceRef surface, std::uint32_t options, std::uint32_t* seed);
std::uint32_t IOSurfaceGetSeed(IOSurfaceRef surface);

std::uint64_t IOSurfaceGetWidth(IOSurfaceRef surface);
std::uint64_t IOSurfaceGetHeight(IOSurfaceRef surface);
std::uint64_t IOSurfaceGetBytesPerElement(IOSurfaceRef surface);
std::uint64_t IOSurfaceGetBytesPerRow(IOSurfaceRef surface);
std::uint64_t IOSurfaceGetAllocSize(IOSurfaceRef surface);
std::uint32_t IOSurfaceGetPixelFormat(IOSurfaceRef surface);
void* IOSurfaceGetBaseAddress(IOSurfaceRef surface);

/// 0 for a surface without planes. The functions below take it as plane 0 all the same; a plane that does not exist has
/// no size and no address.
std::uint64_t IOSurfaceGetPlaneCount(IOSurfaceRef surface);
std::uint64_t IOSurfaceGetWidthOfPlane(IOSurfaceRef surface, std::uint64_t plane);
std::uint64_t IOSurfaceGetHeightOfPlane(IOSurfaceRef surface, std::uint64_t plane);
std::uint64_t IOSurfaceGetBytesPerElementOfPlane(IOSurfaceRef surface, std::uint64_t plane);
std::uint64_t IOSurfaceGetBytesPerRowOfPlane(IOSurfaceRef surface, std::uint64_t plane);
void* IOSurfaceGetBaseAddressOfPlane(IOSurfaceRef surface, std::uint64_t plane);

/// Who receives a surface may always read, and write too if it is handed over so. Handed over for reading, the memory
/// cannot be written by processes of other users. A process of the same user, or of the superuser, is trusted not to:
/// it could change the memory's permissions, or reach into this process.
enum class SurfaceAccess { readOnly, readWrite };

/// Hands a surface to the process at the other end of a Unix socket, datagram, seqpacket or stream, which shares its
/// memory from then on. False, and `error` says why, if that failed.
bool IOSurfaceSend(int socket, IOSurfaceRef surface, SurfaceAccess access, std::string& error);

/// Takes a surface that was handed over; waits for it as long as the socket does. Null, and `error` says why, if what
/// arrives is no surface: nothing that the sender says is believed before the memory itself proves it.
std::shared_ptr<IOSurface> IOSurfaceReceive(int socket, std::string& error);

/// The memory as a file: the pixels from its start, then, from the next page on, what the surface needs for itself. For
/// handing on to the system; the surface keeps it. Negative for null.
int IOSurfaceGetDescriptor(IOSurfaceRef surface);

} // namespace qivo
