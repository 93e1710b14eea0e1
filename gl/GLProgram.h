#pragma once

#include <cstdint>

namespace qivo {

/// One GL program: make it, `attach` the shaders, `bind` the attributes in the order of their locations, `link`, then
/// draw between `program(true)` and `program(false)` or with `pid`.
///
/// Thread: the one that has the GL context current, for every operation, destruction included.
class GLProgram {
  public:
    /// Logs a line and leaves `pid` 0 if GL makes no program.
    GLProgram();
    /// Deletes the program, then leaves no program current. No GL call if `pid` is 0.
    ~GLProgram();
    GLProgram(const GLProgram&) = delete;
    GLProgram& operator=(const GLProgram&) = delete;

    /// Attaches the shader of this name; 0 is skipped.
    void attach(std::uint32_t shader);
    /// Gives the attribute of this name the next location, from 0 on; null is skipped and takes none. Takes effect with
    /// the next `link`.
    void bind(const char* attribute);
    /// False if linking failed: the linker's log was logged, `pid` is 0 from now on, and the GL program is forgotten
    /// without deleting it.
    bool link();
    /// Makes the program current, or none.
    void program(bool use);

    std::uint32_t pid() const { return _pid; }

    // Nothing stores what `attach`, `bind` and `program` were given: these always answer 0, null and false.
    std::uint32_t shader() const { return _shader; }
    const char* attribute() const { return _attribute; }
    bool use() const { return _use; }

  private:
    std::uint32_t _pid = 0;
    std::uint32_t index = 0;
    const bool _use = false;
    const std::uint32_t _shader = 0;
    const char* const _attribute = nullptr;
};

} // namespace qivo
