#pragma once

#include <epoxy/gl.h>

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <type_traits>
#include <vector>

namespace qivo {

/// Stands in for GL without a context: for as long as it lives, every GL function that the kit and the view use is
/// recorded instead of called. Any other GL function still needs a context, and ends the program without one. One at a
/// time.
class RecordingGL {
  public:
    RecordingGL();
    ~RecordingGL();
    RecordingGL(const RecordingGL&) = delete;
    RecordingGL& operator=(const RecordingGL&) = delete;

    /// What was called since the last time, in the form of `call`.
    std::vector<std::string> take();

    // What GL answers.

    /// Each name that is given is one higher, whatever it is a name of.
    GLuint nextName = 1;
    /// False: every name is 0.
    bool givesNames = true;
    /// Answers to GL_COMPILE_STATUS and GL_LINK_STATUS; empty leaves the caller's value untouched.
    std::optional<GLint> compileStatus = GL_TRUE;
    std::optional<GLint> linkStatus = GL_TRUE;
    std::string infoLog = "the log";
    /// Answer to GL_INFO_LOG_LENGTH, if not the length of `infoLog` with its NUL.
    std::optional<GLint> infoLogLength;

    /// What glBufferData was last given.
    std::vector<float> bufferData;

    /// Called for every call before it is recorded, in the thread that calls. Threads must exclude each other.
    std::function<void()> hook;

    // For the recorders.
    void add(std::string call) {
        if (hook) {
            hook();
        }
        _calls.push_back(std::move(call));
    }
    GLuint name() { return givesNames ? nextName++ : 0; }

  private:
    template <typename Function>
    void replace(Function& slot, std::type_identity_t<Function> recorder);

    std::vector<std::string> _calls;
    std::vector<std::function<void()>> _restorations;
};

namespace recorded {

std::string argument(const void* pointer);
std::string argument(const char* text);
std::string argument(std::nullptr_t);
std::string argument(float number);
std::string argument(std::int64_t number);

template <typename Number>
requires std::is_integral_v<Number> std::string argument(Number number) {
    return argument(static_cast<std::int64_t>(number));
}

} // namespace recorded

/// How a call is recorded: "glEnable(0xDE1)". Arrays that GL reads or fills are left out or given element by element;
/// see the recorders.
template <typename... Arguments>
std::string call(const char* function, Arguments... arguments) {
    std::string text;
    ((text += (text.empty() ? "" : ", ") + recorded::argument(arguments)), ...);
    return std::string(function) + "(" + text + ")";
}

} // namespace qivo
