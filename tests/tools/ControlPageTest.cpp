#include "tools/publish/page/ControlPage.h"
#include "tests/tools/Digest.h"
#include "tests/tools/HttpFixture.h"

#include <gmock/gmock.h>

namespace qivo::test {
namespace {

using namespace std::chrono_literals;
using testing::HasSubstr;
using testing::Not;
using testing::StartsWith;

PageSubject subject(const std::shared_ptr<Camera>& camera) {
    const PictureFormat format{{320, 180}, {30, 1}, jpegColours};
    const MakePictures make = [format] {
        return std::make_unique<DrawnPictureSource>(format, drawTestPicture(format, {"Cam", {}, 0, {}}));
    };
    return {"/source-1/", "studio", "STUDIO (<b>\"Cam\"</b>)", "320 x 180", camera, format, make, [] { return 3; }};
}

class ControlPages : public HttpFixture {
  protected:
    static void SetUpTestSuite() { gst_init(nullptr, nullptr); }
    ControlPages() { EXPECT_EQ(m_server.listen(0, 0, true), ""); }

    std::string host() const { return "127.0.0.1:" + std::to_string(m_server.port()); }
    std::string ask(const std::string& request) {
        return serve([port = m_server.port(), request] { return test::ask(port, request); });
    }
    std::string get(const std::string& path, const std::string& headers = {}) {
        return ask("GET " + path + " HTTP/1.1\r\nHost: " + host() + "\r\n" + headers + "\r\n");
    }
    int command(const std::string& json) {
        return statusOf(ask(
            jsonPost("/source-1/command", json,
                     "Host: " + host() + "\r\nOrigin: http://" + host() + "\r\nContent-Type: application/json\r\n")));
    }

    Camera::Time m_now{};
    std::shared_ptr<Camera> m_camera = std::make_shared<Camera>([this] { return m_now; });
    HttpServer m_server;
    ControlPage m_page{m_server, subject(m_camera), nullptr};
};

TEST_F(ControlPages, thePageCarriesTheNameEscapedAndForbidsWhatItDoesNotNeed) {
    const std::string answer = get("/source-1/");
    EXPECT_EQ(statusOf(answer), 200);
    EXPECT_THAT(answer, HasSubstr("<h1 id=\"name\">STUDIO (&lt;b&gt;&quot;Cam&quot;&lt;/b&gt;)</h1>"));
    EXPECT_THAT(answer, Not(HasSubstr("<b>")));
    EXPECT_THAT(answer, Not(HasSubstr("{{")));
    EXPECT_THAT(answer, HasSubstr("Content-Type: text/html; charset=utf-8\r\n"));
    EXPECT_THAT(answer, HasSubstr("Content-Security-Policy: default-src 'none'; script-src 'self'"));
    EXPECT_THAT(answer, HasSubstr("frame-ancestors 'none'"));
    EXPECT_THAT(answer, HasSubstr("X-Frame-Options: DENY\r\n"));
    EXPECT_THAT(answer, HasSubstr("X-Content-Type-Options: nosniff\r\n"));
    EXPECT_THAT(answer, HasSubstr("Cross-Origin-Resource-Policy: same-origin\r\n"));
    EXPECT_THAT(get("/source-1/page.js"), HasSubstr("Content-Type: text/javascript"));
    EXPECT_THAT(get("/source-1/page.css"), HasSubstr("Content-Type: text/css"));
}

TEST_F(ControlPages, theStateIsTold) {
    ASSERT_TRUE(m_camera->storePreset("4"));
    EXPECT_EQ(bodyOf(get("/source-1/state")),
              "{\"name\":\"STUDIO (<b>\\\"Cam\\\"</b>)\",\"stream\":\"320 x 180\",\"viewers\":3,\"pan\":0.000000,"
              "\"tilt\":0.000000,\"zoom\":0.000000,\"turning\":false,\"zooming\":false,\"focus\":0.500000,"
              "\"focusing\":false,\"automaticFocus\":true,\"presets\":[4]}");
}

TEST_F(ControlPages, aMovementEndsByItselfUnlessItIsRenewed) {
    EXPECT_EQ(command("{\"command\":\"move\",\"pan\":1,\"tilt\":-0.5}"), 204);
    EXPECT_TRUE(m_camera->state().turning);
    m_now += 900ms;
    EXPECT_EQ(command("{\"command\":\"move\",\"pan\":1,\"tilt\":-0.5}"), 204);
    m_now += 900ms;
    EXPECT_TRUE(m_camera->state().turning);
    m_now += 101ms;
    EXPECT_FALSE(m_camera->state().turning);
}

TEST_F(ControlPages, aStopStopsWhatItNames) {
    EXPECT_EQ(command("{\"command\":\"move\",\"pan\":0.5,\"tilt\":0,\"zoom\":0.1}"), 204);
    EXPECT_EQ(command("{\"command\":\"stop\",\"turn\":true,\"zoom\":false}"), 204);
    EXPECT_FALSE(m_camera->state().turning);
    EXPECT_TRUE(m_camera->state().zooming);
    EXPECT_EQ(command("{\"command\":\"stop\"}"), 204);
    EXPECT_FALSE(m_camera->state().zooming);
}

TEST_F(ControlPages, focusAndPresets) {
    EXPECT_EQ(command("{\"command\":\"focus\",\"value\":0.6}"), 204);
    EXPECT_FALSE(m_camera->state().automaticFocus);
    EXPECT_EQ(command("{\"command\":\"automaticFocus\",\"on\":true}"), 204);
    EXPECT_TRUE(m_camera->state().automaticFocus);
    EXPECT_EQ(command("{\"command\":\"recall\",\"preset\":2}"), 400);
    EXPECT_EQ(command("{\"command\":\"store\",\"preset\":2}"), 204);
    EXPECT_EQ(m_camera->presets().count(2), 1U);
    EXPECT_EQ(command("{\"command\":\"recall\",\"preset\":2}"), 204);
}

TEST_F(ControlPages, badCommandsAreRefusedAndMoveNothing) {
    for (const char* json : {"",
                             "x",
                             "[]",
                             "{}",
                             "{\"command\":1}",
                             "{\"command\":\"dance\"}",
                             "{\"command\":\"move\"}",
                             "{\"command\":\"move\",\"pan\":1}",
                             "{\"command\":\"move\",\"tilt\":1}",
                             "{\"command\":\"move\",\"pan\":1.01,\"tilt\":0}",
                             "{\"command\":\"move\",\"pan\":nan,\"tilt\":0}",
                             "{\"command\":\"move\",\"pan\":\"1\",\"tilt\":0}",
                             "{\"command\":\"move\",\"zoom\":-1.5}",
                             "{\"command\":\"focus\"}",
                             "{\"command\":\"focus\",\"value\":1.5}",
                             "{\"command\":\"automaticFocus\"}",
                             "{\"command\":\"store\"}",
                             "{\"command\":\"store\",\"preset\":0}",
                             "{\"command\":\"store\",\"preset\":10}",
                             "{\"command\":\"store\",\"preset\":1.5}",
                             "{\"command\":\"store\",\"preset\":\"1\"}",
                             "{\"command\":\"recall\",\"preset\":-1}"}) {
        EXPECT_EQ(command(json), 400) << json;
    }
    EXPECT_EQ(m_camera->serial(), Camera().serial());
}

TEST_F(ControlPages, aCommandThatWasOvertakenDoesNotCount) {
    EXPECT_EQ(command("{\"command\":\"stop\",\"page\":\"abc\",\"order\":5}"), 204);
    EXPECT_EQ(command("{\"command\":\"move\",\"zoom\":1,\"page\":\"abc\",\"order\":4}"), 409);
    EXPECT_FALSE(m_camera->state().zooming);
    EXPECT_EQ(command("{\"command\":\"move\",\"zoom\":1,\"page\":\"other\",\"order\":1}"), 204);
    EXPECT_TRUE(m_camera->state().zooming);
}

TEST_F(ControlPages, commandsOfOtherPagesAreRefused) {
    const std::string move = "{\"command\":\"move\",\"zoom\":1}";
    const std::string type = "Content-Type: application/json\r\n";
    const std::string own = "Origin: http://" + host() + "\r\n";
    EXPECT_EQ(statusOf(ask(jsonPost("/source-1/command", move, "Host: " + host() + "\r\n" + type))), 403);
    EXPECT_EQ(statusOf(ask(jsonPost("/source-1/command", move,
                                    "Host: " + host() + "\r\nOrigin: http://evil.example\r\n" + type))),
              403);
    EXPECT_EQ(statusOf(ask(jsonPost("/source-1/command", move,
                                    "Host: " + host() + "\r\n" + own + "Content-Type: text/plain\r\n"))),
              403);
    EXPECT_EQ(statusOf(ask(
                  jsonPost("/source-1/command", move, "Host: evil.example\r\nOrigin: http://evil.example\r\n" + type))),
              421);
    EXPECT_EQ(statusOf(get("/source-1/command")), 405);
    EXPECT_FALSE(m_camera->state().zooming);
}

TEST_F(ControlPages, noPartIsShownUnderAnotherName) {
    for (const char* part : {"", "page.js", "page.css", "state", "picture.jpg"}) {
        EXPECT_EQ(statusOf(ask(std::string("GET /source-1/") + part + " HTTP/1.1\r\nHost: evil.example\r\n\r\n")), 421)
            << part;
    }
    EXPECT_EQ(statusOf(get("/source-1/", "Sec-Fetch-Site: cross-site\r\n")), 200); // a link leads here
    EXPECT_EQ(statusOf(get("/source-1/state", "Sec-Fetch-Site: cross-site\r\n")), 403);
    EXPECT_EQ(statusOf(get("/source-1/picture.jpg", "Sec-Fetch-Site: cross-site\r\n")), 403);
    EXPECT_FALSE(m_page.encoding());
}

std::string pictureNumber(const std::string& answer) {
    const std::size_t begin = answer.find("X-Picture: ");
    return begin == std::string::npos ? "" : answer.substr(begin + 11, answer.find('\r', begin) - begin - 11);
}

TEST_F(ControlPages, picturesFollowEachOtherAndAreEncodedWhileSomebodyLooks) {
    EXPECT_FALSE(m_page.encoding());
    std::string number = "0";
    for (int i = 0; i < 4; ++i) {
        const std::string answer = get("/source-1/picture.jpg?page=abc&after=" + number);
        ASSERT_EQ(statusOf(answer), 200);
        EXPECT_THAT(answer, HasSubstr("Content-Type: image/jpeg\r\n"));
        EXPECT_THAT(bodyOf(answer), StartsWith("\xFF\xD8\xFF"));
        EXPECT_NE(pictureNumber(answer), number);
        number = pictureNumber(answer);
    }
    EXPECT_TRUE(m_page.encoding());
    EXPECT_EQ(m_page.viewers(), 4);
    const auto begin = std::chrono::steady_clock::now();
    while (m_page.encoding() && std::chrono::steady_clock::now() - begin < 20s) {
        g_main_context_iteration(nullptr, TRUE);
    }
    EXPECT_FALSE(m_page.encoding());
    EXPECT_GE(std::chrono::steady_clock::now() - begin, 2500ms);
    EXPECT_EQ(m_page.viewers(), 3);
    EXPECT_EQ(statusOf(get("/source-1/picture.jpg?page=abc&after=" + number)), 200);
}

TEST_F(ControlPages, aFloodOfPageNamesIsBounded) {
    for (std::size_t i = 0; i < ControlPage::maximumPages + 5; ++i) {
        get("/source-1/picture.jpg?page=p" + std::to_string(i));
    }
    EXPECT_EQ(m_page.viewers(), 3 + static_cast<int>(ControlPage::maximumPages));
    get("/source-1/picture.jpg?page=" + std::string(ControlPage::maximumPageNameBytes + 1, 'x'));
    EXPECT_EQ(m_page.viewers(), 3 + static_cast<int>(ControlPage::maximumPages));
}

TEST_F(ControlPages, aLoginGuardsEveryPart) {
    HttpServer server;
    const auto login = std::make_shared<HttpLogin>(Login{"ada", "secret:1"});
    ControlPage page(server, subject(m_camera), login);
    ASSERT_EQ(server.listen(0, 0, true), "");
    const std::string where = "Host: 127.0.0.1:" + std::to_string(server.port()) + "\r\n";
    const auto askThere = [&](const std::string& request) {
        return serve([port = server.port(), request] { return test::ask(port, request); });
    };
    std::string challenge;
    for (const char* part : {"", "page.js", "page.css", "state", "picture.jpg"}) {
        challenge = askThere(std::string("GET /source-1/") + part + " HTTP/1.1\r\n" + where + "\r\n");
        EXPECT_EQ(statusOf(challenge), 401) << part;
        EXPECT_THAT(challenge, HasSubstr("WWW-Authenticate: Digest "));
    }
    const std::string ownPage = where + "Origin: http://" + where.substr(6) + "Content-Type: application/json\r\n";
    EXPECT_EQ(statusOf(askThere(jsonPost("/source-1/command", "{\"command\":\"move\",\"zoom\":1}", ownPage))), 401);
    EXPECT_FALSE(m_camera->state().zooming);
    DigestAnswer answer;
    answer.nonce = nonceIn(challenge);
    answer.uri = "/source-1/state";
    const std::string in =
        "GET /source-1/state HTTP/1.1\r\n" + where + "Authorization: " + answer.header() + "\r\n\r\n";
    EXPECT_EQ(statusOf(askThere(in)), 200);
    EXPECT_THAT(askThere(in), HasSubstr("stale=true"));
    answer.count = "00000002";
    answer.uri = "/source-1/command";
    answer.method = "POST";
    EXPECT_EQ(statusOf(askThere(jsonPost("/source-1/command", "{\"command\":\"move\",\"zoom\":1}",
                                         ownPage + "Authorization: " + answer.header() + "\r\n"))),
              204);
    EXPECT_TRUE(m_camera->state().zooming);
}

} // namespace
} // namespace qivo::test
