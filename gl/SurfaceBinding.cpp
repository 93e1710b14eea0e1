#include "gl/SurfaceBinding.h"

#include "gl/EglImport.h"

#include <epoxy/gl.h>

#include <dlfcn.h>

namespace qivo {

namespace {

using CurrentContext = void* (*)();

/// Asks a library only if the process has it loaded already: otherwise it has no context that could be current.
CGLContextObj currentOf(const char* library, const char* function) {
    void* handle = ::dlopen(library, RTLD_LAZY | RTLD_NOLOAD);
    if (!handle) {
        return nullptr;
    }
    const auto current = reinterpret_cast<CurrentContext>(::dlsym(handle, function));
    CGLContextObj context = current ? current() : nullptr;
    ::dlclose(handle);
    return context;
}

CGLContextObj currentOfEgl() {
    return currentOf("libEGL.so.1", "eglGetCurrentContext");
}

/// Whether the plane has these pixels: what it has may come from another process, and be larger than GL's numbers.
bool has(IOSurfaceRef surface, std::uint32_t plane, std::int32_t width, std::int32_t height, std::uint64_t bytes) {
    return width > 0 && height > 0 && IOSurfaceGetWidthOfPlane(surface, plane) == static_cast<std::uint64_t>(width) &&
           IOSurfaceGetHeightOfPlane(surface, plane) == static_cast<std::uint64_t>(height) &&
           IOSurfaceGetBytesPerElementOfPlane(surface, plane) == bytes &&
           IOSurfaceGetAllocSize(surface) <= std::uint64_t{INT32_MAX};
}

} // namespace

CGLContextObj CGLGetCurrentContext() {
    if (CGLContextObj context = currentOfEgl()) {
        return context;
    }
    // Who links the one need not have loaded the other.
    CGLContextObj context = currentOf("libGLX.so.0", "glXGetCurrentContext");
    return context ? context : currentOf("libGL.so.1", "glXGetCurrentContext");
}

CGLError CGLTexImageIOSurface2D(CGLContextObj context, std::uint32_t target, std::int32_t internal, std::int32_t width,
                                std::int32_t height, std::uint32_t format, std::uint32_t type, IOSurfaceRef surface,
                                std::uint32_t plane) {
    const bool isDeep = internal == GL_RGBA16 && type == GL_UNSIGNED_SHORT;
    const bool isPlain = internal == GL_RGBA8 && type == GL_UNSIGNED_INT_8_8_8_8_REV;
    if (format != GL_RGBA || isDeep == isPlain || !has(surface, plane, width, height, isDeep ? 8 : 4)) {
        return kCGLBadSurface;
    }
    if (!context || context != currentOfEgl()) {
        return kCGLBadContext;
    }
    if (!eglImportWorks()) {
        return kCGLUnsupported;
    }
    return eglImport(target, surface, plane) ? kCGLNoError : kCGLRefused;
}

} // namespace qivo
