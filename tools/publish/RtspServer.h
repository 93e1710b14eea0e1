#pragma once

#include "tools/publish/Handles.h"
#include "tools/publish/Login.h"
#include "tools/publish/Stream.h"

#include <gst/rtsp-server/rtsp-server.h>
#include <string>

namespace qivo {

/** The RTSP server of this process. Lives on the thread of the default main context. */
class RtspServer {
  public:
    RtspServer();
    ~RtspServer();
    RtspServer(const RtspServer&) = delete;
    RtspServer& operator=(const RtspServer&) = delete;

    /** Lets only those who log in, by digest, see what is mounted from now on. */
    void requireLogin(const Login& login);

    /** Those who play the picture of the stream under a path at this moment. One who went without a word is among them
     *  until the server's time-out, a minute at most. */
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
    bool m_loginNeeded = false;
};

} // namespace qivo
