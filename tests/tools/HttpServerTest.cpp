#include "tools/publish/HttpServer.h"
#include "tests/tools/HttpFixture.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace qivo::test {
namespace {

using namespace std::chrono_literals;
using testing::HasSubstr;
using testing::Not;

class HttpServing : public HttpFixture {
  protected:
    HttpServing() {
        m_server.route("GET", "/page", [](const HttpRequest&, HttpReply reply) {
            reply.send({200, "text/html", "<p>page</p>", {{"X-Own", "1"}}});
        });
        m_server.route("POST", "/echo", [](const HttpRequest& request, HttpReply reply) {
            reply.send({200,
                        "text/plain",
                        request.method + "|" + request.path + "|" + request.query + "|" + request.header("HOST") + "|" +
                            request.localAddress + "|" + std::to_string(request.localPort) + "|" +
                            request.remoteAddress + "|" + request.body,
                        {}});
        });
        m_server.route("GET", "/later",
                       [this](const HttpRequest&, HttpReply reply) { m_kept.push_back(std::move(reply)); });
        m_server.route("GET", "/never", [](const HttpRequest&, HttpReply) {});
        EXPECT_EQ(m_server.listen(0, 0, true), "");
    }

    std::string ask(const std::string& request) {
        return serve([port = m_server.port(), request] { return test::ask(port, request); });
    }

    std::vector<HttpReply> m_kept;
    HttpServer m_server{{400ms, 800ms}};
};

TEST_F(HttpServing, aPageComesWithItsTypeItsHeadersAndNoSniffing) {
    const std::string answer = ask("GET /page HTTP/1.1\r\nHost: here\r\n\r\n");
    EXPECT_EQ(statusOf(answer), 200);
    EXPECT_EQ(bodyOf(answer), "<p>page</p>");
    EXPECT_THAT(answer, HasSubstr("Content-Type: text/html\r\n"));
    EXPECT_THAT(answer, HasSubstr("X-Own: 1\r\n"));
    EXPECT_THAT(answer, HasSubstr("X-Content-Type-Options: nosniff\r\n"));
    EXPECT_THAT(answer, HasSubstr("Cache-Control: no-store\r\n"));
}

TEST_F(HttpServing, aHeadIsAnsweredWithoutBody) {
    const std::string answer = ask("HEAD /page HTTP/1.1\r\nHost: here\r\n\r\n");
    EXPECT_EQ(statusOf(answer), 200);
    EXPECT_EQ(bodyOf(answer), "");
}

TEST_F(HttpServing, aHandlerSeesMethodPathQueryHostAddressesAndBody) {
    const std::string answer =
        ask("POST /echo?a=%20b HTTP/1.1\r\nHost: cam.local:99\r\nContent-Length: 5\r\n\r\n<x/>\n");
    EXPECT_EQ(bodyOf(answer),
              "POST|/echo|a=%20b|cam.local:99|127.0.0.1|" + std::to_string(m_server.port()) + "|127.0.0.1|<x/>\n");
}

TEST_F(HttpServing, aChunkedBodyIsPutTogether) {
    EXPECT_THAT(bodyOf(ask("POST /echo HTTP/1.1\r\nHost: h\r\nTransfer-Encoding: chunked\r\n\r\n3\r\nabc\r\n2\r\nde\r\n"
                           "0\r\n\r\n")),
                HasSubstr("|abcde"));
}

TEST_F(HttpServing, unknownPathsAndWaysOutOfTheTreeAreNotFound) {
    for (const char* path :
         {"/", "/pag", "/page/", "/page/x", "//page", "/../../etc/passwd", "/%2e%2e/%2e%2e/etc/passwd"}) {
        EXPECT_EQ(statusOf(ask(std::string("GET ") + path + " HTTP/1.1\r\nHost: here\r\n\r\n")), 404) << path;
    }
    for (const char* path : {"/page%00", "/..%2f..%2fetc/passwd", "/%zz"}) {
        EXPECT_EQ(statusOf(ask(std::string("GET ") + path + " HTTP/1.1\r\nHost: here\r\n\r\n")), 400) << path;
    }
}

TEST_F(HttpServing, anotherMethodIsRefusedWithThoseThatThePathTakes) {
    const std::string post = ask("POST /page HTTP/1.1\r\nHost: h\r\nContent-Length: 0\r\n\r\n");
    EXPECT_EQ(statusOf(post), 405);
    EXPECT_THAT(post, HasSubstr("Allow: GET, HEAD\r\n"));
    EXPECT_EQ(statusOf(ask("GET /echo HTTP/1.1\r\nHost: h\r\n\r\n")), 405);
    EXPECT_EQ(statusOf(ask("OPTIONS /echo HTTP/1.1\r\nHost: h\r\n\r\n")), 405);
}

TEST_F(HttpServing, anAnswerMayComeLater) {
    auto answer = std::async(std::launch::async, [port = m_server.port()] {
        return test::ask(port, "GET /later HTTP/1.1\r\nHost: here\r\n\r\n");
    });
    while (m_kept.empty()) {
        g_main_context_iteration(nullptr, TRUE);
    }
    m_kept.front().send({200, "text/plain", "late", {}});
    m_kept.front().send({200, "text/plain", "twice", {}});
    EXPECT_EQ(bodyOf(serve([&answer] { return answer.get(); })), "late");
}

TEST_F(HttpServing, aReplyLetGoAnswersThatNothingWasFound) {
    EXPECT_EQ(statusOf(ask("GET /never HTTP/1.1\r\nHost: here\r\n\r\n")), 500);
}

TEST_F(HttpServing, aReplyThatOutlivesItsServerGoesNowhere) {
    auto server = std::make_unique<HttpServer>();
    server->route("GET", "/later", [this](const HttpRequest&, HttpReply reply) { m_kept.push_back(std::move(reply)); });
    ASSERT_EQ(server->listen(0, 0, true), "");
    RawConnection client(server->port());
    client.send("GET /later HTTP/1.1\r\nHost: here\r\n\r\n");
    while (m_kept.empty()) {
        g_main_context_iteration(nullptr, TRUE);
    }
    server.reset();
    m_kept.front().send({200, "text/plain", "late", {}});
    EXPECT_EQ(client.readAll(), "");
    EXPECT_TRUE(client.ended());
}

TEST_F(HttpServing, theLongestBodyIsTakenAndOneByteMoreIsRefused) {
    const auto post = [](std::size_t bytes) {
        return "POST /echo HTTP/1.1\r\nHost: h\r\nContent-Length: " + std::to_string(bytes) + "\r\n\r\n" +
               std::string(bytes, 'x');
    };
    EXPECT_EQ(statusOf(ask(post(maximumHttpRequestBytes))), 200);
    EXPECT_EQ(statusOf(ask("POST /echo HTTP/1.1\r\nHost: h\r\nContent-Length: " +
                           std::to_string(maximumHttpRequestBytes + 1) + "\r\n\r\n")),
              413);
    EXPECT_EQ(statusOf(ask("POST /echo HTTP/1.1\r\nHost: h\r\nContent-Length: 99999999999999999999\r\n\r\n")), 413);
    EXPECT_EQ(
        statusOf(ask("POST /echo HTTP/1.1\r\nHost: h\r\nExpect: 100-continue\r\nContent-Length: 99999999\r\n\r\n")),
        413);
}

TEST_F(HttpServing, aChunkedBodyWithoutEndIsCutOff) {
    const bool ended = serve([port = m_server.port()] {
        RawConnection client(port);
        client.send("POST /echo HTTP/1.1\r\nHost: h\r\nTransfer-Encoding: chunked\r\n\r\n");
        const std::string chunk = "1000\r\n" + std::string(4096, 'x') + "\r\n";
        for (std::size_t sent = 0; sent <= 4 * maximumHttpRequestBytes && client.send(chunk); sent += 4096) {
        }
        const std::string answer = client.readAll(300ms);
        return client.ended() && statusOf(answer) != 200;
    });
    EXPECT_TRUE(ended);
}

TEST_F(HttpServing, aSilentAndASlowConnectionAreClosed) {
    const auto closed = serve([port = m_server.port()] {
        RawConnection silent(port);
        RawConnection slow(port);
        for (int i = 0; i < 15; ++i) {
            slow.send(i == 0 ? "G" : i == 1 ? "E" : "T");
            slow.readAll(50ms);
        }
        silent.readAll(2s);
        return std::vector<bool>{silent.ended(), slow.ended()};
    });
    EXPECT_EQ(closed, (std::vector<bool>{true, true}));
}

TEST_F(HttpServing, aClientThatDoesNotTakeItsAnswerIsLeft) {
    m_server.route("GET", "/much", [](const HttpRequest&, HttpReply reply) {
        reply.send({200, "text/plain", std::string(64U << 20U, 'x'), {}});
    });
    const std::size_t taken = serve([port = m_server.port()] {
        RawConnection client(port);
        client.send("GET /much HTTP/1.1\r\nHost: h\r\n\r\n");
        std::this_thread::sleep_for(1200ms);
        return client.readAll().size();
    });
    EXPECT_GT(taken, 0U);
    EXPECT_LT(taken, 64U << 20U);
}

TEST_F(HttpServing, aConnectionServesOneRequest) {
    const bool one = serve([port = m_server.port()] {
        RawConnection client(port);
        client.send("GET /page HTTP/1.1\r\nHost: h\r\n\r\nGET /page HTTP/1.1\r\nHost: h\r\n\r\n");
        const std::string answer = client.readAll();
        return answer.find("Connection: close\r\n") != std::string::npos &&
               answer.find("HTTP/1.1", 1) == std::string::npos && client.ended();
    });
    EXPECT_TRUE(one);
}

TEST_F(HttpServing, connectionsOfOneAddressAreLimitedAndRoomReturnsWithTheirEnd) {
    HttpServer server; // patient: the many stay
    server.route("GET", "/page", [](const HttpRequest&, HttpReply reply) { reply.send({200, "", "", {}}); });
    ASSERT_EQ(server.listen(0, 0, true), "");
    const std::string get = "GET /page HTTP/1.1\r\nHost: h\r\n\r\n";
    const auto [beyond, after] = serve([port = server.port(), get] {
        std::vector<std::unique_ptr<RawConnection>> many;
        for (std::size_t i = 0; i < maximumHttpConnectionsOfOne; ++i) {
            many.push_back(std::make_unique<RawConnection>(port));
            many.back()->send("GET ");
            std::this_thread::sleep_for(2ms); // the kernel's queue is shorter than the limit
        }
        const std::string refused = test::ask(port, get);
        many.clear();
        std::string taken;
        for (int i = 0; i < 50 && taken.empty(); ++i) {
            taken = test::ask(port, get);
        }
        return std::pair(refused, taken);
    });
    EXPECT_EQ(beyond, "");
    EXPECT_EQ(statusOf(after), 200);
}

TEST_F(HttpServing, whatIsNoHttpIsRefusedAndHarmsNobody) {
    for (const char* nonsense : {"\r\n\r\n", "GET\r\n\r\n", "GET /page\r\n\r\n", "\x16\x03\x01\x02\x00\r\n\r\n",
                                 "GET http://[ HTTP/1.1\r\n\r\n", "GET /page HTTP/9.9\r\n\r\n",
                                 "POST /echo HTTP/1.1\r\nHost: h\r\nContent-Length: -1\r\n\r\n"}) {
        const std::string answer = serve([port = m_server.port(), nonsense] {
            RawConnection client(port);
            client.send(nonsense);
            return client.readAll(600ms);
        });
        EXPECT_NE(statusOf(answer), 200) << nonsense;
    }
    EXPECT_EQ(statusOf(ask("GET /page HTTP/1.1\r\nHost: here\r\n\r\n")), 200);
}

TEST_F(HttpServing, aBusyPortIsSaidOrPassedBy) {
    HttpServer second;
    const std::string problem = second.listen(m_server.port(), 0, true);
    EXPECT_THAT(problem, testing::StartsWith("cannot serve at HTTP port " + std::to_string(m_server.port())));
    EXPECT_THAT(problem, HasSubstr("in use; choose another with --http-port"));
    EXPECT_EQ(second.port(), 0);
    EXPECT_EQ(second.listen(-1, m_server.port(), true), "");
    EXPECT_NE(second.port(), m_server.port());
    EXPECT_NE(second.port(), 0);
}

TEST_F(HttpServing, stoppedItHoldsNoPort) {
    const int port = m_server.port();
    m_server.stop();
    HttpServer second;
    EXPECT_EQ(second.listen(port, 0, true), "");
}

} // namespace
} // namespace qivo::test
