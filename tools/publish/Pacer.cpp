#include "tools/publish/Pacer.h"

#include <algorithm>

namespace qivo {
namespace {

constexpr std::int64_t second = 1'000'000'000;

} // namespace

// Whole seconds' worth of pictures and the rest are scaled apart: one product would overflow within days.
std::chrono::nanoseconds Pacer::offset(std::int64_t number) const {
    const std::int64_t groups = number / m_rate.numerator;
    const std::int64_t rest = number % m_rate.numerator;
    return std::chrono::nanoseconds(groups * m_rate.denominator * second +
                                    rest * m_rate.denominator * second / m_rate.numerator);
}

Pacer::Time Pacer::next(Time now) {
    // Moments are rounded down to whole nanoseconds; the one added finds a moment again at its own time.
    const std::int64_t passed = std::chrono::nanoseconds(now - m_start).count() + 1;
    const std::int64_t group = m_rate.denominator * second;
    const std::int64_t due = passed / group * m_rate.numerator + passed % group * m_rate.numerator / group;
    m_next = std::max(m_next, due);
    return m_start + offset(m_next++);
}

} // namespace qivo
