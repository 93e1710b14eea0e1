#include "gl/GLTexture.h"

#include "tests/gl/RecordingGL.h"
#include "tests/platform/LogCapture.h"
#include "video/IOSurface2D.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <limits>
#include <memory>
#include <vector>

namespace qivo {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

constexpr auto fallBack = ">> MESSAGE[2]: Fall back scheme for creating a 2d texture from an i/o surface!";

class GLTextureSurfaceTest : public testing::Test {
  protected:
    LogCapture log;
    RecordingGL gl;
    /// No thread's: nothing may be asked of it.
    const CGLContextObj context = &gl;

    void TearDown() override { EXPECT_THAT(log.take(), IsEmpty()); }

    static std::unique_ptr<IOSurface2D> acquired(std::uint64_t bitsPerPixel, std::uint64_t width,
                                                 std::uint64_t height) {
        auto surface = std::make_unique<IOSurface2D>();
        surface->setBitsPerPixel(bitsPerPixel);
        surface->setWidth(width);
        surface->setHeight(height);
        EXPECT_TRUE(surface->acquire());
        return surface;
    }

    /// What is called but for the upload, which comes in between.
    static std::vector<std::string> before() {
        return {call("glGenTextures", 1),
                call("glEnable", GL_TEXTURE_RECTANGLE),
                call("glBindTexture", GL_TEXTURE_RECTANGLE, 1),
                call("glTexParameteri", GL_TEXTURE_RECTANGLE, GL_TEXTURE_MIN_FILTER, GL_LINEAR),
                call("glTexParameteri", GL_TEXTURE_RECTANGLE, GL_TEXTURE_MAG_FILTER, GL_LINEAR),
                call("glTexParameteri", GL_TEXTURE_RECTANGLE, GL_TEXTURE_WRAP_S, GL_CLAMP_TO_EDGE),
                call("glTexParameteri", GL_TEXTURE_RECTANGLE, GL_TEXTURE_WRAP_T, GL_CLAMP_TO_EDGE)};
    }
    static std::vector<std::string> after() {
        return {call("glBindTexture", GL_TEXTURE_RECTANGLE, 0), call("glDisable", GL_TEXTURE_RECTANGLE)};
    }
    static std::vector<std::string> with(const std::vector<std::string>& upload) {
        auto calls = before();
        calls.insert(calls.end(), upload.begin(), upload.end());
        const auto rest = after();
        calls.insert(calls.end(), rest.begin(), rest.end());
        return calls;
    }
};

TEST_F(GLTextureSurfaceTest, IsARectangleWhateverTheSizeAndFallsBackToOneCopyWithOneLine) {
    for (const auto& [width, height] : {std::pair{640, 480}, {64, 64}}) {
        gl.nextName = 1;
        gl.take();
        const auto surface = acquired(32, static_cast<std::uint64_t>(width), static_cast<std::uint64_t>(height));
        const auto texture = GLTexture::initWithSurface(surface.get(), context);
        EXPECT_EQ(gl.take(), with({call("glTexImage2D", GL_TEXTURE_RECTANGLE, 0, GL_RGBA8, width, height, 0, GL_RGBA,
                                        GL_UNSIGNED_INT_8_8_8_8_REV, surface->map())}));
        EXPECT_THAT(log.take(), ElementsAre(fallBack));
        EXPECT_EQ(texture->target(), static_cast<GLenum>(GL_TEXTURE_RECTANGLE));
        EXPECT_EQ(texture->width(), width);
        EXPECT_EQ(texture->height(), height);
        EXPECT_EQ(texture->samplesPerPixel(), 4U);
        EXPECT_EQ(texture->bitsPerComponent(), 8U);
        EXPECT_EQ(texture->texture(), 1U);
    }
}

TEST_F(GLTextureSurfaceTest, OfSixteenBitsIsDeep) {
    const auto surface = acquired(48, 3, 2);
    const auto texture = GLTexture::initWithSurface(surface.get(), context);
    EXPECT_EQ(gl.take(), with({call("glTexImage2D", GL_TEXTURE_RECTANGLE, 0, GL_RGBA16, 3, 2, 0, GL_RGBA,
                                    GL_UNSIGNED_SHORT, surface->map())}));
    EXPECT_THAT(log.take(), ElementsAre(fallBack));
}

TEST_F(GLTextureSurfaceTest, LocksTheSurfaceForReadingAndUnlocksIt) {
    const auto surface = acquired(32, 3, 2);
    const auto seed = IOSurfaceGetSeed(surface->surface());
    const auto texture = GLTexture::initWithSurface(surface.get(), context);
    EXPECT_EQ(IOSurfaceGetSeed(surface->surface()), seed) << "it was not locked for writing";
    EXPECT_FALSE(surface->unlock()) << "it is still locked";
    log.take();
}

TEST_F(GLTextureSurfaceTest, ThatCannotBeLockedHasNoUploadAndIsNotMade) {
    const auto surface = acquired(32, 4, std::numeric_limits<std::uint64_t>::max());
    ASSERT_EQ(surface->samplesPerPixel(), 4U);
    ASSERT_FALSE(surface->lock(true));
    auto texture = GLTexture::initWithSurface(surface.get(), context);
    EXPECT_EQ(gl.take(), with({}));
    EXPECT_THAT(log.take(), ElementsAre(">> MESSAGE[1]: Fall back scheme for creating a 2d texture from an i/o "
                                        "surface!"));
    const std::uint8_t pixel[4] = {};
    EXPECT_FALSE(texture->update(pixel));
    texture->setWidth(7);
    EXPECT_EQ(texture->width(), 7) << "not frozen";
    EXPECT_EQ(texture->texture(), 1U);
    texture.reset();
    EXPECT_THAT(gl.take(), ElementsAre(call("glDeleteTextures", 1, 1)));
}

TEST_F(GLTextureSurfaceTest, WithoutSurfaceOrContextMakesNoCall) {
    const auto surface = acquired(32, 3, 2);
    EXPECT_EQ(GLTexture::initWithSurface(nullptr, context)->texture(), 0U);
    EXPECT_EQ(GLTexture::initWithSurface(surface.get(), nullptr)->texture(), 0U);
    EXPECT_EQ(GLTexture::initWithSurface(nullptr)->texture(), 0U);
    EXPECT_EQ(CGLGetCurrentContext(), nullptr);
    const auto texture = GLTexture::initWithSurface(surface.get());
    EXPECT_EQ(texture->texture(), 0U) << "no context is current here";
    EXPECT_EQ(texture->samplesPerPixel(), 0U);
    EXPECT_THAT(gl.take(), IsEmpty());
}

TEST_F(GLTextureSurfaceTest, OfAnObjectWithoutSurfaceMakesNoCall) {
    IOSurface2D none;
    const auto texture = GLTexture::initWithSurface(&none, context);
    EXPECT_EQ(texture->texture(), 0U);
    EXPECT_EQ(texture->target(), 0U);
    EXPECT_THAT(gl.take(), IsEmpty());
}

TEST_F(GLTextureSurfaceTest, OfOtherSampleCountsKeepsTheCountAndMakesNoCall) {
    const std::vector<std::uint8_t> pixels(16);
    const auto image = CGImage::create({.width = 1, .height = 1, .bitsPerComponent = 16, .bytesPerRow = 4},
                                       pixels.data(), pixels.size());
    const auto surface = IOSurface2D::initWithImageRef(image.get());
    ASSERT_EQ(surface->samplesPerPixel(), 2U);
    const auto texture = GLTexture::initWithSurface(surface.get(), context);
    EXPECT_EQ(texture->samplesPerPixel(), 2U);
    EXPECT_EQ(texture->bitsPerComponent(), 0U);
    EXPECT_EQ(texture->texture(), 0U);
    EXPECT_THAT(gl.take(), IsEmpty());
}

TEST_F(GLTextureSurfaceTest, TakesTheBitsOfAComponentUncheckedAndReadsThemAs8) {
    const std::vector<std::uint8_t> pixels(16);
    const auto image = CGImage::create({.width = 1, .height = 1, .bitsPerComponent = 32, .bytesPerRow = 4},
                                       pixels.data(), pixels.size());
    const auto surface = IOSurface2D::initWithImageRef(image.get());
    ASSERT_EQ(surface->samplesPerPixel(), 4U);
    const auto texture = GLTexture::initWithSurface(surface.get(), context);
    EXPECT_EQ(texture->bitsPerComponent(), 32U);
    EXPECT_EQ(texture->internal(), GL_RGBA8);
    EXPECT_THAT(log.take(), ElementsAre(testing::StartsWith(">> MESSAGE[1]: Fall back")));
}

TEST_F(GLTextureSurfaceTest, IsFrozenAndUpdatedLikeAnyOther) {
    const auto surface = acquired(32, 3, 2);
    const auto texture = GLTexture::initWithSurface(surface.get(), context);
    log.take();
    gl.take();
    texture->setTarget(GL_TEXTURE_2D);
    texture->setWidth(1);
    EXPECT_TRUE(texture->acquire());
    EXPECT_TRUE(texture->update(surface->map()));
    EXPECT_THAT(gl.take(), ElementsAre(call("glTexSubImage2D", GL_TEXTURE_RECTANGLE, 0, 0, 0, 3, 2, GL_RGBA,
                                            GL_UNSIGNED_INT_8_8_8_8_REV, surface->map())));
}

TEST_F(GLTextureSurfaceTest, WithoutANameCountsAsMade) {
    gl.givesNames = false;
    const auto surface = acquired(32, 3, 2);
    const auto texture = GLTexture::initWithSurface(surface.get(), context);
    EXPECT_EQ(texture->texture(), 0U);
    EXPECT_TRUE(texture->update(surface->map())) << "the name is tested for pictures alone";
    log.take();
}

} // namespace
} // namespace qivo
