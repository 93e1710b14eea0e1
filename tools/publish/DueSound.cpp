#include "tools/publish/DueSound.h"

#include <algorithm>
#include <cstdlib>

namespace qivo {
namespace {

using namespace std::chrono_literals;

// Many a file tells times in whole milliseconds only, or by its pictures.
constexpr auto tolerance = 10ms;

} // namespace

// Whole seconds and the rest are scaled apart: one product would overflow within days.
std::int64_t DueSound::numberAt(Time time) const {
    constexpr std::int64_t second = 1'000'000'000;
    const std::int64_t passed = std::chrono::nanoseconds(time.time_since_epoch()).count();
    return passed / second * m_format.rate + passed % second * m_format.rate / second;
}

std::int64_t DueSound::samplesIn(std::chrono::milliseconds time) const {
    return m_format.rate * time.count() / 1000;
}

std::int64_t DueSound::end() const {
    return m_first + static_cast<std::int64_t>(m_sound.size()) / m_format.channels;
}

bool DueSound::near(std::int64_t one, std::int64_t other) const {
    return std::abs(one - other) <= samplesIn(tolerance);
}

void DueSound::dropBefore(std::int64_t number) {
    const std::int64_t dropped = std::clamp<std::int64_t>(number - m_first, 0, end() - m_first);
    m_sound.erase(m_sound.begin(), m_sound.begin() + static_cast<std::ptrdiff_t>(dropped * m_format.channels));
    m_first += dropped;
}

void DueSound::add(const float* samples, std::size_t count, Time due) {
    const auto length = static_cast<std::int64_t>(count) / m_format.channels;
    const std::int64_t number = numberAt(due);
    const std::int64_t next = m_sound.empty() ? m_taken.value_or(number) : end();
    const bool late = m_taken && number < *m_taken;
    const std::int64_t begin = late || near(number, next) ? next : number;
    if (m_sound.empty() || begin - next > samplesIn(most)) {
        m_sound.assign(samples, samples + length * m_format.channels);
        m_first = begin;
    } else {
        const std::int64_t silence = std::max<std::int64_t>(0, begin - next);
        m_sound.insert(m_sound.end(), static_cast<std::size_t>(silence * m_format.channels), 0.0F);
        const std::int64_t overlap = std::clamp<std::int64_t>(next - begin, 0, length);
        m_sound.insert(m_sound.end(), samples + overlap * m_format.channels, samples + length * m_format.channels);
    }
    dropBefore(end() - samplesIn(most));
}

void DueSound::take(float* samples, std::size_t count, Time due) {
    const auto length = static_cast<std::int64_t>(count) / m_format.channels;
    const std::int64_t number = numberAt(due);
    const std::int64_t begin = m_taken && near(number, *m_taken) ? *m_taken : number;
    m_taken = begin + length;
    dropBefore(begin);
    const std::int64_t before = m_sound.empty() ? length : std::clamp<std::int64_t>(m_first - begin, 0, length);
    const std::int64_t there = std::min(length - before, end() - m_first);
    float* at = std::fill_n(samples, before * m_format.channels, 0.0F);
    at = std::copy_n(m_sound.begin(), there * m_format.channels, at);
    std::fill(at, samples + count, 0.0F);
    dropBefore(*m_taken);
}

void DueSound::clear() {
    m_sound.clear();
    m_taken.reset();
}

} // namespace qivo
