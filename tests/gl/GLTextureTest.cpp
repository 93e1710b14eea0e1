#include "gl/GLTexture.h"

#include "tests/gl/Pictures.h"
#include "tests/gl/RecordingGL.h"
#include "tests/gl/ResourceDirectory.h"
#include "tests/platform/LogCapture.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <QImage>

#include <limits>
#include <memory>
#include <type_traits>
#include <vector>

namespace qivo {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

static_assert(!std::is_copy_constructible_v<GLTexture> && !std::is_move_constructible_v<GLTexture>);

constexpr BitmapLayout vga{.pixelsWide = 640, .pixelsHigh = 480, .bytesPerRow = 2560};

/// Where pixels would be: nothing reads them here.
const void* const somePixels = &vga;

class GLTextureTest : public testing::Test {
  protected:
    LogCapture log;
    RecordingGL gl;

    void TearDown() override { EXPECT_THAT(log.take(), IsEmpty()); }

    static std::unique_ptr<GLTexture> textureOf(const BitmapLayout& layout) {
        const Image image = pictureOf(layout, somePixels);
        return GLTexture::initWithImage(&image);
    }

    struct Storage {
        GLenum target = GL_TEXTURE_2D;
        GLint rowLength = 0;
        GLint internal = GL_RGBA16;
        GLint width = 1920;
        GLint height = 1080;
        GLenum format = GL_RGBA;
        GLenum type = GL_UNSIGNED_SHORT;
        const void* pixels = nullptr;
        GLuint texture = 1;
    };

    static std::vector<std::string> creation(const Storage& storage) {
        const GLenum target = storage.target;
        return {call("glGenTextures", 1),
                call("glEnable", target),
                call("glBindTexture", target, storage.texture),
                call("glPixelStorei", GL_UNPACK_ROW_LENGTH, storage.rowLength),
                call("glTexParameteri", target, GL_TEXTURE_MIN_FILTER, GL_LINEAR),
                call("glTexParameteri", target, GL_TEXTURE_MAG_FILTER, GL_LINEAR),
                call("glTexParameteri", target, GL_TEXTURE_WRAP_S, GL_CLAMP_TO_EDGE),
                call("glTexParameteri", target, GL_TEXTURE_WRAP_T, GL_CLAMP_TO_EDGE),
                call("glTexImage2D", target, 0, storage.internal, storage.width, storage.height, 0, storage.format,
                     storage.type, storage.pixels),
                call("glBindTexture", target, 0),
                call("glDisable", target)};
    }
};

TEST_F(GLTextureTest, InitDescribesAndMakesNoCall) {
    const GLTexture texture;
    EXPECT_EQ(texture.texture(), 0U);
    EXPECT_EQ(texture.target(), static_cast<GLenum>(GL_TEXTURE_2D));
    EXPECT_EQ(texture.samplesPerPixel(), 4U);
    EXPECT_EQ(texture.bitsPerComponent(), 16U);
    EXPECT_EQ(texture.width(), 1920);
    EXPECT_EQ(texture.height(), 1080);
    EXPECT_EQ(texture.internal(), GL_RGBA16);
    EXPECT_EQ(texture.format(), static_cast<GLenum>(GL_RGBA));
    EXPECT_EQ(texture.type(), static_cast<GLenum>(GL_UNSIGNED_SHORT));
    EXPECT_FALSE(texture.bind());
    EXPECT_FALSE(texture.enable());
    EXPECT_THAT(gl.take(), IsEmpty());
}

TEST_F(GLTextureTest, InitThenAcquireMakesStorageWithoutPixels) {
    GLTexture texture;
    EXPECT_TRUE(texture.acquire());
    EXPECT_EQ(texture.texture(), 1U);
    EXPECT_EQ(gl.take(), creation({}));
}

TEST_F(GLTextureTest, ASecondAcquireIsTrueWithoutACall) {
    GLTexture texture;
    texture.acquire();
    gl.take();
    EXPECT_TRUE(texture.acquire());
    EXPECT_TRUE(texture.acquire(somePixels));
    EXPECT_THAT(gl.take(), IsEmpty());
}

TEST_F(GLTextureTest, AcquireUploadsPixels) {
    GLTexture texture;
    EXPECT_TRUE(texture.acquire(somePixels));
    EXPECT_EQ(gl.take(), creation({.pixels = somePixels}));
}

TEST_F(GLTextureTest, WithoutANameIsNotAcquiredAndCanBeTriedAgain) {
    gl.givesNames = false;
    GLTexture texture;
    EXPECT_FALSE(texture.acquire());
    EXPECT_EQ(gl.take(), creation({.texture = 0}));
    EXPECT_FALSE(texture.update(somePixels));
    texture.setWidth(640);
    EXPECT_THAT(gl.take(), IsEmpty());

    gl.givesNames = true;
    EXPECT_TRUE(texture.acquire());
    EXPECT_EQ(gl.take(), creation({.width = 640}));
}

TEST_F(GLTextureTest, SettersCorrectWhatTheyDoNotKnow) {
    GLTexture texture;
    texture.setWidth(640);
    texture.setWidth(0);
    EXPECT_EQ(texture.width(), 1920);
    texture.setHeight(480);
    texture.setHeight(0);
    EXPECT_EQ(texture.height(), 1080);
    texture.setBitsPerComponent(8);
    texture.setBitsPerComponent(12);
    EXPECT_EQ(texture.bitsPerComponent(), 16U);
    texture.setSamplesPerPixel(3);
    texture.setSamplesPerPixel(2);
    EXPECT_EQ(texture.samplesPerPixel(), 4U);
    texture.setTarget(GL_TEXTURE_RECTANGLE);
    texture.setTarget(GL_TEXTURE_3D);
    EXPECT_EQ(texture.target(), static_cast<GLenum>(GL_TEXTURE_2D));
}

TEST_F(GLTextureTest, SettersKeepWhatTheyKnowWithoutACall) {
    GLTexture texture;
    texture.setWidth(-1);
    EXPECT_EQ(texture.width(), -1);
    texture.setHeight(1);
    EXPECT_EQ(texture.height(), 1);
    texture.setBitsPerComponent(8);
    EXPECT_EQ(texture.bitsPerComponent(), 8U);
    texture.setBitsPerComponent(16);
    EXPECT_EQ(texture.bitsPerComponent(), 16U);
    texture.setSamplesPerPixel(3);
    EXPECT_EQ(texture.samplesPerPixel(), 3U);
    texture.setSamplesPerPixel(4);
    EXPECT_EQ(texture.samplesPerPixel(), 4U);
    texture.setTarget(GL_TEXTURE_RECTANGLE);
    EXPECT_EQ(texture.target(), static_cast<GLenum>(GL_TEXTURE_RECTANGLE));
    EXPECT_THAT(gl.take(), IsEmpty());
}

TEST_F(GLTextureTest, SettersLeaveTheFormatsToTheCreation) {
    GLTexture texture;
    texture.setSamplesPerPixel(3);
    texture.setBitsPerComponent(8);
    EXPECT_EQ(texture.internal(), GL_RGBA16);
    EXPECT_EQ(texture.format(), static_cast<GLenum>(GL_RGBA));
    EXPECT_EQ(texture.type(), static_cast<GLenum>(GL_UNSIGNED_SHORT));
    texture.acquire();
    EXPECT_EQ(texture.internal(), GL_RGB8);
    EXPECT_EQ(texture.format(), static_cast<GLenum>(GL_RGB));
    EXPECT_EQ(texture.type(), static_cast<GLenum>(GL_UNSIGNED_INT_8_8_8_8_REV));
}

TEST_F(GLTextureTest, AfterCreationAllFiveSettersAreIgnored) {
    GLTexture texture;
    texture.acquire();
    texture.setWidth(1);
    texture.setHeight(2);
    texture.setBitsPerComponent(8);
    texture.setSamplesPerPixel(3);
    texture.setTarget(GL_TEXTURE_RECTANGLE);
    EXPECT_EQ(texture.width(), 1920);
    EXPECT_EQ(texture.height(), 1080);
    EXPECT_EQ(texture.bitsPerComponent(), 16U);
    EXPECT_EQ(texture.samplesPerPixel(), 4U);
    EXPECT_EQ(texture.target(), static_cast<GLenum>(GL_TEXTURE_2D));
}

TEST_F(GLTextureTest, UsesTheTargetThroughout) {
    GLTexture texture;
    texture.setTarget(GL_TEXTURE_RECTANGLE);
    texture.acquire();
    EXPECT_EQ(gl.take(), creation({.target = GL_TEXTURE_RECTANGLE}));
    texture.setBind(true);
    texture.setEnable(true);
    texture.update(somePixels);
    EXPECT_THAT(gl.take(),
                ElementsAre(call("glBindTexture", GL_TEXTURE_RECTANGLE, 1), call("glEnable", GL_TEXTURE_RECTANGLE),
                            call("glTexSubImage2D", GL_TEXTURE_RECTANGLE, 0, 0, 0, 1920, 1080, GL_RGBA,
                                 GL_UNSIGNED_SHORT, somePixels)));
}

TEST_F(GLTextureTest, PictureOf8BitRgba) {
    const auto texture = textureOf(vga);
    EXPECT_EQ(gl.take(), creation({.rowLength = 640,
                                   .internal = GL_RGBA8,
                                   .width = 640,
                                   .height = 480,
                                   .format = GL_RGBA,
                                   .type = GL_UNSIGNED_INT_8_8_8_8_REV,
                                   .pixels = somePixels}));
    EXPECT_EQ(texture->texture(), 1U);
    EXPECT_EQ(texture->target(), static_cast<GLenum>(GL_TEXTURE_2D));
    EXPECT_EQ(texture->width(), 640);
    EXPECT_EQ(texture->height(), 480);
    EXPECT_EQ(texture->samplesPerPixel(), 4U);
    EXPECT_EQ(texture->bitsPerComponent(), 8U);
    EXPECT_TRUE(texture->acquire());
    EXPECT_THAT(gl.take(), IsEmpty());
}

TEST_F(GLTextureTest, PictureOf16BitsHasTwiceTheRowLength) {
    BitmapLayout layout = vga;
    layout.bitsPerSample = 16;
    layout.bytesPerRow = 5120;
    textureOf(layout);
    EXPECT_EQ(gl.take()[3], call("glPixelStorei", GL_UNPACK_ROW_LENGTH, 1280));
}

TEST_F(GLTextureTest, PictureWithoutRowBytesHasNoRowLength) {
    BitmapLayout layout = vga;
    layout.bytesPerRow = 0;
    textureOf(layout);
    EXPECT_EQ(gl.take()[3], call("glPixelStorei", GL_UNPACK_ROW_LENGTH, 0));
}

TEST_F(GLTextureTest, RowLengthIsRoundedDown) {
    BitmapLayout layout = vga;
    layout.bytesPerRow = 2563;
    textureOf(layout);
    EXPECT_EQ(gl.take()[3], call("glPixelStorei", GL_UNPACK_ROW_LENGTH, 640));
}

TEST_F(GLTextureTest, PictureOf3SamplesOf8BitsCountsAsMade) {
    BitmapLayout layout = vga;
    layout.samplesPerPixel = 3;
    layout.bytesPerRow = 1920;
    const auto texture = textureOf(layout);
    EXPECT_EQ(gl.take(), creation({.rowLength = 640,
                                   .internal = GL_RGB8,
                                   .width = 640,
                                   .height = 480,
                                   .format = GL_RGB,
                                   .type = GL_UNSIGNED_INT_8_8_8_8_REV,
                                   .pixels = somePixels}));
    EXPECT_TRUE(texture->update(somePixels));
}

struct Formats {
    std::int32_t samples;
    std::int32_t bits;
    GLint internal;
    GLenum format;
    GLenum type;
};

class GLTextureFormats : public GLTextureTest, public testing::WithParamInterface<Formats> {};

TEST_P(GLTextureFormats, FollowFromSamplesAndBits) {
    const Formats& expected = GetParam();
    BitmapLayout layout = vga;
    layout.samplesPerPixel = expected.samples;
    layout.bitsPerSample = expected.bits;
    const auto texture = textureOf(layout);
    EXPECT_EQ(texture->internal(), expected.internal);
    EXPECT_EQ(texture->format(), expected.format);
    EXPECT_EQ(texture->type(), expected.type);
    EXPECT_EQ(texture->bitsPerComponent(), static_cast<std::uint64_t>(expected.bits)) << "kept unchecked";
    EXPECT_EQ(gl.take()[8], call("glTexImage2D", GL_TEXTURE_2D, 0, expected.internal, 640, 480, 0, expected.format,
                                 expected.type, somePixels));
}

INSTANTIATE_TEST_SUITE_P(All, GLTextureFormats,
                         testing::Values(Formats{4, 16, 0x805B, 0x1908, 0x1403}, Formats{3, 16, 0x8054, 0x1907, 0x1403},
                                         Formats{4, 8, 0x8058, 0x1908, 0x8367}, Formats{3, 8, 0x8051, 0x1907, 0x8367},
                                         Formats{4, 12, 0x8058, 0x1908, 0x8367},
                                         Formats{3, 32, 0x8051, 0x1907, 0x8367}),
                         [](const auto& row) {
                             return std::to_string(row.param.samples) + "SamplesOf" + std::to_string(row.param.bits) +
                                    "Bits";
                         });

TEST_F(GLTextureTest, PlanarPictureFailsWithoutACall) {
    BitmapLayout layout = vga;
    layout.isPlanar = true;
    const auto texture = textureOf(layout);
    EXPECT_EQ(texture->texture(), 0U);
    EXPECT_FALSE(texture->update(somePixels));
    EXPECT_THAT(gl.take(), IsEmpty());
    EXPECT_EQ(texture->samplesPerPixel(), 4U);
    EXPECT_EQ(texture->width(), 0);
}

TEST_F(GLTextureTest, PictureOfAnyOtherSampleCountFailsWithoutACallAndKeepsTheCount) {
    for (const std::int32_t samples : {0, 1, 2, 5}) {
        BitmapLayout layout = vga;
        layout.samplesPerPixel = samples;
        const auto texture = textureOf(layout);
        EXPECT_EQ(texture->texture(), 0U);
        EXPECT_FALSE(texture->update(somePixels));
        EXPECT_EQ(texture->samplesPerPixel(), static_cast<std::uint64_t>(samples));
    }
    EXPECT_THAT(gl.take(), IsEmpty());
}

TEST_F(GLTextureTest, WithoutABitmapFailsWithoutACall) {
    Image vector({640, 480});
    vector.addRepresentation(std::make_shared<ImageRep>(Size{640, 480}));
    for (const Image* image : {static_cast<const Image*>(nullptr), static_cast<const Image*>(&vector)}) {
        const auto texture = GLTexture::initWithImage(image);
        EXPECT_EQ(texture->texture(), 0U);
        EXPECT_EQ(texture->samplesPerPixel(), 0U);
        EXPECT_EQ(texture->target(), 0U);
        EXPECT_EQ(texture->internal(), 0);
        EXPECT_FALSE(texture->update(somePixels));
    }
    EXPECT_THAT(gl.take(), IsEmpty());
}

TEST_F(GLTextureTest, AfterAFailureCanBeDescribedAndAcquired) {
    const auto texture = GLTexture::initWithImage(nullptr);
    texture->setTarget(GL_TEXTURE_2D);
    texture->setSamplesPerPixel(4);
    texture->setBitsPerComponent(8);
    texture->setWidth(2);
    texture->setHeight(3);
    EXPECT_TRUE(texture->acquire(somePixels));
    EXPECT_EQ(gl.take(), creation({.internal = GL_RGBA8,
                                   .width = 2,
                                   .height = 3,
                                   .type = GL_UNSIGNED_INT_8_8_8_8_REV,
                                   .pixels = somePixels}));
}

TEST_F(GLTextureTest, WithoutAnyDescriptionHasNoRowLength) {
    EXPECT_TRUE(GLTexture::initWithImage(nullptr)->acquire());
    EXPECT_EQ(gl.take()[3], call("glPixelStorei", GL_UNPACK_ROW_LENGTH, 0));
}

TEST_F(GLTextureTest, UpdateReplacesAllPixelsAndDoesNothingElse) {
    const auto texture = textureOf(vga);
    gl.take();
    EXPECT_TRUE(texture->update(somePixels));
    EXPECT_THAT(gl.take(), ElementsAre(call("glTexSubImage2D", GL_TEXTURE_2D, 0, 0, 0, 640, 480, GL_RGBA,
                                            GL_UNSIGNED_INT_8_8_8_8_REV, somePixels)));
}

TEST_F(GLTextureTest, UpdateBeforeCreationIsFalseWithoutACall) {
    GLTexture texture;
    EXPECT_FALSE(texture.update(somePixels));
    EXPECT_FALSE(texture.update(somePixels, {0, 0}));
    EXPECT_THAT(gl.take(), IsEmpty());
}

TEST_F(GLTextureTest, UpdateWithNullIsFalseWithoutACall) {
    const auto texture = textureOf(vga);
    gl.take();
    EXPECT_FALSE(texture->update(nullptr));
    EXPECT_FALSE(texture->update(nullptr, {0, 0}));
    EXPECT_THAT(gl.take(), IsEmpty());
}

TEST_F(GLTextureTest, UpdateAtAPointTruncatesTowardZero) {
    constexpr double infinity = std::numeric_limits<double>::infinity();
    constexpr GLint farthest = GLTexture::farthestOffset;
    const struct {
        Point point;
        GLint x, y;
    } cases[] = {{{0.9, 0.9}, 0, 0},
                 {{1, 0}, 1, 0},
                 {{-0.9, 2.999}, 0, 2},
                 {{-1.5, 5}, -1, 5},
                 {{farthest, farthest + 1.0}, farthest, farthest},
                 {{1e300, -1e300}, farthest, -farthest},
                 {{infinity, -infinity}, farthest, -farthest},
                 {{std::numeric_limits<double>::quiet_NaN(), 1}, 0, 1}};
    const auto texture = textureOf(vga);
    for (const auto& one : cases) {
        gl.take();
        EXPECT_TRUE(texture->update(somePixels, one.point));
        EXPECT_THAT(gl.take(), ElementsAre(call("glTexSubImage2D", GL_TEXTURE_2D, 0, one.x, one.y, 640, 480, GL_RGBA,
                                                GL_UNSIGNED_INT_8_8_8_8_REV, somePixels)));
    }
}

TEST_F(GLTextureTest, BindKeepsTheFlagAndBinds) {
    const auto texture = textureOf(vga);
    gl.take();
    texture->setBind(true);
    EXPECT_TRUE(texture->bind());
    texture->setBind(false);
    EXPECT_FALSE(texture->bind());
    EXPECT_THAT(gl.take(),
                ElementsAre(call("glBindTexture", GL_TEXTURE_2D, 1), call("glBindTexture", GL_TEXTURE_2D, 0)));
}

TEST_F(GLTextureTest, EnableKeepsTheFlagAndEnables) {
    const auto texture = textureOf(vga);
    gl.take();
    texture->setEnable(true);
    EXPECT_TRUE(texture->enable());
    texture->setEnable(false);
    EXPECT_FALSE(texture->enable());
    EXPECT_THAT(gl.take(), ElementsAre(call("glEnable", GL_TEXTURE_2D), call("glDisable", GL_TEXTURE_2D)));
}

TEST_F(GLTextureTest, DestructionDeletesTheNameAndUndoesNothing) {
    auto texture = textureOf(vga);
    texture->setBind(true);
    texture->setEnable(true);
    gl.take();
    texture.reset();
    EXPECT_THAT(gl.take(), ElementsAre(call("glDeleteTextures", 1, 1)));
}

TEST_F(GLTextureTest, DestructionWithoutANameMakesNoCall) {
    { const GLTexture texture; }
    GLTexture::initWithImage(nullptr);
    EXPECT_THAT(gl.take(), IsEmpty());
}

class GLTextureFiles : public GLTextureTest {
  protected:
    ResourceDirectory resources;
    const std::string path = resources.path("picture.png");

    void SetUp() override { save(QImage::Format_RGBA8888); }

    void save(QImage::Format format) const {
        QImage picture(5, 2, format);
        picture.fill(Qt::green);
        ASSERT_TRUE(picture.save(QString::fromStdString(path)));
    }

    void expectUpload(const GLTexture& texture) {
        EXPECT_EQ(texture.texture(), gl.nextName - 1);
        EXPECT_EQ(texture.width(), 5);
        EXPECT_EQ(texture.height(), 2);
        EXPECT_EQ(texture.internal(), GL_RGBA8);
        EXPECT_THAT(gl.take(), testing::Contains(call("glPixelStorei", GL_UNPACK_ROW_LENGTH, 5)));
    }

    void expectFailure(const GLTexture& texture) {
        EXPECT_EQ(texture.texture(), 0U);
        EXPECT_THAT(gl.take(), IsEmpty());
    }
};

TEST_F(GLTextureFiles, AreLoaded) {
    expectUpload(*GLTexture::initWithFile(path.c_str()));
    expectUpload(*GLTexture::initWithURL(("file://" + path).c_str()));
    expectUpload(*GLTexture::initWithResource("picture.png"));
}

TEST_F(GLTextureFiles, ThatAreMissingFailWithoutACall) {
    expectFailure(*GLTexture::initWithFile(resources.path("none.png").c_str()));
    expectFailure(*GLTexture::initWithURL("file:///none.png"));
    expectFailure(*GLTexture::initWithURL("http://127.0.0.1/picture.png"));
    expectFailure(*GLTexture::initWithResource("none.png"));
}

TEST_F(GLTextureFiles, WithoutANameFailWithoutACall) {
    expectFailure(*GLTexture::initWithFile(nullptr));
    expectFailure(*GLTexture::initWithURL(nullptr));
    expectFailure(*GLTexture::initWithResource(nullptr));
}

TEST_F(GLTextureFiles, ThatAreBrokenFailWithoutACall) {
    resources.write("picture.png", "no picture");
    expectFailure(*GLTexture::initWithFile(path.c_str()));
}

TEST_F(GLTextureFiles, ThatAreGreyFailWithoutACall) {
    save(QImage::Format_Grayscale8);
    const auto texture = GLTexture::initWithFile(path.c_str());
    expectFailure(*texture);
    EXPECT_EQ(texture->samplesPerPixel(), 1U);
}

} // namespace
} // namespace qivo
