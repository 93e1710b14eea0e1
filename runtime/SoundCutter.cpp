#include "runtime/SoundCutter.h"

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <utility>

namespace qivo::runtime {
namespace {

constexpr std::int64_t kUnitsPerSecond = 10'000'000;
constexpr std::int64_t kMillisecondsPerSecond = 1000;
constexpr std::int64_t kMicrosecondsPerSecond = 1'000'000;

float sane(float sample) {
    return std::isfinite(sample) ? std::clamp(sample, -SoundCutter::kLoudest, SoundCutter::kLoudest) : 0.0F;
}

} // namespace

/// The least number of samples that lasts so long.
std::size_t SoundCutter::samplesIn(std::chrono::microseconds time) const {
    const std::int64_t product = time.count() * m_format.rate;
    return static_cast<std::size_t>((product + kMicrosecondsPerSecond - 1) / kMicrosecondsPerSecond);
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
    const bool alone = m_pending.empty();
    if (alone) {
        m_format = piece.format;
        m_timecode = piece.timecode;
        m_taken = piece.taken;
        m_arrived = piece.arrived;
    }
    m_pending.insert(m_pending.end(), piece.samples,
                     piece.samples + piece.count * static_cast<std::size_t>(m_format.channels));
    const std::size_t longest = static_cast<std::size_t>(m_format.rate) * kLongest.count() / kMillisecondsPerSecond;
    const bool good = alone && pending() >= samplesIn(kJoined) && pending() <= longest;
    const std::size_t length = good ? pending() : samplesIn(kJoined);
    std::size_t first = 0;
    for (; pending() - first >= length; first += length) {
        emit(first, length);
    }
    if (first > 0) {
        drop(first, piece);
    }
}

/// Forgets what has become frames. What is left is the end of the piece, from which it gets its times.
void SoundCutter::drop(std::size_t count, const Piece& piece) {
    const auto channels = static_cast<std::ptrdiff_t>(m_format.channels);
    m_pending.erase(m_pending.begin(), m_pending.begin() + static_cast<std::ptrdiff_t>(count) * channels);
    const std::int64_t into = unitsOf(piece.count - pending());
    m_timecode = piece.timecode + into;
    m_taken = piece.taken;
    if (m_taken) {
        *m_taken += into;
    }
    m_arrived = piece.arrived;
}

void SoundCutter::flush() {
    if (!m_pending.empty() && pending() >= samplesIn(kShortest)) {
        emit(0, pending());
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
