#pragma once

#include "platform/Surface.h"

#include <cstdint>

namespace qivo {

/// Textures whose storage is memory that EGL was handed. The calling thread must have an EGL context current.

/// Whether that is to be had: both EGL and GL say so, the system makes buffers for devices of memory, and a trial
/// surface showed in a rectangle texture both before and after it was written to. The trial runs in a context of its
/// own, once for each display, so that the errors of a driver that refuses stay out of the current one.
///
/// Thread: any.
bool eglImportWorks();

/// Makes a plane, of RGBA with 8 or 16 bits a component, the storage of the texture that is bound to this target. False
/// if it was refused; a GL error may be pending then.
bool eglImport(std::uint32_t target, IOSurfaceRef surface, std::uint32_t plane);

} // namespace qivo
