#include "tests/tools/OnvifFixture.h"
#include "tests/tools/OnvifToken.h"
#include "tools/publish/onvif/Duration.h"

namespace qivo::test {
namespace {

using namespace std::chrono_literals;
using testing::HasSubstr;

class OnvifLogin : public OnvifFixture {
  protected:
    OnvifLogin() {
        makeDevice(std::make_shared<UsernameTokens>(Login{"admin", "secret"}, [this] { return m_utc; }));
    }

    Token token(std::chrono::seconds off = 0s) {
        Token made;
        made.created = utcText(m_utc + off);
        made.nonce += std::to_string(++m_nonces);
        return made;
    }
    bool accepted(const Token& made, const std::string& operation = "Stop") {
        const OnvifAnswer found =
            answer(soap(call(ptzSpace, operation, "<ProfileToken>full</ProfileToken>"), made.xml()));
        if (found.status != 200) {
            EXPECT_THAT(found.body, HasSubstr("ter:NotAuthorized"));
        }
        return found.status == 200;
    }

    std::chrono::system_clock::time_point m_utc{std::chrono::seconds(1795230154)};
    int m_nonces = 0;
};

TEST_F(OnvifLogin, aDigestOfTheRightPasswordIsAccepted) {
    EXPECT_TRUE(accepted(token()));
}

TEST_F(OnvifLogin, theDigestIsThatOfTheStandard) {
    // SHA-1 of "nonce" "2026-01-01T00:00:00Z" "secret", computed by another program.
    EXPECT_EQ(passwordDigest("nonce", "2026-01-01T00:00:00Z", "secret"), "pnjj9YytzZmPCimFk6SD59iS/Q4=");
}

TEST_F(OnvifLogin, withoutATokenAChallengeIsAskedFor) {
    const OnvifAnswer found = answer(soap(call(ptzSpace, "GetNodes")));
    EXPECT_EQ(found.status, 401);
    EXPECT_TRUE(found.challenge);
    EXPECT_THAT(found.body, HasSubstr("ter:NotAuthorized"));
}

TEST_F(OnvifLogin, whatTheTransportHasSeenIsEnough) {
    EXPECT_EQ(m_device->answer(soap(call(ptzSpace, "GetNodes")), m_place, true).status, 200);
}

TEST_F(OnvifLogin, wrongUsersPasswordsAndClearTextAreRefused) {
    Token user = token();
    user.user = "Admin";
    EXPECT_FALSE(accepted(user));
    Token password = token();
    password.password = "Secret";
    EXPECT_FALSE(accepted(password));
    Token clear = token();
    clear.type = "#PasswordText";
    clear.given = "secret";
    EXPECT_FALSE(accepted(clear));
    Token disguised = token();
    disguised.given = "secret";
    EXPECT_FALSE(accepted(disguised));
    Token none = token();
    none.nonce = "";
    EXPECT_FALSE(accepted(none));
}

TEST_F(OnvifLogin, aTokenIsGoodOnce) {
    const Token made = token();
    EXPECT_TRUE(accepted(made));
    EXPECT_FALSE(accepted(made));
    m_utc += 1s;
    EXPECT_FALSE(accepted(made));
    EXPECT_TRUE(accepted(token()));
}

TEST_F(OnvifLogin, aTokenIsGoodForFurtherQuestionsForAMoment) {
    const Token made = token();
    EXPECT_TRUE(accepted(made, "GetNodes"));
    m_utc += UsernameTokens::repetition;
    EXPECT_TRUE(accepted(made, "GetStatus"));
    EXPECT_FALSE(accepted(made, "Stop"));
    m_utc += 1s;
    EXPECT_FALSE(accepted(made, "GetStatus"));
}

TEST_F(OnvifLogin, tokensOfOneSecondAreToldApart) {
    Token one = token();
    Token other = one;
    one.created = utcText(m_utc).substr(0, 19) + ".001Z";
    other.created = utcText(m_utc).substr(0, 19) + ".002Z";
    EXPECT_TRUE(accepted(one));
    EXPECT_TRUE(accepted(other));
    EXPECT_FALSE(accepted(one));
}

TEST_F(OnvifLogin, clocksMayBeOffByTheToleranceAndNoMore) {
    EXPECT_TRUE(accepted(token(UsernameTokens::tolerance)));
    EXPECT_TRUE(accepted(token(-UsernameTokens::tolerance)));
    EXPECT_FALSE(accepted(token(UsernameTokens::tolerance + 1s)));
    EXPECT_FALSE(accepted(token(-UsernameTokens::tolerance - 1s)));
    Token late = token();
    m_utc += UsernameTokens::tolerance + 1s;
    EXPECT_FALSE(accepted(late));
    for (const char* created : {"", "now", "2026", "2026-13-01T00:00:00Z", "1795230154"}) {
        Token wrong = token();
        wrong.created = created;
        EXPECT_FALSE(accepted(wrong)) << created;
    }
}

TEST_F(OnvifLogin, aWrongTokenDoesNotSpendItsNonce) {
    Token wrong = token();
    wrong.password = "x";
    EXPECT_FALSE(accepted(wrong));
    wrong.password = "secret";
    EXPECT_TRUE(accepted(wrong));
}

TEST_F(OnvifLogin, timeZonesAndFractionsOfSecondsAreRead) {
    Token zone = token();
    zone.created = utcText(m_utc + 2h).substr(0, 19) + ".125+02:00";
    EXPECT_TRUE(accepted(zone));
}

TEST_F(OnvifLogin, onlyWhatTellsHowToLogInIsOpen) {
    for (const OnvifService& service : onvifServices()) {
        for (std::size_t i = 0; i < service.count; ++i) {
            const std::string name(service.first[i].name);
            const bool open = answer(soap(call(std::string(service.space), name))).status == 200;
            const bool meant = name == "GetSystemDateAndTime" || name == "GetServices" || name == "GetCapabilities" ||
                               name == "GetServiceCapabilities" || name == "GetHostname" ||
                               name == "GetEndpointReference" || name == "GetWsdlUrl";
            EXPECT_EQ(open, meant) << name;
        }
    }
    EXPECT_EQ(answer(soap(call(ptzSpace, "Explode"))).status, 401);
}

} // namespace
} // namespace qivo::test
