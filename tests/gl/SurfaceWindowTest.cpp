// A surface shown in the context that a window of this desktop has: of GLX or EGL, as the window system would have it.
#include "gl/GLTexture.h"

#include "platform/DmaBuf.h"
#include "tests/platform/LogCapture.h"
#include "video/IOSurface2D.h"

#include <epoxy/gl.h>

#include <QGuiApplication>
#include <QOffscreenSurface>
#include <QOpenGLContext>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdlib>
#include <string>
#include <vector>

namespace qivo {
namespace {

class SurfaceWindowTest : public testing::TestWithParam<const char*> {};

TEST_P(SurfaceWindowTest, ContextOfTheWindowSystemIsFoundAndShowsTheSurface) {
    ::setenv("QT_XCB_GL_INTEGRATION", GetParam(), 1);
    int count = 1;
    char program[] = "test";
    char* arguments[] = {program, nullptr};
    const QGuiApplication application(count, static_cast<char**>(arguments));
    EXPECT_EQ(CGLGetCurrentContext(), nullptr);
    QOpenGLContext context;
    ASSERT_TRUE(context.create());
    QOffscreenSurface drawable;
    drawable.create();
    ASSERT_TRUE(context.makeCurrent(&drawable));
    EXPECT_NE(CGLGetCurrentContext(), nullptr);

    IOSurface2D surface;
    surface.setWidth(2);
    surface.setHeight(1);
    ASSERT_TRUE(surface.acquire());
    const std::vector<std::uint8_t> pixels = {1, 2, 3, 4, 5, 6, 7, 8};
    ASSERT_TRUE(surface.update(pixels.data()));
    setDmaBufMaker([](IOSurfaceRef) { return FileDescriptor(); });
    LogCapture log;
    const auto texture = GLTexture::initWithSurface(&surface);
    const int error = std::string(GetParam()) == "xcb_glx" ? kCGLBadContext : kCGLUnsupported;
    EXPECT_THAT(log.take(), testing::ElementsAre(">> MESSAGE[" + std::to_string(error) +
                                                 "]: Fall back scheme for creating a 2d texture from an i/o surface!"));
    std::vector<std::uint8_t> shown(8);
    glBindTexture(GL_TEXTURE_RECTANGLE, texture->texture());
    glGetTexImage(GL_TEXTURE_RECTANGLE, 0, GL_RGBA, GL_UNSIGNED_BYTE, shown.data());
    EXPECT_EQ(shown, pixels);
    context.doneCurrent();
    EXPECT_EQ(CGLGetCurrentContext(), nullptr);
    context.makeCurrent(&drawable); // the texture is deleted in it
}

INSTANTIATE_TEST_SUITE_P(Integrations, SurfaceWindowTest, testing::Values("xcb_glx", "xcb_egl"));

} // namespace
} // namespace qivo
