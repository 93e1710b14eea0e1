#pragma once

#include "tools/publish/Handles.h"
#include "tools/publish/Login.h"
#include "tools/publish/Stream.h"

#include <chrono>
#include <gst/rtsp-server/rtsp-server.h>
#include <string>

namespace qivo {

/** The RTSP server of this process. Lives on the thread of the default main context. */
class RtspServer {
  public:
    /** Of a viewer who has sent nothing for this long, neither a request nor an RTCP report, the server takes leave
     *  (five to six seconds later: who keeps the session alive at the last moment may be late). */
    static constexpr std::chrono::seconds usualSessionTimeout{60};

    explicit RtspServer(std::chrono::seconds sessionTimeout = usualSessionTimeout);
    ~RtspServer();
    RtspServer(const RtspServer&) = delete;
    RtspServer& operator=(const RtspServer&) = delete;

    /** Lets only those who log in, by digest, see what is mounted from now on. */
    void requireLogin(const Login& login);

    /** Those who play the picture of the stream under a path at this moment. One who went without a word is among them
     *  until the session's time-out. */
    [[nodiscard]] int viewers(const std::string& path) const;

    /** Serves a stream under a path, which begins with "/". */
    void mount(const std::string& path, Object<GstRTSPMediaFactory> factory);

    /** Begins to listen, on 127.0.0.1 or on every interface. `port` as in Options. Empty, or one line that says why not
     *  and what to do. */
    [[nodiscard]] std::string listen(int port, bool loopbackOnly);

    /** The port it listens at. */
    [[nodiscard]] int port() const;

    /** Takes leave of every client and stops listening. */
    void stop();

  private:
    [[nodiscard]] bool attach(int port, std::string& reason);

    Object<GstRTSPServer> m_server;
    guint m_source = 0;
    guint m_cleanup = 0; // the timer that ends sessions
    bool m_loginNeeded = false;
};

} // namespace qivo
