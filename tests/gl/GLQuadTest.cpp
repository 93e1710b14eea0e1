#include "gl/GLQuad.h"

#include "tests/gl/RecordingGL.h"
#include "tests/gl/ResourceDirectory.h"
#include "tests/platform/LogCapture.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <limits>
#include <memory>
#include <type_traits>
#include <vector>

namespace qivo {
namespace {

using Calls = std::vector<std::string>;
using testing::ElementsAre;
using testing::IsEmpty;

static_assert(!std::is_copy_constructible_v<GLQuad> && !std::is_move_constructible_v<GLQuad>);

class GLQuadTest : public testing::Test {
  protected:
    ResourceDirectory resources;
    LogCapture log;
    RecordingGL gl;

    void SetUp() override {
        for (const char* name : {"Quad2D.vs", "Quad2D.fs", "QuadRect.vs", "QuadRect.fs"}) {
            resources.write(name, name);
        }
    }

    std::unique_ptr<GLQuad> rectangle(Rect bounds = {{1, 2}, {3, 4}}) {
        auto quad = GLQuad::initWithBounds(bounds);
        gl.take();
        return quad;
    }

    /// Shaders 1 and 2, program 3.
    static Calls programOf(const char* vertexShader, const char* fragmentShader) {
        return {call("glCreateShader", GL_VERTEX_SHADER),
                call("glShaderSource", 1, 1, vertexShader, nullptr),
                call("glCompileShader", 1),
                call("glGetShaderiv", 1, GL_COMPILE_STATUS),
                call("glCreateShader", GL_FRAGMENT_SHADER),
                call("glShaderSource", 2, 1, fragmentShader, nullptr),
                call("glCompileShader", 2),
                call("glGetShaderiv", 2, GL_COMPILE_STATUS),
                call("glCreateProgram"),
                call("glAttachShader", 3, 1),
                call("glAttachShader", 3, 2),
                call("glBindAttribLocation", 3, 0, "vertex"),
                call("glBindAttribLocation", 3, 1, "texCoord"),
                call("glLinkProgram", 3),
                call("glGetProgramiv", 3, GL_LINK_STATUS),
                call("glDeleteShader", 2),
                call("glDeleteShader", 1)};
    }

    static Calls verticesOf(GLuint array, GLuint buffer) {
        return {call("glGenVertexArrays", 1),
                call("glBindVertexArray", array),
                call("glGenBuffers", 1),
                call("glBindBuffer", GL_ARRAY_BUFFER, buffer),
                call("glBufferData", GL_ARRAY_BUFFER, 64, GL_STATIC_DRAW),
                call("glVertexAttribPointer", 0, 2, GL_FLOAT, GL_FALSE, 16, 0),
                call("glVertexAttribPointer", 1, 2, GL_FLOAT, GL_FALSE, 16, 8)};
    }
};

Calls operator+(Calls first, const Calls& second) {
    first.insert(first.end(), second.begin(), second.end());
    return first;
}

TEST_F(GLQuadTest, InitMakesA2DQuadComplete) {
    const GLQuad quad;
    EXPECT_EQ(gl.take(), programOf("Quad2D.vs", "Quad2D.fs") + verticesOf(4, 5));
    EXPECT_EQ(quad.target(), static_cast<GLenum>(GL_TEXTURE_2D));
    EXPECT_EQ(quad.mode(), 5U);
    EXPECT_EQ(quad.bounds(), (Rect{{0, 0}, {1, 1}}));
    EXPECT_EQ(quad.size(), (Size{1, 1}));
    EXPECT_EQ(quad.pid(), 3U);
    EXPECT_EQ(quad.vao(), 4U);
    EXPECT_THAT(log.take(), IsEmpty());
}

TEST_F(GLQuadTest, InitPutsTheFirstRowOnTop) {
    const GLQuad quad;
    EXPECT_THAT(gl.bufferData, ElementsAre(-1, -1, 0, 1, //
                                           -1, 1, 0, 0,  //
                                           1, -1, 1, 1,  //
                                           1, 1, 1, 0));
}

TEST_F(GLQuadTest, InitWithBoundsMakesARectangleQuadWithoutVertices) {
    const auto quad = GLQuad::initWithBounds({{1, 2}, {3, 4}});
    EXPECT_EQ(gl.take(), programOf("QuadRect.vs", "QuadRect.fs"));
    EXPECT_EQ(quad->target(), static_cast<GLenum>(GL_TEXTURE_RECTANGLE));
    EXPECT_EQ(quad->mode(), 5U);
    EXPECT_EQ(quad->bounds(), (Rect{{1, 2}, {3, 4}}));
    EXPECT_EQ(quad->size(), (Size{0, 0}));
    EXPECT_EQ(quad->pid(), 3U);
    EXPECT_EQ(quad->vao(), 0U);
}

TEST_F(GLQuadTest, InitWithBoundsIsARectangleQuadWhateverTheRectangle) {
    for (const Rect bounds : {Rect{{0, 0}, {1, 1}}, Rect{}, Rect{{0, 0}, {1920, 1080}}}) {
        const auto quad = GLQuad::initWithBounds(bounds);
        EXPECT_EQ(quad->target(), static_cast<GLenum>(GL_TEXTURE_RECTANGLE));
        EXPECT_THAT(gl.take(), testing::Contains(testing::HasSubstr("\"QuadRect.vs\"")));
    }
}

TEST_F(GLQuadTest, SetSizeMakesVerticesInPixels) {
    const auto quad = rectangle();
    quad->setSize({1920, 1080});
    EXPECT_EQ(gl.take(), verticesOf(4, 5));
    EXPECT_EQ(quad->size(), (Size{1920, 1080}));
    EXPECT_EQ(quad->vao(), 4U);
    EXPECT_EQ(quad->target(), static_cast<GLenum>(GL_TEXTURE_RECTANGLE));
    EXPECT_THAT(gl.bufferData, ElementsAre(-1, -1, 0, 1080,   //
                                           -1, 1, 0, 0,       //
                                           1, -1, 1920, 1080, //
                                           1, 1, 1920, 0));
}

TEST_F(GLQuadTest, SetSizeIgnoresAChangeOfOneDimension) {
    const auto quad = rectangle();
    quad->setSize({1920, 1080});
    gl.take();
    quad->setSize({1280, 1080});
    EXPECT_EQ(quad->size(), (Size{1920, 1080})) << "the height is unchanged";
    quad->setSize({1920, 720});
    EXPECT_EQ(quad->size(), (Size{1920, 1080})) << "the width is unchanged";
    quad->setSize({1920, 1080});
    EXPECT_THAT(gl.take(), IsEmpty());
}

TEST_F(GLQuadTest, SetSizeOfBothDimensionsLeavesThePreviousVerticesAllocated) {
    auto quad = rectangle();
    quad->setSize({1920, 1080});
    gl.take();
    quad->setSize({1280, 720});
    EXPECT_EQ(quad->size(), (Size{1280, 720}));
    EXPECT_EQ(gl.take(), verticesOf(6, 7));
    EXPECT_EQ(quad->vao(), 6U);
    quad.reset();
    EXPECT_THAT(gl.take(), ElementsAre(call("glDeleteBuffers", 1, 7), call("glDeleteVertexArrays", 1, 6),
                                       call("glDeleteProgram", 3), call("glUseProgram", 0)));
}

TEST_F(GLQuadTest, SetSizeIgnoresADimensionOf0AtFirst) {
    const auto quad = rectangle();
    quad->setSize({0, 1080});
    quad->setSize({1920, 0});
    EXPECT_EQ(quad->size(), (Size{0, 0}));
    EXPECT_EQ(quad->vao(), 0U);
    EXPECT_THAT(gl.take(), IsEmpty());
}

TEST_F(GLQuadTest, SetSizeOf1By1LeavesARectangleQuadOne) {
    const auto quad = rectangle();
    quad->setSize({1, 1});
    EXPECT_EQ(quad->target(), static_cast<GLenum>(GL_TEXTURE_RECTANGLE));
    quad->setSize({2, 2});
    EXPECT_EQ(quad->size(), (Size{2, 2})) << "not frozen";
}

TEST_F(GLQuadTest, SetSizeTakesWhatIsNoNumberAsAChange) {
    constexpr double nan = std::numeric_limits<double>::quiet_NaN();
    const auto quad = rectangle();
    quad->setSize({nan, nan});
    EXPECT_EQ(gl.take(), verticesOf(4, 5));
    quad->setSize({nan, nan});
    EXPECT_EQ(gl.take(), verticesOf(6, 7));
}

TEST_F(GLQuadTest, SetSizeOfA2DQuadChangesNothing) {
    GLQuad quad;
    gl.take();
    quad.setSize({1920, 1080});
    quad.setSize({0, 0});
    EXPECT_EQ(quad.size(), (Size{1, 1}));
    EXPECT_EQ(quad.vao(), 4U);
    EXPECT_THAT(gl.take(), IsEmpty());
}

TEST_F(GLQuadTest, RenderOfNothingMakesNoCall) {
    GLQuad quad;
    gl.take();
    quad.render(0);
    EXPECT_THAT(gl.take(), IsEmpty());
}

Calls rendering(GLuint program, GLenum target, GLuint texture, GLuint array) {
    return {call("glUseProgram", program),
            call("glEnable", target),
            call("glBindTexture", target, texture),
            call("glBindVertexArray", array),
            call("glEnableVertexAttribArray", 0),
            call("glEnableVertexAttribArray", 1),
            call("glDrawArrays", GL_TRIANGLE_STRIP, 0, 4),
            call("glDisableVertexAttribArray", 1),
            call("glDisableVertexAttribArray", 0),
            call("glBindTexture", target, 0),
            call("glDisable", target),
            call("glUseProgram", 0)};
}

TEST_F(GLQuadTest, RenderDrawsAndLeavesTheVertexArrayBound) {
    GLQuad quad;
    gl.take();
    quad.render(77);
    EXPECT_EQ(gl.take(), rendering(3, GL_TEXTURE_2D, 77, 4));
}

TEST_F(GLQuadTest, RenderOfARectangleQuadUsesItsTarget) {
    const auto quad = rectangle();
    quad->setSize({64, 48});
    gl.take();
    quad->render(77);
    EXPECT_EQ(gl.take(), rendering(3, GL_TEXTURE_RECTANGLE, 77, 4));
}

TEST_F(GLQuadTest, RenderOfARectangleQuadWithoutVerticesBindsNone) {
    const auto quad = rectangle();
    quad->render(77);
    EXPECT_EQ(gl.take(), rendering(3, GL_TEXTURE_RECTANGLE, 77, 0));
}

TEST_F(GLQuadTest, DestructionReleasesTheProgramLast) {
    auto quad = std::make_unique<GLQuad>();
    gl.take();
    quad.reset();
    EXPECT_THAT(gl.take(), ElementsAre(call("glDeleteBuffers", 1, 5), call("glDeleteVertexArrays", 1, 4),
                                       call("glDeleteProgram", 3), call("glUseProgram", 0)));
}

TEST_F(GLQuadTest, DestructionWithoutVerticesLeavesTheNames0ToGl) {
    auto quad = rectangle();
    quad.reset();
    EXPECT_THAT(gl.take(), ElementsAre(call("glDeleteBuffers", 1, 0), call("glDeleteVertexArrays", 1, 0),
                                       call("glDeleteProgram", 3), call("glUseProgram", 0)));
}

class GLQuadWithoutShaders : public GLQuadTest {
  protected:
    void SetUp() override {}

    Calls missing(const std::string& name) const {
        return {">> " + resources.path(name) + ": No such file or directory",
                ">> ERROR: Failed acquiring sources from the \"" + name + "' at application's bunble!"};
    }

    static Calls emptyProgram(GLuint program) {
        return {call("glCreateProgram"), call("glBindAttribLocation", program, 0, "vertex"),
                call("glBindAttribLocation", program, 1, "texCoord"), call("glLinkProgram", program),
                call("glGetProgramiv", program, GL_LINK_STATUS)};
    }
};

TEST_F(GLQuadWithoutShaders, HasNoProgramIfTheEmptyOneDoesNotLink) {
    gl.linkStatus = GL_FALSE;
    auto quad = std::make_unique<GLQuad>();
    EXPECT_EQ(quad->pid(), 0U);
    EXPECT_EQ(log.take(), missing("Quad2D.vs") + missing("Quad2D.fs") + Calls{">> ERROR: {\nthe log\n}\n"});
    const Calls reading = {call("glGetProgramiv", 1, GL_INFO_LOG_LENGTH), call("glGetProgramInfoLog", 1, 8)};
    EXPECT_EQ(gl.take(), emptyProgram(1) + reading + verticesOf(2, 3));
    quad->render(77);
    EXPECT_EQ(gl.take(), rendering(0, GL_TEXTURE_2D, 77, 2));
    quad.reset();
    EXPECT_THAT(gl.take(), ElementsAre(call("glDeleteBuffers", 1, 3), call("glDeleteVertexArrays", 1, 2)));
}

TEST_F(GLQuadWithoutShaders, HasTheEmptyProgramIfItLinks) {
    const auto quad = GLQuad::initWithBounds({});
    EXPECT_EQ(quad->pid(), 1U);
    EXPECT_EQ(log.take(), missing("QuadRect.vs") + missing("QuadRect.fs"));
    EXPECT_EQ(gl.take(), emptyProgram(1));
}

TEST_F(GLQuadTest, WithBrokenShadersAttachesNone) {
    gl.compileStatus = GL_FALSE;
    gl.linkStatus = GL_FALSE;
    const auto quad = GLQuad::initWithBounds({});
    EXPECT_EQ(quad->pid(), 0U);
    EXPECT_EQ(log.take(), Calls(3, ">> ERROR: {\nthe log\n}\n"));
    EXPECT_THAT(gl.take(), testing::Not(testing::Contains(testing::StartsWith("glAttachShader"))));
}

TEST_F(GLQuadTest, WithoutAProgramNameStillDraws) {
    gl.givesNames = false;
    gl.linkStatus = GL_FALSE;
    GLQuad quad;
    EXPECT_THAT(log.take(), ElementsAre(">> ERROR: GL create program failed!", ">> ERROR: {\nthe log\n}\n"));
    gl.take();
    quad.render(77);
    EXPECT_EQ(gl.take(), rendering(0, GL_TEXTURE_2D, 77, 0));
}

} // namespace
} // namespace qivo
