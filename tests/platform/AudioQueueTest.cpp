#include "platform/AudioQueue.h"
#include "platform/AudioKeeper.h"
#include "platform/AudioOutput.h"
#include "platform/NullAudioOutput.h"

#include "tests/platform/EventLoop.h"
#include "tests/platform/LogCapture.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <cstring>
#include <functional>
#include <memory>
#include <thread>
#include <vector>

using namespace qivo;
using namespace qivo::test;
using namespace std::chrono_literals;
using std::chrono::nanoseconds;
using testing::Each;
using testing::ElementsAre;
using testing::IsEmpty;

namespace {

constexpr std::uint32_t kFrameBytes = 8;
constexpr std::uint32_t kBufferFrames = 480; // 10 ms

AudioStreamBasicDescription stereo() {
    return {48000.0,
            kAudioFormatLinearPCM,
            kAudioFormatFlagIsFloat | kAudioFormatFlagIsPacked,
            kFrameBytes,
            1,
            kFrameBytes,
            2,
            32,
            0};
}

/// A queue on an output without a device, and an owner that fills its buffers with counting samples.
class AudioQueueTest : public testing::Test {
  protected:
    void SetUp() override { use(NullAudioDriver::Options()); }

    void TearDown() override {
        dispose();
        setAudioOutputDriver(nullptr);
        EXPECT_EQ(driver->outputs(), 0);
    }

    void use(const NullAudioDriver::Options& options) {
        driver = std::make_shared<NullAudioDriver>(options);
        setAudioOutputDriver(driver);
    }

    void dispose() {
        if (queue != nullptr) {
            EXPECT_EQ(AudioQueueDispose(std::exchange(queue, nullptr)), 0);
        }
    }

    static void called(void* self, AudioQueueRef queue, AudioQueueBufferRef buffer) {
        auto& test = *static_cast<AudioQueueTest*>(self);
        EXPECT_EQ(queue, test.queue);
        EXPECT_EQ(std::this_thread::get_id(), test.thread);
        ++test.callbacks;
        test.onCallback(buffer);
    }

    void refill(AudioQueueBufferRef buffer) {
        auto* const floats = static_cast<float*>(buffer->mAudioData);
        buffer->mAudioDataByteSize = buffer->mAudioDataBytesCapacity;
        for (std::uint32_t i = 0; i < buffer->mAudioDataByteSize / sizeof(float); ++i) {
            floats[i] = ++counter;
        }
        EXPECT_EQ(AudioQueueEnqueueBuffer(queue, buffer), 0);
    }

    void make(int buffers = 3) {
        const auto format = stereo();
        ASSERT_EQ(AudioQueueNewOutput(&format, called, this, &queue), 0);
        for (int i = 0; i < buffers; ++i) {
            AudioQueueBufferRef buffer = nullptr;
            ASSERT_EQ(AudioQueueAllocateBuffer(queue, kBufferFrames * kFrameBytes, &buffer), 0);
            allocated.push_back(buffer);
        }
    }

    void makeAndStart() {
        make();
        for (AudioQueueBufferRef buffer : allocated) {
            refill(buffer);
        }
        ASSERT_EQ(AudioQueueStart(queue), 0);
        advance(0ns); // the device opens
    }

    /// Moves the clock on in small steps, as far as the owner's loop would keep up with.
    void advance(nanoseconds time) {
        do {
            const nanoseconds step = std::min<nanoseconds>(time, 5ms);
            driver->advance(step);
            EventLoop::settle();
            time -= step;
        } while (time > 0ns);
    }

    EventLoop loop;
    std::thread::id thread = std::this_thread::get_id();
    std::shared_ptr<NullAudioDriver> driver;
    AudioQueueRef queue = nullptr;
    std::vector<AudioQueueBufferRef> allocated;
    float counter = 0.0F;
    int callbacks = 0;
    std::function<void(AudioQueueBufferRef)> onCallback = [this](AudioQueueBufferRef buffer) { refill(buffer); };
};

/// Whether the samples, silence in front left out, count on from `first` without a gap.
testing::AssertionResult countsFrom(const std::vector<float>& heard, float first) {
    auto at = std::find_if(heard.begin(), heard.end(), [](float sample) { return sample != 0.0F; });
    if (at == heard.end()) {
        return testing::AssertionFailure() << "silence";
    }
    for (float expected = first; at != heard.end(); ++at, ++expected) {
        if (*at != expected) {
            return testing::AssertionFailure() << *at << " where " << expected << " should be";
        }
    }
    return testing::AssertionSuccess();
}

} // namespace

// --- Playing.

TEST_F(AudioQueueTest, WhatIsHeardIsWhatWasEnqueued) {
    makeAndStart();
    advance(1s);
    const auto heard = driver->heard();
    EXPECT_EQ(heard.size(), 96000U);
    EXPECT_TRUE(countsFrom(heard, 1.0F));
    EXPECT_EQ(heard.front(), 1.0F);
    EXPECT_NEAR(callbacks, 100, 1);
}

TEST_F(AudioQueueTest, BuffersComeBackInTheOrderTheyWereEnqueued) {
    makeAndStart();
    std::vector<AudioQueueBufferRef> order;
    onCallback = [&](AudioQueueBufferRef buffer) { order.push_back(buffer); };
    advance(100ms);
    EXPECT_EQ(order, allocated);
}

TEST_F(AudioQueueTest, NothingEnqueuedIsSilenceUntilSomethingIs) {
    makeAndStart();
    onCallback = [](AudioQueueBufferRef) {};
    advance(100ms);
    driver->forgetHeard();
    advance(50ms);
    EXPECT_THAT(driver->heard(), Each(0.0F));
    driver->forgetHeard();
    const float first = counter + 1;
    for (AudioQueueBufferRef buffer : allocated) {
        refill(buffer);
    }
    advance(30ms);
    EXPECT_TRUE(countsFrom(driver->heard(), first));
}

TEST_F(AudioQueueTest, ShortBuffersArePlayedWithoutPadding) {
    makeAndStart();
    onCallback = [&](AudioQueueBufferRef buffer) { refill(buffer); };
    advance(30ms);
    dispose();
    allocated.clear();
    make();
    driver->forgetHeard();
    for (AudioQueueBufferRef buffer : allocated) {
        auto* const floats = static_cast<float*>(buffer->mAudioData);
        floats[0] = ++counter;
        floats[1] = ++counter;
        buffer->mAudioDataByteSize = kFrameBytes;
        ASSERT_EQ(AudioQueueEnqueueBuffer(queue, buffer), 0);
    }
    ASSERT_EQ(AudioQueueStart(queue), 0);
    onCallback = [](AudioQueueBufferRef) {};
    advance(0ns);
    advance(10ms);
    const auto heard = driver->heard();
    ASSERT_GE(heard.size(), 7U);
    EXPECT_TRUE(countsFrom({heard.begin(), heard.begin() + 6}, counter - 5));
    EXPECT_EQ(heard[6], 0.0F);
}

TEST_F(AudioQueueTest, ADeviceThatPullsInBurstsIsKeptFed) {
    NullAudioDriver::Options options;
    options.burst = 3; // 30 ms at once: all that is enqueued
    use(options);
    makeAndStart();
    advance(900ms);
    EXPECT_EQ(driver->heard().size(), 86400U);
    EXPECT_TRUE(countsFrom(driver->heard(), 1.0F));
}

TEST_F(AudioQueueTest, ABurstBeyondWhatIsEnqueuedLeavesAGapAndGoesOn) {
    NullAudioDriver::Options options;
    options.burst = 4;
    use(options);
    makeAndStart();
    advance(80ms);
    const auto heard = driver->heard();
    constexpr std::ptrdiff_t buffer = 960;
    ASSERT_EQ(heard.size(), 8U * buffer);
    const auto piece = [&heard](std::ptrdiff_t from, std::ptrdiff_t to) {
        return std::vector<float>(heard.begin() + from * buffer, heard.begin() + to * buffer);
    };
    EXPECT_TRUE(countsFrom(piece(0, 3), 1.0F));
    EXPECT_THAT(piece(3, 4), Each(0.0F));
    EXPECT_TRUE(countsFrom(piece(4, 7), 3 * buffer + 1.0F));
}

TEST_F(AudioQueueTest, ADeviceWithLatencyIsFilledAtOnceAndHeardLater) {
    NullAudioDriver::Options options;
    options.latency = 20ms;
    use(options);
    makeAndStart();
    EXPECT_TRUE(driver->heard().empty());
    advance(10ms);
    EXPECT_EQ(driver->heard().size(), 960U);
    advance(300ms);
    EXPECT_TRUE(countsFrom(driver->heard(), 1.0F));
}

TEST_F(AudioQueueTest, OneCallbackATurnOfTheEventLoop) {
    makeAndStart();
    onCallback = [](AudioQueueBufferRef) {};
    for (int i = 0; i < 6; ++i) {
        driver->advance(5ms); // all three buffers are used up without a turn
    }
    EXPECT_EQ(callbacks, 0);
    std::vector<int> seen;
    for (int turn = 0; turn < 10; ++turn) {
        QCoreApplication::processEvents();
        seen.push_back(callbacks);
    }
    EXPECT_EQ(callbacks, 3);
    int before = 0;
    for (const int now : seen) {
        EXPECT_LE(now - before, 2) << "a turn of the notifier and one of the timer at the most";
        before = now;
    }
}

TEST_F(AudioQueueTest, TwoQueuesDoNotDisturbEachOther) {
    makeAndStart();
    const auto format = stereo();
    AudioQueueRef other = nullptr;
    ASSERT_EQ(AudioQueueNewOutput(
                  &format, [](void*, AudioQueueRef, AudioQueueBufferRef) {}, nullptr, &other),
              0);
    AudioQueueBufferRef foreign = nullptr;
    ASSERT_EQ(AudioQueueAllocateBuffer(other, 800, &foreign), 0);
    foreign->mAudioDataByteSize = 8;
    EXPECT_EQ(AudioQueueEnqueueBuffer(queue, foreign), kAudioQueueErrInvalidBuffer);
    EXPECT_EQ(AudioQueueFreeBuffer(queue, foreign), kAudioQueueErrInvalidBuffer);
    EXPECT_EQ(AudioQueueDispose(other), 0);
    advance(100ms);
    EXPECT_TRUE(countsFrom(driver->heard(), 1.0F));
}

// --- Statuses.

TEST_F(AudioQueueTest, FormatsThatItDoesNotTake) {
    const auto status = [this](auto change) {
        auto format = stereo();
        change(format);
        AudioQueueRef made = nullptr;
        const int result = AudioQueueNewOutput(&format, called, this, &made);
        EXPECT_EQ(made, nullptr);
        return result;
    };
    EXPECT_EQ(status([](auto& f) { f.mFormatID = 1; }), kAudioQueueErrFormat);
    EXPECT_EQ(status([](auto& f) { f.mFormatFlags = 8; }), kAudioQueueErrFormat);
    EXPECT_EQ(status([](auto& f) { f.mSampleRate = kAudioQueueLowestRate - 1; }), kAudioQueueErrFormat);
    EXPECT_EQ(status([](auto& f) { f.mSampleRate = kAudioQueueHighestRate + 1; }), kAudioQueueErrFormat);
    EXPECT_EQ(status([](auto& f) { f.mSampleRate = std::nan(""); }), kAudioQueueErrFormat);
    EXPECT_EQ(status([](auto& f) { f.mChannelsPerFrame = 0; }), kAudioQueueErrFormat);
    EXPECT_EQ(status([](auto& f) { f.mChannelsPerFrame = 9; }), kAudioQueueErrFormat);
    EXPECT_EQ(status([](auto& f) { f.mBitsPerChannel = 16; }), kAudioQueueErrFormat);
    EXPECT_EQ(status([](auto& f) { f.mBytesPerFrame = 4; }), kAudioQueueErrFormat);
}

TEST_F(AudioQueueTest, NullsAreRefused) {
    const auto format = stereo();
    AudioQueueRef made = nullptr;
    EXPECT_EQ(AudioQueueNewOutput(nullptr, called, this, &made), kAudioQueueErrInvalidArgument);
    EXPECT_EQ(AudioQueueNewOutput(&format, nullptr, this, &made), kAudioQueueErrInvalidArgument);
    EXPECT_EQ(AudioQueueNewOutput(&format, called, this, nullptr), kAudioQueueErrInvalidArgument);
    AudioQueueBufferRef buffer = nullptr;
    EXPECT_EQ(AudioQueueAllocateBuffer(nullptr, 8, &buffer), kAudioQueueErrInvalidQueue);
    EXPECT_EQ(AudioQueueEnqueueBuffer(nullptr, nullptr), kAudioQueueErrInvalidQueue);
    EXPECT_EQ(AudioQueueStart(nullptr), kAudioQueueErrInvalidQueue);
    EXPECT_EQ(AudioQueueStop(nullptr), kAudioQueueErrInvalidQueue);
    EXPECT_EQ(AudioQueueFreeBuffer(nullptr, nullptr), kAudioQueueErrInvalidQueue);
    EXPECT_EQ(AudioQueueDispose(nullptr), kAudioQueueErrInvalidQueue);
    make();
    EXPECT_EQ(AudioQueueAllocateBuffer(queue, 8, nullptr), kAudioQueueErrInvalidArgument);
    EXPECT_EQ(AudioQueueEnqueueBuffer(queue, nullptr), kAudioQueueErrInvalidBuffer);
    EXPECT_EQ(AudioQueueFreeBuffer(queue, nullptr), kAudioQueueErrInvalidBuffer);
}

TEST_F(AudioQueueTest, CapacitiesAndNumbersOfBuffersHaveLimits) {
    make(0);
    AudioQueueBufferRef buffer = nullptr;
    EXPECT_EQ(AudioQueueAllocateBuffer(queue, 0, &buffer), kAudioQueueErrInvalidArgument);
    EXPECT_EQ(AudioQueueAllocateBuffer(queue, kAudioQueueMaxCapacity + 1, &buffer), kAudioQueueErrInvalidArgument);
    EXPECT_EQ(AudioQueueAllocateBuffer(queue, kAudioQueueMaxCapacity, &buffer), 0);
    for (std::uint32_t i = 1; i < kAudioQueueMaxBuffers; ++i) {
        EXPECT_EQ(AudioQueueAllocateBuffer(queue, 8, &buffer), 0);
    }
    EXPECT_EQ(AudioQueueAllocateBuffer(queue, 8, &buffer), kAudioQueueErrTooManyBuffers);
    EXPECT_EQ(AudioQueueFreeBuffer(queue, buffer), 0);
    EXPECT_EQ(AudioQueueAllocateBuffer(queue, 8, &buffer), 0);
}

TEST_F(AudioQueueTest, AsManyBuffersAsThereMayBeAreAllPlayed) {
    make(kAudioQueueMaxBuffers);
    for (AudioQueueBufferRef buffer : allocated) {
        refill(buffer);
    }
    ASSERT_EQ(AudioQueueStart(queue), 0);
    advance(0ns);
    advance(500ms);
    EXPECT_TRUE(countsFrom(driver->heard(), 1.0F));
}

TEST_F(AudioQueueTest, ByteSizesThatCannotBePlayed) {
    make();
    AudioQueueBufferRef buffer = allocated[0];
    for (const std::uint32_t size : {0U, kFrameBytes - 1, kFrameBytes + 4, kBufferFrames * kFrameBytes + kFrameBytes}) {
        buffer->mAudioDataByteSize = size;
        EXPECT_EQ(AudioQueueEnqueueBuffer(queue, buffer), kAudioQueueErrBufferSize);
    }
    buffer->mAudioDataByteSize = kFrameBytes;
    EXPECT_EQ(AudioQueueEnqueueBuffer(queue, buffer), 0);
}

TEST_F(AudioQueueTest, AnEnqueuedBufferCanNeitherBeEnqueuedNorFreed) {
    make();
    refill(allocated[0]);
    EXPECT_EQ(AudioQueueEnqueueBuffer(queue, allocated[0]), kAudioQueueErrBufferEnqueued);
    EXPECT_EQ(AudioQueueFreeBuffer(queue, allocated[0]), kAudioQueueErrBufferEnqueued);
    EXPECT_EQ(AudioQueueStop(queue), 0);
    EXPECT_EQ(AudioQueueFreeBuffer(queue, allocated[0]), 0);
    EXPECT_EQ(AudioQueueFreeBuffer(queue, allocated[0]), kAudioQueueErrInvalidBuffer);
    EXPECT_EQ(AudioQueueEnqueueBuffer(queue, allocated[0]), kAudioQueueErrInvalidBuffer);
}

TEST_F(AudioQueueTest, StartingTwiceIsRefused) {
    makeAndStart();
    EXPECT_EQ(AudioQueueStart(queue), kAudioQueueErrStarted);
}

TEST_F(AudioQueueTest, AThreadWithoutAnEventLoopGetsNoQueue) {
    int status = 0;
    std::thread([&status] {
        const auto format = stereo();
        AudioQueueRef made = nullptr;
        status = AudioQueueNewOutput(
            &format, [](void*, AudioQueueRef, AudioQueueBufferRef) {}, nullptr, &made);
    }).join();
    EXPECT_EQ(status, kAudioQueueErrNoEventLoop);
}

TEST_F(AudioQueueTest, ADriverThatCannotTryMakesTheStartFail) {
    NullAudioDriver::Options options;
    options.status = 4711;
    use(options);
    make();
    EXPECT_EQ(AudioQueueStart(queue), 4711);
    advance(100ms);
    EXPECT_EQ(callbacks, 0);
    driver->setOptions(NullAudioDriver::Options());
    EXPECT_EQ(AudioQueueStart(queue), 0);
}

// --- Stopping.

TEST_F(AudioQueueTest, StopIsImmediateAndNoCallbackComes) {
    makeAndStart();
    advance(100ms);
    driver->advance(10ms); // buffers are on their way back
    const int before = callbacks;
    EXPECT_EQ(AudioQueueStop(queue), 0);
    driver->forgetHeard();
    advance(200ms);
    EXPECT_EQ(callbacks, before);
    EXPECT_THAT(driver->heard(), Each(0.0F));
    EXPECT_EQ(driver->outputs(), 0);
}

TEST_F(AudioQueueTest, AStoppedQueueStartsAnew) {
    makeAndStart();
    advance(100ms);
    EXPECT_EQ(AudioQueueStop(queue), 0);
    EXPECT_EQ(AudioQueueStop(queue), 0) << "harmless";
    const float first = counter + 1;
    for (AudioQueueBufferRef buffer : allocated) {
        refill(buffer);
    }
    driver->forgetHeard();
    EXPECT_EQ(AudioQueueStart(queue), 0);
    advance(0ns);
    advance(100ms);
    EXPECT_TRUE(countsFrom(driver->heard(), first));
}

TEST_F(AudioQueueTest, NoCallbackAfterDisposeWhileOneIsOnItsWay) {
    makeAndStart();
    driver->advance(30ms);
    dispose();
    EventLoop::settle();
    EXPECT_EQ(callbacks, 0);
}

TEST_F(AudioQueueTest, TheCallbackMayDisposeOfItsQueue) {
    makeAndStart();
    onCallback = [this](AudioQueueBufferRef) { dispose(); };
    driver->advance(30ms);
    EventLoop::settle();
    EXPECT_EQ(callbacks, 1);
}

TEST_F(AudioQueueTest, TheCallbackMayStopItsQueue) {
    makeAndStart();
    onCallback = [this](AudioQueueBufferRef) { AudioQueueStop(queue); };
    advance(50ms);
    EXPECT_EQ(callbacks, 1);
}

TEST_F(AudioQueueTest, TheCallbackMayRunAnEventLoopAndDisposeInIt) {
    makeAndStart();
    onCallback = [this](AudioQueueBufferRef) {
        onCallback = [this](AudioQueueBufferRef) { dispose(); };
        EventLoop::settle();
    };
    for (int i = 0; i < 6; ++i) {
        driver->advance(5ms);
    }
    EventLoop::settle();
    EXPECT_EQ(callbacks, 2);
    EXPECT_EQ(queue, nullptr);
}

TEST_F(AudioQueueTest, LoadPlayAndUnloadInALoop) {
    for (int i = 0; i < 50; ++i) {
        counter = 0;
        driver->forgetHeard();
        makeAndStart();
        advance(40ms);
        EXPECT_TRUE(countsFrom(driver->heard(), 1.0F));
        dispose();
        allocated.clear();
    }
}

// --- Devices that come and go. Without one the clock drains, silently.

TEST_F(AudioQueueTest, WhileTheDeviceOpensTheClockDrains) {
    NullAudioDriver::Options options;
    options.openTime = 300ms;
    use(options);
    makeAndStart();
    advance(295ms);
    EXPECT_NEAR(callbacks, 29, 2);
    EXPECT_TRUE(driver->heard().empty());
    advance(105ms);
    EXPECT_NEAR(callbacks, 39, 2);
    EXPECT_TRUE(countsFrom(driver->heard(), driver->heard().at(0)));
    EXPECT_NEAR(driver->heard().at(0), 300 * 96, 20 * 96) << "what was due before is gone";
}

TEST_F(AudioQueueTest, WithoutAnyDeviceTheQueueRunsAtThePaceOfTheClock) {
    NullAudioDriver::Options options;
    options.failingOpens = -1;
    use(options);
    makeAndStart();
    advance(10s);
    EXPECT_NEAR(callbacks, 1000, 3);
    EXPECT_TRUE(driver->heard().empty());
}

TEST_F(AudioQueueTest, AttemptsToOpenBackOff) {
    NullAudioDriver::Options options;
    options.failingOpens = -1;
    use(options);
    makeAndStart();
    std::vector<nanoseconds> times;
    int attempts = driver->attempts();
    EXPECT_EQ(attempts, 1);
    for (nanoseconds time{}; time < 30s; time += 5ms) {
        advance(5ms);
        if (driver->attempts() != attempts) {
            attempts = driver->attempts();
            times.push_back(driver->now());
        }
    }
    ASSERT_GE(times.size(), 8U);
    EXPECT_NEAR(times[0].count(), nanoseconds(250ms).count(), 1e7);
    EXPECT_NEAR((times[1] - times[0]).count(), nanoseconds(500ms).count(), 2e7);
    EXPECT_NEAR((times[2] - times[1]).count(), nanoseconds(1s).count(), 2e7);
    for (std::size_t i = 5; i < times.size(); ++i) {
        EXPECT_NEAR((times[i] - times[i - 1]).count(), nanoseconds(AudioKeeper::kLongestRetry).count(), 2e7);
    }
}

TEST_F(AudioQueueTest, ADeviceThatFailsToOpenAtFirstIsHeardOnceItDoes) {
    NullAudioDriver::Options options;
    options.failingOpens = 2;
    use(options);
    makeAndStart();
    advance(600ms);
    EXPECT_TRUE(driver->heard().empty());
    advance(400ms);
    EXPECT_EQ(driver->attempts(), 3);
    EXPECT_TRUE(countsFrom(driver->heard(), driver->heard().at(0)));
}

TEST_F(AudioQueueTest, AnUnpluggedDeviceIsReplacedAndTheSoundGoesOn) {
    makeAndStart();
    advance(100ms);
    driver->unplug();
    EventLoop::settle();
    EXPECT_EQ(driver->outputs(), 0);
    const int before = callbacks;
    driver->forgetHeard();
    advance(240ms);
    EXPECT_NEAR(callbacks - before, 24, 2) << "the clock drains meanwhile";
    EXPECT_TRUE(driver->heard().empty());
    advance(200ms);
    EXPECT_EQ(driver->attempts(), 2);
    const auto heard = driver->heard();
    ASSERT_FALSE(heard.empty());
    EXPECT_TRUE(countsFrom(heard, heard.at(0)));
    EXPECT_NEAR(heard.at(0), 350 * 96, 30 * 96) << "current, not what was left behind";
}

TEST_F(AudioQueueTest, ADeviceThatCeasesToPullIsGivenUp) {
    makeAndStart();
    advance(100ms);
    driver->setHung(true);
    const int before = callbacks;
    advance(900ms);
    EXPECT_LE(callbacks - before, 1);
    EXPECT_EQ(driver->attempts(), 1) << "not yet";
    advance(200ms);
    EXPECT_GT(callbacks - before, 4) << "the clock drains";
    advance(400ms);
    EXPECT_EQ(driver->attempts(), 2);
    const auto heard = driver->heard();
    EXPECT_NE(heard.back(), 0.0F);
}

TEST_F(AudioQueueTest, AShortHaltOfTheDeviceIsNoLoss) {
    makeAndStart();
    advance(100ms);
    driver->setHung(true);
    advance(500ms);
    driver->setHung(false);
    advance(500ms);
    EXPECT_EQ(driver->attempts(), 1);
    EXPECT_TRUE(countsFrom(driver->heard(), 1.0F));
}

TEST_F(AudioQueueTest, AHaltOfTheOwnerIsNoLossOfTheDevice) {
    makeAndStart();
    advance(100ms);
    driver->setHung(true); // as if the whole process had been stopped: nobody pulls and nobody watches
    driver->advance(60s);
    EventLoop::settle();
    driver->setHung(false);
    advance(500ms);
    EXPECT_EQ(driver->attempts(), 1);
}

TEST_F(AudioQueueTest, AHaltOfTheOwnerIsNotMadeUpForByTheClock) {
    NullAudioDriver::Options options;
    options.failingOpens = -1;
    use(options);
    makeAndStart();
    advance(100ms);
    const int before = callbacks;
    driver->advance(60s);
    EventLoop::settle();
    advance(100ms);
    EXPECT_LE(callbacks - before, 10 + 3 + 2);
}

TEST_F(AudioQueueTest, ADeviceThatDiesAgainAndAgainIsTriedLessAndLess) {
    makeAndStart();
    for (int i = 0; i < 40; ++i) {
        advance(250ms);
        driver->unplug();
    }
    EXPECT_LE(driver->attempts(), 8);
    EXPECT_GE(driver->attempts(), 4);
}

TEST_F(AudioQueueTest, AfterASoundDeviceTheFirstPauseIsShortAgain) {
    NullAudioDriver::Options options;
    options.failingOpens = 5;
    use(options);
    makeAndStart();
    advance(20s);
    ASSERT_EQ(driver->attempts(), 6);
    driver->unplug();
    advance(300ms);
    EXPECT_EQ(driver->attempts(), 7);
}

// --- What the system log tells.

TEST_F(AudioQueueTest, EachChangeOfWhatIsHeardIsToldOnce) {
    LogCapture log;
    NullAudioDriver::Options options;
    options.failingOpens = 5;
    use(options);
    makeAndStart();
    advance(20s);
    ASSERT_EQ(driver->attempts(), 6);
    EXPECT_THAT(log.take(),
                ElementsAre("No sound: a stand-in for a device", "Sound plays through a stand-in for a device"));
    AudioQueueStop(queue);
    for (AudioQueueBufferRef buffer : allocated) {
        refill(buffer);
    }
    AudioQueueStart(queue);
    advance(1s);
    EXPECT_THAT(log.take(), IsEmpty()) << "as before";
    driver->unplug();
    EventLoop::settle();
    EXPECT_THAT(log.take(), ElementsAre("Sound has stopped: a stand-in for a device"));
    advance(1s);
    EXPECT_THAT(log.take(), ElementsAre("Sound plays through a stand-in for a device"));
    driver->setHung(true);
    advance(1500ms);
    EXPECT_THAT(log.take(), ElementsAre("Sound has stopped: the device takes nothing any more",
                                        "Sound plays through a stand-in for a device"));
    options.status = 4711;
    driver->setOptions(options);
    driver->unplug();
    advance(3s);
    EXPECT_THAT(log.take(), ElementsAre("Sound has stopped: a stand-in for a device", "No sound: status 4711"));
}

TEST_F(AudioQueueTest, StoppingWhileTheDeviceOpensIsClean) {
    NullAudioDriver::Options options;
    options.openTime = 1s;
    use(options);
    makeAndStart();
    advance(100ms);
    EXPECT_EQ(AudioQueueStop(queue), 0);
    EXPECT_EQ(driver->outputs(), 0);
    advance(2s);
    EXPECT_TRUE(driver->heard().empty());
}
