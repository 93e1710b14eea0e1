#pragma once

#include <gst/gst.h>

#include <atomic>
#include <chrono>
#include <cstdint>
#include <optional>

namespace qivo::runtime {

/// What the sender's wall clock showed when something was taken, by its RTCP reports. It is the same clock for all
/// streams of a sender, however they are received.
///
/// A report that differs a little from the ones before is followed slowly, so that times go on increasing; one that
/// differs by kStep is taken at once.
///
/// Thread: `note` on one, `at` on any.
class SenderClock {
  public:
    static constexpr std::chrono::nanoseconds kStep = std::chrono::milliseconds(100);
    /// At most 1/n of the time that passes is added or left out.
    static constexpr std::int64_t kSlowness = 20;

    /// Looks at a packet on which the jitter buffer has noted the sender's time, if it has.
    void look(GstBuffer* packet);
    /// The packet with this presentation time was taken at this NTP time, both in nanoseconds.
    void note(GstClockTime pts, GstClockTime ntp);
    /// When what has this presentation time was taken, in units of 100 ns since the Unix epoch; empty before the first
    /// report, and where the sender does not know what year it is.
    std::optional<std::int64_t> at(GstClockTime pts) const;

  private:
    static constexpr std::int64_t kUnknown = INT64_MIN;

    std::int64_t m_pts = 0;                        // of the last packet; the noting thread's
    std::atomic<std::int64_t> m_offset = kUnknown; // from presentation times to the Unix epoch, in nanoseconds
};

} // namespace qivo::runtime
