#include "gl/GLProgram.h"

#include "gl/GLShader.h"
#include "tests/gl/ContextTest.h"
#include "tests/gl/GlErrorTrace.h"
#include "tests/platform/LogCapture.h"

#include <epoxy/gl.h>

#include <memory>

namespace qivo {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::MatchesRegex;

constexpr const char* vertexSource = "#version 410 core\n"
                                     "in vec2 first; in vec2 second; in vec2 third;\n"
                                     "void main() { gl_Position = vec4(first + second, third); }\n";
constexpr const char* fragmentSource = "#version 410 core\nout vec4 colour;\nvoid main() { colour = vec4(1.0); }\n";
/// Compiles, but nothing gives it what it calls.
constexpr const char* unfinishedSource = "#version 410 core\nvoid missing();\nvoid main() { missing(); }\n";

GLint currentProgram() {
    GLint program = -1;
    glGetIntegerv(GL_CURRENT_PROGRAM, &program);
    return program;
}

class GLProgramContextTest : public ContextTest {
  protected:
    LogCapture log;

    static void attach(GLProgram& program, const char* source, GLenum type) {
        program.attach(GLShader::shaderWithSource(source, type)->shader());
    }
};

TEST_F(GLProgramContextTest, GivesAttributesTheirLocations) {
    GlErrorTrace trace;
    GLProgram program;
    attach(program, vertexSource, GL_VERTEX_SHADER);
    attach(program, fragmentSource, GL_FRAGMENT_SHADER);
    program.bind("third");
    program.bind(nullptr);
    program.bind("first");
    program.bind("second");
    EXPECT_TRUE(program.link());
    EXPECT_EQ(glGetAttribLocation(program.pid(), "third"), 0);
    EXPECT_EQ(glGetAttribLocation(program.pid(), "first"), 1);
    EXPECT_EQ(glGetAttribLocation(program.pid(), "second"), 2);
    EXPECT_THAT(trace.take(), IsEmpty());
    EXPECT_THAT(log.take(), IsEmpty());
}

TEST_F(GLProgramContextTest, LogsTheLinkersLogAndLeavesTheProgramBehind) {
    GlErrorTrace trace;
    auto program = std::make_unique<GLProgram>();
    const GLuint name = program->pid();
    attach(*program, unfinishedSource, GL_VERTEX_SHADER);
    attach(*program, fragmentSource, GL_FRAGMENT_SHADER);
    EXPECT_FALSE(program->link());
    EXPECT_EQ(program->pid(), 0U);
    EXPECT_THAT(log.take(), ElementsAre(MatchesRegex(">> ERROR: \\{\n(.|\n)*missing(.|\n)*\n\\}\n")));
    program.reset();
    EXPECT_TRUE(glIsProgram(name)) << "kept: forgotten, not deleted";
    EXPECT_THAT(trace.take(), IsEmpty());
}

TEST_F(GLProgramContextTest, IsSwitchedOnAndOff) {
    GLProgram program;
    attach(program, vertexSource, GL_VERTEX_SHADER);
    attach(program, fragmentSource, GL_FRAGMENT_SHADER);
    ASSERT_TRUE(program.link());
    program.program(true);
    EXPECT_EQ(currentProgram(), static_cast<GLint>(program.pid()));
    program.program(false);
    EXPECT_EQ(currentProgram(), 0);
}

TEST_F(GLProgramContextTest, InUseIsDeletedAndSwitchedOff) {
    GlErrorTrace trace;
    auto program = std::make_unique<GLProgram>();
    attach(*program, vertexSource, GL_VERTEX_SHADER);
    attach(*program, fragmentSource, GL_FRAGMENT_SHADER);
    ASSERT_TRUE(program->link());
    const GLuint name = program->pid();
    program->program(true);
    program.reset();
    EXPECT_EQ(currentProgram(), 0);
    EXPECT_FALSE(glIsProgram(name));
    EXPECT_THAT(trace.take(), IsEmpty());
}

} // namespace
} // namespace qivo
