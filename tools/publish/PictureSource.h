#pragma once

#include "tools/publish/Handles.h"
#include "tools/publish/Options.h"
#include "tools/publish/Pacer.h"
#include "tools/publish/TestPicture.h"

#include <chrono>
#include <condition_variable>
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

/** Draws test pictures into buffers of a pool. */
class TestPicturePainter {
  public:
    TestPicturePainter(const PictureFormat& format, const TestPictureLook& look);
    ~TestPicturePainter();
    TestPicturePainter(const TestPicturePainter&) = delete;
    TestPicturePainter& operator=(const TestPicturePainter&) = delete;

    /** The picture of this moment; null if there is no memory. */
    [[nodiscard]] Buffer paint();

  private:
    TestPicture m_picture;
    GstVideoInfo m_info{};
    Object<GstBufferPool> m_pool;
};

/** The live test picture at the format's rate. */
class TestPictureSource final : public PictureSource {
  public:
    TestPictureSource(const PictureFormat& format, const TestPictureLook& look);

    Picture next() override;
    void stop() override;

  private:
    TestPicturePainter m_painter;
    Pacer m_pacer;
    std::mutex m_mutex;
    std::condition_variable m_changed;
    bool m_stopped = false; // under m_mutex
};

} // namespace qivo
