#pragma once

#include <QSurfaceFormat>
#include <cstdint>
#include <vector>

namespace qivo {

/// What an OpenGL view asks of its context and drawable, as a list of attributes that ends with 0. Switches stand
/// alone, the others are followed by their value. What is not in the list is not asked for: no depth, stencil or
/// multisample buffer.
class PixelFormat {
  public:
    enum Attribute : std::uint32_t {
        DoubleBuffer = 5,
        ColorSize = 8, ///< bits of red, green and blue together
        AlphaSize = 11,
        OpenGLProfile = 99
    };
    enum Profile : std::uint32_t { ProfileVersion4_1Core = 0x4100 };

    /// Attributes that it does not know are skipped as switches.
    static PixelFormat initWithAttributes(std::vector<std::uint32_t> attributes);

    const std::vector<std::uint32_t>& attributes() const { return m_attributes; }
    /// The same in the window system's terms.
    QSurfaceFormat surfaceFormat() const;

  private:
    explicit PixelFormat(std::vector<std::uint32_t> attributes) : m_attributes(std::move(attributes)) {}
    std::vector<std::uint32_t> m_attributes;
};

} // namespace qivo
