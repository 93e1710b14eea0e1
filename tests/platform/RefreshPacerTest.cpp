#include "platform/RefreshPacer.h"

#include <cmath>
#include <gtest/gtest.h>
#include <limits>

namespace qivo::test {
namespace {

using namespace std::chrono_literals;
using Time = RefreshPacer::Time;
using Duration = RefreshPacer::Duration;

constexpr Duration kPeriod = 16'666'667ns;
constexpr Duration kPause = kPeriod / RefreshPacer::kPause;
const Time kStart{1000s};

/// Runs passes as a refresh thread does, on a clock of the test's own.
class Loop {
  public:
    explicit Loop(Duration period = kPeriod) : pacer(period) {}

    /// Waits until the next pass is due, runs it, and lets it take so long. Returns when it began.
    Time pass(Duration takes) {
        now = std::max(now, pacer.due());
        const Time begun = now;
        pacer.begin(now);
        now += takes;
        pacer.end(now);
        return begun;
    }

    /// A pass whose swap waits for the display's next retrace.
    Time passUntilRetrace(Duration work, Duration displayPeriod) {
        const Time begun = pass(work);
        const auto retraces = (now - kStart) / displayPeriod + 1;
        now = kStart + retraces * displayPeriod;
        return begun;
    }

    void settleOnClock() {
        for (int i = 0; i < 20; ++i) {
            pass(100us);
        }
        ASSERT_TRUE(pacer.pacedByClock());
    }

    RefreshPacer pacer;
    Time now = kStart;
};

TEST(RefreshPacerTest, PeriodOfARateWhateverIsReported) {
    EXPECT_EQ(RefreshPacer::periodOfRate(50), 20ms);
    EXPECT_EQ(RefreshPacer::periodOfRate(60), kPeriod);
    const Duration usual = RefreshPacer::periodOfRate(RefreshPacer::kDefaultRate);
    EXPECT_EQ(RefreshPacer::periodOfRate(0), usual);
    EXPECT_EQ(RefreshPacer::periodOfRate(-1), usual);
    EXPECT_EQ(RefreshPacer::periodOfRate(std::nan("")), usual);
    EXPECT_EQ(RefreshPacer::periodOfRate(1e-300), 1s);
    EXPECT_EQ(RefreshPacer::periodOfRate(RefreshPacer::kSlowestRate), 1s);
    EXPECT_EQ(RefreshPacer::periodOfRate(std::numeric_limits<double>::infinity()), 1ms);
    EXPECT_EQ(RefreshPacer::periodOfRate(RefreshPacer::kFastestRate), 1ms);
}

TEST(RefreshPacerTest, SwapsThatWaitPaceWithoutTheClock) {
    Loop loop;
    Time last = loop.passUntilRetrace(2ms, kPeriod);
    for (int i = 0; i < 10'000; ++i) {
        const Time begun = loop.passUntilRetrace(2ms, kPeriod);
        ASSERT_EQ(begun - last, i == 0 ? begun - last : kPeriod);
        last = begun;
    }
    EXPECT_FALSE(loop.pacer.pacedByClock());
}

TEST(RefreshPacerTest, ADisplaySomewhatFasterThanReportedIsFollowed) {
    Loop loop;
    for (int i = 0; i < 10'000; ++i) {
        loop.passUntilRetrace(1ms, 15ms); // 66.7 instead of 60 a second
    }
    EXPECT_FALSE(loop.pacer.pacedByClock());
}

TEST(RefreshPacerTest, ADisplayThatQueuesPicturesFirstIsFollowed) {
    Loop loop;
    for (int i = 0; i < 3; ++i) {
        loop.pass(200us);
    }
    for (int i = 0; i < 1000; ++i) {
        loop.passUntilRetrace(200us, kPeriod);
    }
    EXPECT_FALSE(loop.pacer.pacedByClock());
}

TEST(RefreshPacerTest, SwapsThatReturnAtOnceLeaveItToTheClock) {
    Loop loop;
    int passes = 0;
    while (loop.now < kStart + 1s) {
        loop.pass(100us);
        ++passes;
    }
    EXPECT_TRUE(loop.pacer.pacedByClock());
    EXPECT_GE(passes, 60);
    EXPECT_LE(passes, 60 + RefreshPacer::kSwapQueue + 2);
}

TEST(RefreshPacerTest, TheClockDoesNotDrift) {
    Loop loop;
    loop.settleOnClock();
    const Time first = loop.pass(100us);
    Time last = first;
    constexpr int kPasses = 100'000;
    for (int i = 0; i < kPasses; ++i) {
        last = loop.pass(i % 7 == 0 ? 9ms : 300us);
        loop.now += 50us; // a thread never wakes up in time
    }
    EXPECT_EQ(last - first, kPasses * kPeriod);
}

TEST(RefreshPacerTest, ALatePassKeepsTheGrid) {
    Loop loop;
    loop.settleOnClock();
    const Time first = loop.pass(100us);
    loop.pass(kPeriod + 5ms);
    EXPECT_EQ(loop.pass(100us) - first, 2 * kPeriod + 5ms + kPause);
    EXPECT_EQ(loop.pass(100us) - first, 3 * kPeriod);
}

TEST(RefreshPacerTest, NoBurstAfterAStall) {
    Loop loop;
    loop.settleOnClock();
    loop.pass(3s);
    const Time after = loop.pass(100us);
    for (int i = 1; i <= 10; ++i) {
        EXPECT_EQ(loop.pass(100us) - after, i * kPeriod);
    }
}

TEST(RefreshPacerTest, NoBurstAfterAStallWhileSwapsWait) {
    Loop loop;
    for (int i = 0; i < 100; ++i) {
        loop.passUntilRetrace(1ms, kPeriod);
    }
    loop.now += 10s;
    // Now swaps return at once: the stall must not have earned more passes than the queue holds.
    const Time after = loop.now;
    int passes = 0;
    while (loop.now < after + 1s) {
        loop.pass(100us);
        ++passes;
    }
    EXPECT_LE(passes, 60 + RefreshPacer::kSwapQueue + 2);
}

/// Passes that take long, and how far apart they begin.
void runLongPasses(Loop& loop, Duration takes, Duration apart) {
    Time last = loop.pass(takes);
    for (int i = 0; i < 100; ++i) {
        const Time begun = loop.pass(takes);
        ASSERT_EQ(begun - last, apart);
        last = begun;
    }
}

TEST(RefreshPacerTest, WorkLongerThanAPeriodRunsBackToBackWhereSwapsMayWait) {
    Loop loop;
    runLongPasses(loop, 20ms, 20ms);
    EXPECT_FALSE(loop.pacer.pacedByClock());
}

TEST(RefreshPacerTest, WorkLongerThanAPeriodLeavesAPauseWhereTheClockPaces) {
    Loop loop;
    loop.settleOnClock();
    runLongPasses(loop, 20ms, 20ms + kPause);
}

TEST(RefreshPacerTest, WorkThatFitsIsNotSlowedDownByThePause) {
    Loop loop;
    loop.settleOnClock();
    loop.pass(100us);
    runLongPasses(loop, kPeriod - kPause, kPeriod);
}

TEST(RefreshPacerTest, APauseEndsWithARestart) {
    Loop loop;
    loop.settleOnClock();
    loop.pass(20ms);
    loop.pacer.restart();
    EXPECT_LE(loop.pacer.due(), loop.now);
}

TEST(RefreshPacerTest, AfterARestartItLooksAfresh) {
    Loop loop;
    loop.settleOnClock();
    loop.pacer.restart();
    for (int i = 0; i < 100; ++i) {
        loop.passUntilRetrace(1ms, kPeriod);
    }
    EXPECT_FALSE(loop.pacer.pacedByClock());
}

TEST(RefreshPacerTest, ANewPeriodHolds) {
    Loop loop;
    loop.settleOnClock();
    loop.pacer.setPeriod(20ms);
    loop.pass(100us);
    const Time first = loop.pass(100us);
    EXPECT_EQ(loop.pass(100us) - first, 20ms);
}

} // namespace
} // namespace qivo::test
