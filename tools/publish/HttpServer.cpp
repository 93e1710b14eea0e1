#include "tools/publish/HttpServer.h"

#include <algorithm>
#include <array>

namespace qivo {
namespace {

constexpr const char* receivedKey = "qivo-received";

std::string addressOf(GSocketAddress* address) {
    if (!G_IS_INET_SOCKET_ADDRESS(address)) {
        return {};
    }
    const Text text(g_inet_address_to_string(g_inet_socket_address_get_address(G_INET_SOCKET_ADDRESS(address))));
    return text.get();
}

int portOf(GSocketAddress* address) {
    return G_IS_INET_SOCKET_ADDRESS(address) ? g_inet_socket_address_get_port(G_INET_SOCKET_ADDRESS(address)) : 0;
}

std::string methodOf(SoupServerMessage* message) {
    const std::string method = soup_server_message_get_method(message);
    return method == "HEAD" ? "GET" : method;
}

HttpRequest requestOf(SoupServerMessage* message) {
    HttpRequest request;
    request.method = methodOf(message);
    GUri* uri = soup_server_message_get_uri(message);
    request.path = g_uri_get_path(uri);
    request.query = g_uri_get_query(uri) != nullptr ? g_uri_get_query(uri) : "";
    const SoupMessageBody* body = soup_server_message_get_request_body(message);
    if (body->data != nullptr) {
        request.body.assign(body->data, static_cast<std::size_t>(body->length));
    }
    SoupMessageHeadersIter iterator;
    soup_message_headers_iter_init(&iterator, soup_server_message_get_request_headers(message));
    const char* name = nullptr;
    const char* value = nullptr;
    while (soup_message_headers_iter_next(&iterator, &name, &value) != FALSE) {
        request.headers.emplace_back(name, value);
    }
    GSocketAddress* local = soup_server_message_get_local_address(message);
    request.localAddress = addressOf(local);
    request.localPort = portOf(local);
    request.remoteAddress = addressOf(soup_server_message_get_remote_address(message));
    return request;
}

void write(SoupServerMessage* message, const HttpResponse& response) {
    soup_server_message_set_status(message, static_cast<guint>(response.status), nullptr);
    SoupMessageHeaders* headers = soup_server_message_get_response_headers(message);
    soup_message_headers_replace(headers, "X-Content-Type-Options", "nosniff");
    soup_message_headers_replace(headers, "Cache-Control", "no-store");
    for (const auto& [name, value] : response.headers) {
        if (g_ascii_strcasecmp(name.c_str(), "Cache-Control") == 0) {
            soup_message_headers_replace(headers, name.c_str(), value.c_str());
        } else {
            soup_message_headers_append(headers, name.c_str(), value.c_str());
        }
    }
    const char* type = response.contentType.empty() ? nullptr : response.contentType.c_str();
    if (type != nullptr) {
        soup_server_message_set_response(message, type, SOUP_MEMORY_COPY, response.body.data(), response.body.size());
    }
}

HttpResponse plain(int status, const std::string& text) {
    return {status, "text/plain; charset=utf-8", text + "\n", {}};
}

} // namespace

std::string HttpRequest::header(std::string_view name) const {
    std::string all;
    bool found = false;
    for (const auto& [key, value] : headers) {
        if (key.size() == name.size() && g_ascii_strncasecmp(key.data(), name.data(), name.size()) == 0) {
            all += (found ? ", " : "") + value;
            found = true;
        }
    }
    return all;
}

struct HttpReply::Exchange {
    Object<SoupServerMessage> message; // until it is answered or its connection gone
    std::function<void(SoupServerMessage*)> sent;
    std::array<gulong, 2> handlers{};

    ~Exchange() { release(); }
    void release() {
        if (message) {
            for (const gulong handler : handlers) {
                g_signal_handler_disconnect(message.get(), handler);
            }
            message.reset();
        }
    }
};

HttpReply::HttpReply(SoupServerMessage* message, std::function<void(SoupServerMessage*)> sent)
    : m_exchange(std::make_unique<Exchange>()) {
    m_exchange->message = share(message);
    m_exchange->sent = std::move(sent);
    const auto over = +[](SoupServerMessage*, gpointer exchange) { static_cast<Exchange*>(exchange)->release(); };
    m_exchange->handlers = {g_signal_connect(message, "finished", G_CALLBACK(over), m_exchange.get()),
                            g_signal_connect(message, "disconnected", G_CALLBACK(over), m_exchange.get())};
    soup_server_message_pause(message);
}

HttpReply::~HttpReply() {
    if (m_exchange) {
        send(plain(500, "No answer was found."));
    }
}

HttpReply::HttpReply(HttpReply&& other) noexcept = default;
HttpReply& HttpReply::operator=(HttpReply&& other) noexcept {
    std::swap(m_exchange, other.m_exchange);
    return *this;
}

void HttpReply::send(const HttpResponse& response) {
    if (!m_exchange || !m_exchange->message) {
        return;
    }
    const Object<SoupServerMessage> message = share(m_exchange->message.get());
    m_exchange->release();
    write(message.get(), response);
    m_exchange->sent(message.get());
    soup_server_message_unpause(message.get());
}

HttpServer::HttpServer(HttpPatience patience)
    : m_patience(patience),
      m_server(SOUP_SERVER(g_object_new(SOUP_TYPE_SERVER, "server-header", "qivo-publish", nullptr))) {
    const auto started = +[](SoupServer*, SoupServerMessage* message, gpointer self) {
        static_cast<HttpServer*>(self)->awaitRequest(message);
    };
    const auto head = +[](SoupServer*, SoupServerMessage* message, const char*, GHashTable*, gpointer self) {
        static_cast<HttpServer*>(self)->bound(message);
    };
    const auto whole = +[](SoupServer*, SoupServerMessage* message, const char*, GHashTable*, gpointer self) {
        static_cast<HttpServer*>(self)->answer(message);
    };
    g_signal_connect(m_server.get(), "request-started", G_CALLBACK(started), this);
    soup_server_add_early_handler(m_server.get(), nullptr, head, this, nullptr);
    soup_server_add_handler(m_server.get(), nullptr, whole, this, nullptr);
}

HttpServer::~HttpServer() {
    stop();
    g_signal_handlers_disconnect_by_data(m_server.get(), this);
    for (auto& [socket, connection] : m_connections) {
        g_object_weak_unref(G_OBJECT(socket), onGone, this);
        endTime(connection);
    }
}

void HttpServer::route(const std::string& method, const std::string& path, HttpHandler handler) {
    m_routes[path][method] = std::move(handler);
}

bool HttpServer::bind(int port, bool loopbackOnly, std::string& reason) {
    const Object<GSocketAddress> wanted(
        g_inet_socket_address_new_from_string(loopbackOnly ? "127.0.0.1" : "0.0.0.0", static_cast<guint>(port)));
    GError* failure = nullptr;
    const bool done =
        soup_server_listen(m_server.get(), wanted.get(), static_cast<SoupServerListenOptions>(0), &failure) != FALSE;
    const Error error(failure);
    if (!done) {
        reason = error ? error->message : "unknown reason";
        return false;
    }
    const std::unique_ptr<GSList, void (*)(GSList*)> listeners(soup_server_get_listeners(m_server.get()), g_slist_free);
    const Object<GSocketAddress> bound(g_socket_get_local_address(static_cast<GSocket*>(listeners->data), nullptr));
    m_port = portOf(bound.get());
    return true;
}

std::string HttpServer::listen(int port, int preferred, bool loopbackOnly) {
    std::string reason;
    const bool anyWillDo = port < 0;
    if (bind(anyWillDo ? preferred : port, loopbackOnly, reason) || (anyWillDo && bind(0, loopbackOnly, reason))) {
        return {};
    }
    return "cannot serve web pages at port " + std::to_string(port) + ": " + reason;
}

void HttpServer::stop() {
    soup_server_disconnect(m_server.get());
    m_port = 0;
}

// A connection's first request starts with the connection, before a byte of it has come.
void HttpServer::awaitRequest(SoupServerMessage* message) {
    GSocket* socket = soup_server_message_get_socket(message);
    const std::string address = addressOf(soup_server_message_get_remote_address(message));
    if (m_connections.count(socket) == 0) {
        const auto ofOne = std::count_if(m_connections.begin(), m_connections.end(),
                                         [&address](const auto& entry) { return entry.second.address == address; });
        if (m_connections.size() >= maximumHttpConnections ||
            static_cast<std::size_t>(ofOne) >= maximumHttpConnectionsOfOne) {
            g_socket_shutdown(socket, TRUE, TRUE, nullptr);
            return;
        }
        m_connections[socket].address = address;
        g_object_weak_ref(G_OBJECT(socket), onGone, this);
    }
    giveTime(message, m_patience.request);
}

void HttpServer::onGone(gpointer server, GObject* socket) {
    auto& connections = static_cast<HttpServer*>(server)->m_connections;
    const auto found = std::find_if(connections.begin(), connections.end(), [socket](const auto& entry) {
        return static_cast<const void*>(entry.first) == socket;
    });
    if (found != connections.end()) {
        endTime(found->second);
        connections.erase(found);
    }
}

void HttpServer::endTime(Connection& connection) {
    if (connection.timer != 0) {
        g_source_remove(connection.timer);
        connection.timer = 0;
    }
}

void HttpServer::giveTime(SoupServerMessage* message, std::chrono::milliseconds time) {
    const auto found = m_connections.find(soup_server_message_get_socket(message));
    if (found == m_connections.end()) {
        return;
    }
    endTime(found->second);
    using Entry = decltype(m_connections)::value_type;
    const auto over = [](gpointer data) -> gboolean {
        auto& [socket, connection] = *static_cast<Entry*>(data);
        connection.timer = 0;
        // libsoup reads the end of the stream and closes what is its own.
        g_socket_shutdown(socket, TRUE, TRUE, nullptr);
        return G_SOURCE_REMOVE;
    };
    found->second.timer = g_timeout_add(static_cast<guint>(time.count()), over, &*found);
}

void HttpServer::bound(SoupServerMessage* message) {
    SoupMessageHeaders* headers = soup_server_message_get_request_headers(message);
    if (soup_message_headers_get_encoding(headers) == SOUP_ENCODING_CONTENT_LENGTH) {
        const goffset length = soup_message_headers_get_content_length(headers);
        if (length < 0 || static_cast<std::size_t>(length) > maximumHttpRequestBytes) {
            refuseLength(message);
        }
        return;
    }
    const auto chunk = +[](SoupServerMessage* from, GBytes* bytes, gpointer) {
        const gsize before = GPOINTER_TO_SIZE(g_object_get_data(G_OBJECT(from), receivedKey));
        const gsize received = before + g_bytes_get_size(bytes);
        g_object_set_data(G_OBJECT(from), receivedKey, GSIZE_TO_POINTER(received));
        if (before <= maximumHttpRequestBytes && received > maximumHttpRequestBytes) {
            refuseLength(from);
        }
    };
    g_signal_connect(message, "got-chunk", G_CALLBACK(chunk), nullptr);
}

// libsoup answers only once it has read the whole body. So the answer goes past it, and what still comes is dropped
// until the client or its time is at its end; were it left unread, the client might never see the answer.
void HttpServer::refuseLength(SoupServerMessage* message) {
    static const std::string refusal =
        "HTTP/1.1 413 Payload Too Large\r\nConnection: close\r\nContent-Length: 0\r\n\r\n";
    soup_message_body_set_accumulate(soup_server_message_get_request_body(message), FALSE);
    soup_server_message_set_status(message, SOUP_STATUS_REQUEST_ENTITY_TOO_LARGE, nullptr);
    GSocket* socket = soup_server_message_get_socket(message);
    g_socket_send(socket, refusal.data(), refusal.size(), nullptr, nullptr);
    g_socket_shutdown(socket, FALSE, TRUE, nullptr);
}

void HttpServer::answer(SoupServerMessage* message) {
    if (const auto found = m_connections.find(soup_server_message_get_socket(message)); found != m_connections.end()) {
        endTime(found->second);
    }
    HttpReply reply(message, [weak = std::weak_ptr<HttpServer*>(m_self)](SoupServerMessage* sent) {
        if (const auto self = weak.lock()) {
            (*self)->giveTime(sent, (*self)->m_patience.response);
        }
    });
    const HttpRequest request = requestOf(message);
    const auto path = m_routes.find(request.path);
    if (path != m_routes.end()) {
        if (const auto handler = path->second.find(request.method); handler != path->second.end()) {
            const HttpHandler called = handler->second; // which may replace itself
            called(request, std::move(reply));
            return;
        }
    }
    reply.send(refusal(request.path));
}

HttpResponse HttpServer::refusal(const std::string& path) const {
    const auto found = m_routes.find(path);
    if (found == m_routes.end()) {
        return plain(404, "There is nothing here.");
    }
    std::string allowed;
    for (const auto& [method, handler] : found->second) {
        allowed += (allowed.empty() ? "" : ", ") + method + (method == "GET" ? ", HEAD" : "");
    }
    HttpResponse response = plain(405, "This is asked in another way.");
    response.headers.emplace_back("Allow", allowed);
    return response;
}

} // namespace qivo
