#include "tests/gl/RecordingGL.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <utility>

namespace qivo {

namespace recorded {

std::string argument(const void* pointer) {
    char text[32];
    std::snprintf(text, sizeof text, "%p", pointer);
    return pointer ? text : "null";
}

std::string argument(const char* text) {
    return text ? "\"" + std::string(text) + "\"" : "null";
}

std::string argument(std::nullptr_t) {
    return "null";
}

std::string argument(float number) {
    return std::to_string(number);
}

// From 2048 on most numbers are GL constants.
std::string argument(std::int64_t number) {
    char text[32];
    std::snprintf(text, sizeof text, number < 0x800 ? "%lld" : "0x%llX", static_cast<long long>(number));
    return text;
}

} // namespace recorded

namespace {

RecordingGL* current = nullptr;

template <typename... Arguments>
void record(const char* function, Arguments... arguments) {
    current->add(call(function, arguments...));
}

void giveNames(const char* function, GLsizei count, GLuint* names) {
    record(function, count);
    std::generate_n(names, count, [] { return current->name(); });
}

void takeNames(const char* function, GLsizei count, const GLuint* names) {
    for (GLsizei at = 0; at < count; ++at) {
        record(function, count, names[at]);
    }
}

void answer(GLenum what, GLint* value, GLenum statusName, std::optional<GLint> status) {
    if (what == statusName && status) {
        *value = *status;
    } else if (what == GL_INFO_LOG_LENGTH) {
        *value = current->infoLogLength.value_or(static_cast<GLint>(current->infoLog.size() + 1));
    }
}

void giveLog(GLsizei bytes, GLsizei* length, GLchar* buffer) {
    const int written =
        bytes > 0 ? std::snprintf(buffer, static_cast<std::size_t>(bytes), "%s", current->infoLog.c_str()) : 0;
    if (length) {
        *length = written;
    }
}

} // namespace

template <typename Function>
void RecordingGL::replace(Function& slot, std::type_identity_t<Function> recorder) {
    _restorations.emplace_back([&slot, original = slot] { slot = original; });
    slot = recorder;
}

RecordingGL::RecordingGL() {
    if (std::exchange(current, this)) {
        std::fputs("GL is recorded already\n", stderr);
        std::abort();
    }

    // Shaders and programs.
    replace(epoxy_glCreateShader, [](GLenum type) {
        record("glCreateShader", type);
        return current->name();
    });
    replace(epoxy_glShaderSource, [](GLuint shader, GLsizei count, const GLchar* const* texts, const GLint* lengths) {
        record("glShaderSource", shader, count, texts[0], static_cast<const void*>(lengths));
    });
    replace(epoxy_glCompileShader, [](GLuint shader) { record("glCompileShader", shader); });
    replace(epoxy_glGetShaderiv, [](GLuint shader, GLenum what, GLint* value) {
        record("glGetShaderiv", shader, what);
        answer(what, value, GL_COMPILE_STATUS, current->compileStatus);
    });
    replace(epoxy_glGetShaderInfoLog, [](GLuint shader, GLsizei bytes, GLsizei* length, GLchar* buffer) {
        record("glGetShaderInfoLog", shader, bytes);
        giveLog(bytes, length, buffer);
    });
    replace(epoxy_glDeleteShader, [](GLuint shader) { record("glDeleteShader", shader); });
    replace(epoxy_glCreateProgram, [] {
        record("glCreateProgram");
        return current->name();
    });
    replace(epoxy_glAttachShader, [](GLuint program, GLuint shader) { record("glAttachShader", program, shader); });
    replace(epoxy_glBindAttribLocation, [](GLuint program, GLuint index, const GLchar* name) {
        record("glBindAttribLocation", program, index, name);
    });
    replace(epoxy_glLinkProgram, [](GLuint program) { record("glLinkProgram", program); });
    replace(epoxy_glGetProgramiv, [](GLuint program, GLenum what, GLint* value) {
        record("glGetProgramiv", program, what);
        answer(what, value, GL_LINK_STATUS, current->linkStatus);
    });
    replace(epoxy_glGetProgramInfoLog, [](GLuint program, GLsizei bytes, GLsizei* length, GLchar* buffer) {
        record("glGetProgramInfoLog", program, bytes);
        giveLog(bytes, length, buffer);
    });
    replace(epoxy_glUseProgram, [](GLuint program) { record("glUseProgram", program); });
    replace(epoxy_glDeleteProgram, [](GLuint program) { record("glDeleteProgram", program); });

    // Textures.
    replace(epoxy_glGenTextures, [](GLsizei count, GLuint* names) { giveNames("glGenTextures", count, names); });
    replace(epoxy_glDeleteTextures,
            [](GLsizei count, const GLuint* names) { takeNames("glDeleteTextures", count, names); });
    replace(epoxy_glBindTexture, [](GLenum target, GLuint texture) { record("glBindTexture", target, texture); });
    replace(epoxy_glPixelStorei, [](GLenum what, GLint value) { record("glPixelStorei", what, value); });
    replace(epoxy_glTexParameteri,
            [](GLenum target, GLenum what, GLint value) { record("glTexParameteri", target, what, value); });
    replace(epoxy_glTexImage2D, [](GLenum target, GLint level, GLint internal, GLsizei width, GLsizei height,
                                   GLint border, GLenum format, GLenum type, const void* pixels) {
        record("glTexImage2D", target, level, internal, width, height, border, format, type, pixels);
    });
    replace(epoxy_glTexSubImage2D, [](GLenum target, GLint level, GLint x, GLint y, GLsizei width, GLsizei height,
                                      GLenum format, GLenum type, const void* pixels) {
        record("glTexSubImage2D", target, level, x, y, width, height, format, type, pixels);
    });

    // Vertices.
    replace(epoxy_glGenVertexArrays,
            [](GLsizei count, GLuint* names) { giveNames("glGenVertexArrays", count, names); });
    replace(epoxy_glDeleteVertexArrays,
            [](GLsizei count, const GLuint* names) { takeNames("glDeleteVertexArrays", count, names); });
    replace(epoxy_glBindVertexArray, [](GLuint array) { record("glBindVertexArray", array); });
    replace(epoxy_glGenBuffers, [](GLsizei count, GLuint* names) { giveNames("glGenBuffers", count, names); });
    replace(epoxy_glDeleteBuffers,
            [](GLsizei count, const GLuint* names) { takeNames("glDeleteBuffers", count, names); });
    replace(epoxy_glBindBuffer, [](GLenum target, GLuint buffer) { record("glBindBuffer", target, buffer); });
    replace(epoxy_glBufferData, [](GLenum target, GLsizeiptr bytes, const void* data, GLenum usage) {
        record("glBufferData", target, bytes, usage);
        current->bufferData.resize(static_cast<std::size_t>(bytes) / sizeof(float));
        std::memcpy(current->bufferData.data(), data, current->bufferData.size() * sizeof(float));
    });
    replace(epoxy_glVertexAttribPointer, [](GLuint index, GLint size, GLenum type, GLboolean normalised, GLsizei stride,
                                            const void* offset) {
        record("glVertexAttribPointer", index, size, type, normalised, stride, reinterpret_cast<std::intptr_t>(offset));
    });
    replace(epoxy_glEnableVertexAttribArray, [](GLuint index) { record("glEnableVertexAttribArray", index); });
    replace(epoxy_glDisableVertexAttribArray, [](GLuint index) { record("glDisableVertexAttribArray", index); });
    replace(epoxy_glDrawArrays,
            [](GLenum mode, GLint first, GLsizei count) { record("glDrawArrays", mode, first, count); });

    // The state of the context.
    replace(epoxy_glEnable, [](GLenum what) { record("glEnable", what); });
    replace(epoxy_glDisable, [](GLenum what) { record("glDisable", what); });
    replace(epoxy_glBlendFunc, [](GLenum source, GLenum target) { record("glBlendFunc", source, target); });
    replace(epoxy_glViewport,
            [](GLint x, GLint y, GLsizei width, GLsizei height) { record("glViewport", x, y, width, height); });
    replace(epoxy_glClearBufferfv, [](GLenum buffer, GLint number, const GLfloat* value) {
        record("glClearBufferfv", buffer, number, value[0], value[1], value[2], value[3]);
    });
    replace(epoxy_glFlush, [] { record("glFlush"); });
    replace(epoxy_glFinish, [] { record("glFinish"); });
    replace(epoxy_glGetError, [] {
        record("glGetError");
        return GLenum{GL_NO_ERROR};
    });
}

RecordingGL::~RecordingGL() {
    for (const auto& restore : _restorations) {
        restore();
    }
    current = nullptr;
}

std::vector<std::string> RecordingGL::take() {
    return std::exchange(_calls, {});
}

} // namespace qivo
