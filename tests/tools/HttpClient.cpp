#include "tests/tools/HttpClient.h"

#include <arpa/inet.h>
#include <array>
#include <cstdlib>
#include <netinet/in.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>
#include <utility>

namespace qivo::test {

RawConnection::RawConnection(int port) : m_socket(socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(static_cast<std::uint16_t>(port));
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    m_ended = connect(m_socket, reinterpret_cast<const sockaddr*>(&address), sizeof(address)) != 0;
}

RawConnection::~RawConnection() {
    close(m_socket);
}

bool RawConnection::send(const std::string& text) {
    return ::send(m_socket, text.data(), text.size(), MSG_NOSIGNAL) == static_cast<ssize_t>(text.size());
}

// Gives so many bytes as `length` says once it does not say 0; whatever there is at the end or the deadline.
std::string RawConnection::take(const std::function<std::size_t()>& length, std::chrono::milliseconds deadline) {
    const auto end = std::chrono::steady_clock::now() + deadline;
    while (length() == 0) {
        const auto left =
            std::chrono::duration_cast<std::chrono::milliseconds>(end - std::chrono::steady_clock::now()).count();
        pollfd waiting{m_socket, POLLIN, 0};
        if (m_ended || left <= 0 || poll(&waiting, 1, static_cast<int>(left)) <= 0) {
            return std::exchange(m_rest, {});
        }
        std::array<char, 65536> bytes;
        const ssize_t count = recv(m_socket, bytes.data(), bytes.size(), 0);
        m_ended = count <= 0;
        m_rest.append(bytes.data(), count > 0 ? static_cast<std::size_t>(count) : 0);
    }
    const std::size_t whole = length();
    const std::string read = m_rest.substr(0, whole);
    m_rest.erase(0, whole);
    return read;
}

std::string RawConnection::readUntil(const std::string& marker, std::chrono::milliseconds deadline) {
    return take(
        [&] {
            const std::size_t at = marker.empty() ? std::string::npos : m_rest.find(marker);
            return at == std::string::npos ? 0 : at + marker.size();
        },
        deadline);
}

std::string RawConnection::read(std::size_t bytes, std::chrono::milliseconds deadline) {
    return bytes == 0 ? "" : take([&] { return m_rest.size() >= bytes ? bytes : 0; }, deadline);
}

std::string RawConnection::readAll(std::chrono::milliseconds deadline) {
    return readUntil("", deadline);
}

std::string ask(int port, const std::string& request) {
    RawConnection connection(port);
    const std::size_t line = request.find("\r\n") + 2;
    connection.send(request.substr(0, line) + "Connection: close\r\n" + request.substr(line));
    return connection.readAll();
}

std::string jsonPost(const std::string& path, const std::string& body, const std::string& headers) {
    return "POST " + path + " HTTP/1.1\r\n" + headers + "Content-Length: " + std::to_string(body.size()) + "\r\n\r\n" +
           body;
}

int statusOf(const std::string& answer) {
    const std::size_t blank = answer.find(' ');
    return answer.rfind("HTTP/1.", 0) == 0 && blank != std::string::npos ? std::atoi(answer.c_str() + blank) : 0;
}

std::string bodyOf(const std::string& answer) {
    const std::size_t end = answer.find("\r\n\r\n");
    return end == std::string::npos ? "" : answer.substr(end + 4);
}

} // namespace qivo::test
