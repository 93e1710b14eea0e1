#pragma once

#include <atomic>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

namespace qivo::test {

/// One side of a TCP connection, without any notion of RTSP but the end of a header.
class Connection {
  public:
    explicit Connection(int socket) : m_socket(socket) {}
    Connection(const Connection&) = delete;
    Connection& operator=(const Connection&) = delete;
    ~Connection();

    /// Up to the empty line; empty if the other side has closed or the server ends.
    std::string request();
    /// What has come, at least one byte; empty at the end.
    std::string some();
    /// False if the other side has closed.
    bool send(const std::string& bytes);
    /// The system keeps no more than about this much of what has been sent and not yet received.
    void keepNoMoreThan(int bytes) const;
    /// Until the other side closes or the server ends.
    void untilClosed();
    /// Ends every operation above, from another thread.
    void interrupt() const;
    void close();

  private:
    const int m_socket;
    std::string m_pending;
};

/// The number of a request, for its answer.
std::string cseqOf(const std::string& request);
/// A complete answer: status line, CSeq, the lines given (each with its CR LF) and the body.
std::string answer(const std::string& request, const std::string& status = "200 OK", const std::string& lines = "",
                   const std::string& body = "");

/// A TCP server on loopback that treats every connection as the test says: with a script, or as a tunnel to a server
/// that behaves.
class RawServer {
  public:
    using Script = std::function<void(Connection&)>;
    using Rewrite = std::function<std::string(std::string)>;

    /// Port 0: any. A backlog of 0 with `accepting` false leaves connections unanswered.
    explicit RawServer(int port = 0, bool accepting = true);
    RawServer(const RawServer&) = delete;
    RawServer& operator=(const RawServer&) = delete;
    ~RawServer();

    int port() const { return m_port; }
    std::string url(const std::string& path = "/live") const;

    /// Fills the queue of a server that does not accept, so that the next connection gets no answer at all.
    void fill();

    /// What the next connections meet. An open one goes on as it began.
    void setScript(Script script);
    /// The next connections lead to a port on loopback; what the client says passes through `rewrite`.
    void forwardTo(int port, Rewrite rewrite = nullptr);
    /// Closes every open connection.
    void closeAll();
    int connections() const { return m_connections; }

  private:
    void accept();
    void tunnel(Connection& client, int port, const Rewrite& rewrite);
    std::shared_ptr<Connection> adopt(int socket);

    int m_socket = -1;
    int m_port = 0;
    std::atomic<bool> m_ending = false;
    std::atomic<int> m_connections = 0;
    std::thread m_thread;

    std::mutex m_mutex; // protects the rest
    Script m_script;
    std::vector<std::weak_ptr<Connection>> m_open;
    std::vector<std::thread> m_threads;
    std::vector<std::unique_ptr<Connection>> m_fillers;
};

} // namespace qivo::test
