#include "platform/AudioDrain.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <atomic>
#include <cmath>
#include <limits>
#include <memory>
#include <poll.h>
#include <thread>
#include <vector>

using namespace qivo;
using testing::Each;
using testing::ElementsAre;

namespace {

/// A buffer of floats that begins with `first` and counts on.
struct Samples {
    explicit Samples(std::size_t count, float first = 0.0F) : floats(count) {
        for (std::size_t i = 0; i < count; ++i) {
            floats[i] = first + static_cast<float>(i);
        }
    }
    std::vector<float> floats;
    AudioQueueBuffer buffer{static_cast<std::uint32_t>(floats.size() * sizeof(float)), floats.data(),
                            static_cast<std::uint32_t>(floats.size() * sizeof(float))};
};

bool readable(int descriptor) {
    pollfd watched{descriptor, POLLIN, 0};
    return poll(&watched, 1, 0) == 1;
}

} // namespace

TEST(AudioDrainTest, NothingEnqueuedIsSilence) {
    const auto drain = AudioDrain::create();
    std::vector<float> out(6, 9.0F);
    drain->pull(out.data(), out.size());
    EXPECT_THAT(out, Each(0.0F));
    EXPECT_FALSE(readable(drain->wakeDescriptor()));
}

TEST(AudioDrainTest, BuffersFollowEachOtherWithoutAGap) {
    const auto drain = AudioDrain::create();
    Samples one(3, 1);
    Samples two(2, 11);
    ASSERT_TRUE(drain->enqueue(&one.buffer));
    ASSERT_TRUE(drain->enqueue(&two.buffer));
    std::vector<float> out(4);
    drain->pull(out.data(), 4);
    EXPECT_THAT(out, ElementsAre(1, 2, 3, 11));
    EXPECT_EQ(drain->takeFinished(), &one.buffer);
    EXPECT_EQ(drain->takeFinished(), nullptr);
    drain->pull(out.data(), 4);
    EXPECT_THAT(out, ElementsAre(12, 0, 0, 0));
    EXPECT_EQ(drain->takeFinished(), &two.buffer);
}

TEST(AudioDrainTest, OnlyTheValidBytesArePlayed) {
    const auto drain = AudioDrain::create();
    Samples shortened(8, 1);
    shortened.buffer.mAudioDataByteSize = 2 * sizeof(float);
    drain->enqueue(&shortened.buffer);
    std::vector<float> out(4);
    drain->pull(out.data(), 4);
    EXPECT_THAT(out, ElementsAre(1, 2, 0, 0));
}

TEST(AudioDrainTest, DiscardingUsesBuffersUp) {
    const auto drain = AudioDrain::create();
    Samples one(4, 1);
    drain->enqueue(&one.buffer);
    drain->pull(nullptr, 3);
    EXPECT_FALSE(drain->hasFinished());
    drain->pull(nullptr, 3);
    EXPECT_TRUE(drain->hasFinished());
    EXPECT_EQ(drain->takeFinished(), &one.buffer);
}

TEST(AudioDrainTest, AUsedUpBufferMakesTheDescriptorReadable) {
    const auto drain = AudioDrain::create();
    Samples one(4);
    drain->enqueue(&one.buffer);
    std::vector<float> out(4);
    drain->pull(out.data(), 2);
    EXPECT_FALSE(readable(drain->wakeDescriptor()));
    drain->pull(out.data(), 2);
    EXPECT_TRUE(readable(drain->wakeDescriptor()));
    drain->acknowledge();
    EXPECT_FALSE(readable(drain->wakeDescriptor()));
    drain->acknowledge(); // does not block when there is nothing
}

TEST(AudioDrainTest, WhatIsNoNumberIsSilence) {
    const auto drain = AudioDrain::create();
    Samples one(5, 1);
    one.floats[1] = std::numeric_limits<float>::quiet_NaN();
    one.floats[2] = std::numeric_limits<float>::infinity();
    one.floats[3] = -std::numeric_limits<float>::infinity();
    drain->enqueue(&one.buffer);
    std::vector<float> out(5);
    drain->pull(out.data(), 5);
    EXPECT_THAT(out, ElementsAre(1, 0, 0, 0, 5));
}

TEST(AudioDrainTest, ClearForgetsWhatWaitsWhatPlaysAndWhatIsDone) {
    const auto drain = AudioDrain::create();
    Samples one(2, 1);
    Samples two(2, 1);
    Samples three(2, 1);
    for (Samples* samples : {&one, &two, &three}) {
        drain->enqueue(&samples->buffer);
    }
    std::vector<float> out(3);
    drain->pull(out.data(), 3);
    drain->clear();
    EXPECT_EQ(drain->takeFinished(), nullptr);
    EXPECT_FALSE(readable(drain->wakeDescriptor()));
    drain->pull(out.data(), 3);
    EXPECT_THAT(out, Each(0.0F));
}

TEST(AudioTapTest, ATapThatIsNotAttachedIsSilentAndTouchesNothing) {
    const auto drain = AudioDrain::create();
    AudioTap tap(drain);
    Samples one(2, 1);
    drain->enqueue(&one.buffer);
    std::vector<float> out(2, 9.0F);
    tap.pull(out.data(), 2);
    EXPECT_THAT(out, Each(0.0F));
    tap.attach();
    tap.pull(out.data(), 1);
    EXPECT_EQ(out[0], 1.0F);
    tap.detach();
    tap.pull(out.data(), 1);
    EXPECT_EQ(out[0], 0.0F);
    EXPECT_EQ(tap.pulls(), 3U);
    drain->pull(out.data(), 1);
    EXPECT_EQ(out[0], 2.0F) << "the next drainer goes on where the device left off";
}

TEST(AudioTapTest, AStateChangeMakesTheDescriptorReadable) {
    const auto drain = AudioDrain::create();
    AudioTap tap(drain);
    tap.stateChanged();
    EXPECT_TRUE(readable(drain->wakeDescriptor()));
}

/// Devices pull all the time while the owner hands the drain from one to the next, through the clock in between. Every
/// float is taken once and in order, and no device touches a buffer after it was detached.
TEST(AudioTapTest, HandingOverBetweenThreadsLosesAndRepeatsNothing) {
    constexpr int kHandOvers = 300;
    const auto drain = AudioDrain::create();
    std::array<std::unique_ptr<Samples>, 3> buffers;
    for (auto& each : buffers) {
        each = std::make_unique<Samples>(64);
    }
    float next = 1.0F; // what the next buffer begins with; exact up to 2^24
    const auto refill = [&](AudioQueueBuffer* buffer) {
        auto* const floats = static_cast<float*>(buffer->mAudioData);
        for (int i = 0; i < 64; ++i) {
            floats[i] = next++;
        }
        ASSERT_TRUE(drain->enqueue(buffer));
    };
    for (auto& each : buffers) {
        refill(&each->buffer);
    }
    std::vector<float> played; // written by whoever drains
    const auto keep = [&played](const std::vector<float>& out) {
        for (const float sample : out) {
            if (sample != 0.0F) {
                played.push_back(sample);
            }
        }
    };
    for (int round = 0; round < kHandOvers; ++round) {
        AudioTap tap(drain);
        std::atomic<bool> closed = false;
        std::vector<float> mine;
        std::thread device([&] {
            std::vector<float> out(48);
            while (!closed) {
                tap.pull(out.data(), out.size());
                mine.insert(mine.end(), out.begin(), out.end());
                std::this_thread::yield();
            }
        });
        tap.attach();
        for (int refilled = 0; refilled < 4;) {
            if (AudioQueueBuffer* buffer = drain->takeFinished()) {
                refill(buffer);
                ++refilled;
            }
        }
        tap.detach();
        std::vector<float> out(10);
        drain->pull(out.data(), out.size()); // by the clock
        closed = true;
        device.join();
        keep(mine);
        keep(out);
    }
    ASSERT_GT(played.size(), 64U * kHandOvers);
    for (std::size_t i = 0; i < played.size(); ++i) {
        ASSERT_EQ(played[i], static_cast<float>(i + 1));
    }
}
