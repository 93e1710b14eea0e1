#pragma once

#include <epoxy/egl.h>
#include <epoxy/gl.h>

#include <cstdint>
#include <functional>
#include <type_traits>
#include <vector>

namespace qivo {

/// A driver that imports memory into textures, made up around the one that is current, for as long as it lives. Its
/// display passes for another one each time, so that nothing is known of it. One at a time.
///
/// What shows in an imported texture is brought up to date when it is read with glReadPixels or `follow`.
class ImportingDriver {
  public:
    enum class Kind {
        follows,          ///< shows the memory where it is
        copies,           ///< shows the memory as it was
        refusesTheTarget, ///< takes no memory for rectangles
        makesNoImages,    ///< takes no memory at all, although it offers to
        offersNothing     ///< does not even
    };

    explicit ImportingDriver(Kind kind);
    ~ImportingDriver();
    ImportingDriver(const ImportingDriver&) = delete;
    ImportingDriver& operator=(const ImportingDriver&) = delete;

    /// Refuses memory with rows at this distance.
    void refusePitch(EGLint pitch) { _refusedPitch = pitch; }

    int imagesMade() const { return _imagesMade; }
    int imagesAlive() const { return _imagesAlive; }
    /// What the last image was made with, but for the descriptor.
    const std::vector<EGLint>& lastAttributes() const { return _attributes; }
    /// What an imported rectangle texture shows, as bytes R, G, B, A.
    std::vector<std::uint8_t> follow(GLuint texture);

    // For the functions that it puts in place of the driver's own.
    struct Import {
        GLuint texture;
        void* memory;
        GLsizei width;
        GLsizei height;
    };
    EGLImageKHR makeImage(const EGLint* attributes);
    void releaseImage();
    void import(GLenum target);
    void bringUpToDate();

  private:
    template <typename Function>
    void replace(Function& slot, std::type_identity_t<Function> replacement);

    Kind _kind;
    EGLint _refusedPitch = 0;
    int _imagesMade = 0;
    int _imagesAlive = 0;
    std::vector<EGLint> _attributes;
    Import _pending{};
    std::vector<Import> _imports;
    std::vector<std::function<void()>> _restorations;
};

} // namespace qivo
