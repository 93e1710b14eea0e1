#include "gl/GLShader.h"

#include "gl/GLProgram.h"
#include "tests/gl/ContextTest.h"
#include "tests/gl/GlErrorTrace.h"
#include "tests/gl/ResourceDirectory.h"
#include "tests/platform/LogCapture.h"

#include <epoxy/gl.h>

#include <utility>

namespace qivo {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::MatchesRegex;

constexpr const char* vertexSource = "#version 410 core\nvoid main() { gl_Position = vec4(0.0); }\n";
constexpr const char* brokenSource = "#version 410 core\nvoid main() { nonsense = 1; }\n";

class GLShaderContextTest : public ContextTest {
  protected:
    LogCapture log;
};

TEST_F(GLShaderContextTest, Compiles) {
    GlErrorTrace trace;
    const auto shader = GLShader::initWithSource(vertexSource, GL_VERTEX_SHADER);
    ASSERT_NE(shader->shader(), 0U);
    GLint type = 0;
    glGetShaderiv(shader->shader(), GL_SHADER_TYPE, &type);
    EXPECT_EQ(type, GL_VERTEX_SHADER);
    EXPECT_THAT(trace.take(), IsEmpty());
    EXPECT_THAT(log.take(), IsEmpty());
}

TEST_F(GLShaderContextTest, LogsTheCompilersLogAndLeavesTheShaderBehind) {
    GlErrorTrace trace;
    const auto working = GLShader::initWithSource(vertexSource, GL_VERTEX_SHADER);
    const auto broken = GLShader::initWithSource(brokenSource, GL_VERTEX_SHADER);
    EXPECT_EQ(broken->shader(), 0U);
    EXPECT_THAT(log.take(), ElementsAre(MatchesRegex(">> ERROR: \\{\n(.|\n)*nonsense(.|\n)*\n\\}\n")));
    EXPECT_TRUE(glIsShader(working->shader() + 1)) << "kept: the name is dropped, not deleted";
    EXPECT_THAT(trace.take(), IsEmpty());
}

TEST_F(GLShaderContextTest, OfAnUnknownTypeHasNoName) {
    GlErrorTrace trace;
    EXPECT_EQ(GLShader::initWithSource(vertexSource, 1)->shader(), 0U);
    EXPECT_THAT(trace.take(), ElementsAre("glCreateShader: GL_INVALID_ENUM", "glShaderSource: GL_INVALID_VALUE",
                                          "glCompileShader: GL_INVALID_VALUE", "glGetShaderiv: GL_INVALID_VALUE",
                                          "glGetShaderiv: GL_INVALID_VALUE", "glGetShaderInfoLog: GL_INVALID_VALUE"));
    EXPECT_THAT(log.take(), ElementsAre(">> ERROR: {\n\n}\n"));
}

TEST_F(GLShaderContextTest, IsDeletedWithItsOwner) {
    auto shader = GLShader::initWithSource(vertexSource, GL_VERTEX_SHADER);
    const GLuint name = shader->shader();
    EXPECT_TRUE(glIsShader(name));
    shader.reset();
    EXPECT_FALSE(glIsShader(name));
}

TEST_F(GLShaderContextTest, LivesOnInItsProgram) {
    GLProgram program;
    auto shader = GLShader::initWithSource(vertexSource, GL_VERTEX_SHADER);
    const GLuint name = shader->shader();
    program.attach(name);
    shader.reset();
    EXPECT_TRUE(glIsShader(name));
    EXPECT_TRUE(program.link());
}

TEST_F(GLShaderContextTest, ShippedShadersCompile) {
    GlErrorTrace trace;
    for (const char* name : {"Quad2D", "QuadRect"}) {
        EXPECT_NE(GLShader::initWithResource(name, GL_VERTEX_SHADER)->shader(), 0U) << name;
        EXPECT_NE(GLShader::initWithResource(name, GL_FRAGMENT_SHADER)->shader(), 0U) << name;
    }
    EXPECT_THAT(trace.take(), IsEmpty());
    EXPECT_THAT(log.take(), IsEmpty());
}

TEST_F(GLShaderContextTest, EmptyResourceDoesNotCompile) {
    const ResourceDirectory resources;
    resources.write("Empty.vs", "");
    EXPECT_EQ(GLShader::initWithResource("Empty", GL_VERTEX_SHADER)->shader(), 0U);
    EXPECT_THAT(log.take(), ElementsAre(testing::StartsWith(">> ERROR: {\n")));
}

} // namespace
} // namespace qivo
