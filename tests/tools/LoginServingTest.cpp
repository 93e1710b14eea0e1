#include "tests/tools/Digest.h"
#include "tests/tools/HttpClient.h"
#include "tests/tools/Publisher.h"
#include "tests/tools/Watcher.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdlib>

namespace qivo::test {
namespace {

using namespace std::chrono_literals;
using testing::HasSubstr;
using testing::Not;

/// A camera that wants a login.
class LoginServing : public testing::Test {
  protected:
    static int portOf(const std::string& address) { return std::atoi(address.c_str() + address.rfind(':') + 1); }
    std::string withLogin(const std::string& login) const {
        return "rtsp://" + login + "@" + m_publisher.address(0).substr(7);
    }
    /// The answer to an RTSP request, sent with what `authorization` holds, if anything.
    std::string describe(const std::string& authorization) const {
        RawConnection connection(portOf(m_publisher.address(0)));
        connection.send("DESCRIBE " + m_publisher.address(0) + " RTSP/1.0\r\nCSeq: 1\r\n" + authorization + "\r\n");
        return connection.readUntil("\r\n\r\n");
    }
    std::string post(const std::string& xml, const std::string& authorization = {}) const {
        return ask(portOf(m_publisher.address(2)),
                   jsonPost("/source-1/onvif/media", xml,
                            "Host: 127.0.0.1\r\nContent-Type: application/soap+xml\r\n" + authorization));
    }

    PublishProcess m_publisher{{"--ptz", "--http-port", "0", "--login", "ada:secret:1"}, 4};
};

TEST_F(LoginServing, streamsAreForThoseWhoLogIn) {
    const std::string refused = describe("");
    EXPECT_THAT(refused, testing::StartsWith("RTSP/1.0 401"));
    EXPECT_THAT(refused, HasSubstr("WWW-Authenticate: Digest realm=\"qivo-publish\""));
    EXPECT_THAT(refused, Not(HasSubstr("Basic")));
    EXPECT_THAT(describe("Authorization: Basic YWRhOnNlY3JldDox\r\n"), testing::StartsWith("RTSP/1.0 401"));

    Watcher wrong(withLogin("ada:wrong"), "tcp");
    EXPECT_TRUE(wrong.waitForEnd(10s));
    Watcher right(withLogin("ada:secret%3A1"), "tcp");
    EXPECT_TRUE(right.next());
}

TEST_F(LoginServing, onvifTakesHttpDigest) {
    const std::string profiles = "<s:Envelope xmlns:s=\"http://www.w3.org/2003/05/soap-envelope\"><s:Body>"
                                 "<GetProfiles xmlns=\"http://www.onvif.org/ver10/media/wsdl\"/></s:Body></s:Envelope>";
    const std::string refused = post(profiles);
    EXPECT_EQ(statusOf(refused), 401);
    EXPECT_THAT(refused, HasSubstr("WWW-Authenticate: Digest realm=\"qivo-publish\""));
    EXPECT_THAT(refused, HasSubstr("NotAuthorized"));
    DigestAnswer answer;
    answer.nonce = nonceIn(refused);
    answer.method = "POST";
    answer.uri = "/source-1/onvif/media";
    const std::string accepted = post(profiles, "Authorization: " + answer.header() + "\r\n");
    EXPECT_EQ(statusOf(accepted), 200);
    EXPECT_THAT(accepted, HasSubstr("GetProfilesResponse"));
    EXPECT_EQ(statusOf(post(profiles, "Authorization: " + answer.header() + "\r\n")), 401); // overheard
}

TEST_F(LoginServing, thePageIsForThoseWhoLogInAndNothingTellsThePassword) {
    const int port = portOf(m_publisher.address(2));
    const std::string get = "GET /source-1/ HTTP/1.1\r\nHost: 127.0.0.1:" + std::to_string(port) + "\r\n";
    const std::string refused = ask(port, get + "\r\n");
    EXPECT_EQ(statusOf(refused), 401);
    DigestAnswer answer;
    answer.nonce = nonceIn(refused);
    answer.uri = "/source-1/";
    EXPECT_EQ(statusOf(ask(port, get + "Authorization: " + answer.header() + "\r\n\r\n")), 200);
    EXPECT_THAT(m_publisher.lines(), testing::Each(Not(HasSubstr("secret"))));
    EXPECT_THAT(m_publisher.errors(), Not(HasSubstr("secret")));
}

} // namespace
} // namespace qivo::test
