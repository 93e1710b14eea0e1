#pragma once

#include <array>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

namespace qivo {

/// R, G, B, A.
using Pixel = std::array<std::uint8_t, 4>;

/// An OpenGL 4.1 core context on software GL that draws into memory: no window, no display, no GPU.
///
/// Drawing goes to a frame buffer of RGBA with 8 bits, which is bound, and the viewport covers it.
class EglContext {
  public:
    /// Makes a context and makes it current on this thread; null, and `error` says which step failed and why, if there
    /// is none to be had.
    static std::unique_ptr<EglContext> create(int width, int height, std::string& error);

    ~EglContext();
    EglContext(const EglContext&) = delete;
    EglContext& operator=(const EglContext&) = delete;

    bool makeCurrent();
    /// Leaves this thread without a context.
    bool releaseCurrent();

    int width() const { return _width; }
    int height() const { return _height; }

    /// The whole frame buffer, top row first. Reads from it whatever frame buffer is bound.
    std::vector<Pixel> pixels() const;
    /// The pixel in this column and row, counted from the top left.
    Pixel pixel(int x, int y) const;
    void clear(Pixel colour) const;

  private:
    EglContext(int width, int height) : _width(width), _height(height) {}

    bool initialize(std::string& error);
    bool makeFrameBuffer(std::string& error);

    int _width;
    int _height;
    void* _display = nullptr;
    void* _context = nullptr;
    std::uint32_t _frameBuffer = 0;
    std::uint32_t _renderBuffer = 0;
};

/// The GL errors that are pending, which are pending no longer. Needs a context.
std::vector<std::string> takeGlErrors();

/// "GL_INVALID_ENUM" for 0x500, and so on.
std::string glErrorName(std::uint32_t error);

} // namespace qivo
