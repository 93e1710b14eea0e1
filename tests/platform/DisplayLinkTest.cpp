#include "platform/ThreadDisplayLink.h"

#include "platform/FairLock.h"
#include "platform/PixelFormat.h"

#include <atomic>
#include <ctime>
#include <functional>
#include <gtest/gtest.h>
#include <optional>
#include <thread>
#include <vector>

namespace qivo::test {
namespace {

using namespace std::chrono_literals;

/// A context that knows a display and nothing else.
class DisplayOnly final : public GLContext {
  public:
    explicit DisplayOnly(double rate) { refresh->rate = rate; }
    void makeCurrentContext() override {}
    void setSwapInterval(int /*interval*/) override {}
    void lock() override { fair.lock(); }
    void unlock() override { fair.unlock(); }
    void flushDrawable() override {}
    void afterNextFlush(std::function<void()> /*done*/) override {}
    std::shared_ptr<const DisplayRefresh> display() const override { return refresh; }

    FairLock fair;
    std::shared_ptr<DisplayRefresh> refresh = std::make_shared<DisplayRefresh>();
};

bool waitUntil(const std::function<bool()>& condition) {
    const auto end = std::chrono::steady_clock::now() + 20s;
    while (!condition()) {
        if (std::chrono::steady_clock::now() > end) {
            return false;
        }
        std::this_thread::sleep_for(1ms);
    }
    return true;
}

class DisplayLinkTest : public testing::Test {
  protected:
    static int call(DisplayLink* /*link*/, const TimeStamp& /*time*/, void* context) {
        auto& self = *static_cast<DisplayLinkTest*>(context);
        ++self.entered;
        if (self.work) {
            self.work();
        }
        ++self.left;
        return DisplayLink::kSuccess;
    }

    void SetUp() override {
        link.setOutputCallback(call, this);
        link.setCurrentDisplayFromContext(display, PixelFormat::initWithAttributes({0}));
    }
    void TearDown() override { link.stop(); }

    DisplayOnly display{200};
    std::function<void()> work;
    std::atomic<int> entered{0};
    std::atomic<int> left{0};
    ThreadDisplayLink link;
};

TEST_F(DisplayLinkTest, CallsBackInAThreadOfItsOwn) {
    std::atomic<std::thread::id> thread{};
    work = [&] { thread = std::this_thread::get_id(); };
    link.start();
    EXPECT_TRUE(link.isRunning());
    ASSERT_TRUE(waitUntil([&] { return left > 10; }));
    EXPECT_NE(thread.load(), std::this_thread::get_id());
}

TEST_F(DisplayLinkTest, NoCallbackRunsAfterStop) {
    for (int i = 0; i < 50; ++i) {
        const int before = left;
        link.start();
        ASSERT_TRUE(waitUntil([&] { return left > before; }));
        link.stop();
        const int after = entered;
        EXPECT_EQ(left, after);
        std::this_thread::sleep_for(2ms);
        EXPECT_EQ(entered, after);
        EXPECT_FALSE(link.isRunning());
    }
}

TEST_F(DisplayLinkTest, StopWaitsForACallbackThatIsUnderWay) {
    std::atomic<bool> go{false};
    work = [&] { waitUntil([&] { return go.load(); }); };
    link.start();
    ASSERT_TRUE(waitUntil([&] { return entered == 1; }));
    std::thread releaser([&] {
        std::this_thread::sleep_for(20ms);
        go = true;
    });
    link.stop();
    EXPECT_TRUE(go);
    EXPECT_EQ(left, entered);
    releaser.join();
}

TEST_F(DisplayLinkTest, StopsWhileACallbackWaitsForTheContextsLock) {
    work = [&] {
        display.lock();
        display.unlock();
    };
    std::thread holder;
    std::atomic<bool> held{false};
    std::atomic<bool> letGo{false};
    holder = std::thread([&] {
        display.lock();
        held = true;
        waitUntil([&] { return letGo.load(); });
        display.unlock();
    });
    ASSERT_TRUE(waitUntil([&] { return held.load(); }));
    link.start();
    ASSERT_TRUE(waitUntil([&] { return entered > left; }));
    std::thread releaser([&] {
        std::this_thread::sleep_for(20ms);
        letGo = true;
    });
    link.stop();
    EXPECT_EQ(left, entered);
    releaser.join();
    holder.join();
}

TEST_F(DisplayLinkTest, LongCallbacksLeaveAPause) {
    std::vector<std::chrono::nanoseconds> pauses;
    std::optional<std::chrono::steady_clock::time_point> ended;
    const auto period = RefreshPacer::periodOfRate(display.refresh->rate);
    work = [&, number = 0]() mutable {
        if (ended) {
            pauses.push_back(std::chrono::steady_clock::now() - *ended);
        }
        const bool fits = ++number <= 50; // the link is certain of the clock then
        std::this_thread::sleep_for(fits ? 0ns : 2 * period);
        ended = fits ? std::nullopt : std::optional(std::chrono::steady_clock::now());
    };
    const int before = left;
    link.start();
    ASSERT_TRUE(waitUntil([&] { return left > before + 60; }));
    link.stop();
    ASSERT_GT(pauses.size(), 5U);
    for (const auto pause : pauses) {
        EXPECT_GE(pause, period / RefreshPacer::kPause);
    }
}

TEST_F(DisplayLinkTest, AWaitForTheNextRefreshIsCutShortByStop) {
    display.refresh->rate = RefreshPacer::kSlowestRate;
    link.start();
    ASSERT_TRUE(waitUntil([&] { return left > RefreshPacer::kSwapQueue; }));
    const auto before = std::chrono::steady_clock::now();
    link.stop();
    EXPECT_LT(std::chrono::steady_clock::now() - before, 500ms);
}

TEST_F(DisplayLinkTest, StopFromWithinTheCallbackMakesItTheLast) {
    work = [&] { link.stop(); };
    link.start();
    ASSERT_TRUE(waitUntil([&] { return left == 1; }));
    link.stop();
    EXPECT_EQ(entered, 1);
    work = nullptr;
    link.start();
    EXPECT_TRUE(waitUntil([&] { return left > 3; }));
}

TEST_F(DisplayLinkTest, StartingTwiceAndStoppingTwiceIsHarmless) {
    link.start();
    link.start();
    ASSERT_TRUE(waitUntil([&] { return left > 1; }));
    link.stop();
    link.stop();
    EXPECT_EQ(left, entered);
}

TEST_F(DisplayLinkTest, WithoutACallbackItDoesNotStart) {
    ThreadDisplayLink none;
    none.start();
    EXPECT_FALSE(none.isRunning());
}

TEST_F(DisplayLinkTest, DestructionStops) {
    {
        ThreadDisplayLink other;
        other.setOutputCallback(call, this);
        other.start();
        ASSERT_TRUE(waitUntil([&] { return left > 1; }));
    }
    const int after = entered;
    std::this_thread::sleep_for(30ms);
    EXPECT_EQ(entered, after);
}

TEST_F(DisplayLinkTest, ADisplayWhoseSwapsDoNotWaitDoesNotMakeItSpin) {
    display.refresh->rate = 50;
    const auto before = std::chrono::steady_clock::now();
    const std::clock_t processorBefore = std::clock();
    link.start();
    ASSERT_TRUE(waitUntil([&] { return left >= 30; }));
    const std::clock_t processor = std::clock() - processorBefore;
    const auto took = std::chrono::steady_clock::now() - before;
    EXPECT_GE(took, (30 - RefreshPacer::kSwapQueue - 3) * 20ms);
    EXPECT_LT(processor, CLOCKS_PER_SEC / 4);
}

TEST_F(DisplayLinkTest, FollowsADisplayThatChangesItsRate) {
    display.refresh->rate = 20;
    link.start();
    ASSERT_TRUE(waitUntil([&] { return left > RefreshPacer::kSwapQueue + 2; }));
    display.refresh->rate = 500;
    ++display.refresh->generation;
    const int before = left;
    const auto start = std::chrono::steady_clock::now();
    ASSERT_TRUE(waitUntil([&] { return left >= before + 100; }));
    EXPECT_LT(std::chrono::steady_clock::now() - start, 100 * 50ms / 2);
}

} // namespace
} // namespace qivo::test
