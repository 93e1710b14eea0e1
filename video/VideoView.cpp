#include "video/VideoView.h"

#include "app/AppData.h"
#include "gl/GLQuad.h"
#include "gl/GLTexture.h"
#include "platform/ThreadDisplayLink.h"
#include "video/LetterBox.h"

#include <array>
#include <epoxy/gl.h>
#include <mutex>

namespace qivo {
namespace {

constexpr std::array<GLfloat, 4> kGLClearColor = {0, 0, 0, 0};

int MyDisplayLinkCallback(DisplayLink* /*link*/, const TimeStamp& outputTime, void* context) {
    return static_cast<VideoView*>(context)->getFrameForTime(outputTime);
}

QRect rectangle(const Rect& frame) {
    return QRectF(frame.origin.x, frame.origin.y, frame.size.width, frame.size.height).toRect();
}

} // namespace

VideoView::VideoView(QWidget* parent) : VideoView(parent, defaultPixelFormat()) {}

VideoView::VideoView(QWidget* parent, const PixelFormat& pixelFormat)
    : OpenGLView(parent, pixelFormat), theModel(AppData::inst()) {
    _captured_frame.picture_aspect_ratio = kInitialAspect;
}

std::unique_ptr<VideoView> VideoView::initWithFrame(const Rect& frame) {
    return initWithFrame(frame, defaultPixelFormat());
}

std::unique_ptr<VideoView> VideoView::initWithFrame(const Rect& frame, const PixelFormat& pixelFormat) {
    std::unique_ptr<VideoView> view(new VideoView(nullptr, pixelFormat)); // NOLINT: the constructor is private
    view->setGeometry(rectangle(frame));
    return view;
}

VideoView::~VideoView() {
    if (displayLink) {
        displayLink->stop();
        displayLink.reset();
    }
    closeQIVOReceiver();
    if (GLContext* context = openGLContext()) {
        context->makeCurrentContext();
        const std::lock_guard guard(*context);
        tex2D.reset();
        quad.reset();
    }
}

PixelFormat VideoView::defaultPixelFormat() {
    return PixelFormat::initWithAttributes({PixelFormat::DoubleBuffer, PixelFormat::ColorSize, 24,
                                            PixelFormat::AlphaSize, 8, PixelFormat::OpenGLProfile,
                                            PixelFormat::ProfileVersion4_1Core, 0});
}

void VideoView::prepareOpenGL() {
    OpenGLView::prepareOpenGL();
    GLContext* context = openGLContext();
    context->makeCurrentContext();
    context->setSwapInterval(1);
    glEnable(GL_BLEND);
    glBlendFunc(GL_SRC_ALPHA, GL_ONE_MINUS_SRC_ALPHA);
    setWantsBestResolutionOpenGLSurface(true);
    m_bounds = convertRectToBacking(bounds());
    updateViewportAspect();
    quad = std::make_unique<GLQuad>();
    startDisplayLink();
    observeWindow();
}

std::unique_ptr<DisplayLink> VideoView::newDisplayLink() {
    return std::make_unique<ThreadDisplayLink>();
}

void VideoView::startDisplayLink() {
    displayLink = newDisplayLink();
    if (displayLink) {
        displayLink->setOutputCallback(MyDisplayLinkCallback, this);
        displayLink->setCurrentDisplayFromContext(*openGLContext(), OpenGLView::defaultPixelFormat());
        displayLink->start();
    }
}

/// Windows that announce their closing do it by this signal. Observers are told in the order in which they came.
void VideoView::observeWindow() {
    if (window()->metaObject()->indexOfSignal("willClose()") >= 0) {
        connect(window(), SIGNAL(willClose()), this, SLOT(windowWillClose()));
    }
}

void VideoView::windowWillClose() {
    if (displayLink) {
        displayLink->stop();
    }
    closeQIVOReceiver();
}

/// Runs on the main thread while the link's thread may be drawing. Taking the lock makes the context current here once
/// that thread has let go of it, which takes one buffer swap at most because the lock is fair; so GL is never called
/// without the context.
void VideoView::reshape() {
    OpenGLView::reshape();
    const std::lock_guard guard(*openGLContext());
    m_bounds = convertRectToBacking(bounds());
    updateViewportAspect();
    glViewport(_xOffset, _yOffset, _width, _height);
}

void VideoView::renewGState() {
    disableScreenUpdatesUntilFlush();
    OpenGLView::renewGState();
}

void VideoView::drawRect(const Rect& /*dirty*/) {
    drawView();
}

void VideoView::updateViewportAspect() {
    const Viewport viewport = letterBox(m_bounds.size, m_video_aspect);
    _xOffset = viewport.x;
    _yOffset = viewport.y;
    _width = viewport.width;
    _height = viewport.height;
}

void VideoView::drawView() {
    GLContext* context = openGLContext();
    context->makeCurrentContext();
    const std::lock_guard guard(*context);
    if (const float aspect = m_capturedAspect; aspect != m_video_aspect) {
        m_video_aspect = aspect;
        updateViewportAspect();
    }
    glViewport(_xOffset, _yOffset, _width, _height);
    glClearBufferfv(GL_COLOR, 0, kGLClearColor.data());
    if (tex2D) {
        quad->render(tex2D->texture());
    }
    context->flushDrawable();
}

int VideoView::getFrameForTime(const TimeStamp& /*time*/) {
    drawView();
    captureNewVideoSample();
    return DisplayLink::kSuccess;
}

} // namespace qivo
