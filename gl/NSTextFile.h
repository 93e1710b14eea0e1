#pragma once

#include <cstddef>
#include <memory>
#include <optional>
#include <string>

namespace qivo {

/// A whole text file, handed out as a C string.
///
/// Texts are 7-bit ASCII: a file with any other byte cannot be read, nor can one that is larger than `maximumBytes`. A
/// failure is logged, twice: why, then of what. Null names are allowed and count as names of nothing.
///
/// Thread: any; blocks for the input.
class NSTextFile {
  public:
    static constexpr std::size_t maximumBytes = std::size_t{1} << 20;

    /// Loads from a URL. Only `file:` URLs of this machine can be read.
    static std::unique_ptr<NSTextFile> initWithURL(const char* url);
    static std::shared_ptr<NSTextFile> textWithURL(const char* url);

    static std::unique_ptr<NSTextFile> initWithFile(const char* path);
    static std::shared_ptr<NSTextFile> textWithFile(const char* path);

    /// Loads the file `name`.`ext` of the resource directory.
    static std::unique_ptr<NSTextFile> initWithResource(const char* name, const char* ext);
    static std::shared_ptr<NSTextFile> textWithResource(const char* name, const char* ext);

    /// The text, for as long as this object lives; it ends early at a NUL byte in the file. Null if loading failed.
    const char* source() const { return m_String ? m_String->c_str() : nullptr; }

  private:
    bool _newStringWithURL(const char* url);
    bool _newStringWithFile(const char* path);
    bool _newStringWithResource(const char* name, const char* ext);

    std::optional<std::string> m_String;
};

} // namespace qivo
