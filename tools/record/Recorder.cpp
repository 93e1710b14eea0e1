#include "tools/record/Recorder.h"

#include <algorithm>
#include <utility>

namespace qivo::record {
namespace {

constexpr Nanoseconds encoderLimit = std::chrono::milliseconds(500);
constexpr Nanoseconds quiet = std::chrono::seconds(1);

} // namespace

Recorder::Recorder(Settings settings, MoviePlace place) : m_settings(std::move(settings)), m_writer(std::move(place)) {
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

bool Recorder::startEncoder(const QIVOlib_video_frame_v2_t& frame) {
    PictureEncoder::Calls calls;
    calls.format = [this](PictureFormat format) { m_writer.setPicture(std::move(format)); };
    calls.picture = [this](CodedPicture picture) { m_writer.add(std::move(picture)); };
    std::string problem;
    auto encoder = PictureEncoder::create(shapeFor(frame), std::move(calls), problem);
    const std::lock_guard guard(m_mutex);
    m_encoder = std::move(encoder);
    m_problem = std::move(problem);
    return m_encoder != nullptr;
}

void Recorder::takePicture(const QIVOlib_video_frame_v2_t& frame, Nanoseconds place) {
    m_anyPicture = true;
    if (!m_encoder && (frame.xres <= 0 || frame.yres <= 0 || !problem().empty() || !startEncoder(frame))) {
        return;
    }
    if (!m_encoder->encode(frame, place)) {
        ++m_dropped;
        m_lastDrop = steadyNow().count();
    }
}

void Recorder::takeSound(const QIVOlib_audio_frame_v2_t& frame, Nanoseconds place) {
    std::vector<std::uint8_t> bytes = m_sound.fit(frame);
    if (!bytes.empty()) {
        // What the disk is too slow for becomes silence.
        static_cast<void>(m_writer.add(SoundPiece{std::move(bytes), place}, m_sound.format()));
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
    if (written.diskIsSlow) {
        return "the disk";
    }
    if (now - last > quiet) {
        return "the source to come back";
    }
    if (m_lastDrop > 0 && now - Nanoseconds(m_lastDrop) < quiet) {
        return "the encoder";
    }
    return m_anyPicture ? "" : "a picture";
}

Progress Recorder::progress(Nanoseconds now) const {
    const MovieWriter::Status written = m_writer.status();
    return {written.length, written.pictures, m_dropped, written.bytes, waiting(now, written)};
}

void Recorder::finish() {
    m_pictures->stop();
    m_sounds->stop();
    if (m_encoder) {
        m_encoder->finish(encoderLimit);
    }
    m_writer.finish();
}

} // namespace qivo::record
