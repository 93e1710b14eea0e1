#pragma once

#include "tools/publish/Handles.h"
#include "tools/publish/Options.h"
#include "tools/publish/Pacer.h"
#include "tools/publish/TestPicture.h"

#include <chrono>
#include <condition_variable>
#include <functional>
#include <gst/video/video.h>
#include <memory>
#include <mutex>

namespace qivo {

/** A picture on its way to an encoder, and when it was taken. */
struct Picture {
    Buffer buffer; ///< I420 without padding beyond GStreamer's default; null when the source was stopped
    std::chrono::steady_clock::time_point taken;
};

/** What a stream shows, picture after picture as they are due. next() is called by one thread, stop() by any. */
class PictureSource {
  public:
    virtual ~PictureSource() = default;

    /** Waits for the next picture. A null buffer once stop() was called. */
    [[nodiscard]] virtual Picture next() = 0;

    /** Makes next() return at once, now and ever after. */
    virtual void stop() = 0;
};

/** The form in which pictures come. */
struct PictureFormat {
    PictureSize size;
    PictureRate rate;
    ColourSpace space = bt709;

    /** Raw video caps that say all of it. */
    [[nodiscard]] Caps caps() const;
};

/** Fills planes with the picture of a moment. */
using DrawPicture = std::function<void(const PicturePlanes&, std::chrono::system_clock::time_point)>;

/** Draws test pictures of a format. */
[[nodiscard]] DrawPicture drawTestPicture(const PictureFormat& format, TestPictureLook look);

/** Draws pictures into buffers of a pool. */
class PicturePainter {
  public:
    PicturePainter(const PictureFormat& format, DrawPicture draw);
    ~PicturePainter();
    PicturePainter(const PicturePainter&) = delete;
    PicturePainter& operator=(const PicturePainter&) = delete;

    /** The picture of a moment, whose wall clock is what it shows, however late it is painted; null if there is no
     *  memory. */
    [[nodiscard]] Buffer paint(std::chrono::steady_clock::time_point moment);

  private:
    DrawPicture m_draw;
    GstVideoInfo m_info{};
    Object<GstBufferPool> m_pool;
};

/** Drawn pictures, live at the format's rate. */
class DrawnPictureSource final : public PictureSource {
  public:
    DrawnPictureSource(const PictureFormat& format, DrawPicture draw);

    Picture next() override;
    void stop() override;

  private:
    PicturePainter m_painter;
    Pacer m_pacer;
    std::mutex m_mutex;
    std::condition_variable m_changed;
    bool m_stopped = false; // under m_mutex
};

} // namespace qivo
