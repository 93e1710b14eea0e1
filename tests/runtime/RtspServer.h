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
    void setSilent(bool silent) { *m_silent = silent; }
    /// From now on every n-th buffer of packets is lost; 0 for none.
    void setLossy(unsigned everyNth) { *m_lossy = everyNth; }
    /// Sets a property of an element of the pipeline that runs.
    void set(const std::string& element, const std::string& property, const std::string& value);
    /// Connections accepted so far.
    int connections() const { return m_connections; }
    /// Streams set up so far.
    int setups() const { return m_setups; }
    /// SETUP requests answered so far that chose TCP.
    int tcpSetups() const { return m_tcpSetups; }

  private:
    struct Callbacks;

    void addFactory(const std::string& path, const std::string& launch);

    const Options m_options;
    GMainContext* m_context = nullptr;
    GMainLoop* m_loop = nullptr;
    GstRTSPServer* m_server = nullptr;
    std::thread m_thread;
    int m_port = 0;
    /// Shared with the pipelines, which may outlive the server.
    const std::shared_ptr<std::atomic<bool>> m_silent = std::make_shared<std::atomic<bool>>(false);
    const std::shared_ptr<std::atomic<unsigned>> m_lossy = std::make_shared<std::atomic<unsigned>>(0);
    std::atomic<int> m_connections = 0;
    std::atomic<int> m_setups = 0;
    std::atomic<int> m_tcpSetups = 0;

    std::mutex m_mutex; // protects the rest
    GstElement* m_pipeline = nullptr;
};

/// A source of test pictures; `caps` as in "width=320,height=240,framerate=30/1".
std::string h264(const std::string& caps, const std::string& pattern = "smpte");
std::string h265(const std::string& caps, const std::string& pattern = "smpte");
std::string jpeg(const std::string& caps, const std::string& pattern = "smpte");

} // namespace qivo::test
