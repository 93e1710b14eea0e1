#pragma once

#include <cstdint>
#include <memory>

namespace qivo {

/// One GL shader, compiled from a text.
///
/// `shader` is 0 if the text could not be read or compiled, which was logged then. The name of a shader that does not
/// compile is dropped without deleting it. An attached shader outlives this object for as long as its program lives.
///
/// Thread: the one that has the GL context current, for every operation, destruction included.
class GLShader {
    struct Name {
        std::uint32_t shader;
    };

  public:
    /// `type` is a GL shader type. A null source makes no GL call and leaves no log line.
    static std::unique_ptr<GLShader> initWithSource(const char* source, std::uint32_t type);
    static std::shared_ptr<GLShader> shaderWithSource(const char* source, std::uint32_t type);

    /// The source is loaded as NSTextFile does it.
    static std::unique_ptr<GLShader> initWithURL(const char* url, std::uint32_t type);
    static std::shared_ptr<GLShader> shaderWithURL(const char* url, std::uint32_t type);
    static std::unique_ptr<GLShader> initWithFile(const char* path, std::uint32_t type);
    static std::shared_ptr<GLShader> shaderWithFile(const char* path, std::uint32_t type);

    /// The resource with this base name and the extension "vs" for `GL_VERTEX_SHADER`, "fs" for every other type.
    static std::unique_ptr<GLShader> initWithResource(const char* name, std::uint32_t type);
    static std::shared_ptr<GLShader> shaderWithResource(const char* name, std::uint32_t type);

    /// For the initialisers.
    explicit GLShader(Name name) : _shader(name.shader) {}
    ~GLShader();
    GLShader(const GLShader&) = delete;
    GLShader& operator=(const GLShader&) = delete;

    std::uint32_t shader() const { return _shader; }

  private:
    static std::uint32_t _newShaderWithSource(const char* source, std::uint32_t type);

    std::uint32_t _shader = 0;
};

} // namespace qivo
