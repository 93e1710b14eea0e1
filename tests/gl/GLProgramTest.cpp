#include "gl/GLProgram.h"

#include "gl/InfoLog.h"
#include "tests/gl/RecordingGL.h"
#include "tests/platform/LogCapture.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <memory>
#include <type_traits>

namespace qivo {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

static_assert(!std::is_copy_constructible_v<GLProgram> && !std::is_move_constructible_v<GLProgram>);

class GLProgramTest : public testing::Test {
  protected:
    LogCapture log;
    RecordingGL gl;

    std::unique_ptr<GLProgram> make() {
        gl.nextName = 9;
        auto program = std::make_unique<GLProgram>();
        gl.take();
        return program;
    }
};

TEST_F(GLProgramTest, IsCreatedAtOnce) {
    const GLProgram program;
    EXPECT_EQ(program.pid(), 1U);
    EXPECT_THAT(gl.take(), ElementsAre(call("glCreateProgram")));
    EXPECT_THAT(log.take(), IsEmpty());
}

TEST_F(GLProgramTest, ThatCannotBeCreatedIsLoggedAndDestroyedWithoutACall) {
    gl.givesNames = false;
    auto program = std::make_unique<GLProgram>();
    EXPECT_EQ(program->pid(), 0U);
    EXPECT_THAT(log.take(), ElementsAre(">> ERROR: GL create program failed!"));
    gl.take();
    program.reset();
    EXPECT_THAT(gl.take(), IsEmpty());
}

TEST_F(GLProgramTest, AttachesShaders) {
    const auto program = make();
    program->attach(3);
    program->attach(4);
    EXPECT_THAT(gl.take(), ElementsAre(call("glAttachShader", 9, 3), call("glAttachShader", 9, 4)));
}

TEST_F(GLProgramTest, SkipsShader0) {
    const auto program = make();
    program->attach(0);
    EXPECT_THAT(gl.take(), IsEmpty());
}

TEST_F(GLProgramTest, GivesLocationsInTheOrderOfBinding) {
    const auto program = make();
    program->bind("zebra");
    program->bind("ant");
    program->bind("zebra");
    EXPECT_THAT(gl.take(),
                ElementsAre(call("glBindAttribLocation", 9, 0, "zebra"), call("glBindAttribLocation", 9, 1, "ant"),
                            call("glBindAttribLocation", 9, 2, "zebra")));
}

TEST_F(GLProgramTest, NullTakesNoLocation) {
    const auto program = make();
    program->bind(nullptr);
    EXPECT_THAT(gl.take(), IsEmpty());
    program->bind("first");
    program->bind(nullptr);
    program->bind("second");
    EXPECT_THAT(gl.take(),
                ElementsAre(call("glBindAttribLocation", 9, 0, "first"), call("glBindAttribLocation", 9, 1, "second")));
}

TEST_F(GLProgramTest, Links) {
    const auto program = make();
    EXPECT_TRUE(program->link());
    EXPECT_EQ(program->pid(), 9U);
    EXPECT_THAT(gl.take(), ElementsAre(call("glLinkProgram", 9), call("glGetProgramiv", 9, GL_LINK_STATUS)));
    EXPECT_THAT(log.take(), IsEmpty());
}

TEST_F(GLProgramTest, AfterAFailedLinkIsForgotten) {
    gl.linkStatus = GL_FALSE;
    gl.infoLog = "no main";
    auto program = make();
    EXPECT_FALSE(program->link());
    EXPECT_EQ(program->pid(), 0U);
    EXPECT_THAT(gl.take(),
                ElementsAre(call("glLinkProgram", 9), call("glGetProgramiv", 9, GL_LINK_STATUS),
                            call("glGetProgramiv", 9, GL_INFO_LOG_LENGTH), call("glGetProgramInfoLog", 9, 8)));
    EXPECT_THAT(log.take(), ElementsAre(">> ERROR: {\nno main\n}\n"));
    program.reset();
    EXPECT_THAT(gl.take(), IsEmpty()) << "the program stays allocated";
}

TEST_F(GLProgramTest, WithoutAStatusCountsAsNotLinked) {
    gl.linkStatus.reset();
    const auto program = make();
    EXPECT_FALSE(program->link());
    EXPECT_THAT(log.take(), ElementsAre(">> ERROR: {\nthe log\n}\n"));
}

TEST_F(GLProgramTest, LogThatThereIsNoMemoryForIsNeitherReadNorShown) {
    gl.linkStatus = GL_FALSE;
    for (const GLint length : {maximumInfoLogBytes + 1, -1}) {
        gl.infoLogLength = length;
        const auto program = make();
        EXPECT_FALSE(program->link());
        EXPECT_EQ(program->pid(), 0U);
        EXPECT_EQ(gl.take().back(), call("glGetProgramiv", 9, GL_INFO_LOG_LENGTH));
    }
    EXPECT_THAT(log.take(), IsEmpty());
}

TEST_F(GLProgramTest, IsSwitchedOnAndOff) {
    const auto program = make();
    program->program(true);
    program->program(false);
    EXPECT_THAT(gl.take(), ElementsAre(call("glUseProgram", 9), call("glUseProgram", 0)));
}

TEST_F(GLProgramTest, IsDeletedBeforeItIsSwitchedOff) {
    auto program = make();
    program.reset();
    EXPECT_THAT(gl.take(), ElementsAre(call("glDeleteProgram", 9), call("glUseProgram", 0)));
}

TEST_F(GLProgramTest, ShaderAttributeAndUseAlwaysReadAsNothing) {
    const auto program = make();
    program->attach(3);
    program->bind("vertex");
    EXPECT_TRUE(program->link());
    program->program(true);
    EXPECT_EQ(program->shader(), 0U);
    EXPECT_EQ(program->attribute(), nullptr);
    EXPECT_FALSE(program->use());
}

} // namespace
} // namespace qivo
