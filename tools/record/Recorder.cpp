#include "tools/record/Recorder.h"

#include <algorithm>
#include <thread>
#include <utility>

namespace qivo::record {
namespace {

constexpr Nanoseconds encoderLimit = std::chrono::milliseconds(500);
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

Recorder::Recorder(Settings settings, MoviePlace place) : m_settings(std::move(settings)), m_writer(std::move(place)) {
    m_choice = std::async(std::launch::async, [this] {
        return chooseEncoder(m_settings.encoders(usualShape, std::thread::hardware_concurrency()), usualShape,
                             m_stopping);
    });
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

/// Software is given other properties for other shapes.
EncoderChoice Recorder::encoderFor(const PictureShape& shape) {
    EncoderChoice early = m_choice.get();
    const bool hardware = early.encoder && early.encoder->hardware;
    if (hardware && isUsual(shape)) {
        return early;
    }
    auto candidates = m_settings.encoders(shape, std::thread::hardware_concurrency());
    if (!hardware) {
        std::erase_if(candidates, [](const EncoderCandidate& candidate) { return candidate.hardware; });
        EncoderChoice choice = chooseEncoder(candidates, shape, m_stopping);
        choice.passedOver = early.passedOver;
        return choice;
    }
    return chooseEncoder(candidates, shape, m_stopping);
}

bool Recorder::startEncoder(const QIVOlib_video_frame_v2_t& frame) {
    PictureEncoder::Calls calls;
    calls.format = [this](PictureFormat format) { m_writer.setPicture(std::move(format)); };
    calls.picture = [this](CodedPicture picture) { m_writer.add(std::move(picture)); };
    const PictureShape shape = shapeFor(frame);
    const EncoderChoice choice = encoderFor(shape);
    std::string problem = "there is no H.264 encoder for GStreamer (Debian: gstreamer1.0-plugins-ugly)";
    std::unique_ptr<PictureEncoder> encoder;
    if (choice.encoder) {
        problem.clear();
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
    if (!m_encoder && (frame.xres <= 0 || frame.yres <= 0 || !problem().empty() || !startEncoder(frame))) {
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
    // What the disk is too slow for becomes silence.
    if (!bytes.empty() && !m_writer.add(SoundPiece{std::move(bytes), place}, m_sound.format())) {
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
    m_stopping = true;
    m_pictures->stop();
    m_sounds->stop();
    if (m_encoder) {
        m_dropped += m_encoder->finish(encoderLimit);
    }
    m_writer.finish();
}

} // namespace qivo::record
