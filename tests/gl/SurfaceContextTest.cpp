// Surfaces shown as textures in a windowless context on software GL, and by drivers that others might have.
#include "gl/GLTexture.h"

#include "platform/DmaBuf.h"
#include "tests/gl/ContextTest.h"
#include "tests/gl/ImportingDriver.h"
#include "tests/platform/LogCapture.h"
#include "tests/platform/SurfaceSocket.h"
#include "tests/support/Process.h"
#include "video/IOSurface2D.h"

#include <epoxy/gl.h>

#include <algorithm>
#include <cstring>
#include <fcntl.h>
#include <filesystem>
#include <memory>
#include <vector>

namespace qivo {
namespace {

using testing::Each;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::StartsWith;

template <typename Sample>
std::vector<Sample> samplesOf(const GLTexture& texture, GLenum type) {
    std::vector<Sample> values(static_cast<std::size_t>(texture.width() * texture.height() * 4));
    glBindTexture(texture.target(), texture.texture());
    glGetTexImage(texture.target(), 0, GL_RGBA, type, values.data());
    glBindTexture(texture.target(), 0);
    return values;
}

std::vector<std::uint8_t> bytesOf(const GLTexture& texture) {
    return samplesOf<std::uint8_t>(texture, GL_UNSIGNED_BYTE);
}

std::unique_ptr<IOSurface2D> acquired(std::uint64_t bitsPerPixel, std::uint64_t width, std::uint64_t height) {
    auto surface = std::make_unique<IOSurface2D>();
    surface->setBitsPerPixel(bitsPerPixel);
    surface->setWidth(width);
    surface->setHeight(height);
    EXPECT_TRUE(surface->acquire());
    return surface;
}

std::vector<std::uint8_t> countingFrom(int first, std::size_t count) {
    std::vector<std::uint8_t> bytes(count);
    for (auto& byte : bytes) {
        byte = static_cast<std::uint8_t>(first++);
    }
    return bytes;
}

class SurfaceContextTest : public ContextTest {
  protected:
    LogCapture log;

    void TearDown() override {
        setDmaBufMaker({});
        EXPECT_THAT(log.take(), IsEmpty());
        ContextTest::TearDown();
    }

    /// A core profile knows no texture target that could be enabled.
    static void expectOnlyTheErrorOfEnabling() { EXPECT_THAT(takeGlErrors(), ElementsAre("GL_INVALID_ENUM")); }

    void expectFallBack(int error) {
        EXPECT_THAT(log.take(), ElementsAre(">> MESSAGE[" + std::to_string(error) +
                                            "]: Fall back scheme for creating a 2d texture from an i/o surface!"));
    }
};

TEST_F(SurfaceContextTest, CurrentContextIsTheOneOfEgl) {
    EXPECT_NE(CGLGetCurrentContext(), nullptr);
    context->releaseCurrent();
    EXPECT_EQ(CGLGetCurrentContext(), nullptr);
    context->makeCurrent();
}

TEST_F(SurfaceContextTest, TextureShowsTheSurfaceAndIsBroughtUpToDateByUpdates) {
    // The driver of this machine may be one that can do without the copy.
    setDmaBufMaker([](IOSurfaceRef) { return FileDescriptor(); });
    const auto surface = acquired(32, 2, 2);
    auto pixels = countingFrom(0, 16);
    surface->update(pixels.data());
    const auto texture = GLTexture::initWithSurface(surface.get());
    expectFallBack(kCGLUnsupported);
    expectOnlyTheErrorOfEnabling();
    EXPECT_EQ(bytesOf(*texture), pixels) << "bytes are R, G, B, A in memory order";

    const auto news = countingFrom(100, 16);
    surface->update(news.data());
    EXPECT_EQ(bytesOf(*texture), pixels) << "a copy";
    texture->setBind(true);
    surface->lock(true);
    EXPECT_TRUE(texture->update(surface->map()));
    surface->unlock();
    texture->setBind(false);
    EXPECT_EQ(bytesOf(*texture), news);
}

TEST_F(SurfaceContextTest, SixteenBitComponentsAreThoseOfTheMachine) {
    setDmaBufMaker([](IOSurfaceRef) { return FileDescriptor(); });
    const auto surface = acquired(64, 3, 1);
    const std::vector<std::uint16_t> pixels = {1, 2, 3, 4, 0x1234, 0x5678, 0x9ABC, 0xDEF0, 9, 10, 11, 12};
    surface->update(pixels.data());
    const auto texture = GLTexture::initWithSurface(surface.get());
    expectFallBack(kCGLUnsupported);
    expectOnlyTheErrorOfEnabling();
    EXPECT_EQ(samplesOf<std::uint16_t>(*texture, GL_UNSIGNED_SHORT), pixels);
}

TEST_F(SurfaceContextTest, AnotherThreadsContextIsRefusedAndTheTextureIsACopy) {
    const auto surface = acquired(32, 2, 2);
    const auto texture = GLTexture::initWithSurface(surface.get(), this);
    expectFallBack(kCGLBadContext);
    expectOnlyTheErrorOfEnabling();
    EXPECT_THAT(bytesOf(*texture), Each(0));
}

TEST_F(SurfaceContextTest, BindingRefusesWhatIsNoSurfaceOrAnother) {
    const CGLContextObj current = CGLGetCurrentContext();
    const auto surface = acquired(32, 3, 2);
    const auto bind = [&](GLint internal, GLint wide, GLint high, GLenum format, GLenum type, IOSurfaceRef memory,
                          std::uint32_t plane) {
        return CGLTexImageIOSurface2D(current, GL_TEXTURE_RECTANGLE, internal, wide, high, format, type, memory, plane);
    };
    constexpr GLenum type = GL_UNSIGNED_INT_8_8_8_8_REV;
    EXPECT_EQ(bind(GL_RGBA8, 3, 2, GL_RGBA, type, nullptr, 0), kCGLBadSurface);
    EXPECT_EQ(bind(GL_RGBA8, 3, 2, GL_RGBA, type, surface->surface(), 1), kCGLBadSurface);
    EXPECT_EQ(bind(GL_RGBA8, 4, 2, GL_RGBA, type, surface->surface(), 0), kCGLBadSurface);
    EXPECT_EQ(bind(GL_RGBA8, 3, -2, GL_RGBA, type, surface->surface(), 0), kCGLBadSurface);
    EXPECT_EQ(bind(GL_RGB8, 3, 2, GL_RGB, type, surface->surface(), 0), kCGLBadSurface);
    EXPECT_EQ(bind(GL_RGBA16, 3, 2, GL_RGBA, GL_UNSIGNED_SHORT, surface->surface(), 0), kCGLBadSurface);
}

/// On a driver that the test makes up around the real one.
class SurfaceImportTest : public SurfaceContextTest {
  protected:
    std::unique_ptr<IOSurface2D> surface;

    void SetUp() override {
        SurfaceContextTest::SetUp();
        surface = acquired(32, 4, 4);
        surface->update(countingFrom(0, 64).data());
    }
};

TEST_F(SurfaceImportTest, TextureSharesTheMemoryWithoutALine) {
    ImportingDriver driver(ImportingDriver::Kind::follows);
    const CGLContextObj current = CGLGetCurrentContext();
    auto texture = GLTexture::initWithSurface(surface.get());
    EXPECT_THAT(log.take(), IsEmpty());
    expectOnlyTheErrorOfEnabling();
    EXPECT_EQ(CGLGetCurrentContext(), current) << "the trial gave the context back";
    EXPECT_EQ(driver.follow(texture->texture()), countingFrom(0, 64));
    surface->update(countingFrom(100, 64).data());
    EXPECT_EQ(driver.follow(texture->texture()), countingFrom(100, 64));
    surface.reset();
    EXPECT_EQ(driver.follow(texture->texture()), countingFrom(100, 64)) << "the memory stays with the texture";
    EXPECT_EQ(driver.imagesAlive(), 0);
}

TEST_F(SurfaceImportTest, TellsTheDriverHowThePixelsLie) {
    ImportingDriver driver(ImportingDriver::Kind::follows);
    GLTexture::initWithSurface(surface.get());
    using Attributes = std::vector<EGLint>;
    EXPECT_EQ(driver.lastAttributes(),
              (Attributes{EGL_WIDTH, 4, EGL_HEIGHT, 4, EGL_LINUX_DRM_FOURCC_EXT, 0x34324241,
                          EGL_DMA_BUF_PLANE0_OFFSET_EXT, 0, EGL_DMA_BUF_PLANE0_PITCH_EXT, 16}));
    const auto deep = acquired(64, 4, 4);
    GLTexture::initWithSurface(deep.get());
    EXPECT_EQ(driver.lastAttributes(),
              (Attributes{EGL_WIDTH, 4, EGL_HEIGHT, 4, EGL_LINUX_DRM_FOURCC_EXT, 0x38344241,
                          EGL_DMA_BUF_PLANE0_OFFSET_EXT, 0, EGL_DMA_BUF_PLANE0_PITCH_EXT, 32}));
    takeGlErrors();
}

TEST_F(SurfaceImportTest, TrialIsMadeOnce) {
    ImportingDriver driver(ImportingDriver::Kind::follows);
    GLTexture::initWithSurface(surface.get());
    EXPECT_EQ(driver.imagesMade(), 2) << "the trial's and the texture's";
    GLTexture::initWithSurface(surface.get());
    EXPECT_EQ(driver.imagesMade(), 3);
    takeGlErrors();
}

struct Declined {
    ImportingDriver::Kind kind;
    int imagesMade;
};

TEST_F(SurfaceImportTest, DriversThatDoNotStandTheTrialAreDeclined) {
    using Kind = ImportingDriver::Kind;
    for (const auto& [kind, imagesMade] : {Declined{Kind::copies, 1}, Declined{Kind::refusesTheTarget, 1},
                                           Declined{Kind::makesNoImages, 1}, Declined{Kind::offersNothing, 0}}) {
        ImportingDriver driver(kind);
        const auto texture = GLTexture::initWithSurface(surface.get());
        expectFallBack(kCGLUnsupported);
        expectOnlyTheErrorOfEnabling();
        EXPECT_EQ(bytesOf(*texture), countingFrom(0, 64));
        EXPECT_EQ(driver.imagesMade(), imagesMade);
        EXPECT_EQ(driver.imagesAlive(), 0);
    }
}

TEST_F(SurfaceImportTest, SystemWithoutBuffersForDevicesIsDeclined) {
    ImportingDriver driver(ImportingDriver::Kind::follows);
    setDmaBufMaker([](IOSurfaceRef) { return FileDescriptor(); });
    const auto texture = GLTexture::initWithSurface(surface.get());
    expectFallBack(kCGLUnsupported);
    expectOnlyTheErrorOfEnabling();
    EXPECT_EQ(bytesOf(*texture), countingFrom(0, 64));
    EXPECT_EQ(driver.imagesMade(), 0);
}

TEST_F(SurfaceImportTest, SurfaceThatTheDriverRefusesIsCopied) {
    ImportingDriver driver(ImportingDriver::Kind::follows);
    GLTexture::initWithSurface(surface.get());
    takeGlErrors();
    const auto odd = acquired(32, 3, 2);
    driver.refusePitch(12);
    const auto texture = GLTexture::initWithSurface(odd.get());
    expectFallBack(kCGLRefused);
    expectOnlyTheErrorOfEnabling();
    EXPECT_THAT(bytesOf(*texture), Each(0));
}

TEST_F(SurfaceContextTest, SystemMakesBuffersOfSurfacesOrSaysThatItCannot) {
    const auto surface = acquired(32, 64, 64);
    const FileDescriptor buffer = IOSurfaceCreateDmaBuf(surface->surface());
    const bool canTry = FileDescriptor(::open("/dev/udmabuf", O_RDWR | O_CLOEXEC)).number() >= 0;
    EXPECT_EQ(static_cast<bool>(buffer), canTry);
    EXPECT_FALSE(IOSurfaceCreateDmaBuf(nullptr));
}

/// A second process with the same surface.
class SurfaceProcessTest : public SurfaceContextTest {
  protected:
    SurfaceSocket socket;
    std::unique_ptr<test::Process> writer;
    std::string error;

    void SetUp() override {
        SurfaceContextTest::SetUp();
        setDmaBufMaker([](IOSurfaceRef) { return FileDescriptor(); });
    }

    /// Starts the writer, at the other end of the socket.
    void start() {
        const int end = ::fcntl(socket.there(), F_DUPFD, 3);
        const auto program = std::filesystem::read_symlink("/proc/self/exe").parent_path() / "surface-writer";
        writer = test::Process::start({program.string(), std::to_string(end)});
        ::close(end);
        socket.closeThere();
        ASSERT_TRUE(writer);
    }

    /// Has the writer fill the surface with a byte, and waits until it has.
    void fill(std::uint8_t byte) {
        ASSERT_EQ(::send(socket.here(), &byte, 1, MSG_NOSIGNAL), 1);
        char done = 0;
        ASSERT_EQ(::recv(socket.here(), &done, 1, 0), 1) << writer->errors();
    }
};

TEST_F(SurfaceProcessTest, SecondProcessWritesWhatTheFirstShows) {
    const auto surface = acquired(32, 64, 48);
    start();
    ASSERT_TRUE(IOSurfaceSend(socket.here(), surface->surface(), SurfaceAccess::readWrite, error)) << error;
    fill(10);
    const auto texture = GLTexture::initWithSurface(surface.get());
    expectFallBack(kCGLUnsupported);
    EXPECT_THAT(bytesOf(*texture), Each(10));
    for (int frame = 11; frame < 20; ++frame) {
        const auto seed = IOSurfaceGetSeed(surface->surface());
        fill(static_cast<std::uint8_t>(frame));
        ASSERT_NE(IOSurfaceGetSeed(surface->surface()), seed) << "the other process's lock shows";
        texture->setBind(true);
        ASSERT_TRUE(surface->lock(true));
        EXPECT_TRUE(texture->update(surface->map()));
        ASSERT_TRUE(surface->unlock());
        texture->setBind(false);
        ASSERT_THAT(bytesOf(*texture), Each(frame));
    }
    takeGlErrors();
}

TEST_F(SurfaceProcessTest, SurfaceOutlivesAWriterThatDies) {
    const auto surface = acquired(32, 64, 48);
    start();
    ASSERT_TRUE(IOSurfaceSend(socket.here(), surface->surface(), SurfaceAccess::readWrite, error)) << error;
    fill(10);
    writer.reset();
    const auto texture = GLTexture::initWithSurface(surface.get());
    expectFallBack(kCGLUnsupported);
    EXPECT_THAT(bytesOf(*texture), Each(10));
    takeGlErrors();
}

} // namespace
} // namespace qivo
