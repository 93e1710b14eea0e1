#include "gl/GLTexture.h"

#include "tests/gl/ContextTest.h"
#include "tests/gl/GlErrorTrace.h"
#include "tests/gl/Pictures.h"
#include "tests/platform/LogCapture.h"
#include "tests/platform/TemporaryDirectory.h"

#include <epoxy/gl.h>

#include <QImage>

#include <memory>
#include <vector>

namespace qivo {
namespace {

using testing::Each;
using testing::ElementsAre;
using testing::ElementsAreArray;
using testing::IsEmpty;

GLint levelParameter(const GLTexture& texture, GLenum what) {
    GLint value = -1;
    glBindTexture(texture.target(), texture.texture());
    glGetTexLevelParameteriv(texture.target(), 0, what, &value);
    glBindTexture(texture.target(), 0);
    return value;
}

GLint parameter(const GLTexture& texture, GLenum what) {
    GLint value = -1;
    glBindTexture(texture.target(), texture.texture());
    glGetTexParameteriv(texture.target(), what, &value);
    glBindTexture(texture.target(), 0);
    return value;
}

GLint integer(GLenum what) {
    GLint value = -1;
    glGetIntegerv(what, &value);
    return value;
}

/// All samples of the texture, without padding.
template <typename Sample>
std::vector<Sample> samplesOf(const GLTexture& texture, GLenum format, GLenum type) {
    const int perPixel = format == GL_RGBA ? 4 : 3;
    std::vector<Sample> values(static_cast<std::size_t>(texture.width() * texture.height() * perPixel));
    glPixelStorei(GL_PACK_ALIGNMENT, 1);
    glBindTexture(texture.target(), texture.texture());
    glGetTexImage(texture.target(), 0, format, type, values.data());
    glBindTexture(texture.target(), 0);
    return values;
}

std::vector<std::uint8_t> bytesOf(const GLTexture& texture) {
    return samplesOf<std::uint8_t>(texture, GL_RGBA, GL_UNSIGNED_BYTE);
}

std::vector<std::uint8_t> countingFrom(int first, int count) {
    std::vector<std::uint8_t> bytes;
    for (int at = 0; at < count; ++at) {
        bytes.push_back(static_cast<std::uint8_t>(first + at));
    }
    return bytes;
}

/// 2 x 2 pixels, tightly packed.
constexpr BitmapLayout small{.pixelsWide = 2, .pixelsHigh = 2, .bytesPerRow = 8};

class GLTextureContextTest : public ContextTest {
  protected:
    LogCapture log;
    std::unique_ptr<GlErrorTrace> trace;

    void SetUp() override {
        ContextTest::SetUp();
        if (context) {
            trace = std::make_unique<GlErrorTrace>();
        }
    }

    void TearDown() override {
        EXPECT_THAT(log.take(), IsEmpty());
        trace.reset();
        ContextTest::TearDown();
    }

    /// What a core profile makes of enabling and disabling a texture target.
    void expectOnlyTheErrorsOfEnabling() {
        EXPECT_THAT(trace->take(), ElementsAre("glEnable: GL_INVALID_ENUM", "glDisable: GL_INVALID_ENUM"));
    }
};

TEST_F(GLTextureContextTest, InitThenAcquireMakesStorage) {
    GLTexture texture;
    EXPECT_TRUE(texture.acquire());
    expectOnlyTheErrorsOfEnabling();
    EXPECT_EQ(levelParameter(texture, GL_TEXTURE_WIDTH), 1920);
    EXPECT_EQ(levelParameter(texture, GL_TEXTURE_HEIGHT), 1080);
    EXPECT_EQ(levelParameter(texture, GL_TEXTURE_INTERNAL_FORMAT), GL_RGBA16);
    EXPECT_EQ(levelParameter(texture, GL_TEXTURE_RED_SIZE), 16);
    EXPECT_TRUE(texture.acquire());
    EXPECT_THAT(trace->take(), IsEmpty());
}

TEST_F(GLTextureContextTest, IsLinearAndClampedAndLeftUnbound) {
    GLTexture texture;
    texture.acquire();
    EXPECT_EQ(integer(GL_TEXTURE_BINDING_2D), 0);
    EXPECT_EQ(parameter(texture, GL_TEXTURE_MIN_FILTER), GL_LINEAR);
    EXPECT_EQ(parameter(texture, GL_TEXTURE_MAG_FILTER), GL_LINEAR);
    EXPECT_EQ(parameter(texture, GL_TEXTURE_WRAP_S), GL_CLAMP_TO_EDGE);
    EXPECT_EQ(parameter(texture, GL_TEXTURE_WRAP_T), GL_CLAMP_TO_EDGE);
}

TEST_F(GLTextureContextTest, RectangleTextureIsOne) {
    GLTexture texture;
    texture.setTarget(GL_TEXTURE_RECTANGLE);
    texture.setWidth(3);
    texture.setHeight(5);
    EXPECT_TRUE(texture.acquire());
    expectOnlyTheErrorsOfEnabling();
    EXPECT_EQ(levelParameter(texture, GL_TEXTURE_WIDTH), 3);
    EXPECT_EQ(integer(GL_TEXTURE_BINDING_RECTANGLE), 0);
}

TEST_F(GLTextureContextTest, PictureIsReadAsBytesRgba) {
    const auto pixels = countingFrom(0, 16);
    const Image image = pictureOf(small, pixels.data());
    const auto texture = GLTexture::initWithImage(&image);
    expectOnlyTheErrorsOfEnabling();
    EXPECT_EQ(bytesOf(*texture), pixels);
    EXPECT_EQ(levelParameter(*texture, GL_TEXTURE_INTERNAL_FORMAT), GL_RGBA8);
}

TEST_F(GLTextureContextTest, PaddedRowsAreSkippedThenAndInLaterUpdates) {
    constexpr BitmapLayout padded{.pixelsWide = 2, .pixelsHigh = 2, .bytesPerRow = 12};
    auto pixels = countingFrom(0, 24);
    const Image image = pictureOf(padded, pixels.data());
    const auto texture = GLTexture::initWithImage(&image);
    EXPECT_EQ(integer(GL_UNPACK_ROW_LENGTH), 3);
    EXPECT_THAT(bytesOf(*texture), ElementsAre(0, 1, 2, 3, 4, 5, 6, 7, 12, 13, 14, 15, 16, 17, 18, 19));

    pixels = countingFrom(100, 24);
    texture->setBind(true);
    EXPECT_TRUE(texture->update(pixels.data()));
    texture->setBind(false);
    expectOnlyTheErrorsOfEnabling();
    EXPECT_THAT(bytesOf(*texture),
                ElementsAre(100, 101, 102, 103, 104, 105, 106, 107, 112, 113, 114, 115, 116, 117, 118, 119));
}

TEST_F(GLTextureContextTest, RowLengthOfVgaIs640) {
    const std::vector<std::uint8_t> pixels(2560 * 480, 7);
    const Image image = pictureOf({.pixelsWide = 640, .pixelsHigh = 480, .bytesPerRow = 2560}, pixels.data());
    const auto texture = GLTexture::initWithImage(&image);
    EXPECT_EQ(integer(GL_UNPACK_ROW_LENGTH), 640);
    EXPECT_THAT(bytesOf(*texture), Each(7));
}

TEST_F(GLTextureContextTest, RowsOf16BitPicturesAreReadAtTwiceTheirDistance) {
    std::vector<std::uint16_t> pixels(64, 0); // twice the 2 x 4 pixels
    for (std::uint16_t at = 0; at < 32; ++at) {
        pixels[at] = at;
    }
    const Image image =
        pictureOf({.pixelsWide = 2, .pixelsHigh = 4, .bitsPerSample = 16, .bytesPerRow = 16}, pixels.data());
    const auto texture = GLTexture::initWithImage(&image);
    expectOnlyTheErrorsOfEnabling();
    EXPECT_EQ(integer(GL_UNPACK_ROW_LENGTH), 4);
    EXPECT_THAT(samplesOf<std::uint16_t>(*texture, GL_RGBA, GL_UNSIGNED_SHORT),
                ElementsAre(0, 1, 2, 3, 4, 5, 6, 7, 16, 17, 18, 19, 20, 21, 22, 23, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0,
                            0, 0, 0, 0));
}

TEST_F(GLTextureContextTest, SixteenBitPictureFilesStayWithinTheirMemory) {
    const TemporaryDirectory directory;
    const std::string path = directory.path("picture.png");
    for (const auto format : {QImage::Format_RGBA64, QImage::Format_RGBX64}) {
        QImage picture(301, 200, format);
        picture.fill(Qt::white);
        ASSERT_TRUE(picture.save(QString::fromStdString(path)));
        const auto texture = GLTexture::initWithFile(path.c_str());
        expectOnlyTheErrorsOfEnabling();
        const auto samples = samplesOf<std::uint16_t>(*texture, texture->format(), GL_UNSIGNED_SHORT);
        EXPECT_EQ(samples.front(), 0xFFFF);
        EXPECT_EQ(samples.back(), 0) << "from the zero bytes behind the picture";
    }
}

TEST_F(GLTextureContextTest, PictureOf3SamplesOf8BitsIsRefusedByGlAndCountsAsMade) {
    const auto pixels = countingFrom(0, 16);
    BitmapLayout layout = small;
    layout.samplesPerPixel = 3;
    const Image image = pictureOf(layout, pixels.data());
    const auto texture = GLTexture::initWithImage(&image);
    EXPECT_NE(texture->texture(), 0U);
    EXPECT_THAT(trace->take(), ElementsAre("glEnable: GL_INVALID_ENUM", "glTexImage2D: GL_INVALID_OPERATION",
                                           "glDisable: GL_INVALID_ENUM"));
    EXPECT_EQ(levelParameter(*texture, GL_TEXTURE_WIDTH), 0) << "no storage";
    texture->setBind(true);
    EXPECT_TRUE(texture->update(pixels.data()));
    texture->setBind(false);
    EXPECT_THAT(trace->take(), ElementsAre("glTexSubImage2D: GL_INVALID_OPERATION"));
}

TEST_F(GLTextureContextTest, FrameSequenceReplacesThePixels) {
    auto pixels = countingFrom(0, 16);
    const Image image = pictureOf(small, pixels.data());
    const auto texture = GLTexture::initWithImage(&image);
    trace->take();
    pixels = countingFrom(200, 16);
    texture->setEnable(true);
    EXPECT_THAT(trace->take(), ElementsAre("glEnable: GL_INVALID_ENUM"));
    texture->setBind(true);
    EXPECT_EQ(integer(GL_TEXTURE_BINDING_2D), static_cast<GLint>(texture->texture()));
    EXPECT_TRUE(texture->update(pixels.data()));
    texture->setBind(false);
    EXPECT_EQ(integer(GL_TEXTURE_BINDING_2D), 0);
    EXPECT_THAT(trace->take(), IsEmpty());
    texture->setEnable(false);
    EXPECT_THAT(trace->take(), ElementsAre("glDisable: GL_INVALID_ENUM"));
    EXPECT_EQ(bytesOf(*texture), pixels);
}

TEST_F(GLTextureContextTest, UpdateGoesToWhatIsBound) {
    const auto pixels = countingFrom(0, 16);
    const Image image = pictureOf(small, pixels.data());
    const auto texture = GLTexture::initWithImage(&image);
    const auto other = GLTexture::initWithImage(&image);
    const auto news = countingFrom(50, 16);
    other->setBind(true);
    EXPECT_TRUE(texture->update(news.data()));
    other->setBind(false);
    EXPECT_EQ(bytesOf(*texture), pixels);
    EXPECT_EQ(bytesOf(*other), news);
}

TEST_F(GLTextureContextTest, UpdateAtAFractionOfAPixelIsAtTheOrigin) {
    auto pixels = countingFrom(0, 16);
    const Image image = pictureOf(small, pixels.data());
    const auto texture = GLTexture::initWithImage(&image);
    trace->take();
    pixels = countingFrom(50, 16);
    texture->setBind(true);
    EXPECT_TRUE(texture->update(pixels.data(), {0.9, 0.9}));
    texture->setBind(false);
    EXPECT_THAT(trace->take(), IsEmpty());
    EXPECT_EQ(bytesOf(*texture), pixels);
}

TEST_F(GLTextureContextTest, UpdateAtAnyOtherPointIsRefusedByGlAndTrue) {
    const auto pixels = countingFrom(0, 16);
    const Image image = pictureOf(small, pixels.data());
    const auto texture = GLTexture::initWithImage(&image);
    trace->take();
    const auto news = countingFrom(50, 16);
    texture->setBind(true);
    for (const Point point : {Point{1, 0}, Point{0, 1}, Point{-1, 0}, Point{1e300, 1e300}}) {
        EXPECT_TRUE(texture->update(news.data(), point));
        EXPECT_THAT(trace->take(), ElementsAre("glTexSubImage2D: GL_INVALID_VALUE")) << point.x << ", " << point.y;
    }
    texture->setBind(false);
    EXPECT_EQ(bytesOf(*texture), pixels);
}

TEST_F(GLTextureContextTest, ImpossibleSizeIsRefusedByGlAndCountsAsMade) {
    GLTexture texture;
    texture.setWidth(-1);
    EXPECT_TRUE(texture.acquire());
    EXPECT_THAT(trace->take(), ElementsAre("glEnable: GL_INVALID_ENUM", "glTexImage2D: GL_INVALID_VALUE",
                                           "glDisable: GL_INVALID_ENUM"));
}

TEST_F(GLTextureContextTest, IsDeletedWithItsOwner) {
    auto texture = std::make_unique<GLTexture>();
    texture->acquire();
    trace->take();
    const GLuint name = texture->texture();
    EXPECT_TRUE(glIsTexture(name));
    texture.reset();
    EXPECT_FALSE(glIsTexture(name));
    EXPECT_THAT(trace->take(), IsEmpty());
}

TEST_F(GLTextureContextTest, OfAnUnfitPictureTouchesNoState) {
    const auto pixels = countingFrom(0, 16);
    BitmapLayout layout = small;
    layout.samplesPerPixel = 2;
    const Image image = pictureOf(layout, pixels.data());
    glPixelStorei(GL_UNPACK_ROW_LENGTH, 5);
    EXPECT_EQ(GLTexture::initWithImage(&image)->texture(), 0U);
    EXPECT_EQ(integer(GL_UNPACK_ROW_LENGTH), 5);
    EXPECT_THAT(trace->take(), IsEmpty());
}

} // namespace
} // namespace qivo
