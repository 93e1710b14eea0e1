#pragma once

#include "tools/publish/LocalAddresses.h"
#include "tools/publish/onvif/Discovery.h"

#include <glib.h>
#include <string>
#include <vector>

namespace qivo {

/** Lets cameras be found by WS-Discovery: says when they come and go and answers who looks for them, each with the
 *  address at which this one reaches them. Only what comes over multicast is answered. Lives on the thread of the
 * default main context. */
class WsDiscovery {
  public:
    static constexpr const char* group = "239.255.255.250";
    static constexpr std::uint16_t port = 3702;

    /** The cameras must outlive it. `httpPort` is where their services are. */
    WsDiscovery(std::vector<const OnvifCamera*> cameras, int httpPort, bool loopbackOnly);
    ~WsDiscovery();
    WsDiscovery(const WsDiscovery&) = delete;
    WsDiscovery& operator=(const WsDiscovery&) = delete;

    /** Begins. Empty, or one line that says why not. */
    [[nodiscard]] std::string start();

  private:
    [[nodiscard]] bool open();
    void join();
    void read();
    void sayHello(const LocalAddress& local);
    void sayBye();
    void multicast(const LocalAddress& from, const std::string& text) const;

    std::vector<const OnvifCamera*> m_cameras;
    int m_httpPort;
    bool m_loopbackOnly;
    DiscoveryMessages m_messages;
    int m_socket = -1;
    guint m_readable = 0;
    guint m_timer = 0;
    std::vector<LocalAddress> m_joined;
};

} // namespace qivo
