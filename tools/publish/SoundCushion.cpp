#include "tools/publish/SoundCushion.h"

#include <algorithm>

namespace qivo {
namespace {

using namespace std::chrono_literals;

// Longer than the pieces' irregularities last.
constexpr auto timeToLook = 1000ms;

// What is left out is heard as a click, so it is not done for less.
constexpr auto tolerance = 10ms;

} // namespace

std::size_t SoundCushion::samplesIn(std::chrono::milliseconds time) const {
    return static_cast<std::size_t>(m_format.rate * time.count() / 1000) * static_cast<std::size_t>(m_format.channels);
}

void SoundCushion::shortenTo(std::size_t count) {
    if (m_sound.size() > count) {
        m_sound.erase(m_sound.begin(), m_sound.end() - static_cast<std::ptrdiff_t>(count));
    }
}

void SoundCushion::add(const float* samples, std::size_t count) {
    m_sound.insert(m_sound.end(), samples, samples + count);
    m_piece = std::max(m_piece, count);
    shortenTo(samplesIn(most));
}

void SoundCushion::take(float* samples, std::size_t count) {
    if (!m_flowing && m_sound.size() >= samplesIn(held)) {
        m_flowing = true;
        shortenTo(std::max(samplesIn(held), m_piece));
        m_taken = 0;
        m_least = m_sound.size();
    }
    const std::size_t there = m_flowing ? std::min(count, m_sound.size()) : 0;
    const auto end = m_sound.begin() + static_cast<std::ptrdiff_t>(there);
    std::copy(m_sound.begin(), end, samples);
    m_sound.erase(m_sound.begin(), end);
    std::fill(samples + there, samples + count, 0.0F);
    m_flowing = there == count;
    look(there);
}

// Right after a piece has come `held` is enough, and less a piece before it.
void SoundCushion::look(std::size_t taken) {
    m_taken += taken;
    m_least = std::min(m_least, m_sound.size());
    if (m_taken < samplesIn(timeToLook)) {
        return;
    }
    const std::size_t enough = samplesIn(held) - std::min(m_piece, samplesIn(held));
    if (m_least > enough + samplesIn(tolerance)) {
        shortenTo(m_sound.size() - (m_least - enough));
    }
    m_taken = 0;
    m_least = m_sound.size();
    m_piece = 0;
}

void SoundCushion::clear() {
    m_sound.clear();
    m_flowing = false;
    m_piece = 0;
}

} // namespace qivo
