#pragma once

#include <chrono>

namespace qivo::runtime {

/// Whether the one who captures a source's pictures keeps up with them: looks often and now and then finds none.
///
/// A look that comes late, or a long time in which every look has found one, shows that pictures come faster than they
/// are taken. To keep them then would only make all later ones late. Whoever is a little slower than the source finds
/// none by accident, too, where a picture is late. So who has turned out to be too slow must find none twice.
///
/// Pure: it is told the time. Thread: one.
class CallerPace {
  public:
    using Time = std::chrono::steady_clock::time_point;

    /// How soon who keeps up looks again.
    static constexpr std::chrono::milliseconds kLooksOften{150};
    /// How soon it finds none again. Who is not much faster than the source takes that long to catch up.
    static constexpr std::chrono::milliseconds kCatchesUp{1500};
    /// How soon who was too slow finds none once more.
    static constexpr std::chrono::milliseconds kNoAccident{150};

    /// The caller looks; whether a picture waits for it.
    void looks(Time now, bool found) {
        const bool often = now - m_looked <= kLooksOften;
        const auto busy = now - m_foundNone;
        m_looked = now;
        if (!found) {
            m_foundNone = now;
            m_tooSlow = m_tooSlow && busy > kNoAccident;
        } else {
            m_tooSlow = m_tooSlow || busy > kCatchesUp;
        }
        m_keepsUp = !m_tooSlow && (often || !found);
    }
    /// It has found none and has waited for one until now.
    void waited(Time now) { m_foundNone = m_looked = now; }

    bool keepsUp() const { return m_keepsUp; }
    /// When it looks again at the latest if it keeps up.
    Time looksBy() const { return m_looked + kLooksOften; }

  private:
    Time m_looked{};
    Time m_foundNone{};
    bool m_tooSlow = false;
    bool m_keepsUp = false;
};

} // namespace qivo::runtime
