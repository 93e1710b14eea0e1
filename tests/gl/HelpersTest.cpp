#include "tests/gl/ContextTest.h"
#include "tests/gl/GlErrorTrace.h"
#include "tests/gl/RecordingGL.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <epoxy/gl.h>

namespace qivo {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

TEST(RecordingGLTest, PutsTheDispatchBack) {
    const auto before = epoxy_glEnable;
    {
        RecordingGL gl;
        EXPECT_NE(epoxy_glEnable, before);
    }
    EXPECT_EQ(epoxy_glEnable, before);
}

TEST(RecordingGLTest, TellsCallsAndArgumentsApart) {
    RecordingGL gl;
    glEnable(GL_BLEND);
    glViewport(-1, 0, 1920, 1080);
    EXPECT_THAT(gl.take(), ElementsAre("glEnable(0xBE2)", "glViewport(-1, 0, 1920, 1080)"));
    EXPECT_THAT(gl.take(), IsEmpty());
}

class GlErrorTraceTest : public ContextTest {};

TEST_F(GlErrorTraceTest, SaysWhichCallMadeWhichError) {
    glEnable(0);
    GlErrorTrace trace;
    EXPECT_THAT(trace.take(), IsEmpty()) << "older errors are not the trace's";
    glEnable(GL_BLEND);
    glEnable(1);
    glDrawArrays(GL_TRIANGLES, 0, -1);
    EXPECT_THAT(trace.take(), ElementsAre("glEnable: GL_INVALID_ENUM", "glDrawArrays: GL_INVALID_VALUE"));
}

TEST_F(GlErrorTraceTest, PutsTheDispatchBack) {
    glEnable(GL_BLEND);
    const auto before = epoxy_glEnable;
    {
        GlErrorTrace trace;
        glEnable(GL_BLEND);
        EXPECT_NE(epoxy_glEnable, before);
    }
    EXPECT_EQ(epoxy_glEnable, before);
}

class EglContextTest : public ContextTest {};

TEST_F(EglContextTest, IsACoreProfileOfAtLeast41) {
    GLint profile = 0;
    glGetIntegerv(GL_CONTEXT_PROFILE_MASK, &profile);
    EXPECT_EQ(profile, GL_CONTEXT_CORE_PROFILE_BIT);
    EXPECT_GE(epoxy_gl_version(), 41);
}

TEST_F(EglContextTest, ReadsPixelsFromTheTop) {
    context->clear({10, 20, 30, 40});
    glEnable(GL_SCISSOR_TEST);
    glScissor(0, height - 1, 1, 1);
    context->clear({50, 60, 70, 80});
    EXPECT_EQ(context->pixel(0, 0), (Pixel{50, 60, 70, 80}));
    EXPECT_EQ(context->pixel(1, 0), (Pixel{10, 20, 30, 40}));
    EXPECT_EQ(context->pixel(0, height - 1), (Pixel{10, 20, 30, 40}));
}

TEST_F(EglContextTest, SaysWhyThereIsNone) {
    std::string error;
    EXPECT_EQ(EglContext::create(-1, -1, error), nullptr);
    EXPECT_EQ(error, "The frame buffer is not complete");
    ASSERT_TRUE(context->makeCurrent());
}

} // namespace
} // namespace qivo
