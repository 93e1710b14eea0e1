#include "platform/PixelFormat.h"

namespace qivo {
namespace {

constexpr int kColorChannels = 3;

void setColorSize(QSurfaceFormat& format, std::uint32_t bits) {
    const int each = static_cast<int>(bits) / kColorChannels;
    format.setRedBufferSize(each);
    format.setGreenBufferSize(each);
    format.setBlueBufferSize(each);
}

void setProfile(QSurfaceFormat& format, std::uint32_t profile) {
    if (profile == PixelFormat::ProfileVersion4_1Core) {
        format.setVersion(4, 1);
        format.setProfile(QSurfaceFormat::CoreProfile);
    }
}

} // namespace

PixelFormat PixelFormat::initWithAttributes(std::vector<std::uint32_t> attributes) {
    return PixelFormat(std::move(attributes));
}

QSurfaceFormat PixelFormat::surfaceFormat() const {
    QSurfaceFormat format;
    format.setRenderableType(QSurfaceFormat::OpenGL);
    format.setSwapBehavior(QSurfaceFormat::SingleBuffer);
    format.setDepthBufferSize(0);
    format.setStencilBufferSize(0);
    format.setSamples(0);
    for (auto attribute = m_attributes.begin(); attribute != m_attributes.end() && *attribute != 0; ++attribute) {
        const bool hasValue = *attribute == ColorSize || *attribute == AlphaSize || *attribute == OpenGLProfile;
        const std::uint32_t name = *attribute;
        if (hasValue && ++attribute == m_attributes.end()) {
            break;
        }
        switch (name) {
        case DoubleBuffer:
            format.setSwapBehavior(QSurfaceFormat::DoubleBuffer);
            break;
        case ColorSize:
            setColorSize(format, *attribute);
            break;
        case AlphaSize:
            format.setAlphaBufferSize(static_cast<int>(*attribute));
            break;
        case OpenGLProfile:
            setProfile(format, *attribute);
            break;
        default:
            break;
        }
    }
    return format;
}

} // namespace qivo
