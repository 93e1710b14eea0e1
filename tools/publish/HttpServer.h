#pragma once

#include "tools/publish/Handles.h"

#include <chrono>
#include <cstddef>
#include <functional>
#include <libsoup/soup.h>
#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace qivo {

/** A request whose body is longer is refused with 413. */
inline constexpr std::size_t maximumHttpRequestBytes = 65536;

/** Connections at a time, in all and from one address; what comes beyond is closed at once. */
inline constexpr std::size_t maximumHttpConnections = 64;
inline constexpr std::size_t maximumHttpConnectionsOfOne = 32;

/** What a client gets, and how long it may take for it, before its connection is closed. */
struct HttpPatience {
    std::chrono::milliseconds request{15000};  ///< a whole request, since the connection's begin or its last answer
    std::chrono::milliseconds response{30000}; ///< the taking of a whole answer
};

/** A whole request, as a handler sees it. */
struct HttpRequest {
    std::string method; ///< "GET", "POST" and so on; a HEAD comes as "GET"
    std::string
        path; ///< as sent, normalised: no dot segments, nothing percent-encoded that need not be; begins with "/"
    std::string query; ///< without "?", as sent; empty if there is none
    std::string body;  ///< at most maximumHttpRequestBytes
    std::vector<std::pair<std::string, std::string>> headers;
    std::string localAddress; ///< at which the client reached this machine, for instance "192.168.1.7"
    int localPort = 0;
    std::string remoteAddress; ///< the client's

    /** The value of a header, its name in any case; of several with a comma between. Empty if it was not sent. */
    [[nodiscard]] std::string header(std::string_view name) const;
};

struct HttpResponse {
    int status = 200;
    std::string contentType; ///< not sent where empty
    std::string body;
    std::vector<std::pair<std::string, std::string>> headers; ///< further ones
};

/** The one answer to a request, now or later, on the server's thread. One that is let go unsent answers 500. */
class HttpReply {
  public:
    explicit HttpReply(SoupServerMessage* message, std::function<void(SoupServerMessage*)> sent);
    ~HttpReply();
    HttpReply(HttpReply&& other) noexcept;
    HttpReply& operator=(HttpReply&& other) noexcept;

    /** Sends it. Does nothing once the client or the server is gone, nor a second time. */
    void send(const HttpResponse& response);

  private:
    struct Exchange;
    std::unique_ptr<Exchange> m_exchange;
};

using HttpHandler = std::function<void(const HttpRequest& request, HttpReply reply)>;

/** An HTTP/1.1 server over IPv4 with exact paths: nothing is looked up in any file system. Every answer carries
 *  "X-Content-Type-Options: nosniff" and, unless it says otherwise, "Cache-Control: no-store". Lives on the thread of
 *  the default main context, where its handlers are called. */
class HttpServer {
  public:
    explicit HttpServer(HttpPatience patience = {});
    ~HttpServer();
    HttpServer(const HttpServer&) = delete;
    HttpServer& operator=(const HttpServer&) = delete;

    /** Answers requests of this method and path; "GET" takes HEAD too. A later handler replaces an earlier one. Paths
     *  that nobody answers get 404, methods that the path does not take 405. */
    void route(const std::string& method, const std::string& path, HttpHandler handler);

    /** Begins to listen, on 127.0.0.1 or on every interface. `port` is 0 for any free one, -1 for `preferred` or, where
     *  that is busy, any free one. Empty, or one line that says why not. */
    [[nodiscard]] std::string listen(int port, int preferred, bool loopbackOnly);

    /** The port it listens at; 0 before. */
    [[nodiscard]] int port() const { return m_port; }

    /** Closes every connection and stops listening. Replies that are still out go nowhere. */
    void stop();

  private:
    struct Connection {
        std::string address;
        guint timer = 0; // closes it
    };

    [[nodiscard]] bool bind(int port, bool loopbackOnly, std::string& reason);
    void awaitRequest(SoupServerMessage* message);
    static void onGone(gpointer server, GObject* socket);
    void giveTime(SoupServerMessage* message, std::chrono::milliseconds time);
    static void endTime(Connection& connection);
    static void bound(SoupServerMessage* message);
    static void refuseLength(SoupServerMessage* message);
    void answer(SoupServerMessage* message);
    [[nodiscard]] HttpResponse refusal(const std::string& path) const;

    HttpPatience m_patience;
    std::shared_ptr<HttpServer*> m_self = std::make_shared<HttpServer*>(this); // for replies that outlive the server
    std::map<std::string, std::map<std::string, HttpHandler>> m_routes;        // by path, then method
    std::map<GSocket*, Connection> m_connections;                              // libsoup's; each leaves with its end
    Object<SoupServer> m_server;
    int m_port = 0;
};

} // namespace qivo
