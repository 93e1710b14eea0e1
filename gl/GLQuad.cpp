#include "gl/GLQuad.h"

#include "gl/GLProgram.h"
#include "gl/GLShader.h"

#include <epoxy/gl.h>

#include <array>
#include <cstddef>

namespace qivo {

namespace {

constexpr Size normalised{1.0, 1.0};

struct Vertex {
    float x, y; ///< clip space
    float s, t; ///< texture coordinate; t is 0 on top
};
static_assert(sizeof(Vertex) == 16);

std::array<Vertex, 4> stripOver(Size size) {
    const auto w = static_cast<float>(size.width);
    const auto h = static_cast<float>(size.height);
    return {{{-1, -1, 0, h}, {-1, 1, 0, 0}, {1, -1, w, h}, {1, 1, w, 0}}};
}

const void* bufferOffset(std::size_t bytes) {
    return reinterpret_cast<const void*>(bytes);
}

} // namespace

GLQuad::GLQuad() : GLQuad(Extent{normalised}) {
    _acquireQuad({{0, 0}, {1, 1}});
    _acquireVAO();
}

GLQuad::GLQuad(Extent extent) : _size(extent.size) {}

std::unique_ptr<GLQuad> GLQuad::initWithBounds(Rect bounds) {
    auto quad = std::make_unique<GLQuad>(Extent{{0, 0}});
    quad->_acquireQuad(bounds);
    return quad;
}

GLQuad::~GLQuad() {
    glDeleteBuffers(1, &vbo);
    glDeleteVertexArrays(1, &_vao);
}

void GLQuad::_acquireQuad(Rect bounds) {
    _bounds = bounds;
    isTexture2D = _size == normalised;
    _target = isTexture2D ? GL_TEXTURE_2D : GL_TEXTURE_RECTANGLE;
    _mode = GL_TRIANGLE_STRIP;
    program = _newProgram();
    if (program) {
        _pid = program->pid();
    }
}

std::unique_ptr<GLProgram> GLQuad::_newProgram() const {
    const char* name = _target == GL_TEXTURE_2D ? "Quad2D" : "QuadRect";
    const auto vertexShader = GLShader::shaderWithResource(name, GL_VERTEX_SHADER);
    const auto fragmentShader = GLShader::shaderWithResource(name, GL_FRAGMENT_SHADER);
    auto linked = std::make_unique<GLProgram>();
    linked->attach(vertexShader->shader());
    linked->attach(fragmentShader->shader());
    linked->bind("vertex");
    linked->bind("texCoord");
    if (!linked->link()) {
        linked.reset();
    }
    return linked;
}

void GLQuad::_acquireVAO() {
    glGenVertexArrays(1, &_vao);
    glBindVertexArray(_vao);
    const auto vertices = stripOver(_size);
    glGenBuffers(1, &vbo);
    glBindBuffer(GL_ARRAY_BUFFER, vbo);
    glBufferData(GL_ARRAY_BUFFER, sizeof vertices, vertices.data(), GL_STATIC_DRAW);
    glVertexAttribPointer(0, 2, GL_FLOAT, GL_FALSE, sizeof(Vertex), bufferOffset(offsetof(Vertex, x)));
    glVertexAttribPointer(1, 2, GL_FLOAT, GL_FALSE, sizeof(Vertex), bufferOffset(offsetof(Vertex, s)));
}

void GLQuad::setSize(Size size) {
    if (isTexture2D || size.width == _size.width || size.height == _size.height) {
        return;
    }
    _size = size;
    _acquireVAO();
}

void GLQuad::render(std::uint32_t texture) {
    if (!texture) {
        return;
    }
    glUseProgram(_pid);
    glEnable(_target);
    glBindTexture(_target, texture);
    glBindVertexArray(_vao);
    glEnableVertexAttribArray(0);
    glEnableVertexAttribArray(1);
    glDrawArrays(_mode, 0, 4);
    glDisableVertexAttribArray(1);
    glDisableVertexAttribArray(0);
    glBindTexture(_target, 0);
    glDisable(_target);
    glUseProgram(0);
}

} // namespace qivo
