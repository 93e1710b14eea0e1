#pragma once

#include "platform/Surface.h"

#include <cstdint>

namespace qivo {

/// An OpenGL context by its window system's own handle, of EGL or of GLX.
using CGLContextObj = void*;

/// The context that is current in the calling thread, or null.
CGLContextObj CGLGetCurrentContext();

/// Why a surface could not be bound to a texture.
enum CGLError : std::int32_t {
    kCGLNoError = 0,
    kCGLBadSurface = 1,  ///< there is no such surface or plane, or its pixels are not what was asked for
    kCGLBadContext = 2,  ///< the context is not the calling thread's, or not one of EGL
    kCGLUnsupported = 3, ///< this machine's OpenGL cannot show memory where it is
    kCGLRefused = 4      ///< it can, but not this surface: the distance of its rows does not suit it, say
};

/// Makes the memory of a surface's plane the storage of the texture that is bound to `target`, without a copy: what is
/// written into the surface shows in the texture. The texture keeps the memory for itself; the surface may go.
///
/// No platform has a call for this, so it is done by way of EGL, for RGBA of 8 or 16 bits, where a trial has shown once
/// for the display that a texture of this kind follows what is written. On any error the texture has no storage; where
/// the trial succeeded, a GL error may be left behind.
///
/// Thread: the one that has the context current.
CGLError CGLTexImageIOSurface2D(CGLContextObj context, std::uint32_t target, std::int32_t internal, std::int32_t width,
                                std::int32_t height, std::uint32_t format, std::uint32_t type, IOSurfaceRef surface,
                                std::uint32_t plane);

} // namespace qivo
