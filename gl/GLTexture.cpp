#include "gl/GLTexture.h"

#include "gl/NSBitmap.h"
#include "platform/Image.h"
#include "platform/Log.h"
#include "platform/Resources.h"
#include "video/IOSurface2D.h"

#include <epoxy/gl.h>

#include <algorithm>
#include <cmath>

namespace qivo {

namespace {

constexpr std::int32_t defaultWidth = 1920;
constexpr std::int32_t defaultHeight = 1080;

/// Truncates toward zero; what is no number becomes 0. No texture reaches as far as `farthestOffset`, but drivers add
/// the size to the offset without regard to overflow and then write outside of the texture.
GLint pixelOffset(double coordinate) {
    constexpr double farthest = GLTexture::farthestOffset;
    return std::isnan(coordinate) ? 0 : static_cast<GLint>(std::clamp(coordinate, -farthest, farthest));
}

/// The distance of two rows in pixels, as if every sample were one byte. A description whose picture failed may lack
/// the sample count; it has no rows of its own then.
GLint rowLength(std::int32_t bytesPerRow, std::uint64_t samplesPerPixel) {
    return samplesPerPixel ? static_cast<GLint>(static_cast<std::uint64_t>(bytesPerRow) / samplesPerPixel) : 0;
}

} // namespace

GLTexture::GLTexture() {
    _samplesPerPixel = 4;
    _bitsPerComponent = 16;
    _target = GL_TEXTURE_2D;
    _width = defaultWidth;
    _height = defaultHeight;
    _initProperties();
}

GLTexture::~GLTexture() {
    if (_texture) {
        glDeleteTextures(1, &_texture);
    }
}

std::unique_ptr<GLTexture> GLTexture::initWithSurface(IOSurface2D* surface) {
    auto texture = std::make_unique<GLTexture>(Blank());
    texture->isFinalized = texture->_initTextureWithSurface(surface);
    return texture;
}

std::unique_ptr<GLTexture> GLTexture::initWithSurface(IOSurface2D* surface, CGLContextObj context) {
    auto texture = std::make_unique<GLTexture>(Blank());
    texture->isFinalized = texture->_initTextureWithSurface(surface, context);
    return texture;
}

std::unique_ptr<GLTexture> GLTexture::initWithImage(const Image* image) {
    auto texture = std::make_unique<GLTexture>(Blank());
    texture->isFinalized = texture->_initTextureWithImage(image);
    return texture;
}

std::unique_ptr<GLTexture> GLTexture::initWithFile(const char* path) {
    auto texture = std::make_unique<GLTexture>(Blank());
    texture->isFinalized = texture->_initTextureWithFile(path);
    return texture;
}

std::unique_ptr<GLTexture> GLTexture::initWithURL(const char* url) {
    auto texture = std::make_unique<GLTexture>(Blank());
    texture->isFinalized = texture->_initTextureWithURL(url);
    return texture;
}

std::unique_ptr<GLTexture> GLTexture::initWithResource(const char* name) {
    auto texture = std::make_unique<GLTexture>(Blank());
    texture->isFinalized = texture->_initTextureWithResource(name);
    return texture;
}

void GLTexture::_initProperties() {
    const bool hasAlpha = _samplesPerPixel == 4;
    const bool isDeep = _bitsPerComponent == 16;
    _format = hasAlpha ? GL_RGBA : GL_RGB;
    // GL refuses this 8-bit type for pixels without alpha.
    _type = isDeep ? GL_UNSIGNED_SHORT : GL_UNSIGNED_INT_8_8_8_8_REV;
    if (isDeep) {
        _internal = hasAlpha ? GL_RGBA16 : GL_RGB16;
    } else {
        _internal = hasAlpha ? GL_RGBA8 : GL_RGB8;
    }
}

bool GLTexture::_initTextureWithSurface(IOSurface2D* surface, CGLContextObj context) {
    if (!surface || !context) {
        return false;
    }
    _samplesPerPixel = surface->samplesPerPixel();
    if (_samplesPerPixel != 3 && _samplesPerPixel != 4) {
        return false;
    }
    _bitsPerComponent = surface->bitsPerComponent();
    _target = GL_TEXTURE_RECTANGLE;
    _width = static_cast<std::int32_t>(surface->width());
    _height = static_cast<std::int32_t>(surface->height());
    _initProperties();
    return _newTexture(surface, context);
}

bool GLTexture::_initTextureWithSurface(IOSurface2D* surface) {
    return _initTextureWithSurface(surface, CGLGetCurrentContext());
}

bool GLTexture::_initTextureWithImage(const Image* image) {
    const auto holder = NSBitmap::bitmapWithImage(image);
    const BitmapImageRep* bitmap = holder->bitmap();
    if (!bitmap) {
        return false;
    }
    _samplesPerPixel = static_cast<std::uint64_t>(bitmap->samplesPerPixel());
    if (bitmap->isPlanar() || (_samplesPerPixel != 3 && _samplesPerPixel != 4)) {
        return false;
    }
    _bitsPerComponent = static_cast<std::uint64_t>(bitmap->bitsPerSample());
    _target = GL_TEXTURE_2D;
    _width = bitmap->pixelsWide();
    _height = bitmap->pixelsHigh();
    _bytesPerRow = bitmap->bytesPerRow();
    _initProperties();
    return _newTexture(bitmap->bitmapData());
}

bool GLTexture::_initTextureWithFile(const char* path) {
    return path && _initTextureWithImage(Image::imageWithContentsOfFile(path).get());
}

bool GLTexture::_initTextureWithURL(const char* url) {
    return url && _initTextureWithImage(Image::imageWithContentsOfURL(url).get());
}

bool GLTexture::_initTextureWithResource(const char* name) {
    return name && _initTextureWithFile((resourcePath() + "/" + name).c_str());
}

void GLTexture::beginStorage() {
    glGenTextures(1, &_texture);
    glEnable(_target);
    glBindTexture(_target, _texture);
}

void GLTexture::setParameters() const {
    glTexParameteri(_target, GL_TEXTURE_MIN_FILTER, GL_LINEAR);
    glTexParameteri(_target, GL_TEXTURE_MAG_FILTER, GL_LINEAR);
    glTexParameteri(_target, GL_TEXTURE_WRAP_S, GL_CLAMP_TO_EDGE);
    glTexParameteri(_target, GL_TEXTURE_WRAP_T, GL_CLAMP_TO_EDGE);
}

void GLTexture::endStorage() const {
    glBindTexture(_target, 0);
    glDisable(_target);
}

bool GLTexture::_newTexture(const void* pixels) {
    beginStorage();
    glPixelStorei(GL_UNPACK_ROW_LENGTH, rowLength(_bytesPerRow, _samplesPerPixel));
    setParameters();
    glTexImage2D(_target, 0, _internal, _width, _height, 0, _format, _type, pixels);
    endStorage();
    return _texture != 0;
}

bool GLTexture::_newTexture(IOSurface2D* surface, CGLContextObj context) {
    beginStorage();
    setParameters();
    const CGLError error =
        CGLTexImageIOSurface2D(context, _target, _internal, _width, _height, _format, _type, surface->surface(), 0);
    bool hasStorage = error == kCGLNoError;
    if (!hasStorage) {
        logLine(">> MESSAGE[%d]: Fall back scheme for creating a 2d texture from an i/o surface!", error);
        hasStorage = copySurface(surface);
    }
    endStorage();
    return hasStorage;
}

bool GLTexture::copySurface(IOSurface2D* surface) const {
    if (!surface->lock(true)) {
        return false;
    }
    glTexImage2D(_target, 0, _internal, _width, _height, 0, _format, _type, surface->map());
    surface->unlock();
    return true;
}

void GLTexture::setTarget(std::uint32_t target) {
    if (!isFinalized) {
        _target = target == GL_TEXTURE_RECTANGLE ? GL_TEXTURE_RECTANGLE : GL_TEXTURE_2D;
    }
}

void GLTexture::setSamplesPerPixel(std::uint64_t samplesPerPixel) {
    if (!isFinalized) {
        _samplesPerPixel = samplesPerPixel == 3 ? 3 : 4;
    }
}

void GLTexture::setBitsPerComponent(std::uint64_t bitsPerComponent) {
    if (!isFinalized) {
        _bitsPerComponent = bitsPerComponent == 8 ? 8 : 16;
    }
}

void GLTexture::setWidth(std::int32_t width) {
    if (!isFinalized) {
        _width = width ? width : defaultWidth;
    }
}

void GLTexture::setHeight(std::int32_t height) {
    if (!isFinalized) {
        _height = height ? height : defaultHeight;
    }
}

bool GLTexture::acquire(const void* pixels) {
    if (!isFinalized) {
        _initProperties();
        isFinalized = _newTexture(pixels);
    }
    return isFinalized;
}

bool GLTexture::update(const void* pixels) {
    return update(pixels, Point());
}

bool GLTexture::update(const void* pixels, Point point) {
    if (!pixels || !isFinalized) {
        return false;
    }
    glTexSubImage2D(_target, 0, pixelOffset(point.x), pixelOffset(point.y), _width, _height, _format, _type, pixels);
    return true;
}

void GLTexture::setBind(bool bind) {
    _bind = bind;
    glBindTexture(_target, _bind ? _texture : 0);
}

void GLTexture::setEnable(bool enable) {
    _enable = enable;
    if (_enable) {
        glEnable(_target);
    } else {
        glDisable(_target);
    }
}

} // namespace qivo
