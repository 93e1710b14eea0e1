#include "gl/GLShader.h"

#include "gl/InfoLog.h"
#include "tests/gl/RecordingGL.h"
#include "tests/gl/ResourceDirectory.h"
#include "tests/platform/LogCapture.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <type_traits>

namespace qivo {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

static_assert(!std::is_copy_constructible_v<GLShader> && !std::is_move_constructible_v<GLShader>);

class GLShaderTest : public testing::Test {
  protected:
    ResourceDirectory resources;
    LogCapture log;
    RecordingGL gl;

    static std::vector<std::string> compilation(GLuint shader, GLenum type, const char* source) {
        return {call("glCreateShader", type), call("glShaderSource", shader, 1, source, nullptr),
                call("glCompileShader", shader), call("glGetShaderiv", shader, GL_COMPILE_STATUS)};
    }

    static std::vector<std::string> failedCompilation(GLuint shader, GLenum type, const char* source, GLint length) {
        auto calls = compilation(shader, type, source);
        calls.push_back(call("glGetShaderiv", shader, GL_INFO_LOG_LENGTH));
        calls.push_back(call("glGetShaderInfoLog", shader, length));
        return calls;
    }
};

TEST_F(GLShaderTest, CompilesASource) {
    gl.nextName = 5;
    const auto shader = GLShader::initWithSource("text", GL_GEOMETRY_SHADER);
    EXPECT_EQ(shader->shader(), 5U);
    EXPECT_EQ(gl.take(), compilation(5, GL_GEOMETRY_SHADER, "text"));
    EXPECT_THAT(log.take(), IsEmpty());
}

TEST_F(GLShaderTest, CompilesAnEmptySource) {
    EXPECT_EQ(GLShader::initWithSource("", GL_VERTEX_SHADER)->shader(), 1U);
    EXPECT_EQ(gl.take().front(), call("glCreateShader", GL_VERTEX_SHADER));
}

TEST_F(GLShaderTest, NullMakesNoCallAndNoLog) {
    EXPECT_EQ(GLShader::initWithSource(nullptr, GL_VERTEX_SHADER)->shader(), 0U);
    EXPECT_EQ(GLShader::shaderWithSource(nullptr, GL_VERTEX_SHADER)->shader(), 0U);
    EXPECT_THAT(gl.take(), IsEmpty());
    EXPECT_THAT(log.take(), IsEmpty());
}

TEST_F(GLShaderTest, IsDeletedWithItsOwner) {
    auto shader = GLShader::shaderWithSource("text", GL_VERTEX_SHADER);
    gl.take();
    shader.reset();
    EXPECT_THAT(gl.take(), ElementsAre(call("glDeleteShader", 1)));
}

TEST_F(GLShaderTest, ThatDoesNotCompileIsLoggedAndItsNameDropped) {
    gl.compileStatus = GL_FALSE;
    gl.infoLog = "1: broken";
    auto shader = GLShader::initWithSource("text", GL_VERTEX_SHADER);
    EXPECT_EQ(shader->shader(), 0U);
    EXPECT_EQ(gl.take(), failedCompilation(1, GL_VERTEX_SHADER, "text", 10));
    EXPECT_THAT(log.take(), ElementsAre(">> ERROR: {\n1: broken\n}\n"));
    shader.reset();
    EXPECT_THAT(gl.take(), IsEmpty()) << "the shader stays allocated";
}

TEST_F(GLShaderTest, WithoutAStatusCountsAsNotCompiled) {
    gl.compileStatus.reset();
    EXPECT_EQ(GLShader::initWithSource("text", GL_VERTEX_SHADER)->shader(), 0U);
    EXPECT_THAT(log.take(), ElementsAre(">> ERROR: {\nthe log\n}\n"));
}

TEST_F(GLShaderTest, WithoutANameIsCompiledNevertheless) {
    gl.givesNames = false;
    auto shader = GLShader::initWithSource("text", GL_VERTEX_SHADER);
    EXPECT_EQ(shader->shader(), 0U);
    EXPECT_EQ(gl.take(), compilation(0, GL_VERTEX_SHADER, "text"));
    shader.reset();
    EXPECT_THAT(gl.take(), IsEmpty());
}

TEST_F(GLShaderTest, LogWithoutLengthIsEmpty) {
    gl.compileStatus = GL_FALSE;
    gl.infoLogLength = 0;
    EXPECT_EQ(GLShader::initWithSource("text", GL_VERTEX_SHADER)->shader(), 0U);
    EXPECT_EQ(gl.take(), failedCompilation(1, GL_VERTEX_SHADER, "text", 0));
    EXPECT_THAT(log.take(), ElementsAre(">> ERROR: {\n\n}\n"));
}

TEST_F(GLShaderTest, LogOfTheGreatestLengthIsRead) {
    gl.compileStatus = GL_FALSE;
    gl.infoLogLength = maximumInfoLogBytes;
    GLShader::initWithSource("text", GL_VERTEX_SHADER);
    EXPECT_EQ(gl.take(), failedCompilation(1, GL_VERTEX_SHADER, "text", maximumInfoLogBytes));
    EXPECT_THAT(log.take(), ElementsAre(">> ERROR: {\nthe log\n}\n"));
}

TEST_F(GLShaderTest, LogThatThereIsNoMemoryForIsNeitherReadNorShown) {
    gl.compileStatus = GL_FALSE;
    for (const GLint length : {maximumInfoLogBytes + 1, -1}) {
        gl.infoLogLength = length;
        EXPECT_EQ(GLShader::initWithSource("text", GL_VERTEX_SHADER)->shader(), 0U);
        EXPECT_EQ(gl.take().back(), call("glGetShaderiv", gl.nextName - 1, GL_INFO_LOG_LENGTH));
    }
    EXPECT_THAT(log.take(), IsEmpty());
}

TEST_F(GLShaderTest, LogIsNeverAFormat) {
    gl.compileStatus = GL_FALSE;
    gl.infoLog = "100%n %s";
    GLShader::initWithSource("text", GL_VERTEX_SHADER);
    EXPECT_THAT(log.take(), ElementsAre(">> ERROR: {\n100%n %s\n}\n"));
}

TEST_F(GLShaderTest, VertexShaderResourceHasTheExtensionVs) {
    resources.write("Name.vs", "vertices");
    resources.write("Name.fs", "fragments");
    EXPECT_EQ(GLShader::initWithResource("Name", GL_VERTEX_SHADER)->shader(), 1U);
    EXPECT_THAT(gl.take(), testing::Contains(call("glShaderSource", 1, 1, "vertices", nullptr)));
}

TEST_F(GLShaderTest, AnyOtherShaderResourceHasTheExtensionFs) {
    resources.write("Name.vs", "vertices");
    resources.write("Name.fs", "fragments");
    GLuint name = 0;
    for (const GLenum type : {GL_FRAGMENT_SHADER, GL_GEOMETRY_SHADER, 0}) {
        GLShader::shaderWithResource("Name", type);
        const auto calls = gl.take();
        EXPECT_THAT(calls, testing::Contains(call("glCreateShader", type)));
        EXPECT_THAT(calls, testing::Contains(call("glShaderSource", ++name, 1, "fragments", nullptr)));
    }
}

TEST_F(GLShaderTest, OfAMissingResourceMakesTwoLogLinesAndNoCall) {
    EXPECT_EQ(GLShader::initWithResource("None", GL_VERTEX_SHADER)->shader(), 0U);
    EXPECT_THAT(log.take(),
                ElementsAre(">> " + resources.path("None.vs") + ": No such file or directory",
                            ">> ERROR: Failed acquiring sources from the \"None.vs' at application's bunble!"));
    EXPECT_THAT(gl.take(), IsEmpty());
}

TEST_F(GLShaderTest, OfANamelessResourceMakesOneLogLineAndNoCall) {
    EXPECT_EQ(GLShader::initWithResource(nullptr, GL_FRAGMENT_SHADER)->shader(), 0U);
    EXPECT_THAT(log.take(),
                ElementsAre(">> ERROR: Failed acquiring sources from the \"(null).fs' at application's bunble!"));
    EXPECT_THAT(gl.take(), IsEmpty());
}

TEST_F(GLShaderTest, CompilesAFileAndAUrl) {
    const auto path = resources.write("text", "a file");
    EXPECT_EQ(GLShader::initWithFile(path.c_str(), GL_VERTEX_SHADER)->shader(), 1U);
    EXPECT_THAT(gl.take(), testing::Contains(call("glShaderSource", 1, 1, "a file", nullptr)));
    EXPECT_EQ(GLShader::shaderWithFile(path.c_str(), GL_VERTEX_SHADER)->shader(), 2U);
    EXPECT_EQ(GLShader::initWithURL(("file://" + path).c_str(), GL_VERTEX_SHADER)->shader(), 3U);
    EXPECT_THAT(gl.take(), testing::Contains(call("glShaderSource", 3, 1, "a file", nullptr)));
    EXPECT_EQ(GLShader::shaderWithURL(("file://" + path).c_str(), GL_VERTEX_SHADER)->shader(), 4U);
}

TEST_F(GLShaderTest, OfAMissingFileOrUrlMakesNoCall) {
    const auto path = resources.path("none");
    EXPECT_EQ(GLShader::initWithFile(path.c_str(), GL_VERTEX_SHADER)->shader(), 0U);
    EXPECT_THAT(log.take(),
                ElementsAre(">> " + path + ": No such file or directory",
                            ">> ERROR: Failed acquiring sources from the file at pathname \"" + path + "\""));
    EXPECT_EQ(GLShader::initWithURL("none", GL_VERTEX_SHADER)->shader(), 0U);
    EXPECT_THAT(log.take(), ElementsAre(">> none: Only file URLs can be read",
                                        ">> ERROR: Failed acquiring sources from the url <none>"));
    EXPECT_THAT(gl.take(), IsEmpty());
}

} // namespace
} // namespace qivo
