#include "tests/runtime/RawServer.h"

#include <arpa/inet.h>
#include <netinet/in.h>
#include <poll.h>
#include <stdexcept>
#include <sys/socket.h>
#include <unistd.h>
#include <utility>

namespace qivo::test {
namespace {

sockaddr_in loopback(int port) {
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(static_cast<std::uint16_t>(port));
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    return address;
}

constexpr std::size_t kLongestRequest = 1U << 20U;

} // namespace

Connection::~Connection() {
    ::close(m_socket);
}

std::string Connection::some() {
    if (!m_pending.empty()) {
        return std::exchange(m_pending, {});
    }
    char buffer[65536];
    const ssize_t length = recv(m_socket, buffer, sizeof(buffer), 0);
    return length > 0 ? std::string(buffer, static_cast<std::size_t>(length)) : std::string();
}

std::string Connection::request() {
    std::string text;
    for (;;) {
        const std::string more = some();
        if (more.empty() || text.size() > kLongestRequest) {
            return {};
        }
        text += more;
        const std::size_t end = text.find("\r\n\r\n");
        if (end != std::string::npos) {
            m_pending = text.substr(end + 4);
            return text.substr(0, end + 4);
        }
    }
}

bool Connection::send(const std::string& bytes) {
    std::size_t sent = 0;
    while (sent < bytes.size()) {
        const ssize_t length = ::send(m_socket, bytes.data() + sent, bytes.size() - sent, MSG_NOSIGNAL);
        if (length <= 0) {
            return false;
        }
        sent += static_cast<std::size_t>(length);
    }
    return true;
}

void Connection::keepNoMoreThan(int bytes) const {
    setsockopt(m_socket, SOL_SOCKET, SO_SNDBUF, &bytes, sizeof(bytes));
}

void Connection::untilClosed() {
    while (!some().empty()) {
    }
}

void Connection::interrupt() const {
    shutdown(m_socket, SHUT_RDWR);
}

void Connection::close() {
    interrupt();
}

std::string cseqOf(const std::string& request) {
    const std::size_t at = request.find("CSeq: ");
    return at == std::string::npos ? "0" : request.substr(at + 6, request.find("\r\n", at) - at - 6);
}

std::string answer(const std::string& request, const std::string& status, const std::string& lines,
                   const std::string& body) {
    std::string text = "RTSP/1.0 " + status + "\r\nCSeq: " + cseqOf(request) + "\r\n" + lines;
    if (!body.empty()) {
        text += "Content-Length: " + std::to_string(body.size()) + "\r\n";
    }
    return text + "\r\n" + body;
}

RawServer::RawServer(int port, bool accepting) {
    m_socket = socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
    const int yes = 1;
    setsockopt(m_socket, SOL_SOCKET, SO_REUSEADDR, &yes, sizeof(yes));
    sockaddr_in address = loopback(port);
    socklen_t length = sizeof(address);
    if (bind(m_socket, reinterpret_cast<sockaddr*>(&address), length) != 0 ||
        listen(m_socket, accepting ? 16 : 0) != 0 ||
        getsockname(m_socket, reinterpret_cast<sockaddr*>(&address), &length) != 0) {
        ::close(m_socket);
        throw std::runtime_error("the port cannot be had");
    }
    m_port = ntohs(address.sin_port);
    m_script = [](Connection& connection) { connection.untilClosed(); };
    if (accepting) {
        m_thread = std::thread([this] { accept(); });
    }
}

RawServer::~RawServer() {
    m_ending = true;
    shutdown(m_socket, SHUT_RDWR);
    if (m_thread.joinable()) {
        m_thread.join();
    }
    ::close(m_socket);
    closeAll();
    for (std::thread& thread : m_threads) {
        thread.join();
    }
}

void RawServer::fill() {
    constexpr int kEnough = 4;
    const sockaddr_in address = loopback(m_port);
    for (int i = 0; i < kEnough; ++i) {
        const int socket = ::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0);
        connect(socket, reinterpret_cast<const sockaddr*>(&address), sizeof(address));
        m_fillers.push_back(std::make_unique<Connection>(socket));
    }
}

std::string RawServer::url(const std::string& path) const {
    return "rtsp://127.0.0.1:" + std::to_string(m_port) + path;
}

void RawServer::setScript(Script script) {
    const std::lock_guard guard(m_mutex);
    m_script = std::move(script);
}

void RawServer::forwardTo(int port, Rewrite rewrite) {
    setScript([this, port, rewrite = std::move(rewrite)](Connection& client) { tunnel(client, port, rewrite); });
}

void RawServer::closeAll() {
    const std::lock_guard guard(m_mutex);
    for (const auto& open : m_open) {
        if (const auto connection = open.lock()) {
            connection->interrupt();
        }
    }
}

std::shared_ptr<Connection> RawServer::adopt(int socket) {
    auto connection = std::make_shared<Connection>(socket);
    const std::lock_guard guard(m_mutex);
    m_open.push_back(connection);
    if (m_ending) {
        connection->interrupt();
    }
    return connection;
}

void RawServer::accept() {
    while (!m_ending) {
        const int socket = accept4(m_socket, nullptr, nullptr, SOCK_CLOEXEC);
        if (socket < 0) {
            return;
        }
        auto connection = adopt(socket);
        const std::lock_guard guard(m_mutex);
        m_threads.emplace_back([script = m_script, connection = std::move(connection)]() mutable {
            script(*connection);
            connection->interrupt();
            connection.reset();
        });
        ++m_connections;
    }
}

void RawServer::tunnel(Connection& client, int port, const Rewrite& rewrite) {
    const int socket = ::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
    const sockaddr_in address = loopback(port);
    const auto server = adopt(socket);
    if (connect(socket, reinterpret_cast<const sockaddr*>(&address), sizeof(address)) != 0) {
        return;
    }
    std::thread back([&] {
        for (std::string bytes = server->some(); !bytes.empty() && client.send(bytes); bytes = server->some()) {
        }
        client.interrupt();
    });
    for (std::string bytes = client.some(); !bytes.empty(); bytes = client.some()) {
        if (!server->send(rewrite ? rewrite(std::move(bytes)) : bytes)) {
            break;
        }
    }
    server->interrupt();
    back.join();
}

} // namespace qivo::test
