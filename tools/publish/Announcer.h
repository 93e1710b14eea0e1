#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <vector>

namespace qivo {

/** A source as the network hears of it. An address that begins with ":" (":8080/path") leads to this machine: what
 *  others reach it at goes before it, as it is at the time. */
struct Announcement {
    std::string machine;
    std::string source;
    std::string path;  ///< of the full stream, begins with "/"
    std::string low;   ///< of the low-bandwidth stream
    std::string web;   ///< empty: none
    std::string onvif; ///< address of the device service; empty: none
};

/** Announces sources by multicast DNS as `_rtsp._tcp`, with a stack of its own that needs no daemon. `say` is called
 * with lines for the user, on a thread of its own or, within `start`, on the caller's. Where the network cannot be used
 * it is tried again with growing pauses. Destruction says goodbye to the network. */
class Announcer {
  public:
    using Say = std::function<void(const std::string&)>;

    Announcer(std::vector<Announcement> announcements, std::uint16_t port, bool loopbackOnly, Say say);
    ~Announcer();
    Announcer(const Announcer&) = delete;
    Announcer& operator=(const Announcer&) = delete;

    /** Begins. Empty, or one line that says why nothing will ever be announced. */
    [[nodiscard]] std::string start();

  private:
    class Implementation;
    std::unique_ptr<Implementation> m_implementation;
};

} // namespace qivo
