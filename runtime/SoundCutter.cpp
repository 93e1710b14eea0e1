#include "runtime/SoundCutter.h"

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <utility>

namespace qivo::runtime {
namespace {

constexpr std::int64_t kUnitsPerSecond = 10'000'000;
constexpr std::int64_t kMillisecondsPerSecond = 1000;

float sane(float sample) {
    return std::isfinite(sample) ? std::clamp(sample, -SoundCutter::kLoudest, SoundCutter::kLoudest) : 0.0F;
}

} // namespace

/// The least number of samples that lasts so long.
std::size_t SoundCutter::samplesIn(std::chrono::milliseconds time) const {
    const std::int64_t product = time.count() * m_format.rate;
    return static_cast<std::size_t>((product + kMillisecondsPerSecond - 1) / kMillisecondsPerSecond);
}

std::size_t SoundCutter::pending() const {
    return m_pending.empty() ? 0 : m_pending.size() / static_cast<std::size_t>(m_format.channels);
}

std::int64_t SoundCutter::unitsOf(std::size_t samples) const {
    return static_cast<std::int64_t>(samples) * kUnitsPerSecond / m_format.rate;
}

bool SoundCutter::continues(const Piece& piece) const {
    constexpr std::int64_t limit = kGap.count() * (kUnitsPerSecond / kMillisecondsPerSecond);
    return !piece.afterGap && piece.format == m_format &&
           std::llabs(piece.timecode - (m_timecode + unitsOf(pending()))) < limit;
}

void SoundCutter::add(const Piece& piece) {
    if (piece.count == 0) {
        return;
    }
    if (!m_pending.empty() && !continues(piece)) {
        flush();
    }
    if (m_pending.empty()) {
        m_format = piece.format;
        m_timecode = piece.timecode;
        m_taken = piece.taken;
        m_arrived = piece.arrived;
    }
    m_pending.insert(m_pending.end(), piece.samples,
                     piece.samples + piece.count * static_cast<std::size_t>(m_format.channels));
    if (pending() >= samplesIn(kJoined)) {
        emitAll();
    }
}

void SoundCutter::flush() {
    if (!m_pending.empty() && pending() >= samplesIn(kShortest)) {
        emitAll();
    }
    m_pending.clear();
}

/// As few frames as the longest one allows, of the same length but for a sample.
void SoundCutter::emitAll() {
    const std::size_t total = pending();
    const std::size_t longest = static_cast<std::size_t>(m_format.rate) * kLongest.count() / kMillisecondsPerSecond;
    const std::size_t frames = (total + longest - 1) / longest;
    for (std::size_t i = 0; i < frames; ++i) {
        const std::size_t first = total * i / frames;
        emit(first, total * (i + 1) / frames - first);
    }
    m_pending.clear();
}

void SoundCutter::emit(std::size_t first, std::size_t count) {
    const auto channels = static_cast<std::size_t>(m_format.channels);
    std::vector<float> planes(count * channels);
    for (std::size_t channel = 0; channel < channels; ++channel) {
        const float* in = &m_pending[first * channels + channel];
        float* out = &planes[channel * count];
        for (std::size_t i = 0; i < count; ++i) {
            out[i] = sane(in[i * channels]);
        }
    }
    const std::int64_t timecode = m_taken.value_or(m_timecode) + unitsOf(first);
    m_emit(std::make_unique<Sound>(m_format, std::move(planes), timecode, m_arrived));
}

} // namespace qivo::runtime
