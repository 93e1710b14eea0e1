#include "gl/GLProgram.h"

#include "gl/InfoLog.h"
#include "platform/Log.h"

#include <epoxy/gl.h>

namespace qivo {

GLProgram::GLProgram() : _pid(glCreateProgram()) {
    if (!_pid) {
        logLine(">> ERROR: GL create program failed!");
    }
}

GLProgram::~GLProgram() {
    if (_pid) {
        glDeleteProgram(_pid);
        glUseProgram(0);
    }
}

void GLProgram::attach(std::uint32_t shader) {
    if (shader) {
        glAttachShader(_pid, shader);
    }
}

void GLProgram::bind(const char* attribute) {
    if (attribute) {
        glBindAttribLocation(_pid, index, attribute);
        ++index;
    }
}

bool GLProgram::link() {
    glLinkProgram(_pid);
    GLint status = 0;
    glGetProgramiv(_pid, GL_LINK_STATUS, &status);
    if (status) {
        return true;
    }
    GLint length = 0;
    glGetProgramiv(_pid, GL_INFO_LOG_LENGTH, &length);
    logInfoLog(length, [this](GLsizei bytes, char* buffer) { glGetProgramInfoLog(_pid, bytes, nullptr, buffer); });
    _pid = 0;
    return false;
}

void GLProgram::program(bool use) {
    glUseProgram(use ? _pid : 0);
}

} // namespace qivo
