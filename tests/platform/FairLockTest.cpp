#include "platform/FairLock.h"

#include <atomic>
#include <gtest/gtest.h>
#include <mutex>
#include <thread>
#include <vector>

namespace qivo::test {
namespace {

TEST(FairLockTest, IsRecursive) {
    FairLock lock;
    EXPECT_EQ(lock.depth(), 0);
    lock.lock();
    lock.lock();
    EXPECT_EQ(lock.depth(), 2);
    lock.unlock();
    EXPECT_EQ(lock.depth(), 1);
    lock.unlock();
    EXPECT_EQ(lock.depth(), 0);
}

TEST(FairLockTest, DepthIsTheCallersOwn) {
    FairLock lock;
    const std::lock_guard guard(lock);
    int elsewhere = -1;
    std::thread([&] { elsewhere = lock.depth(); }).join();
    EXPECT_EQ(elsewhere, 0);
    EXPECT_EQ(lock.depth(), 1);
}

TEST(FairLockTest, OneAtATime) {
    FairLock lock;
    int count = 0;
    std::vector<std::thread> threads;
    for (int i = 0; i < 4; ++i) {
        threads.emplace_back([&] {
            for (int pass = 0; pass < 1000; ++pass) {
                const std::lock_guard guard(lock);
                ++count;
            }
        });
    }
    for (auto& thread : threads) {
        thread.join();
    }
    EXPECT_EQ(count, 4000);
}

/// A thread that lets go and takes the lock again at once, as a refresh thread that lives in buffer swaps does.
TEST(FairLockTest, WhoWaitsGoesNextThoughTheHolderComesStraightBack) {
    FairLock lock;
    std::atomic<bool> stop{false};
    std::atomic<int> holds{0};
    std::atomic<bool> asking{false};
    std::atomic<int> heldWhenAsked{0};
    std::thread greedy([&] {
        while (!stop) {
            const std::lock_guard guard(lock);
            ++holds;
            // Inside a hold, wait until the other thread has asked; so it asks while the lock is held.
            if (holds == 5) {
                while (!asking) {
                    std::this_thread::yield();
                }
                std::this_thread::sleep_for(std::chrono::milliseconds(50)); // time to queue up; too short only eases it
                heldWhenAsked = holds.load();
            }
        }
    });
    while (holds < 5) {
        std::this_thread::yield();
    }
    asking = true;
    lock.lock();
    const int missed = holds - heldWhenAsked;
    lock.unlock();
    stop = true;
    greedy.join();
    EXPECT_LE(missed, 1);
}

} // namespace
} // namespace qivo::test
