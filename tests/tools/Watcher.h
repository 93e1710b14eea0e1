#pragma once

#include "tests/tools/StreamClient.h"

#include <chrono>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace qivo::test {

/// A decoded picture in RGBA without padding, and when it came.
struct Frame {
    int width = 0;
    int height = 0;
    std::vector<std::uint8_t> pixels;
    std::chrono::system_clock::time_point received;
    /// When it was taken by the sender's RTCP reports, in milliseconds since the Unix epoch; empty before the first.
    std::optional<std::int64_t> reported;

    [[nodiscard]] const std::uint8_t* at(int x, int y) const {
        return &pixels[4 * (static_cast<std::size_t>(y) * width + x)];
    }
    /// Milliseconds from drawing to receiving; empty if there is no intact time code.
    [[nodiscard]] std::optional<std::int64_t> latency() const;
    [[nodiscard]] std::optional<std::int64_t> timeCode() const;
};

/// A viewer of an RTSP address: of its pictures alone.
class Watcher {
  public:
    explicit Watcher(const std::string& address, const std::string& protocol = "udp");

    /// The next picture; empty after the deadline, or once the stream has ended.
    std::optional<Frame> next(std::chrono::milliseconds deadline = std::chrono::seconds(15));
    /// The colorimetry of the decoded pictures as the stream says it.
    [[nodiscard]] std::string colorimetry() const;
    /// Waits for the stream's end or failure.
    bool waitForEnd(std::chrono::milliseconds deadline);

  private:
    StreamClient m_stream;
};

} // namespace qivo::test
