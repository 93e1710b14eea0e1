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

HttpRequest requestOf(SoupServerMessage* message) {
    HttpRequest request;
    request.sentMethod = soup_server_message_get_method(message);
    request.method = request.sentMethod == "HEAD" ? "GET" : request.sentMethod;
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
    soup_message_headers_replace(headers, "Connection", "close");
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
    const auto head = +[](SoupServer*, SoupServerMessage* message, const char*, GHashTable*, gpointer self) {
        static_cast<HttpServer*>(self)->limit(message);
    };
    const auto whole = +[](SoupServer*, SoupServerMessage* message, const char*, GHashTable*, gpointer self) {
        static_cast<HttpServer*>(self)->answer(message);
    };
    soup_server_add_early_handler(m_server.get(), nullptr, head, this, nullptr);
    soup_server_add_handler(m_server.get(), nullptr, whole, this, nullptr);
}

HttpServer::~HttpServer() {
    stop();
    for (auto& [stream, connection] : m_connections) {
        g_object_weak_unref(G_OBJECT(stream), onGone, this);
        endTime(connection);
    }
}

void HttpServer::route(const std::string& method, const std::string& path, HttpHandler handler) {
    m_routes[path][method] = std::move(handler);
}

bool HttpServer::bind(int port, bool loopbackOnly, std::string& reason) {
    const Object<GSocketAddress> wanted(
        g_inet_socket_address_new_from_string(loopbackOnly ? "127.0.0.1" : "0.0.0.0", static_cast<guint>(port)));
    GSocketAddress* bound = nullptr;
    GError* failure = nullptr;
    const bool done =
        g_socket_listener_add_address(G_SOCKET_LISTENER(m_listener.get()), wanted.get(), G_SOCKET_TYPE_STREAM,
                                      G_SOCKET_PROTOCOL_TCP, nullptr, &bound, &failure) != FALSE;
    const Error error(failure);
    const Object<GSocketAddress> address(bound);
    if (!done) {
        reason = error ? error->message : "unknown reason";
        return false;
    }
    m_port = portOf(address.get());
    return true;
}

std::string HttpServer::listen(int port, int preferred, bool loopbackOnly) {
    m_listener.reset(g_socket_service_new());
    const auto incoming = +[](GSocketService*, GSocketConnection* stream, GObject*, gpointer self) -> gboolean {
        static_cast<HttpServer*>(self)->accept(stream);
        return TRUE;
    };
    g_signal_connect(m_listener.get(), "incoming", G_CALLBACK(incoming), this);
    std::string reason;
    const bool anyWillDo = port < 0;
    if (bind(anyWillDo ? preferred : port, loopbackOnly, reason) || (anyWillDo && bind(0, loopbackOnly, reason))) {
        return {};
    }
    m_listener.reset();
    return "cannot serve at HTTP port " + std::to_string(port) + ": " + reason +
           "; choose another with --http-port, or --http-port 0 for any free one";
}

void HttpServer::stop() {
    if (m_listener) {
        g_signal_handlers_disconnect_by_data(m_listener.get(), this);
        g_socket_service_stop(m_listener.get());
        g_socket_listener_close(G_SOCKET_LISTENER(m_listener.get()));
        m_listener.reset();
    }
    soup_server_disconnect(m_server.get());
    m_port = 0;
}

// Accepted here and not by libsoup, which neither counts connections nor, in versions that are about, lets go of those
// that its own listeners brought.
void HttpServer::accept(GSocketConnection* stream) {
    const Object<GSocketAddress> remote(g_socket_connection_get_remote_address(stream, nullptr));
    const Object<GSocketAddress> local(g_socket_connection_get_local_address(stream, nullptr));
    const std::string address = addressOf(remote.get());
    const auto ofOne = std::count_if(m_connections.begin(), m_connections.end(),
                                     [&address](const auto& entry) { return entry.second.address == address; });
    if (!remote || !local || m_connections.size() >= maximumHttpConnections ||
        static_cast<std::size_t>(ofOne) >= maximumHttpConnectionsOfOne) {
        g_io_stream_close(G_IO_STREAM(stream), nullptr, nullptr);
        return;
    }
    g_object_weak_ref(G_OBJECT(stream), onGone, this);
    auto& entry = *m_connections.emplace(stream, Connection{share(remote.get()), address, 0}).first;
    giveTime(entry, m_patience.request);
    soup_server_accept_iostream(m_server.get(), G_IO_STREAM(stream), local.get(), remote.get(), nullptr);
}

void HttpServer::onGone(gpointer server, GObject* stream) {
    auto& connections = static_cast<HttpServer*>(server)->m_connections;
    const auto found = std::find_if(connections.begin(), connections.end(), [stream](const auto& entry) {
        return static_cast<const void*>(entry.first) == stream;
    });
    if (found != connections.end()) {
        endTime(found->second);
        connections.erase(found);
    }
}

HttpServer::Connections::value_type* HttpServer::connectionOf(SoupServerMessage* message) {
    const GSocketAddress* remote = soup_server_message_get_remote_address(message);
    const auto found = std::find_if(m_connections.begin(), m_connections.end(),
                                    [remote](const auto& entry) { return entry.second.remote.get() == remote; });
    return found == m_connections.end() ? nullptr : &*found;
}

void HttpServer::endTime(Connection& connection) {
    if (connection.timer != 0) {
        g_source_remove(connection.timer);
        connection.timer = 0;
    }
}

void HttpServer::giveTime(Connections::value_type& entry, std::chrono::milliseconds time) {
    endTime(entry.second);
    const auto over = [](gpointer data) -> gboolean {
        auto& [stream, connection] = *static_cast<Connections::value_type*>(data);
        connection.timer = 0;
        // libsoup reads the end of the stream and closes what is its own.
        g_socket_shutdown(g_socket_connection_get_socket(stream), TRUE, TRUE, nullptr);
        return G_SOURCE_REMOVE;
    };
    entry.second.timer = g_timeout_add(static_cast<guint>(time.count()), over, &entry);
}

void HttpServer::limit(SoupServerMessage* message) {
    SoupMessageHeaders* headers = soup_server_message_get_request_headers(message);
    if (soup_message_headers_get_encoding(headers) == SOUP_ENCODING_CONTENT_LENGTH) {
        const goffset length = soup_message_headers_get_content_length(headers);
        if (length < 0 || static_cast<std::size_t>(length) > maximumHttpRequestBytes) {
            refuseLength(message);
        }
        return;
    }
    const auto chunk = +[](SoupServerMessage* from, GBytes* bytes, gpointer self) {
        const gsize before = GPOINTER_TO_SIZE(g_object_get_data(G_OBJECT(from), receivedKey));
        const gsize received = before + g_bytes_get_size(bytes);
        g_object_set_data(G_OBJECT(from), receivedKey, GSIZE_TO_POINTER(received));
        if (before <= maximumHttpRequestBytes && received > maximumHttpRequestBytes) {
            static_cast<HttpServer*>(self)->refuseLength(from);
        }
    };
    g_signal_connect(message, "got-chunk", G_CALLBACK(chunk), this);
}

// libsoup answers only once it has read the whole body. So the answer goes past it, and what still comes is dropped
// until the client or its time is at its end; were it left unread, the client might never see the answer.
void HttpServer::refuseLength(SoupServerMessage* message) {
    static const std::string refusal =
        "HTTP/1.1 413 Payload Too Large\r\nConnection: close\r\nContent-Length: 0\r\n\r\n";
    soup_message_body_set_accumulate(soup_server_message_get_request_body(message), FALSE);
    soup_server_message_set_status(message, SOUP_STATUS_REQUEST_ENTITY_TOO_LARGE, nullptr);
    if (const auto* entry = connectionOf(message)) {
        GSocket* socket = g_socket_connection_get_socket(entry->first);
        g_socket_send(socket, refusal.data(), refusal.size(), nullptr, nullptr);
        g_socket_shutdown(socket, FALSE, TRUE, nullptr);
    }
}

void HttpServer::answer(SoupServerMessage* message) {
    if (auto* entry = connectionOf(message)) {
        endTime(entry->second);
    }
    HttpReply reply(message, [weak = std::weak_ptr<HttpServer*>(m_self)](SoupServerMessage* sent) {
        const auto self = weak.lock();
        if (auto* entry = self ? (*self)->connectionOf(sent) : nullptr) {
            (*self)->giveTime(*entry, (*self)->m_patience.response);
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
