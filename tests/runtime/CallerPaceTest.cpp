#include "runtime/CallerPace.h"

#include <gtest/gtest.h>

namespace qivo::runtime {
namespace {

using namespace std::chrono_literals;

constexpr auto kTick = CallerPace::Time::duration(1);

class CallerPaceTest : public testing::Test {
  protected:
    CallerPace m_pace;
    CallerPace::Time m_now{1h};
};

TEST_F(CallerPaceTest, WhoHasNeverLookedDoesNotKeepUp) {
    EXPECT_FALSE(m_pace.keepsUp());
    m_pace.looks(m_now, true);
    EXPECT_FALSE(m_pace.keepsUp()) << "what it finds may have waited for long";
}

TEST_F(CallerPaceTest, WhoFindsNoneKeepsUp) {
    m_pace.looks(m_now, false);
    EXPECT_TRUE(m_pace.keepsUp());
    m_pace.looks(m_now + 1h, false);
    EXPECT_TRUE(m_pace.keepsUp()) << "nothing came meanwhile";
}

TEST_F(CallerPaceTest, WhoLooksLateDoesNotKeepUp) {
    m_pace.looks(m_now, false);
    EXPECT_EQ(m_pace.looksBy(), m_now + CallerPace::kLooksOften);
    m_pace.looks(m_pace.looksBy(), true);
    EXPECT_TRUE(m_pace.keepsUp());
    m_pace.looks(m_now + 2 * CallerPace::kLooksOften + kTick, true);
    EXPECT_FALSE(m_pace.keepsUp());
    m_pace.looks(m_now + 3 * CallerPace::kLooksOften, true);
    EXPECT_TRUE(m_pace.keepsUp()) << "it looks often again, and it is not long since it found none";
}

TEST_F(CallerPaceTest, WhoFindsOneAtEveryLookIsTooSlowInTheEnd) {
    m_pace.looks(m_now, false);
    for (auto passed = 10ms; passed <= CallerPace::kCatchesUp; passed += 10ms) {
        m_pace.looks(m_now + passed, true);
        ASSERT_TRUE(m_pace.keepsUp()) << passed.count();
    }
    m_pace.looks(m_now + CallerPace::kCatchesUp + kTick, true);
    EXPECT_FALSE(m_pace.keepsUp());
}

TEST_F(CallerPaceTest, WhoWasTooSlowKeepsUpOnceItFindsNoneAgainAndAgain) {
    m_pace.looks(m_now, false);
    m_now += CallerPace::kCatchesUp + kTick;
    m_pace.looks(m_now, true);
    m_now += 10ms;
    m_pace.looks(m_now, false);
    EXPECT_FALSE(m_pace.keepsUp()) << "a picture may have been late";
    m_now += CallerPace::kNoAccident + kTick;
    m_pace.looks(m_now, false);
    EXPECT_FALSE(m_pace.keepsUp());
    m_now += CallerPace::kNoAccident;
    m_pace.looks(m_now, false);
    EXPECT_TRUE(m_pace.keepsUp());
    m_pace.looks(m_now + 10ms, true);
    EXPECT_TRUE(m_pace.keepsUp());
}

TEST_F(CallerPaceTest, WhoIsALittleSlowerThanTheSourceDoesNotKeepUpByAccident) {
    m_pace.looks(m_now, false);
    const auto until = m_now + 20s;
    for (int look = 1; m_now < until; ++look) {
        m_now += 20ms;
        const bool pictureIsLate = m_now > until - 17s && look % 50 == 0;
        m_pace.looks(m_now, !pictureIsLate);
        ASSERT_EQ(m_pace.keepsUp(), look * 20ms <= CallerPace::kCatchesUp) << look;
    }
}

TEST_F(CallerPaceTest, WhoWaitsForAPictureKeepsUpMeanwhile) {
    m_pace.looks(m_now, false);
    m_now += 1h;
    m_pace.waited(m_now);
    for (const auto passed : {CallerPace::kLooksOften, 2 * CallerPace::kLooksOften}) {
        m_pace.looks(m_now + passed, true);
        EXPECT_TRUE(m_pace.keepsUp());
    }
}

} // namespace
} // namespace qivo::runtime
