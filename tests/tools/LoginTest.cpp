#include "tools/publish/Login.h"
#include "tests/tools/Digest.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace qivo::test {
namespace {

using namespace std::chrono_literals;
using testing::HasSubstr;
using testing::Not;
using Verdict = HttpLogin::Verdict;

TEST(LoginOption, aUserAndAPasswordThatMayHoldColons) {
    const auto login = parseLogin("ada:secret:1");
    ASSERT_TRUE(login);
    EXPECT_EQ(login->user, "ada");
    EXPECT_EQ(login->password, "secret:1");
    EXPECT_TRUE(parseLogin("\xC3\xA4:\xE2\x82\xAC \"\\"));
    EXPECT_TRUE(parseLogin(std::string(maximumLoginBytes, 'u') + ":" + std::string(maximumLoginBytes, 'p')));
}

TEST(LoginOption, malformedOnesAreRefused) {
    for (const std::string& text :
         {std::string(), std::string(":"), std::string("ada"), std::string("ada:"), std::string(":secret"),
          std::string("a\"b:x"), std::string("a\\b:x"), std::string("a\nb:x"), std::string("ada:x\x01"),
          std::string("ada:\xFF"), std::string("a\0b:x", 5), std::string(maximumLoginBytes + 1, 'u') + ":p",
          "u:" + std::string(maximumLoginBytes + 1, 'p')}) {
        EXPECT_FALSE(parseLogin(text)) << text;
    }
}

TEST(LoginOption, textsAreComparedWhole) {
    EXPECT_TRUE(equalInConstantTime("", ""));
    EXPECT_TRUE(equalInConstantTime("abc", "abc"));
    for (const auto& [one, other] : std::vector<std::pair<const char*, const char*>>{
             {"abc", "abd"}, {"abc", "xbc"}, {"abc", "ab"}, {"ab", "abc"}, {"", "a"}, {"a", ""}, {"abab", "ab"}}) {
        EXPECT_FALSE(equalInConstantTime(one, other)) << one << " " << other;
    }
}

class HttpLogins : public testing::Test {
  protected:
    HttpLogins() { m_answer.nonce = freshNonce(); }

    std::string freshNonce() { return nonceIn(m_login.challenge(Verdict::refused).headers.at(0).second); }
    Verdict check(const DigestAnswer& answer) { return check(answer.header()); }
    Verdict check(const std::string& header) {
        HttpRequest request;
        request.method = "GET";
        request.sentMethod = "GET";
        request.path = "/page";
        if (!header.empty()) {
            request.headers.emplace_back("Authorization", header);
        }
        return m_login.check(request);
    }

    std::chrono::steady_clock::time_point m_now{1h};
    HttpLogin m_login{{"ada", "secret:1"}, [this] { return m_now += 1us; }};
    DigestAnswer m_answer;
};

TEST_F(HttpLogins, theRightAnswerIsAccepted) {
    EXPECT_EQ(check(m_answer), Verdict::accepted);
    m_answer.count = "00000002";
    m_answer.uri = "http://10.0.0.5/page";
    EXPECT_EQ(check(m_answer), Verdict::accepted);
}

TEST_F(HttpLogins, aChallengeNamesWhatIsTaken) {
    const HttpResponse challenge = m_login.challenge(Verdict::refused);
    EXPECT_EQ(challenge.status, 401);
    ASSERT_EQ(challenge.headers.at(0).first, "WWW-Authenticate");
    EXPECT_THAT(challenge.headers[0].second, testing::StartsWith("Digest realm=\"qivo-publish\", qop=\"auth\""));
    EXPECT_THAT(challenge.headers[0].second, Not(HasSubstr("stale")));
    EXPECT_THAT(m_login.challenge(Verdict::stale).headers.at(0).second, HasSubstr("stale=true"));
}

TEST_F(HttpLogins, everyOtherAnswerIsRefused) {
    const auto spoilt = [this](auto spoil) {
        DigestAnswer answer = m_answer;
        spoil(answer);
        return check(answer);
    };
    EXPECT_EQ(spoilt([](DigestAnswer& answer) { answer.user = "eve"; }), Verdict::refused);
    EXPECT_EQ(spoilt([](DigestAnswer& answer) { answer.user = ""; }), Verdict::refused);
    EXPECT_EQ(spoilt([](DigestAnswer& answer) { answer.password = "secret"; }), Verdict::refused);
    EXPECT_EQ(spoilt([](DigestAnswer& answer) { answer.method = "POST"; }), Verdict::refused);
    EXPECT_EQ(spoilt([](DigestAnswer& answer) { answer.uri = "/other"; }), Verdict::refused);
    EXPECT_EQ(spoilt([](DigestAnswer& answer) { answer.uri = "/page?more"; }), Verdict::refused);
    EXPECT_EQ(spoilt([](DigestAnswer& answer) { answer.realm = "elsewhere"; }), Verdict::refused);
    EXPECT_EQ(spoilt([](DigestAnswer& answer) { answer.count = ""; }), Verdict::refused); // without qop
    for (const char* header : {"", "Digest", "Digest ", "Digest ,,,=", "Digest response", "Basic YWRhOnNlY3JldDox",
                               "Bearer x", "Digest username=\"ada\", response=\"\""}) {
        EXPECT_EQ(check(std::string(header)), Verdict::refused) << header;
    }
}

TEST_F(HttpLogins, anAnswerThatWasOverheardIsWorthNothing) {
    EXPECT_EQ(check(m_answer), Verdict::accepted);
    EXPECT_EQ(check(m_answer), Verdict::stale);
    m_answer.count = "00000000";
    EXPECT_EQ(check(m_answer), Verdict::stale);
    for (const char* count : {"x", "100000001", "-1"}) {
        m_answer.count = count;
        EXPECT_EQ(check(m_answer), Verdict::stale) << count;
    }
}

TEST_F(HttpLogins, countsMayOvertakeEachOtherALittle) {
    for (const char* count : {"00000003", "00000001", "00000002", "00000042"}) {
        m_answer.count = count;
        EXPECT_EQ(check(m_answer), Verdict::accepted) << count;
        EXPECT_EQ(check(m_answer), Verdict::stale) << count;
    }
    m_answer.count = "00000004"; // 62 behind
    EXPECT_EQ(check(m_answer), Verdict::accepted);
    m_answer.count = "00000002"; // 64 behind
    EXPECT_EQ(check(m_answer), Verdict::stale);
}

TEST_F(HttpLogins, aNonceIsTakenForItsLifeAndOnlyIfItIsOurs) {
    m_now += HttpLogin::nonceLife - 1s;
    EXPECT_EQ(check(m_answer), Verdict::accepted);
    m_now += 2s;
    m_answer.count = "00000002";
    EXPECT_EQ(check(m_answer), Verdict::stale);
    for (const std::string& nonce : {std::string(), std::string("1-1"), std::string("x"), "0" + freshNonce(),
                                     freshNonce() + "0", freshNonce().substr(1)}) {
        m_answer.nonce = nonce;
        EXPECT_EQ(check(m_answer), Verdict::stale) << nonce;
    }
    HttpLogin other({"ada", "secret:1"}, [this] { return m_now; });
    m_answer.nonce = nonceIn(other.challenge(Verdict::refused).headers.at(0).second);
    EXPECT_EQ(check(m_answer), Verdict::stale);
}

TEST_F(HttpLogins, whereTooManyNoncesAreInUseTheOldestIsNoLongerTaken) {
    EXPECT_EQ(check(m_answer), Verdict::accepted);
    for (std::size_t i = 0; i < HttpLogin::maximumNonces; ++i) {
        DigestAnswer more;
        more.nonce = freshNonce();
        ASSERT_EQ(check(more), Verdict::accepted) << i;
    }
    m_answer.count = "00000002";
    EXPECT_EQ(check(m_answer), Verdict::stale);
}

} // namespace
} // namespace qivo::test
