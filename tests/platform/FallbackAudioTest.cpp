#include "platform/FallbackAudioOutput.h"
#include "platform/NullAudioOutput.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <memory>
#include <string>

using namespace qivo;
using namespace std::chrono_literals;
using std::chrono::nanoseconds;
using testing::Each;
using testing::IsEmpty;
using testing::Not;
using State = AudioOutput::State;

namespace {

class Ones : public AudioSource {
  public:
    void pull(float* out, std::size_t floats) noexcept override { std::fill_n(out, floats, 1.0F); }
    void stateChanged() noexcept override { ++changes; }
    std::atomic<int> changes = 0;
};

NullAudioDriver::Options absent() {
    NullAudioDriver::Options options;
    options.failingOpens = -1;
    options.absent = true;
    return options;
}

NullAudioDriver::Options failing() {
    NullAudioDriver::Options options;
    options.failingOpens = -1;
    return options;
}

class FallbackAudioTest : public testing::Test {
  protected:
    void TearDown() override {
        output.reset();
        EXPECT_EQ(preferred->outputs(), 0);
        EXPECT_EQ(fallback->outputs(), 0);
    }

    void open() {
        output.reset();
        ASSERT_EQ(driver.open(format, source, output), 0);
    }

    State advance(nanoseconds time) {
        for (nanoseconds passed{}; passed < time; passed += 10ms) {
            preferred->advance(10ms);
            fallback->advance(10ms);
            static_cast<void>(output->state());
        }
        return output->state();
    }

    const AudioStreamBasicDescription format{48000.0, kAudioFormatLinearPCM, 9, 8, 1, 8, 2, 32, 0};
    const std::shared_ptr<Ones> source = std::make_shared<Ones>();
    const std::shared_ptr<NullAudioDriver> preferred = std::make_shared<NullAudioDriver>();
    const std::shared_ptr<NullAudioDriver> fallback = std::make_shared<NullAudioDriver>();
    FallbackAudioDriver driver{preferred, fallback};
    std::unique_ptr<AudioOutput> output;
};

} // namespace

TEST_F(FallbackAudioTest, ThePreferredDriverPlaysWhereItCan) {
    open();
    EXPECT_EQ(output->state(), State::Opening);
    EXPECT_EQ(advance(100ms), State::Running);
    EXPECT_THAT(preferred->heard(), Not(IsEmpty()));
    EXPECT_EQ(fallback->attempts(), 0);
}

TEST_F(FallbackAudioTest, WhereNothingIsThereTheOtherPlays) {
    preferred->setOptions(absent());
    open();
    EXPECT_EQ(advance(100ms), State::Running);
    EXPECT_EQ(preferred->outputs(), 0);
    ASSERT_THAT(fallback->heard(), Not(IsEmpty()));
    EXPECT_THAT(fallback->heard(), Each(1.0F));
}

TEST_F(FallbackAudioTest, WhereSomethingIsThereButFailsTheOtherIsNotTried) {
    preferred->setOptions(failing());
    open();
    EXPECT_EQ(advance(100ms), State::Failed);
    EXPECT_EQ(fallback->attempts(), 0);
}

TEST_F(FallbackAudioTest, WhatWasThereOnceIsWaitedFor) {
    open();
    ASSERT_EQ(advance(50ms), State::Running);
    preferred->setOptions(absent());
    open();
    EXPECT_EQ(advance(100ms), State::Absent);
    EXPECT_EQ(fallback->attempts(), 0);
}

TEST_F(FallbackAudioTest, BothMayFail) {
    preferred->setOptions(absent());
    fallback->setOptions(failing());
    open();
    EXPECT_EQ(advance(100ms), State::Failed);
}

TEST_F(FallbackAudioTest, AnOtherThatCannotTryFails) {
    preferred->setOptions(absent());
    NullAudioDriver::Options refusing;
    refusing.status = 4711;
    fallback->setOptions(refusing);
    open();
    EXPECT_EQ(advance(100ms), State::Failed);
}

TEST_F(FallbackAudioTest, APreferredDriverThatCannotTryIsTheAnswer) {
    NullAudioDriver::Options refusing;
    refusing.status = 4711;
    preferred->setOptions(refusing);
    EXPECT_EQ(driver.open(format, source, output), 4711);
    EXPECT_EQ(output, nullptr);
}

TEST_F(FallbackAudioTest, ThePreferredDriverIsLookedForNowAndThenAndSilently) {
    preferred->setOptions(absent());
    open();
    ASSERT_EQ(advance(FallbackAudioDriver::kLookInterval - 1s), State::Running);
    EXPECT_EQ(preferred->attempts(), 1);
    ASSERT_EQ(advance(FallbackAudioDriver::kLookInterval + 2s), State::Running);
    EXPECT_EQ(preferred->attempts(), 3);
    EXPECT_EQ(preferred->outputs(), 0);
    preferred->setOptions(NullAudioDriver::Options());
    EXPECT_EQ(advance(FallbackAudioDriver::kLookInterval), State::Failed);
    EXPECT_THAT(preferred->heard(), Each(0.0F));
    const int attempts = fallback->attempts();
    open();
    EXPECT_EQ(advance(50ms), State::Running);
    EXPECT_EQ(fallback->attempts(), attempts);
    EXPECT_EQ(fallback->outputs(), 0);
    EXPECT_EQ(preferred->heard().back(), 1.0F);
}

TEST_F(FallbackAudioTest, APreferredDriverWithoutADeviceLeavesTheOtherItsSound) {
    preferred->setOptions(absent());
    open();
    ASSERT_EQ(advance(50ms), State::Running);
    preferred->setOptions(failing());
    ASSERT_EQ(advance(3 * FallbackAudioDriver::kLookInterval - 1s), State::Running);
    EXPECT_EQ(preferred->attempts(), 3) << "and is looked for as before";
    EXPECT_EQ(fallback->attempts(), 1);
    open();
    EXPECT_EQ(advance(100ms), State::Running) << "what never played is not waited for";
    EXPECT_EQ(fallback->attempts(), 2);
    preferred->setOptions(NullAudioDriver::Options());
    EXPECT_EQ(advance(FallbackAudioDriver::kLookInterval), State::Failed);
    preferred->setOptions(failing());
    open();
    EXPECT_EQ(advance(100ms), State::Failed) << "what has played is";
    EXPECT_EQ(fallback->attempts(), 2);
}

TEST_F(FallbackAudioTest, ItSaysWhatItPlaysToAndWhy) {
    preferred->setOptions(absent());
    fallback->setOptions(failing());
    const std::string one = "a stand-in for a device";
    open();
    EXPECT_EQ(output->description(), one);
    ASSERT_EQ(advance(50ms), State::Failed);
    EXPECT_EQ(output->description(), one + "; " + one);
    fallback->setOptions(NullAudioDriver::Options());
    open();
    ASSERT_EQ(advance(50ms), State::Running);
    preferred->setOptions(NullAudioDriver::Options());
    ASSERT_EQ(advance(FallbackAudioDriver::kLookInterval), State::Failed);
    EXPECT_EQ(output->description(), one + " is there now");
}

TEST_F(FallbackAudioTest, TheOthersEndIsTold) {
    preferred->setOptions(absent());
    open();
    ASSERT_EQ(advance(50ms), State::Running);
    const int before = source->changes;
    fallback->unplug();
    EXPECT_EQ(output->state(), State::Failed);
    EXPECT_GT(source->changes, before);
}
