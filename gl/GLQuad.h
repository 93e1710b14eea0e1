#pragma once

#include "platform/Geometry.h"

#include <cstdint>
#include <memory>

namespace qivo {

class GLProgram;

/// Draws one texture over the whole current viewport, its first row on top.
///
/// A quad whose texture coordinates run over 1 x 1 samples a `GL_TEXTURE_2D`, any other a `GL_TEXTURE_RECTANGLE` in
/// pixels; each kind has a program of its own. Failures are logged by the program's parts and leave `pid` 0.
///
/// Thread: the one that has the GL context current, for every operation, destruction included.
class GLQuad {
    struct Extent {
        Size size;
    };

  public:
    /// A 2-D quad, complete. Leaves its vertex array and buffer bound.
    GLQuad();

    /// A rectangle quad, with its program but without vertices until the first effective `setSize`. The bounds are only
    /// reported.
    static std::unique_ptr<GLQuad> initWithBounds(Rect bounds);

    /// For the initialisers: nothing made yet.
    explicit GLQuad(Extent extent);
    ~GLQuad();
    GLQuad(const GLQuad&) = delete;
    GLQuad& operator=(const GLQuad&) = delete;

    std::uint32_t pid() const { return _pid; }
    std::uint32_t vao() const { return _vao; }
    std::uint32_t mode() const { return _mode; }
    std::uint32_t target() const { return _target; }
    Rect bounds() const { return _bounds; }
    Size size() const { return _size; }

    /// Sets the extent of a rectangle quad's texture coordinates, in pixels, and makes a new vertex array and buffer,
    /// which are left bound; the previous pair stays allocated. Ignored by a 2-D quad, and unless both width and height
    /// change.
    void setSize(Size size);

    /// Draws this texture, whose target must be the quad's. Leaves the vertex array bound and nothing else. No GL call
    /// if the name is 0.
    void render(std::uint32_t texture);

  private:
    void _acquireQuad(Rect bounds);
    std::unique_ptr<GLProgram> _newProgram() const;
    void _acquireVAO();

    [[maybe_unused]] bool _bind = false; // reserved
    std::uint32_t _mode = 0;
    std::uint32_t _target = 0;
    std::uint32_t _pid = 0;
    std::uint32_t _vao = 0;
    Rect _bounds;
    Size _size;
    bool isTexture2D = false;
    std::uint32_t vbo = 0;
    std::unique_ptr<GLProgram> program;
};

} // namespace qivo
