#pragma once

#include <gst/rtsp-server/rtsp-server.h>

#include <atomic>
#include <chrono>
#include <cstdint>
#include <memory>
#include <mutex>
#include <string>
#include <thread>

namespace qivo::test {

/// A conforming RTSP server in this process, on loopback.
class RtspServer {
  public:
    struct Options {
        /// Pipeline description with payloaders pay0, pay1, ...
        std::string launch;
        std::string path = "/live";
        /// A second stream; empty if there is none.
        std::string lowLaunch = {};
        std::string lowPath = "/low";
        int port = 0;          ///< 0: any
        bool tcpOnly = false;  ///< refuses UDP in SETUP
        bool udpOnly = false;  ///< refuses TCP in SETUP
        std::string user = {}; ///< with a password: asks for a login
        std::string password = {};
        std::string address = "127.0.0.1";
        std::chrono::seconds sessionTimeout{60};
        std::chrono::milliseconds reports{0}; ///< from one RTCP report to the next, about; 0: seconds
    };

    explicit RtspServer(Options options);
    RtspServer(const RtspServer&) = delete;
    RtspServer& operator=(const RtspServer&) = delete;
    /// Closes every connection, as a source does that is switched off.
    ~RtspServer();

    int port() const { return m_port; }
    std::string url() const { return url(m_options.path); }
    std::string url(const std::string& path) const;

    /// Whether anything is sent; connections stay open either way.
    void setSilent(bool silent) { m_state->silent = silent; }
    /// From now on every n-th buffer of packets is lost; 0 for none.
    void setLossy(unsigned everyNth) { m_state->lossy = everyNth; }
    /// Sets a property of an element of the pipeline that runs.
    void set(const std::string& element, const std::string& property, const std::string& value);
    /// Connections accepted so far.
    int connections() const { return m_state->connections; }
    /// Streams set up so far.
    int setups() const { return m_state->setups; }
    /// SETUP requests answered so far that chose TCP.
    int tcpSetups() const { return m_state->tcpSetups; }

  private:
    struct Callbacks;
    /// Shared with connections and pipelines, which end on threads of their own, perhaps after the server.
    struct State {
        const std::chrono::seconds sessionTimeout;
        const std::chrono::milliseconds reports;
        std::atomic<bool> silent = false;
        std::atomic<unsigned> lossy = 0;
        std::atomic<int> connections = 0;
        std::atomic<int> setups = 0;
        std::atomic<int> tcpSetups = 0;

        std::mutex mutex = {}; ///< protects the rest
        bool ended = false;
        GstElement* pipeline = nullptr; ///< the newest; none once the server has ended, as pipelines hold this
    };

    void addFactory(const std::string& path, const std::string& launch);

    const Options m_options;
    GMainContext* m_context = nullptr;
    GMainLoop* m_loop = nullptr;
    GstRTSPServer* m_server = nullptr;
    std::thread m_thread;
    int m_port = 0;
    const std::shared_ptr<State> m_state;
};

/// A source of test pictures; `caps` as in "width=320,height=240,framerate=30/1".
std::string h264(const std::string& caps, const std::string& pattern = "smpte");
std::string h265(const std::string& caps, const std::string& pattern = "smpte");
std::string jpeg(const std::string& caps, const std::string& pattern = "smpte");

} // namespace qivo::test
