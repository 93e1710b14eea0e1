#include "video/IOSurface2D.h"

#include "gl/NSBitmap.h"
#include "platform/CGBitmapContext.h"
#include "platform/Image.h"
#include "platform/Resources.h"
#include "video/s2dcpy.h"

#include <cmath>
#include <cstring>
#include <limits>
#include <string>

namespace qivo {

namespace {

constexpr std::uint32_t fourCharacters(const char (&code)[5]) {
    std::uint32_t value = 0;
    for (int at = 0; at < 4; ++at) {
        value = value << 8 | static_cast<unsigned char>(code[at]);
    }
    return value;
}

std::uint32_t formatOf(std::uint64_t bytesPerPixel) {
    switch (bytesPerPixel) {
    case 3:
        return 24;
    case 6:
        return fourCharacters("b48r");
    case 8:
        return fourCharacters("RGhA");
    default:
        return fourCharacters("RGBA");
    }
}

std::uint32_t byteOrderOf(std::uint64_t bitsPerPixel) {
    return bitsPerPixel == 24 || bitsPerPixel == 32 ? kCGBitmapByteOrder32Little : kCGBitmapByteOrder16Little;
}

/// Truncates; a conversion that the language leaves undefined gives the nearest number there is.
std::uint64_t truncated(double coordinate) {
    constexpr double tooLarge = 18446744073709551616.0;
    if (!(coordinate > 0)) {
        return 0;
    }
    return coordinate < tooLarge ? static_cast<std::uint64_t>(coordinate) : std::numeric_limits<std::uint64_t>::max();
}

} // namespace

std::shared_ptr<IOSurface2D> IOSurface2D::surfaceWithDefaults() {
    return std::make_shared<IOSurface2D>();
}

std::unique_ptr<IOSurface2D> IOSurface2D::initWithImage(const Image* image) {
    auto surface = std::make_unique<IOSurface2D>();
    surface->_initSurfaceWithImage(image);
    return surface;
}

std::shared_ptr<IOSurface2D> IOSurface2D::surfaceWithImage(const Image* image) {
    return initWithImage(image);
}

std::unique_ptr<IOSurface2D> IOSurface2D::initWithImageRef(CGImageRef image) {
    auto surface = std::make_unique<IOSurface2D>();
    surface->_drawImage(image);
    return surface;
}

std::shared_ptr<IOSurface2D> IOSurface2D::surfaceWithImageRef(CGImageRef image) {
    return initWithImageRef(image);
}

std::unique_ptr<IOSurface2D> IOSurface2D::initWithURL(const char* url) {
    auto surface = std::make_unique<IOSurface2D>();
    surface->_initSurfaceWithURL(url);
    return surface;
}

std::shared_ptr<IOSurface2D> IOSurface2D::surfaceWithURL(const char* url) {
    return initWithURL(url);
}

std::unique_ptr<IOSurface2D> IOSurface2D::initWithFile(const char* path) {
    auto surface = std::make_unique<IOSurface2D>();
    surface->_initSurfaceWithFile(path);
    return surface;
}

std::shared_ptr<IOSurface2D> IOSurface2D::surfaceWithFile(const char* path) {
    return initWithFile(path);
}

std::unique_ptr<IOSurface2D> IOSurface2D::initWithResource(const char* name) {
    auto surface = std::make_unique<IOSurface2D>();
    surface->_initIOSurface2DWithResource(name);
    return surface;
}

std::shared_ptr<IOSurface2D> IOSurface2D::surfaceWithResource(const char* name) {
    return initWithResource(name);
}

std::unique_ptr<IOSurface2D> IOSurface2D::copyWithZone() const {
    auto other = std::make_unique<IOSurface2D>();
    other->setAvoidSync(_avoidSync);
    other->setBitsPerComponent(_bitsPerComponent);
    other->setBitsPerPixel(_bitsPerPixel);
    other->setAlphaInfo(_alphaInfo);
    other->setWidth(_width);
    other->setHeight(_height);
    if (other->acquire()) {
        other->copy(surface());
    }
    return other;
}

void IOSurface2D::setBitsPerComponent(std::uint64_t bitsPerComponent) {
    if (!isFinalized) {
        _bitsPerComponent = bitsPerComponent;
    }
}

void IOSurface2D::setBitsPerPixel(std::uint64_t bitsPerPixel) {
    if (!isFinalized) {
        _bitsPerPixel = bitsPerPixel;
    }
}

void IOSurface2D::setAlphaInfo(std::uint32_t alphaInfo) {
    if (!isFinalized) {
        _alphaInfo = alphaInfo;
    }
}

void IOSurface2D::setWidth(std::uint64_t width) {
    if (!isFinalized) {
        _width = width;
    }
}

void IOSurface2D::setHeight(std::uint64_t height) {
    if (!isFinalized) {
        _height = height;
    }
}

bool IOSurface2D::_checkBitsPerPixel(std::uint64_t bitsPerPixel) const {
    return bitsPerPixel == 24 || bitsPerPixel == 32 || bitsPerPixel == 48 || bitsPerPixel == 64;
}

void IOSurface2D::_initSurfaceRGBA() {
    const std::uint64_t components = _bitsPerPixel == 24 || _bitsPerPixel == 48 ? 3 : 4;
    _bitsPerComponent = _bitsPerPixel / components;
    _isRGBA = _bitsPerPixel / _bitsPerComponent % 2 == 0;
    if (!_isRGBA) {
        _bitsPerPixel = _bitsPerComponent * 4;
    }
}

void IOSurface2D::_initSurfaceInfo() {
    if (_isRGBA) {
        const bool hasAlpha = _bitsPerPixel == 32 || _bitsPerPixel == 64;
        _alphaInfo = hasAlpha ? kCGImageAlphaPremultipliedLast : kCGImageAlphaNone;
    } else {
        _bitsPerPixel = _bitsPerComponent * 4;
        _alphaInfo = kCGImageAlphaNoneSkipLast;
    }
    _byteOrder = byteOrderOf(_bitsPerPixel);
    _bitmapInfo = _byteOrder + _alphaInfo;
}

void IOSurface2D::_initSurfaceSize() {
    _samplesPerPixel = _bitsPerPixel / _bitsPerComponent;
    _bytesPerPixel = _bitsPerPixel >> 3;
    _bytesPerRow = _bytesPerPixel * _width;
    _size = _bytesPerRow * _height;
}

void IOSurface2D::_initSurfaceType() {
    _format = formatOf(_bytesPerPixel);
}

bool IOSurface2D::_initSurfaceProperties() {
    if (!_checkBitsPerPixel(_bitsPerPixel)) {
        return false;
    }
    _initSurfaceRGBA();
    _initSurfaceInfo();
    _initSurfaceSize();
    _initSurfaceType();
    return true;
}

bool IOSurface2D::_initSurfaceProperties(CGImageRef image) {
    const std::uint64_t bitsPerPixel = CGImageGetBitsPerPixel(image);
    if (!_checkBitsPerPixel(bitsPerPixel)) {
        return false;
    }
    _bitsPerPixel = bitsPerPixel;
    _bitsPerComponent = CGImageGetBitsPerComponent(image);
    _isRGBA = _bitsPerPixel / _bitsPerComponent % 2 == 0;
    if (_isRGBA) {
        _alphaInfo = CGImageGetAlphaInfo(image);
        _bitmapInfo = CGImageGetBitmapInfo(image);
        _byteOrder = _bitmapInfo & kCGBitmapByteOrderMask;
    } else {
        _bitsPerPixel = _bitsPerComponent * 4;
        _alphaInfo = kCGImageAlphaNoneSkipLast;
        _byteOrder = _bitsPerPixel == 32 ? kCGBitmapByteOrder32Little : kCGBitmapByteOrder16Little;
        _bitmapInfo = _byteOrder + _alphaInfo;
    }
    _width = CGImageGetWidth(image);
    _height = CGImageGetHeight(image);
    _initSurfaceSize();
    _initSurfaceType();
    return true;
}

void IOSurface2D::_newSurface() {
    const std::array<std::uint64_t, 6> values = {_width, _height, _format, _bytesPerPixel, _bytesPerRow, _size};
    IOSurfaceProperties properties;
    for (std::size_t at = 0; at < values.size(); ++at) {
        properties[kIOSurface2DKeys[at]] = static_cast<std::int64_t>(values[at]);
    }
    _surface = IOSurfaceCreate(properties);
    isFinalized = _surface != nullptr;
}

bool IOSurface2D::_newSurface(CGImageRef image) {
    isFinalized = false;
    if (!image || !_initSurfaceProperties(image)) {
        return false;
    }
    _newSurface();
    return isFinalized;
}

bool IOSurface2D::_drawImage(CGImageRef image) {
    if (!_newSurface(image) || IOSurfaceLock(surface(), 0, &seed) != kIOReturnSuccess) {
        return false;
    }
    const CGImageLayout layout{.width = _width,
                               .height = _height,
                               .bitsPerComponent = _bitsPerComponent,
                               .bitsPerPixel = _bitsPerPixel,
                               .bytesPerRow = _bytesPerRow,
                               .bitmapInfo = _bitmapInfo};
    const auto context = CGBitmapContext::create(IOSurfaceGetBaseAddressOfPlane(surface(), 0), layout);
    if (context) {
        context->draw(image);
    }
    IOSurfaceUnlock(surface(), 0, &seed);
    return true;
}

bool IOSurface2D::_initSurfaceWithImage(const Image* image) {
    const auto holder = NSBitmap::bitmapWithImage(image);
    const BitmapImageRep* bitmap = holder->bitmap();
    return bitmap && !bitmap->isPlanar() && _drawImage(CGImage::imageWithBitmap(bitmap).get());
}

bool IOSurface2D::_initSurfaceWithImageSource(const Image* source) {
    // A file that was decoded has its first picture as its only representation.
    return _initSurfaceWithImage(source);
}

void IOSurface2D::_initSurfaceWithURL(const char* url) {
    if (const auto source = Image::imageWithContentsOfURL(url)) {
        _initSurfaceWithImageSource(source.get());
    }
}

void IOSurface2D::_initSurfaceWithFile(const char* path) {
    if (const auto source = Image::imageWithContentsOfFile(path)) {
        _initSurfaceWithImageSource(source.get());
    }
}

void IOSurface2D::_initIOSurface2DWithResource(const char* name) {
    if (name) {
        _initSurfaceWithFile((resourcePath() + "/" + name).c_str());
    }
}

bool IOSurface2D::acquire() {
    if (_surface || !_initSurfaceProperties()) {
        return false;
    }
    _newSurface();
    return true;
}

bool IOSurface2D::update(const void* pixels) {
    if (!pixels || !isFinalized || IOSurfaceLock(surface(), 0, &seed) != kIOReturnSuccess) {
        return false;
    }
    void* base = IOSurfaceGetBaseAddressOfPlane(surface(), 0);
    if (base) {
        std::memcpy(base, pixels, _size);
    }
    IOSurfaceUnlock(surface(), 0, &seed);
    return base != nullptr;
}

bool IOSurface2D::copy(IOSurfaceRef source, std::size_t index) {
    IOReturn status = kIOReturnError;
    s2dcpy_ex(index, source, 0, surface(), &status);
    return status == kIOReturnCpySuccess;
}

void* IOSurface2D::map() const {
    return isFinalized ? IOSurfaceGetBaseAddress(surface()) : nullptr;
}

void* IOSurface2D::map(Point point) const {
    if (!isFinalized) {
        return nullptr;
    }
    // As numbers: the point may lie outside of the memory.
    const auto base = reinterpret_cast<std::uintptr_t>(IOSurfaceGetBaseAddressOfPlane(surface(), 0));
    return reinterpret_cast<void*>(base + truncated(point.x) * _bytesPerPixel + truncated(point.y) * _bytesPerRow);
}

bool IOSurface2D::lock(bool readOnly) {
    if (!isFinalized) {
        return false;
    }
    const std::uint32_t reading = kIOSurfaceLockReadOnly | (_avoidSync ? kIOSurfaceLockAvoidSync : 0U);
    options = readOnly ? reading : 0;
    return IOSurfaceLock(surface(), options, &seed) == kIOReturnSuccess;
}

bool IOSurface2D::unlock() {
    return isFinalized && IOSurfaceUnlock(surface(), options, &seed) == kIOReturnSuccess;
}

} // namespace qivo
