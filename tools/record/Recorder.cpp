#include "tools/record/Recorder.h"

#include <algorithm>
#include <thread>
#include <utility>

namespace qivo::record {
namespace {

constexpr Nanoseconds encoderLimit = std::chrono::milliseconds(500);
constexpr Nanoseconds trialStep = std::chrono::milliseconds(10);
constexpr Nanoseconds trialEndLimit = std::chrono::milliseconds(500); ///< to be over after its limit, or when stopped
constexpr Nanoseconds quiet = std::chrono::seconds(1);
// Pictures that hardware is tried with before there is one. What is smaller or larger than it is sure to take is tried
// again.
constexpr PictureShape usualShape{1920, 1080, 1, 1, 30, 1};
constexpr int smallestUsual = 256;

bool isUsual(const PictureShape& shape) {
    return shape.width >= smallestUsual && shape.height >= smallestUsual / 2 && shape.width <= usualShape.width &&
           shape.height <= usualShape.height;
}

} // namespace

/// What the threads that try encoders use, which a driver may keep beyond the recorder's life.
struct Recorder::Trials {
    std::atomic<bool> stopped = false;
    std::atomic<int> running = 0;
};

Recorder::Recorder(Settings settings, MoviePlace place)
    : m_settings(std::move(settings)), m_writer(std::move(place)), m_trials(std::make_shared<Trials>()),
      m_choice(beginTrial(usualShape)) {
    Reception::Calls calls;
    calls.picture = [this](const auto& frame, Nanoseconds at) { takePicture(frame, at); };
    calls.sound = [this](const auto& frame, Nanoseconds at) { takeSound(frame, at); };
    m_pictures.emplace(Reception::Kind::picture, m_settings.source, calls, m_clock);
    m_sounds.emplace(Reception::Kind::sound, m_settings.source, calls, m_clock);
    if (!m_pictures->started() || !m_sounds->started()) {
        const std::lock_guard guard(m_mutex);
        m_problem = "the source \"" + m_settings.source + "\" is refused";
    }
}

Recorder::~Recorder() {
    finish();
}

/// On a thread that nobody waits for: nothing can be done about a driver that does not come back.
std::future<EncoderChoice> Recorder::beginTrial(const PictureShape& shape) {
    auto candidates = m_settings.encoders(shape, std::thread::hardware_concurrency());
    std::packaged_task<EncoderChoice()> task([trials = m_trials, candidates = std::move(candidates), shape] {
        EncoderChoice choice = chooseEncoder(candidates, shape, trials->stopped);
        --trials->running;
        return choice;
    });
    std::future<EncoderChoice> choice = task.get_future();
    ++m_trials->running;
    std::thread(std::move(task)).detach();
    return choice;
}

EncoderChoice Recorder::endTrial(std::future<EncoderChoice> trial) const {
    Nanoseconds limit = steadyNow() + trialLimit + trialEndLimit;
    while (trial.wait_for(trialStep) != std::future_status::ready) {
        if (m_trials->stopped) {
            limit = std::min(limit, steadyNow() + trialEndLimit);
        }
        if (steadyNow() >= limit) {
            return {std::nullopt, "hardware (its driver hangs)"};
        }
    }
    return trial.get();
}

/// Software is given other properties for other shapes.
EncoderChoice Recorder::encoderFor(const PictureShape& shape) {
    EncoderChoice choice = endTrial(std::move(m_choice));
    if (choice.encoder && choice.encoder->hardware && !isUsual(shape)) {
        choice = endTrial(beginTrial(shape));
    }
    if (choice.encoder && choice.encoder->hardware) {
        return choice;
    }
    auto candidates = m_settings.encoders(shape, std::thread::hardware_concurrency());
    std::erase_if(candidates, [](const EncoderCandidate& candidate) { return candidate.hardware; });
    choice.encoder = chooseEncoder(candidates, shape, m_trials->stopped).encoder;
    return choice;
}

bool Recorder::startEncoder(const QIVOlib_video_frame_v2_t& frame) {
    PictureEncoder::Calls calls;
    calls.format = [this](PictureFormat format) { m_writer.setPicture(std::move(format)); };
    calls.picture = [this](CodedPicture picture) { m_writer.add(std::move(picture)); };
    const PictureShape shape = shapeFor(frame);
    const EncoderChoice choice = encoderFor(shape);
    std::string problem;
    if (!choice.encoder && !m_trials->stopped) {
        problem = "there is no H.264 encoder for GStreamer (Debian: gstreamer1.0-plugins-ugly)";
    }
    std::unique_ptr<PictureEncoder> encoder;
    if (choice.encoder) {
        encoder = PictureEncoder::create(shape, *choice.encoder, std::move(calls), problem);
    }
    const std::lock_guard guard(m_mutex);
    m_encoder = std::move(encoder);
    m_problem = std::move(problem);
    m_encoderText = m_encoder ? "encoding with " + m_encoder->element() : "";
    if (!choice.passedOver.empty()) {
        m_encoderText += (m_encoderText.empty() ? "" : "; ") + ("not with " + choice.passedOver);
    }
    return m_encoder != nullptr;
}

void Recorder::takePicture(const QIVOlib_video_frame_v2_t& frame, Nanoseconds place) {
    if (!m_encoder &&
        (m_trials->stopped || frame.xres <= 0 || frame.yres <= 0 || !problem().empty() || !startEncoder(frame))) {
        return;
    }
    const PictureEncoder::Taken taken = m_encoder->encode(frame, place);
    if (taken != PictureEncoder::Taken::yes) {
        ++m_dropped;
        (taken == PictureEncoder::Taken::behind ? m_lastDrop : m_lastUnreadable) = steadyNow().count();
    }
}

void Recorder::takeSound(const QIVOlib_audio_frame_v2_t& frame, Nanoseconds place) {
    std::vector<std::uint8_t> bytes = m_sound.fit(frame);
    // What the disk is too slow for becomes silence. A writer that has failed takes nothing either.
    if (!bytes.empty() && !m_writer.add(SoundPiece{std::move(bytes), place}, m_sound.format()) &&
        m_writer.status().problem.empty()) {
        m_lastSoundLost = steadyNow().count();
        m_soundLost += std::int64_t{frame.no_samples} * std::nano::den / frame.sample_rate;
    }
}

Nanoseconds Recorder::lastFrame() const {
    return std::max(m_pictures->lastFrame(), m_sounds->lastFrame());
}

std::string Recorder::problem() const {
    {
        const std::lock_guard guard(m_mutex);
        if (!m_problem.empty()) {
            return m_problem;
        }
        if (std::string encoding = m_encoder ? m_encoder->problem() : ""; !encoding.empty()) {
            return encoding;
        }
    }
    return m_writer.status().problem;
}

Recorder::State Recorder::state(Nanoseconds now) const {
    if (!problem().empty()) {
        return State::failed;
    }
    const Nanoseconds last = lastFrame();
    return last >= Nanoseconds(0) && now - last >= m_settings.patience ? State::sourceGone : State::running;
}

std::string Recorder::waiting(Nanoseconds now, const MovieWriter::Status& written) const {
    const Nanoseconds last = lastFrame();
    if (last < Nanoseconds(0)) {
        return "the source";
    }
    const auto recently = [now](std::int64_t when) { return now - Nanoseconds(when) < quiet; };
    if (written.diskIsSlow || recently(m_lastSoundLost)) {
        return "the disk";
    }
    if (now - last > quiet) {
        return "the source to come back";
    }
    if (recently(m_lastDrop)) {
        return "the encoder";
    }
    if (recently(m_lastUnreadable)) {
        return "a picture that can be read";
    }
    return recently(m_pictures->lastFrame().count()) ? "" : "a picture";
}

Progress Recorder::progress(Nanoseconds now) const {
    const MovieWriter::Status written = m_writer.status();
    return {written.length, written.pictures,         m_dropped,
            written.bytes,  Nanoseconds(m_soundLost), waiting(now, written)};
}

std::string Recorder::encoder() const {
    const std::lock_guard guard(m_mutex);
    return m_encoderText;
}

std::string Recorder::remark() const {
    return m_writer.status().remark;
}

void Recorder::finish() {
    m_trials->stopped = true;
    m_pictures->stop();
    m_sounds->stop();
    if (m_encoder) {
        m_dropped += m_encoder->finish(encoderLimit);
    }
    m_writer.finish();
    if (m_choice.valid()) { // no picture has come that would have waited for it
        m_choice.wait_for(trialEndLimit);
    }
}

bool Recorder::isTrying() const {
    return m_trials->running > 0;
}

} // namespace qivo::record
