#include "gl/GLShader.h"

#include "gl/InfoLog.h"
#include "gl/NSTextFile.h"

#include <epoxy/gl.h>

namespace qivo {

std::uint32_t GLShader::_newShaderWithSource(const char* source, std::uint32_t type) {
    if (!source) {
        return 0;
    }
    const GLuint shader = glCreateShader(type);
    glShaderSource(shader, 1, &source, nullptr);
    glCompileShader(shader);
    GLint status = 0;
    glGetShaderiv(shader, GL_COMPILE_STATUS, &status);
    if (status) {
        return shader;
    }
    GLint length = 0;
    glGetShaderiv(shader, GL_INFO_LOG_LENGTH, &length);
    logInfoLog(length, [shader](GLsizei bytes, char* buffer) { glGetShaderInfoLog(shader, bytes, nullptr, buffer); });
    return 0;
}

GLShader::~GLShader() {
    if (_shader) {
        glDeleteShader(_shader);
    }
}

std::unique_ptr<GLShader> GLShader::initWithSource(const char* source, std::uint32_t type) {
    return std::make_unique<GLShader>(Name{_newShaderWithSource(source, type)});
}

std::unique_ptr<GLShader> GLShader::initWithURL(const char* url, std::uint32_t type) {
    return initWithSource(NSTextFile::textWithURL(url)->source(), type);
}

std::unique_ptr<GLShader> GLShader::initWithFile(const char* path, std::uint32_t type) {
    return initWithSource(NSTextFile::textWithFile(path)->source(), type);
}

std::unique_ptr<GLShader> GLShader::initWithResource(const char* name, std::uint32_t type) {
    const char* ext = type == GL_VERTEX_SHADER ? "vs" : "fs";
    return initWithSource(NSTextFile::textWithResource(name, ext)->source(), type);
}

std::shared_ptr<GLShader> GLShader::shaderWithSource(const char* source, std::uint32_t type) {
    return initWithSource(source, type);
}

std::shared_ptr<GLShader> GLShader::shaderWithURL(const char* url, std::uint32_t type) {
    return initWithURL(url, type);
}

std::shared_ptr<GLShader> GLShader::shaderWithFile(const char* path, std::uint32_t type) {
    return initWithFile(path, type);
}

std::shared_ptr<GLShader> GLShader::shaderWithResource(const char* name, std::uint32_t type) {
    return initWithResource(name, type);
}

} // namespace qivo
