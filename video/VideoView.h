#pragma once

#include "platform/DisplayLink.h"
#include "platform/Geometry.h"
#include "platform/OpenGLView.h"
#include "sdk/qivo.h"

#include <QString>
#include <atomic>
#include <cstdint>
#include <memory>

namespace qivo {

class AppData;
class GLQuad;
class GLTexture;
class Image;

/// The application's picture: receives the selected source's video and shows it letter-boxed to its own aspect ratio
/// over black.
///
/// A display link calls getFrameForTime() once for every refresh of the screen: it draws the picture that there is and
/// then makes one capture pass, which follows the model's selection and takes at most one frame. A frame is uploaded
/// from the receiver's own buffer and held until the next one has been uploaded. While the window cannot be seen,
/// capturing goes on, so that the newest picture is there when it comes back; only the buffer swap is left out.
///
/// Thread: main, except drawView(), getFrameForTime() and captureNewVideoSample() with what it calls, which belong to
/// the display link's thread while the link runs; drawView() may be called from both.
class VideoView : public OpenGLView {
    Q_OBJECT

  public:
    static constexpr float kInitialAspect = 16.0F / 9.0F;

    /// As the interface file makes it.
    explicit VideoView(QWidget* parent = nullptr);
    /// The frame is in the parent's units.
    static std::unique_ptr<VideoView> initWithFrame(const Rect& frame);
    static std::unique_ptr<VideoView> initWithFrame(const Rect& frame, const PixelFormat& pixelFormat);
    /// Stops the link, then closes the receiver.
    ~VideoView() override;

    /// Double buffer, 24 bits of colour, 8 of alpha, OpenGL 4.1 core.
    static PixelFormat defaultPixelFormat();

    bool isOpaque() const override { return true; }
    bool acceptsFirstResponder() const override { return true; }
    bool becomeFirstResponder() override { return true; }
    bool resignFirstResponder() override { return true; }

    void prepareOpenGL() override;
    void reshape() override;
    void renewGState() override;
    void drawRect(const Rect& dirty) override;

    /// Draws and shows the picture there is.
    void drawView();
    /// One refresh. The time has no effect; the answer is always DisplayLink::kSuccess.
    int getFrameForTime(const TimeStamp& time);
    /// Fits the viewport to the aspect ratio. The context's lock must be held once the link runs.
    void updateViewportAspect();
    /// Replaces the picture; the old one is given up first. The context must be current.
    void setImage(const Image& image);

    /// Makes the receiver match the model's selection and bandwidth switch. True if there is a receiver now. A failure
    /// is final until one of the two changes.
    bool createQIVOReceiver();
    /// One capture pass. True if a frame was taken and uploaded.
    bool captureNewVideoSample();
    /// Ends the receiver. The link must not run.
    void closeQIVOReceiver();

  public slots:
    /// The window is about to go: stops the link, for good, and closes the receiver.
    void windowWillClose();

  protected:
    /// The link that prepareOpenGL() starts; null for none.
    virtual std::unique_ptr<DisplayLink> newDisplayLink();

  private:
    VideoView(QWidget* parent, const PixelFormat& pixelFormat);
    void startDisplayLink();
    void observeWindow();
    void freeCapturedFrame();
    void holdFrame(const QIVOlib_video_frame_v2_t& frame);
    QIVOlib_recv_instance_t newReceiver(const QString& name, const QString& url) const;
    void handleStatusChange();
    void showFrame(const QIVOlib_video_frame_v2_t& frame);
    void updateTexture(const QIVOlib_video_frame_v2_t& frame);
    void replaceTexture(const QIVOlib_video_frame_v2_t& frame);

    AppData* theModel;                        // lives for ever
    std::unique_ptr<DisplayLink> displayLink; // main thread only

    // Under the context's lock.
    std::unique_ptr<GLQuad> quad;
    std::unique_ptr<GLTexture> tex2D;
    Rect m_bounds; // in pixels of the drawable
    std::int32_t _xOffset = 0;
    std::int32_t _yOffset = 0;
    std::int32_t _width = 0;
    std::int32_t _height = 0;
    float m_video_aspect = kInitialAspect;

    // Display link's thread while it runs, else main thread.
    QIVOlib_recv_instance_t m_pQIVO_recv = nullptr;
    QIVOlib_video_frame_v2_t _captured_frame{};
    std::int32_t _selectedQIVOSourceChangedCount = 0;
    bool _isLowBandwidth = false;
    QString _connectedURL;

    // Any thread: the held frame's, which a drawing main thread reads while a capture pass replaces the frame.
    std::atomic<float> m_capturedAspect{kInitialAspect};
};

} // namespace qivo
