#pragma once

#include "tools/record/MovieWriter.h"
#include "tools/record/PictureEncoder.h"
#include "tools/record/Progress.h"
#include "tools/record/Reception.h"
#include "tools/record/SoundFitter.h"

#include <atomic>
#include <functional>
#include <future>
#include <limits>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

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
        /// The encoders to choose from, by the pictures' shape and the number of processors.
        std::function<std::vector<EncoderCandidate>(const PictureShape&, unsigned)> encoders = encoderCandidates;
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
    /** Which encoder records, and which ones that are installed do not and why, in one line; empty before the first
     *  picture. */
    [[nodiscard]] std::string encoder() const;
    /** What is to be known about the movie though it is as good as it can be; empty if nothing is. */
    [[nodiscard]] std::string remark() const;

    /** Ends receiving and finishes the movie; normally within a fraction of a second, and without a limit where the
     * disk hangs. Thread: any, while `progress` may be asked for. */
    void finish();
    /** Whether an encoder is being tried. Where that is so after `finish` a driver does not come back: the program must
     *  end without taking down what it may use. Thread: any. */
    [[nodiscard]] bool isTrying() const;

  private:
    struct Trials;

    static constexpr std::int64_t never = std::numeric_limits<std::int64_t>::min() / 2;

    void takePicture(const QIVOlib_video_frame_v2_t& frame, Nanoseconds place);
    void takeSound(const QIVOlib_audio_frame_v2_t& frame, Nanoseconds place);
    [[nodiscard]] bool startEncoder(const QIVOlib_video_frame_v2_t& frame);
    [[nodiscard]] std::future<EncoderChoice> beginTrial(const PictureShape& shape);
    [[nodiscard]] EncoderChoice endTrial(std::future<EncoderChoice> trial) const;
    [[nodiscard]] EncoderChoice encoderFor(const PictureShape& shape);
    [[nodiscard]] Nanoseconds lastFrame() const;
    [[nodiscard]] std::string waiting(Nanoseconds now, const MovieWriter::Status& written) const;

    const Settings m_settings;
    MovieWriter m_writer;
    SoundFitter m_sound; // sound's thread only
    const std::shared_ptr<Trials> m_trials;
    std::future<EncoderChoice> m_choice; // begun before the first picture, since trying hardware takes its time
    mutable std::mutex m_mutex;
    std::unique_ptr<PictureEncoder> m_encoder; // made by the pictures' thread under m_mutex
    std::string m_problem;                     // protected by m_mutex, as the next
    std::string m_encoderText;
    std::atomic<std::uint64_t> m_dropped = 0;
    std::atomic<std::int64_t> m_lastDrop = never; // when, as the next two
    std::atomic<std::int64_t> m_lastUnreadable = never;
    std::atomic<std::int64_t> m_lastSoundLost = never;
    std::atomic<std::int64_t> m_soundLost = 0; // ns
    CommonClock m_clock;                       // outlives both
    std::optional<Reception> m_pictures;
    std::optional<Reception> m_sounds;
};

} // namespace qivo::record
