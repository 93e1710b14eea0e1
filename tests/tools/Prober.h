#pragma once

#include <chrono>
#include <optional>
#include <string>

namespace qivo::test {

/// Asks the network for cameras, or listens to what they say to all.
class Prober {
  public:
    /// With a member of the group hears what is said to all, else only what is answered to it.
    explicit Prober(bool member = false);
    ~Prober();
    Prober(const Prober&) = delete;
    Prober& operator=(const Prober&) = delete;

    /// Sends a datagram to the group.
    void probe(const std::string& text) const;
    /// Sends one to this machine alone.
    void probeDirectly(const std::string& text) const;
    /// The next datagram; empty after the deadline.
    std::optional<std::string> next(std::chrono::milliseconds deadline) const;

  private:
    void send(const std::string& text, const char* address) const;

    int m_socket;
};

} // namespace qivo::test
