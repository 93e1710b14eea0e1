#pragma once

#include "tools/record/MovieWriter.h"
#include "tools/record/PictureEncoder.h"
#include "tools/record/Progress.h"
#include "tools/record/Reception.h"
#include "tools/record/SoundFitter.h"

#include <atomic>
#include <memory>
#include <mutex>
#include <optional>
#include <string>

namespace qivo::record {

/** Records one source into one movie, from construction until `finish`. The library and GStreamer must be initialised.
 *
 *  Pictures and sound are received by a receiver each, encoded and written on threads of their own; between them are
 *  queues with bounds. Thread: one. */
class Recorder {
  public:
    struct Settings {
        std::string source;
        Nanoseconds patience = std::chrono::seconds(60); ///< how long a source that was there may be gone
    };

    Recorder(Settings settings, MoviePlace place);
    ~Recorder();
    Recorder(const Recorder&) = delete;
    Recorder& operator=(const Recorder&) = delete;

    /** Whether the recording goes on. */
    enum class State {
        running,
        sourceGone, ///< for longer than patience allows
        failed      ///< `problem` says why
    };
    [[nodiscard]] State state(Nanoseconds now) const;
    [[nodiscard]] Progress progress(Nanoseconds now) const;
    /** Why it cannot go on; empty if it can. */
    [[nodiscard]] std::string problem() const;

    /** Ends receiving and finishes the movie; normally within a fraction of a second. */
    void finish();

  private:
    void takePicture(const QIVOlib_video_frame_v2_t& frame, Nanoseconds place);
    void takeSound(const QIVOlib_audio_frame_v2_t& frame, Nanoseconds place);
    [[nodiscard]] bool startEncoder(const QIVOlib_video_frame_v2_t& frame);
    [[nodiscard]] Nanoseconds lastFrame() const;
    [[nodiscard]] std::string waiting(Nanoseconds now, const MovieWriter::Status& written) const;

    const Settings m_settings;
    MovieWriter m_writer;
    SoundFitter m_sound; // sound's thread only
    mutable std::mutex m_mutex;
    std::unique_ptr<PictureEncoder> m_encoder; // made by the pictures' thread under m_mutex
    std::string m_problem;                     // protected by m_mutex
    std::atomic<std::uint64_t> m_dropped = 0;
    std::atomic<std::int64_t> m_lastDrop = 0;
    std::atomic<bool> m_anyPicture = false;
    CommonClock m_clock; // outlives both
    std::optional<Reception> m_pictures;
    std::optional<Reception> m_sounds;
};

} // namespace qivo::record
