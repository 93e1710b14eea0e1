#pragma once

#include "sdk/qivo.h"
#include "tools/record/CommonClock.h"
#include "tools/record/SourceClock.h"

#include <atomic>
#include <functional>
#include <string>
#include <thread>

namespace qivo::record {

/** A receiver of one source, and the thread that empties it. */
class Reception {
  public:
    enum class Kind { picture, sound };

    /** Frames are handed out on the thread, with their place on this machine's time line. They are given back after. */
    struct Calls {
        std::function<void(const QIVOlib_video_frame_v2_t&, Nanoseconds place)> picture;
        std::function<void(const QIVOlib_audio_frame_v2_t&, Nanoseconds place)> sound;
    };

    /** The clock is that of both kinds and outlives them. */
    Reception(Kind kind, const std::string& source, Calls calls, CommonClock& common);
    ~Reception();
    Reception(const Reception&) = delete;
    Reception& operator=(const Reception&) = delete;

    /** False if the library refused the source. */
    [[nodiscard]] bool started() const { return m_receiver != nullptr; }
    /** When the last frame came; negative before the first. Thread: any. */
    [[nodiscard]] Nanoseconds lastFrame() const { return Nanoseconds(m_lastFrame); }
    /** Returns once no call is made any more. */
    void stop();

  private:
    void run();
    void capture();
    [[nodiscard]] Nanoseconds place(std::int64_t timecode, std::int64_t timestamp);
    [[nodiscard]] Nanoseconds placePicture(std::int64_t timecode, Nanoseconds arrival);
    [[nodiscard]] Nanoseconds placeSound(std::int64_t timecode, Nanoseconds arrival);

    const Kind m_kind;
    const Calls m_calls;
    CommonClock& m_common;
    SourceClock m_clock; // thread only
    QIVOlib_recv_instance_t m_receiver = nullptr;
    std::atomic<bool> m_stopped = false;
    std::atomic<std::int64_t> m_lastFrame = -1;
    std::thread m_thread;
};

} // namespace qivo::record
