#pragma once

#include "platform/Surface.h"

namespace qivo {

// What copying a plane comes to. The result of a lock that failed may come instead.
constexpr IOReturn kIOReturnCpySuccess = 0;
constexpr IOReturn kIOReturnCpyErrSrcRef = 0xE00003B1;   ///< the source is null
constexpr IOReturn kIOReturnCpyErrDstRef = 0xE00003B2;   ///< the destination is null
constexpr IOReturn kIOReturnCpyErrHeight = 0xE00003B3;   ///< the planes differ in height
constexpr IOReturn kIOReturnCpyErrRowBytes = 0xE00003B4; ///< the planes differ in the distance of rows
constexpr IOReturn kIOReturnCpyErrSize = 0xE00003B5;     ///< distance of rows times height is zero
constexpr IOReturn kIOReturnCpyErrSrcPtr = 0xE00003B6;   ///< the source plane has no address
constexpr IOReturn kIOReturnCpyErrDstPtr = 0xE00003B7;   ///< the destination plane has no address

/// Copies a plane of one surface over a plane of another, as one block, padding of the rows included: both must have
/// the same height and the same distance of rows. Widths are not compared. The destination is untouched unless `status`
/// becomes kIOReturnCpySuccess. Returns `dst`. Planes that do not exist have no height: two of them give
/// kIOReturnCpyErrSize.
///
/// The source is locked for reading but unlocked as if it had been locked for writing.
///
/// Thread: any. `status` may be null.
IOSurfaceRef s2dcpy_ex(std::size_t srcPlane, IOSurfaceRef src, std::size_t dstPlane, IOSurfaceRef dst,
                       IOReturn* status);
/// The same with plane 0 of both.
IOSurfaceRef s2dcpy(IOSurfaceRef src, IOSurfaceRef dst, IOReturn* status);

} // namespace qivo
