#pragma once

#include "platform/FileDescriptor.h"
#include "platform/Surface.h"

#include <functional>

namespace qivo {

/// A surface's pixels, up to the next page, as a buffer that graphics devices can use where they are. None where the
/// system cannot make one of memory, as without its udmabuf device or the right to use it.
///
/// Thread: any.
FileDescriptor IOSurfaceCreateDmaBuf(IOSurfaceRef surface);

/// What makes such buffers in place of the system, or the system again if empty.
///
/// Thread: any, but not while buffers are made.
using DmaBufMaker = std::function<FileDescriptor(IOSurfaceRef)>;
void setDmaBufMaker(DmaBufMaker maker);

} // namespace qivo
