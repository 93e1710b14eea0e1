#pragma once

#include "tests/tools/StreamClient.h"

#include <chrono>
#include <string>
#include <vector>

namespace qivo::test {

/// Sound that was received, channel by channel.
struct Heard {
    int rate = 0;
    std::vector<std::vector<float>> planes;

    [[nodiscard]] double seconds() const { return planes.empty() ? 0.0 : static_cast<double>(planes[0].size()) / rate; }
};

/// A listener to an RTSP address: to its sound alone.
class Listener {
  public:
    explicit Listener(const std::string& address, const std::string& protocol = "udp");

    /// What comes next, this long; less if the deadline passes first.
    Heard hear(std::chrono::milliseconds length, std::chrono::milliseconds deadline = std::chrono::seconds(15));

  private:
    StreamClient m_stream;
};

/// A listener to L16 or L24 that takes the samples from the packets itself, in the order in which they lie there.
class PacketListener {
  public:
    explicit PacketListener(const std::string& address, const std::string& protocol = "udp");

    /// What comes next, this long; less if the deadline passes first.
    Heard hear(std::chrono::milliseconds length, std::chrono::milliseconds deadline = std::chrono::seconds(15));

  private:
    StreamClient m_stream;
};

/// The server's description of what it serves at an address, in SDP; empty if it gives none.
std::string descriptionOf(const std::string& address);

} // namespace qivo::test
