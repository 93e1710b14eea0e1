#include "platform/SpscQueue.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <thread>

using namespace qivo;

TEST(SpscQueueTest, WhatComesOutIsWhatWentIn) {
    SpscQueue<int, 4> queue;
    EXPECT_TRUE(queue.empty());
    for (int round = 0; round < 10; ++round) {
        for (int i = 0; i < 4; ++i) {
            EXPECT_TRUE(queue.push(10 * round + i));
        }
        EXPECT_FALSE(queue.push(-1)) << "full";
        EXPECT_FALSE(queue.empty());
        for (int i = 0; i < 4; ++i) {
            int value = -2;
            EXPECT_TRUE(queue.pop(value));
            EXPECT_EQ(value, 10 * round + i);
        }
        int untouched = 77;
        EXPECT_FALSE(queue.pop(untouched));
        EXPECT_EQ(untouched, 77);
        EXPECT_TRUE(queue.empty());
    }
}

TEST(SpscQueueTest, TwoThreadsPassEverythingInOrder) {
    constexpr std::uint64_t kCount = 200000;
    SpscQueue<std::uint64_t, 16, true> queue;
    std::thread producer([&queue] {
        for (std::uint64_t i = 1; i <= kCount;) {
            if (queue.push(i)) {
                ++i;
            } else {
                std::this_thread::yield();
            }
        }
    });
    std::uint64_t next = 1;
    while (next <= kCount) {
        std::uint64_t value = 0;
        if (queue.pop(value)) {
            ASSERT_EQ(value, next);
            ++next;
        } else {
            std::this_thread::yield();
        }
    }
    producer.join();
    EXPECT_TRUE(queue.empty());
}

namespace {

template <typename Work>
void onAnotherThread(Work work) {
    std::thread(work).join();
}

} // namespace

TEST(SpscQueueDeathTest, ASecondProducerEndsTheProgram) {
    testing::FLAGS_gtest_death_test_style = "threadsafe";
    SpscQueue<int, 4, true> queue;
    queue.push(1);
    EXPECT_DEATH(onAnotherThread([&queue] { queue.push(2); }), "SpscQueue: a second thread acts as the producer");
}

TEST(SpscQueueDeathTest, ASecondConsumerEndsTheProgram) {
    testing::FLAGS_gtest_death_test_style = "threadsafe";
    SpscQueue<int, 4, true> queue;
    int value = 0;
    queue.pop(value);
    EXPECT_DEATH(onAnotherThread([&queue] {
                     int other = 0;
                     queue.pop(other);
                 }),
                 "SpscQueue: a second thread acts as the consumer");
}

TEST(SpscQueueTest, AReleasedRoleMayBeTakenOver) {
    SpscQueue<int, 4, true> queue;
    queue.push(1);
    queue.releaseProducer();
    onAnotherThread([&queue] { queue.push(2); });
    int value = 0;
    EXPECT_TRUE(queue.pop(value));
    queue.releaseConsumer();
    onAnotherThread([&queue, &value] { queue.pop(value); });
    EXPECT_EQ(value, 2);
}

TEST(SpscQueueTest, OneThreadMayHaveBothRoles) {
    SpscQueue<int, 1, true> queue;
    int value = 0;
    EXPECT_TRUE(queue.push(5));
    EXPECT_TRUE(queue.pop(value));
    EXPECT_EQ(value, 5);
}

TEST(SpscQueueTest, RolesAreCheckedExactlyInBuildsWithAssertions) {
#ifdef NDEBUG
    EXPECT_FALSE(kCheckThreadRoles);
#else
    EXPECT_TRUE(kCheckThreadRoles);
#endif
}
