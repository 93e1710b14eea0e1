#include "gl/GLQuad.h"

#include "gl/GLTexture.h"
#include "tests/gl/ContextTest.h"
#include "tests/gl/GlErrorTrace.h"
#include "tests/gl/Pictures.h"
#include "tests/gl/ResourceDirectory.h"
#include "tests/platform/LogCapture.h"

#include <epoxy/gl.h>

#include <memory>
#include <vector>

namespace qivo {
namespace {

using testing::Each;
using testing::ElementsAre;
using testing::IsEmpty;

constexpr Pixel red{255, 0, 0, 255};
constexpr Pixel green{0, 255, 0, 255};
constexpr Pixel blue{0, 0, 255, 255};
constexpr Pixel white{255, 255, 255, 255};
constexpr Pixel grey{51, 51, 51, 51};

GLint integer(GLenum what) {
    GLint value = -1;
    glGetIntegerv(what, &value);
    return value;
}

GLint isAttributeEnabled(GLuint index) {
    GLint value = -1;
    glGetVertexAttribiv(index, GL_VERTEX_ATTRIB_ARRAY_ENABLED, &value);
    return value;
}

class GLQuadContextTest : public ContextTest {
  protected:
    LogCapture log;
    std::unique_ptr<GlErrorTrace> trace;

    void SetUp() override {
        ContextTest::SetUp();
        if (context) {
            trace = std::make_unique<GlErrorTrace>();
            context->clear(grey);
        }
    }

    void TearDown() override {
        trace.reset();
        ContextTest::TearDown();
    }

    /// A texture of the frame buffer's size, whose quarters have these colours.
    static std::unique_ptr<GLTexture> quarters(GLenum target, Pixel topLeft, Pixel topRight, Pixel bottomLeft,
                                               Pixel bottomRight) {
        std::vector<Pixel> pixels;
        for (int y = 0; y < height; ++y) {
            for (int x = 0; x < width; ++x) {
                const bool isLeft = x < width / 2;
                pixels.push_back(y < height / 2 ? (isLeft ? topLeft : topRight) : (isLeft ? bottomLeft : bottomRight));
            }
        }
        auto texture = std::make_unique<GLTexture>();
        texture->setTarget(target);
        texture->setBitsPerComponent(8);
        texture->setWidth(width);
        texture->setHeight(height);
        texture->acquire(pixels.data());
        return texture;
    }

    static std::unique_ptr<GLTexture> colours(GLenum target) { return quarters(target, red, green, blue, white); }

    /// Every pixel, at the very edges of the quarters too.
    void expectColours() const {
        for (int y : {0, height / 2 - 1, height / 2, height - 1}) {
            for (int x : {0, width / 2 - 1, width / 2, width - 1}) {
                const bool isLeft = x < width / 2;
                const Pixel expected = y < height / 2 ? (isLeft ? red : green) : (isLeft ? blue : white);
                EXPECT_EQ(context->pixel(x, y), expected) << x << ", " << y;
            }
        }
    }

    void expectOnlyTheErrorsOfEnabling() {
        EXPECT_THAT(trace->take(), ElementsAre("glEnable: GL_INVALID_ENUM", "glDisable: GL_INVALID_ENUM"));
    }
};

TEST_F(GLQuadContextTest, InitMakesNoErrorAndLogsNothing) {
    const GLQuad quad;
    EXPECT_NE(quad.pid(), 0U);
    EXPECT_NE(quad.vao(), 0U);
    EXPECT_EQ(glGetAttribLocation(quad.pid(), "vertex"), 0);
    EXPECT_EQ(glGetAttribLocation(quad.pid(), "texCoord"), 1);
    EXPECT_THAT(trace->take(), IsEmpty());
    EXPECT_THAT(log.take(), IsEmpty());
}

TEST_F(GLQuadContextTest, DrawsThePictureUprightPixelForPixel) {
    GLQuad quad;
    const auto texture = colours(GL_TEXTURE_2D);
    trace->take();
    quad.render(texture->texture());
    expectOnlyTheErrorsOfEnabling();
    expectColours();
}

TEST_F(GLQuadContextTest, DrawsARectangleTextureInPixels) {
    const auto quad = GLQuad::initWithBounds({});
    quad->setSize({width, height});
    EXPECT_THAT(trace->take(), IsEmpty());
    const auto texture = colours(GL_TEXTURE_RECTANGLE);
    trace->take();
    quad->render(texture->texture());
    expectOnlyTheErrorsOfEnabling();
    expectColours();
}

TEST_F(GLQuadContextTest, DrawsAnEighthOfARectangleTexture) {
    const auto quad = GLQuad::initWithBounds({});
    quad->setSize({width / 2.0, height / 4.0});
    const auto texture = colours(GL_TEXTURE_RECTANGLE);
    quad->render(texture->texture());
    EXPECT_EQ(context->pixel(0, 0), red);
    EXPECT_EQ(context->pixel(width / 4, height - 1), red);
}

TEST_F(GLQuadContextTest, FillsTheViewportAndNothingElse) {
    GLQuad quad;
    const auto texture = colours(GL_TEXTURE_2D);
    glViewport(8, 4, 32, 24); // from the bottom left: rows 20 to 43 from the top
    quad.render(texture->texture());
    EXPECT_EQ(context->pixel(7, 20), grey);
    EXPECT_EQ(context->pixel(8, 19), grey);
    EXPECT_EQ(context->pixel(40, 20), grey);
    EXPECT_EQ(context->pixel(39, 44), grey);
    EXPECT_EQ(context->pixel(8, 20), red);
    EXPECT_EQ(context->pixel(39, 20), green);
    EXPECT_EQ(context->pixel(8, 43), blue);
    EXPECT_EQ(context->pixel(39, 43), white);
}

TEST_F(GLQuadContextTest, WritesTheTexturesAlpha) {
    GLQuad quad;
    const Pixel faint{200, 100, 50, 25};
    quad.render(quarters(GL_TEXTURE_2D, faint, faint, faint, faint)->texture());
    EXPECT_THAT(context->pixels(), Each(faint));
}

TEST_F(GLQuadContextTest, BlendsIfTheContextDoes) {
    GLQuad quad;
    context->clear({0, 0, 0, 0});
    glEnable(GL_BLEND);
    glBlendFunc(GL_SRC_ALPHA, GL_ONE_MINUS_SRC_ALPHA);
    trace->take();
    const Pixel clear{255, 255, 255, 0};
    quad.render(quarters(GL_TEXTURE_2D, red, clear, red, clear)->texture());
    EXPECT_EQ(context->pixel(0, 0), red);
    EXPECT_EQ(context->pixel(width - 1, 0), (Pixel{0, 0, 0, 0}));
}

TEST_F(GLQuadContextTest, RenderLeavesTheVertexArrayBoundAndNothingElse) {
    GLQuad quad;
    const auto texture = colours(GL_TEXTURE_2D);
    glBindVertexArray(0);
    quad.render(texture->texture());
    EXPECT_EQ(integer(GL_VERTEX_ARRAY_BINDING), static_cast<GLint>(quad.vao()));
    EXPECT_EQ(integer(GL_CURRENT_PROGRAM), 0);
    EXPECT_EQ(integer(GL_TEXTURE_BINDING_2D), 0);
    EXPECT_EQ(isAttributeEnabled(0), GL_FALSE);
    EXPECT_EQ(isAttributeEnabled(1), GL_FALSE);
}

TEST_F(GLQuadContextTest, RenderOfNothingDrawsNothing) {
    GLQuad quad;
    quad.render(0);
    EXPECT_THAT(trace->take(), IsEmpty());
    EXPECT_THAT(context->pixels(), Each(grey));
}

TEST_F(GLQuadContextTest, RectangleQuadWithoutVerticesDrawsNothing) {
    const auto quad = GLQuad::initWithBounds({});
    const auto texture = colours(GL_TEXTURE_RECTANGLE);
    trace->take();
    quad->render(texture->texture());
    EXPECT_THAT(trace->take(), testing::Contains("glDrawArrays: GL_INVALID_OPERATION"));
    EXPECT_THAT(context->pixels(), Each(grey));
}

TEST_F(GLQuadContextTest, LeavesTheVertexArrayAndBufferBoundThatItMade) {
    const GLQuad quad;
    EXPECT_EQ(integer(GL_VERTEX_ARRAY_BINDING), static_cast<GLint>(quad.vao()));
    EXPECT_NE(integer(GL_ARRAY_BUFFER_BINDING), 0);
    EXPECT_EQ(isAttributeEnabled(0), GL_FALSE);
    GLint bytes = 0;
    glGetBufferParameteriv(GL_ARRAY_BUFFER, GL_BUFFER_SIZE, &bytes);
    EXPECT_EQ(bytes, 64);
}

TEST_F(GLQuadContextTest, ResizedKeepsThePreviousVerticesBeyondItsEnd) {
    auto quad = GLQuad::initWithBounds({});
    quad->setSize({1920, 1080});
    const GLuint firstArray = quad->vao();
    const auto firstBuffer = static_cast<GLuint>(integer(GL_ARRAY_BUFFER_BINDING));
    quad->setSize({1280, 720});
    const GLuint secondArray = quad->vao();
    const auto secondBuffer = static_cast<GLuint>(integer(GL_ARRAY_BUFFER_BINDING));
    EXPECT_NE(firstArray, secondArray);
    EXPECT_NE(firstBuffer, secondBuffer);
    const GLuint program = quad->pid();
    quad.reset();
    EXPECT_TRUE(glIsVertexArray(firstArray));
    EXPECT_TRUE(glIsBuffer(firstBuffer));
    EXPECT_FALSE(glIsVertexArray(secondArray));
    EXPECT_FALSE(glIsBuffer(secondBuffer));
    EXPECT_FALSE(glIsProgram(program));
    EXPECT_THAT(trace->take(), IsEmpty());
}

/// Whether this driver links a program without any shader.
bool linksAnEmptyProgram() {
    const GLuint program = glCreateProgram();
    GLint status = GL_FALSE;
    glLinkProgram(program);
    glGetProgramiv(program, GL_LINK_STATUS, &status);
    glDeleteProgram(program);
    return status;
}

TEST_F(GLQuadContextTest, WithoutShadersHasTheProgramThatGlAllows) {
    const ResourceDirectory empty;
    const bool isAllowed = linksAnEmptyProgram();
    GLQuad quad;
    EXPECT_EQ(quad.pid() != 0, isAllowed);
    const auto records = log.take();
    ASSERT_EQ(records.size(), isAllowed ? 4U : 5U);
    EXPECT_EQ(records[0], ">> " + empty.path("Quad2D.vs") + ": No such file or directory");
    EXPECT_EQ(records[1], ">> ERROR: Failed acquiring sources from the \"Quad2D.vs' at application's bunble!");
    EXPECT_EQ(records[2], ">> " + empty.path("Quad2D.fs") + ": No such file or directory");
    EXPECT_EQ(records[3], ">> ERROR: Failed acquiring sources from the \"Quad2D.fs' at application's bunble!");
    if (!isAllowed) {
        EXPECT_THAT(records[4], testing::MatchesRegex(">> ERROR: \\{\n(.|\n)*\n\\}\n"));
    }
    quad.render(colours(GL_TEXTURE_2D)->texture());
    EXPECT_THAT(context->pixels(), Each(grey));
}

TEST_F(GLQuadContextTest, WithABrokenShaderLogsItAndDrawsNothing) {
    const ResourceDirectory resources;
    resources.write("Quad2D.vs", "#version 410 core\nvoid main() { nonsense = 1; }\n");
    resources.write("Quad2D.fs", "#version 410 core\nout vec4 colour;\nvoid main() { colour = broken; }\n");
    GLQuad quad;
    const auto records = log.take();
    ASSERT_GE(records.size(), 2U);
    EXPECT_THAT(records[0], testing::HasSubstr("nonsense"));
    EXPECT_THAT(records[1], testing::HasSubstr("broken"));
    quad.render(colours(GL_TEXTURE_2D)->texture());
    EXPECT_THAT(context->pixels(), Each(grey));
}

TEST_F(GLQuadContextTest, WithShadersThatDoNotFitHasNoProgram) {
    const ResourceDirectory resources;
    resources.write("Quad2D.vs",
                    "#version 410 core\nout vec2 link;\nvoid main() { gl_Position = vec4(link, 0, 1); }\n");
    resources.write("Quad2D.fs",
                    "#version 410 core\nin vec4 link;\nout vec4 colour;\nvoid main() { colour = link; }\n");
    const GLQuad quad;
    EXPECT_EQ(quad.pid(), 0U);
    EXPECT_THAT(log.take(), ElementsAre(testing::MatchesRegex(">> ERROR: \\{\n(.|\n)*link(.|\n)*\n\\}\n")));
}

} // namespace
} // namespace qivo
