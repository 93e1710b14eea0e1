#pragma once

#include <chrono>
#include <functional>
#include <string>

namespace qivo::test {

/// A TCP connection to this machine that a test writes and reads byte by byte.
class RawConnection {
  public:
    explicit RawConnection(int port);
    ~RawConnection();
    RawConnection(const RawConnection&) = delete;
    RawConnection& operator=(const RawConnection&) = delete;

    /// False once the other end took leave.
    bool send(const std::string& text);

    /// What comes until `marker`, the other end's leave or the deadline; with the marker.
    std::string readUntil(const std::string& marker, std::chrono::milliseconds deadline = std::chrono::seconds(10));

    /// That many bytes; fewer at the other end's leave or the deadline.
    std::string read(std::size_t bytes, std::chrono::milliseconds deadline = std::chrono::seconds(10));

    /// What comes until the other end takes leave or the deadline.
    std::string readAll(std::chrono::milliseconds deadline = std::chrono::seconds(10));

    /// Whether the other end took leave, as far as reading has shown.
    [[nodiscard]] bool ended() const { return m_ended; }

  private:
    std::string take(const std::function<std::size_t()>& length, std::chrono::milliseconds deadline);

    int m_socket = -1;
    bool m_ended = false;
    std::string m_rest;
};

/// The answer to one request on a connection of its own, whole with its head.
std::string ask(int port, const std::string& request);

/// A POST of JSON with further header lines, each ended with "\r\n".
std::string jsonPost(const std::string& path, const std::string& body, const std::string& headers);

/// The number in the answer's first line; 0 if there is none.
int statusOf(const std::string& answer);

/// What follows the answer's head.
std::string bodyOf(const std::string& answer);

} // namespace qivo::test
