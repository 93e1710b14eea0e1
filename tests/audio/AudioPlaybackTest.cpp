#include "audio/AudioPlayback.h"

#include "tests/audio/AudioFrames.h"
#include "tests/audio/AudioPlaybackState.h"
#include "tests/audio/FakeAudioQueue.h"
#include "tests/audio/SoundAnalysis.h"
#include "tests/fake/FakeQivo.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstring>
#include <limits>

using namespace qivo;
using namespace qivo::test;
using testing::Each;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::StartsWith;

namespace {

bool noMemory = false;

} // namespace

extern "C" {

void* __real_realloc(void* memory, std::size_t size); // NOLINT(bugprone-reserved-identifier): the linker's names

void* __wrap_realloc(void* memory, std::size_t size) { // NOLINT(bugprone-reserved-identifier)
    return noMemory ? nullptr : __real_realloc(memory, size);
}

} // extern "C"

namespace {

constexpr std::uint32_t kBufferBytes = 12800;

/// A player bound to the model as the application's controller binds it, on a scripted queue and a scripted libqivo.
class AudioPlaybackTest : public testing::Test {
  protected:
    void SetUp() override {
        fake.reset();
        queue.reset();
        AppData::inst()->setMute(false);
        select("", "");
        player = std::make_unique<AudioPlayback>();
        QObject::connect(AppData::inst(), &AppData::muteChanged, &context,
                         [this] { player->setMute(AppData::inst()->mute()); });
        QObject::connect(AppData::inst(), &AppData::selectedQIVOSourceChangedCountChanged, &context, [this] {
            player->setSourceChangedCounter(AppData::inst()->selectedQIVOSourceChangedCount());
        });
    }

    void TearDown() override {
        context.blockSignals(true);
        QObject::disconnect(AppData::inst(), nullptr, &context, nullptr);
        player.reset();
        EXPECT_EQ(fake.openReceivers(), 0);
        EXPECT_EQ(fake.framesOut(), 0);
        EXPECT_THAT(fake.misuse(), IsEmpty());
        EXPECT_EQ(queue.queue, nullptr);
    }

    static void select(const char* name, const char* url) { AppData::inst()->setQIVOSourceInfoNamed(name, url); }
    AudioPlaybackState state() { return AudioPlaybackState(*player); }

    /// Plays the next buffer out and returns what the player enqueued in its place.
    FakeAudioQueue::Enqueued turn() {
        const std::size_t before = queue.enqueued.size();
        queue.playOut(queue.buffers().at(nextBuffer++ % 3));
        EXPECT_EQ(queue.enqueued.size(), before + 1);
        return queue.enqueued.back();
    }

    void setWaiting(std::int32_t frames) { fake.setQueue({0, frames, 0}); }

    /// A player that is primed and has nothing staged.
    void playPrimed() {
        select("A (1)", "u1");
        setWaiting(3);
        turn();
        ASSERT_TRUE(state().primed());
        fake.takeCalls();
    }

    FakeQivo& fake = FakeQivo::instance();
    FakeAudioQueue& queue = FakeAudioQueue::instance();
    QObject context;
    std::unique_ptr<AudioPlayback> player;
    std::size_t nextBuffer = 0;
};

bool isSilence(const FakeAudioQueue::Enqueued& buffer) {
    return buffer.byteSize == kBufferBytes && buffer.samples == std::vector<float>(buffer.samples.size(), 0.0F);
}

} // namespace

// --- Creation and format.

TEST_F(AudioPlaybackTest, InitTakesTheSharedModelAndHasNeitherQueueNorReceiver) {
    EXPECT_EQ(state().model(), AppData::inst());
    EXPECT_FALSE(state().playing());
    EXPECT_EQ(state().queue(), nullptr);
    EXPECT_EQ(state().receiver(), nullptr);
    EXPECT_EQ(state().stage(), nullptr);
    EXPECT_EQ(state().sampleRate(), 0);
    EXPECT_THAT(queue.calls, IsEmpty());
}

TEST_F(AudioPlaybackTest, OutputIsInterleavedStereoFloatAt48000Hz) {
    const AudioStreamBasicDescription& format = state().format();
    EXPECT_EQ(format.mSampleRate, 48000.0);
    EXPECT_EQ(format.mFormatID, 0x6C70636DU); // "lpcm"
    EXPECT_EQ(format.mFormatFlags, 9U);
    EXPECT_EQ(format.mBytesPerPacket, 8U);
    EXPECT_EQ(format.mFramesPerPacket, 1U);
    EXPECT_EQ(format.mBytesPerFrame, 8U);
    EXPECT_EQ(format.mChannelsPerFrame, 2U);
    EXPECT_EQ(format.mBitsPerChannel, 32U);
    EXPECT_EQ(format.mReserved, 0U);
}

// --- Mute and the counter.

TEST_F(AudioPlaybackTest, RestoredMutePlaysNothingUntilASourceIsChosenAndMuteIsOff) {
    AppData::inst()->setMute(true);
    select("A (1)", "u1");
    EXPECT_FALSE(state().playing());
    EXPECT_THAT(queue.calls, IsEmpty());
    AppData::inst()->setMute(false);
    EXPECT_TRUE(state().playing());
}

TEST_F(AudioPlaybackTest, ChoosingWhileMutedStartsNothingAndMuteOffStarts) {
    player->setMute(true);
    select("A (1)", "u1");
    EXPECT_THAT(queue.calls, IsEmpty());
    EXPECT_EQ(player->sourceChangedCounter(), AppData::inst()->selectedQIVOSourceChangedCount());
    player->setMute(false);
    EXPECT_TRUE(state().playing());
    EXPECT_FALSE(player->mute());
}

TEST_F(AudioPlaybackTest, MuteOffWithoutASourceDoesNothing) {
    player->setMute(false);
    EXPECT_FALSE(state().playing());
    EXPECT_THAT(queue.calls, IsEmpty());
}

TEST_F(AudioPlaybackTest, ANameAloneOrAUrlAloneCountsAsASource) {
    select("A (1)", "");
    EXPECT_TRUE(state().playing());
    player->stopPlayback();
    select("", "u1");
    EXPECT_TRUE(state().playing());
}

TEST_F(AudioPlaybackTest, MuteOffWhilePlayingDoesNotStartAgain) {
    select("A (1)", "u1");
    queue.takeCalls();
    player->setMute(false);
    EXPECT_THAT(queue.calls, IsEmpty());
}

TEST_F(AudioPlaybackTest, CounterWithoutASourceStops) {
    select("A (1)", "u1");
    select("", "");
    EXPECT_FALSE(state().playing());
    EXPECT_EQ(queue.queue, nullptr);
}

TEST_F(AudioPlaybackTest, CounterWithoutASourceStopsAlsoWhenNotPlaying) {
    player->setSourceChangedCounter(5);
    EXPECT_FALSE(state().playing());
    EXPECT_EQ(player->sourceChangedCounter(), 5);
    EXPECT_THAT(queue.calls, IsEmpty());
}

// --- Start.

TEST_F(AudioPlaybackTest, StartOpensThreeSilentBuffersThenStarts) {
    testing::internal::CaptureStdout();
    select("A (1)", "u1");
    EXPECT_EQ(testing::internal::GetCapturedStdout(), "Playing \n");
    EXPECT_THAT(queue.calls,
                ElementsAre("NewOutput", "AllocateBuffer(12800)", "EnqueueBuffer(b1, 12800)", "AllocateBuffer(12800)",
                            "EnqueueBuffer(b2, 12800)", "AllocateBuffer(12800)", "EnqueueBuffer(b3, 12800)", "Start"));
    for (const auto& buffer : queue.enqueued) {
        EXPECT_TRUE(isSilence(buffer));
    }
    EXPECT_EQ(queue.format.mSampleRate, 48000.0);
    EXPECT_EQ(queue.userData, player.get());
    EXPECT_EQ(queue.callback, &AudioOutputCallback);
    EXPECT_EQ(state().activeCounter(), 0);
    EXPECT_THAT(fake.calls(), IsEmpty());
}

TEST_F(AudioPlaybackTest, QueueCreationFailureIsSilentAndLaterTriesAgain) {
    queue.newStatus = -50;
    testing::internal::CaptureStdout();
    select("A (1)", "u1");
    EXPECT_EQ(testing::internal::GetCapturedStdout(), "");
    EXPECT_FALSE(state().playing());
    EXPECT_THAT(queue.takeCalls(), ElementsAre("NewOutput"));
    queue.newStatus = 0;
    player->setMute(false);
    EXPECT_TRUE(state().playing());
}

TEST_F(AudioPlaybackTest, StartFailureIsToldAndCountsAsPlaying) {
    queue.startStatus = -66681;
    testing::internal::CaptureStdout();
    select("A (1)", "u1");
    EXPECT_EQ(testing::internal::GetCapturedStdout(), "AudioQueueStart returned status -66681 \n");
    EXPECT_TRUE(state().playing());
    queue.takeCalls();
    player->setMute(false);
    select("B (2)", "u2");
    EXPECT_THAT(queue.calls, IsEmpty());
}

TEST_F(AudioPlaybackTest, BuffersThatCannotBeHadAreDoneWithout) {
    queue.allocateStatus = -1;
    select("A (1)", "u1");
    EXPECT_THAT(queue.calls, ElementsAre("NewOutput", "AllocateBuffer(12800)", "AllocateBuffer(12800)",
                                         "AllocateBuffer(12800)", "Start"));
    EXPECT_TRUE(state().playing());
}

TEST_F(AudioPlaybackTest, ResultOfTheFirstEnqueuesIsIgnored) {
    queue.enqueueStatus = -2;
    testing::internal::CaptureStdout();
    select("A (1)", "u1");
    EXPECT_EQ(testing::internal::GetCapturedStdout(), "Playing \n");
}

TEST_F(AudioPlaybackTest, StartingTwiceKeepsTheOneQueue) {
    select("A (1)", "u1");
    queue.takeCalls();
    player->startPlayback();
    EXPECT_THAT(queue.calls, IsEmpty());
}

// --- Stop.

TEST_F(AudioPlaybackTest, StopFreesQueueReceiverAndStage) {
    playPrimed();
    fake.addCapture(audioFrame(48000, {ramp(480, 0)}));
    turn();
    queue.takeCalls();
    fake.takeCalls();
    ASSERT_GT(state().size(), 0U);
    player->stopPlayback();
    EXPECT_THAT(queue.calls, ElementsAre("Stop", "FreeBuffer(b1)", "FreeBuffer(b2)", "FreeBuffer(b3)", "Dispose"));
    EXPECT_THAT(fake.calls(), ElementsAre("recv_destroy(r1)"));
    EXPECT_EQ(state().queue(), nullptr);
    EXPECT_EQ(state().buffer(0), nullptr);
    EXPECT_EQ(state().buffer(2), nullptr);
    EXPECT_EQ(state().receiver(), nullptr);
    EXPECT_EQ(state().stage(), nullptr);
    EXPECT_EQ(state().capacity(), 0U);
    EXPECT_EQ(state().size(), 0U);
    EXPECT_EQ(state().cursor(), 0U);
    EXPECT_FALSE(state().playing());
}

TEST_F(AudioPlaybackTest, MuteStopsAPlayingPlayer) {
    select("A (1)", "u1");
    AppData::inst()->setMute(true);
    EXPECT_FALSE(state().playing());
    EXPECT_EQ(queue.queue, nullptr);
}

TEST_F(AudioPlaybackTest, ShutdownTwiceAndStopWhenStoppedAreHarmless) {
    select("A (1)", "u1");
    player->shutdown();
    queue.takeCalls();
    player->shutdown();
    player->stopPlayback();
    EXPECT_THAT(queue.calls, IsEmpty());
    EXPECT_FALSE(state().playing());
}

TEST_F(AudioPlaybackTest, DestructionStops) {
    playPrimed();
    queue.takeCalls();
    QObject::disconnect(AppData::inst(), nullptr, &context, nullptr);
    player.reset();
    EXPECT_THAT(queue.calls, ElementsAre("Stop", "FreeBuffer(b1)", "FreeBuffer(b2)", "FreeBuffer(b3)", "Dispose"));
    EXPECT_EQ(fake.openReceivers(), 0);
}

// --- The receiver.

TEST_F(AudioPlaybackTest, FirstCallbackMakesAnAudioOnlyReceiverAfterItHasEnqueued) {
    select("MACHINE (SOURCE é)", "rtsp://127.0.0.1:5/x");
    std::size_t enqueuedBefore = 0;
    fake.setHook([&](const std::string& line) {
        if (line.rfind("recv_create", 0) == 0) {
            enqueuedBefore = queue.enqueued.size();
        }
    });
    EXPECT_TRUE(isSilence(turn()));
    EXPECT_EQ(enqueuedBefore, 4U);
    EXPECT_THAT(fake.calls(),
                ElementsAre("recv_create_v3(name=MACHINE (SOURCE é), url=rtsp://127.0.0.1:5/x, color=100, "
                            "bandwidth=10, fields=1, receiver=null)",
                            "recv_get_queue(r1)"));
    EXPECT_EQ(state().activeCounter(), AppData::inst()->selectedQIVOSourceChangedCount());
}

TEST_F(AudioPlaybackTest, ASourceWithoutAUrlIsAskedForByNameAlone) {
    AppData::inst()->setQIVOSourceInfoNamed("A (1)", QString());
    turn();
    EXPECT_THAT(fake.callsOf("recv_create"), ElementsAre(StartsWith("recv_create_v3(name=A (1), url=null,")));
}

TEST_F(AudioPlaybackTest, UnprimedUntilThreeFramesWait) {
    select("A (1)", "u1");
    fake.addCapture(audioFrame(48000, {ramp(480, 0)}));
    for (const std::int32_t waiting : {0, 1, 2}) {
        setWaiting(waiting);
        EXPECT_TRUE(isSilence(turn()));
        EXPECT_FALSE(state().primed());
    }
    EXPECT_THAT(fake.callsOf("recv_capture"), IsEmpty());
    setWaiting(3);
    EXPECT_TRUE(isSilence(turn()));
    EXPECT_TRUE(state().primed());
    EXPECT_THAT(fake.callsOf("recv_capture"), ElementsAre("recv_capture_v2(r1, audio, timeout=16) -> 2"));
    setWaiting(0);
    fake.takeCalls();
    turn();
    EXPECT_THAT(fake.callsOf("recv_get_queue"), IsEmpty()) << "a primed receiver is not asked again";
}

TEST_F(AudioPlaybackTest, OnlyTheAudioFramesCountForPriming) {
    select("A (1)", "u1");
    fake.setQueue({9, 2, 9});
    turn();
    EXPECT_FALSE(state().primed());
}

TEST_F(AudioPlaybackTest, AReceiverThatCannotBeMadeIsSilence) {
    fake.setReceiverCreates(false);
    select("A (1)", "u1");
    for (int i = 0; i < 5; ++i) {
        EXPECT_TRUE(isSilence(turn()));
    }
    EXPECT_EQ(state().receiver(), nullptr);
    EXPECT_EQ(fake.callsOf("recv_create").size(), 1U) << "the same selection is not tried again";
    EXPECT_THAT(fake.callsOf("recv_get_queue"), Each("recv_get_queue(null)"));
}

TEST_F(AudioPlaybackTest, SelectingTheSameSourceAgainReplacesTheReceiver) {
    playPrimed();
    select("A (1)", "u1");
    turn();
    EXPECT_THAT(fake.callsOf("recv_"),
                ElementsAre("recv_destroy(r1)", StartsWith("recv_create_v3(name=A (1), url=u1,"), "recv_get_queue(r2)",
                            "recv_capture_v2(r2, audio, timeout=16) -> 0"));
}

TEST_F(AudioPlaybackTest, AfterMuteTheFirstCallbackMakesAReceiverAndPrimesAnew) {
    playPrimed();
    player->setMute(true);
    setWaiting(2);
    player->setMute(false);
    EXPECT_EQ(state().activeCounter(), 0);
    EXPECT_FALSE(state().primed());
    nextBuffer = 0;
    turn();
    EXPECT_THAT(fake.callsOf("recv_"), ElementsAre("recv_destroy(r1)", StartsWith("recv_create_v3(name=A (1), url=u1,"),
                                                   "recv_get_queue(r2)"));
}

TEST_F(AudioPlaybackTest, SwitchingPlaysTheStageOutReplacesTheReceiverAndPrimesAnew) {
    playPrimed();
    fake.addCapture(audioFrame(48000, {ramp(2000, 0.25F, 0), ramp(2000, -0.25F, 0)}));
    turn();
    ASSERT_EQ(state().size(), 16000U);
    queue.takeCalls();
    fake.takeCalls();
    setWaiting(2);
    select("B (2)", "u2");
    EXPECT_THAT(queue.calls, IsEmpty()) << "the queue goes on";
    EXPECT_THAT(fake.calls(), IsEmpty()) << "the next callback does it";

    EXPECT_EQ(turn().byteSize, 12800U);
    EXPECT_THAT(fake.calls(), ElementsAre("recv_destroy(r1)", StartsWith("recv_create_v3(name=B (2), url=u2,")));
    EXPECT_FALSE(state().primed());
    const auto last = turn();
    EXPECT_EQ(last.byteSize, 3200U) << "the old source's sound is played out";
    EXPECT_EQ(last.samples[0], 0.25F);
    EXPECT_TRUE(isSilence(turn())) << "silence between";
    setWaiting(3);
    fake.addCapture(audioFrame(48000, {ramp(1600, 0.5F, 0), ramp(1600, 0.75F, 0)}));
    EXPECT_TRUE(isSilence(turn()));
    const auto first = turn();
    EXPECT_EQ(first.samples[0], 0.5F) << "the resamplers have forgotten the old source";
    EXPECT_EQ(first.samples[1], 0.75F);
}

TEST_F(AudioPlaybackTest, SwitchingResetsTheResamplers) {
    playPrimed();
    fake.addCapture(audioFrame(44100, {ramp(441, 0.9F, 0), ramp(441, 0.9F, 0)}));
    turn();
    select("B (2)", "u2");
    turn();
    fake.addCapture(audioFrame(44100, {ramp(441, 0.1F, 0), ramp(441, -0.1F, 0)}));
    turn();
    const auto first = turn();
    for (const float sample : channelOf(first.samples, 0)) {
        EXPECT_NEAR(sample, 0.1F, 1e-6F);
    }
    for (const float sample : channelOf(first.samples, 1)) {
        EXPECT_NEAR(sample, -0.1F, 1e-6F);
    }
}

// --- Frames.

TEST_F(AudioPlaybackTest, StereoAt48000PassesUnchanged) {
    playPrimed();
    const auto left = ramp(1600, -0.2F);
    const auto right = ramp(1600, 0.3F);
    fake.addCapture(audioFrame(48000, {left, right}));
    EXPECT_TRUE(isSilence(turn()));
    EXPECT_EQ(state().capacity(), 1602U * 8);
    EXPECT_EQ(state().size(), 12800U);
    EXPECT_EQ(fake.framesOut(), 0);
    const auto played = turn();
    EXPECT_EQ(played.byteSize, 12800U);
    EXPECT_EQ(channelOf(played.samples, 0), left);
    EXPECT_EQ(channelOf(played.samples, 1), right);
}

TEST_F(AudioPlaybackTest, MonoPlaysTheSameSamplesOnBothChannels) {
    playPrimed();
    Tone tone(440, 44100);
    fake.addCapture(audioFrame(44100, {tone.next(1024)}));
    turn();
    const auto played = turn();
    EXPECT_GT(played.samples.size(), 2000U);
    EXPECT_EQ(channelOf(played.samples, 0), channelOf(played.samples, 1));
    EXPECT_GT(*std::max_element(played.samples.begin(), played.samples.end()), 0.4F);
}

TEST_F(AudioPlaybackTest, PlanesAfterTheSecondAreDropped) {
    playPrimed();
    fake.addCapture(audioFrame(48000, {ramp(480, 0.1F, 0), ramp(480, 0.2F, 0), ramp(480, 0.3F, 0)}));
    turn();
    const auto played = turn();
    EXPECT_EQ(played.byteSize, 480U * 8);
    EXPECT_THAT(channelOf(played.samples, 0), Each(0.1F));
    EXPECT_THAT(channelOf(played.samples, 1), Each(0.2F));
}

TEST_F(AudioPlaybackTest, FrameOf44100HzNeeds1117FramesAndYieldsAbout1115) {
    playPrimed();
    Tone left(440, 44100);
    Tone right(660, 44100);
    fake.addCapture(audioFrame(44100, {left.next(1024), right.next(1024)}));
    turn();
    EXPECT_EQ(state().capacity(), 8936U);
    EXPECT_NEAR(state().size() / 8, 1115, 1);
    EXPECT_EQ(state().size() % 8, 0U);
}

TEST_F(AudioPlaybackTest, TheStageOnlyGrows) {
    playPrimed();
    for (const std::size_t samples : {1600U, 480U, 1600U}) {
        fake.addCapture(audioFrame(48000, {ramp(samples, 0)}));
        turn();
        EXPECT_EQ(state().capacity(), 1602U * 8);
        turn();
        fake.takeCalls();
    }
    fake.addCapture(audioFrame(48000, {ramp(3200, 0)}));
    turn();
    EXPECT_EQ(state().capacity(), 3202U * 8);
}

TEST_F(AudioPlaybackTest, ALongFrameIsSpreadAndItsLastPieceIsShort) {
    playPrimed();
    const auto left = ramp(3500, 0);
    fake.addCapture(audioFrame(48000, {left}));
    turn();
    fake.takeCalls();
    std::vector<float> played;
    for (const std::uint32_t bytes : {12800U, 12800U, 2400U}) {
        EXPECT_THAT(fake.callsOf("recv_capture"), IsEmpty()) << "nothing is pulled while something is staged";
        const auto buffer = turn();
        EXPECT_EQ(buffer.byteSize, bytes);
        const auto piece = channelOf(buffer.samples, 0);
        played.insert(played.end(), piece.begin(), piece.end());
    }
    EXPECT_EQ(played, left);
    EXPECT_EQ(fake.callsOf("recv_capture").size(), 1U) << "the last piece leaves the stage empty";
}

TEST_F(AudioPlaybackTest, NoFrameInTimeIsSilenceAndNoRepeat) {
    playPrimed();
    fake.addCapture(audioFrame(48000, {ramp(1600, 0.5F, 0)}));
    turn();
    EXPECT_EQ(turn().samples[0], 0.5F);
    EXPECT_TRUE(isSilence(turn()));
    EXPECT_TRUE(isSilence(turn()));
    EXPECT_THAT(fake.callsOf("recv_capture").back(), "recv_capture_v2(r1, audio, timeout=16) -> 0");
    fake.addCapture(audioFrame(48000, {ramp(1600, 0.25F, 0)}));
    EXPECT_TRUE(isSilence(turn()));
    EXPECT_EQ(turn().samples[0], 0.25F);
}

TEST_F(AudioPlaybackTest, StatusChangesAreSkippedWithHalvedWaits) {
    playPrimed();
    for (int i = 0; i < 7; ++i) {
        fake.addStatusChange();
    }
    fake.addCapture(audioFrame(48000, {ramp(480, 0.5F, 0)}));
    turn();
    EXPECT_THAT(
        fake.callsOf("recv_capture"),
        ElementsAre("recv_capture_v2(r1, audio, timeout=16) -> 100", "recv_capture_v2(r1, audio, timeout=8) -> 100",
                    "recv_capture_v2(r1, audio, timeout=4) -> 100", "recv_capture_v2(r1, audio, timeout=2) -> 100",
                    "recv_capture_v2(r1, audio, timeout=1) -> 100", "recv_capture_v2(r1, audio, timeout=0) -> 100",
                    "recv_capture_v2(r1, audio, timeout=0) -> 100", "recv_capture_v2(r1, audio, timeout=0) -> 2"));
    EXPECT_EQ(state().size(), 480U * 8);
}

TEST_F(AudioPlaybackTest, OtherResultsAreNothing) {
    playPrimed();
    FakeQivo::Capture error;
    error.type = QIVOlib_frame_type_error;
    fake.addCapture(std::move(error));
    turn();
    EXPECT_EQ(fake.callsOf("recv_capture").size(), 1U);
    EXPECT_THAT(fake.callsOf("recv_free"), IsEmpty());
    EXPECT_TRUE(isSilence(turn()));
}

TEST_F(AudioPlaybackTest, EnqueueFailureIsToldAndTheCallbackCarriesOn) {
    playPrimed();
    queue.enqueueStatus = 4;
    fake.addCapture(audioFrame(48000, {ramp(480, 0.5F, 0)}));
    testing::internal::CaptureStdout();
    turn();
    EXPECT_EQ(testing::internal::GetCapturedStdout(), "enqueuebuffer result 4 \n");
    EXPECT_EQ(state().size(), 480U * 8);
}

TEST_F(AudioPlaybackTest, TheCallbackEnqueuesOnThePlayersOwnQueue) {
    select("A (1)", "u1");
    queue.takeCalls();
    AudioOutputCallback(player.get(), nullptr, queue.buffers().at(1));
    player->AudioOutputCallbackImp(nullptr, queue.buffers().at(2));
    EXPECT_THAT(queue.calls, ElementsAre("EnqueueBuffer(b2, 12800)", "EnqueueBuffer(b3, 12800)"));
}

TEST_F(AudioPlaybackTest, ASourceThatBecomesStereoPlaysBothChannels) {
    playPrimed();
    Tone mono(440, 44100);
    Tone left(440, 44100);
    Tone right(660, 44100);
    for (int i = 0; i < 5; ++i) {
        fake.addCapture(audioFrame(44100, {mono.next(441)}));
        turn();
        turn();
    }
    fake.addCapture(audioFrame(44100, {left.next(441), right.next(441)}));
    turn();
    const auto played = turn();
    EXPECT_NEAR(played.byteSize / 8, 480, 2);
    for (const float sample : played.samples) {
        EXPECT_LE(std::abs(sample), 1.0F);
    }
}

TEST_F(AudioPlaybackTest, TheRightResamplerHasNotHeardTheMonoThatCameBefore) {
    playPrimed();
    for (int i = 0; i < 3; ++i) {
        fake.addCapture(audioFrame(44100, {ramp(441, 0.9F, 0)}));
        turn();
        turn();
    }
    fake.addCapture(audioFrame(44100, {ramp(441, 0.9F, 0), ramp(441, -0.5F, 0)}));
    turn();
    const auto played = turn();
    for (const float sample : channelOf(played.samples, 1)) {
        EXPECT_NEAR(sample, -0.5F, 1e-6F);
    }
}

TEST_F(AudioPlaybackTest, TheRightChannelSaysHowManyFramesThereAre) {
    // What the two make of the same frames: the left one has a position that the right one, new to the stream, has not.
    constexpr std::size_t kSamples = 100;
    AudioResampler used;
    AudioResampler fresh;
    const auto yield = [](AudioResampler& resampler) {
        std::vector<float> plane(kSamples, 0.5F);
        std::vector<float> out(2 * kSamples);
        resampler.setSourceSampleRate(44100, 48000);
        SampleCursor src{plane.data(), plane.data() + plane.size()};
        SampleCursor dst{out.data(), out.data() + out.size()};
        resampler.processSrc(&src, &dst, 1, 1);
        return static_cast<std::uint32_t>(dst.position - out.data());
    };
    playPrimed();
    const auto play = [this](std::vector<std::vector<float>> channels) {
        fake.addCapture(audioFrame(44100, channels));
        turn();
        const std::uint32_t frames = state().size() / 8;
        turn();
        return frames;
    };
    std::uint32_t left = 0;
    const std::uint32_t right = yield(fresh);
    // Mono until the two differ at the next frame.
    int played = 0;
    for (AudioResampler next = used; played < 100 && (left = yield(next)) == right; next = used, ++played) {
        EXPECT_EQ(play({ramp(kSamples, 0.5F, 0)}), yield(used));
    }
    ASSERT_NE(left, right);
    EXPECT_EQ(play({ramp(kSamples, 0.5F, 0), ramp(kSamples, 0.5F, 0)}), right);
}

// --- Bad input: silence, no crash, and the next good frame plays.

class AudioPlaybackBadFrameTest : public AudioPlaybackTest {
  protected:
    /// Plays a frame and then a good one; returns what was played for the first.
    FakeAudioQueue::Enqueued playBad(FakeQivo::Capture bad) {
        playPrimed();
        fake.addCapture(std::move(bad));
        turn();
        EXPECT_EQ(fake.framesOut(), 0) << "given back";
        auto played = turn();
        while (state().cursor() < state().size()) {
            turn();
        }
        fake.addCapture(audioFrame(48000, {ramp(1600, 0.5F, 0), ramp(1600, 0.25F, 0)}));
        turn();
        EXPECT_EQ(state().size(), 12800U);
        const auto good = turn();
        EXPECT_EQ(good.samples[3198], 0.5F);
        EXPECT_EQ(good.samples[3199], 0.25F);
        return played;
    }
};

TEST_F(AudioPlaybackBadFrameTest, NoSamples) {
    auto bad = audioFrame(48000, {ramp(480, 0.9F, 0)});
    bad.audio.no_samples = 0;
    EXPECT_TRUE(isSilence(playBad(std::move(bad))));
}

TEST_F(AudioPlaybackBadFrameTest, NoSamplesInANullBuffer) {
    const auto played = playBad(audioFrame(48000, {{}, {}}));
    EXPECT_EQ(played.byteSize, 2U * 8) << "silence as long as no samples may yield";
    EXPECT_THAT(played.samples, Each(0.0F));
}

TEST_F(AudioPlaybackBadFrameTest, NegativeSamples) {
    auto bad = audioFrame(48000, {ramp(480, 0.9F, 0)});
    bad.audio.no_samples = -480;
    EXPECT_TRUE(isSilence(playBad(std::move(bad))));
}

TEST_F(AudioPlaybackBadFrameTest, NoChannels) {
    auto bad = audioFrame(48000, {ramp(480, 0.9F, 0)});
    bad.audio.no_channels = 0;
    EXPECT_TRUE(isSilence(playBad(std::move(bad))));
}

TEST_F(AudioPlaybackBadFrameTest, NegativeChannels) {
    auto bad = audioFrame(48000, {ramp(480, 0.9F, 0)});
    bad.audio.no_channels = -2;
    EXPECT_TRUE(isSilence(playBad(std::move(bad))));
}

TEST_F(AudioPlaybackBadFrameTest, NullBufferOfStereo) {
    auto bad = audioFrame(48000, {});
    bad.audio.no_channels = 2;
    bad.audio.no_samples = 480;
    const auto played = playBad(std::move(bad));
    EXPECT_EQ(played.byteSize, 482U * 8);
    EXPECT_THAT(played.samples, Each(0.0F));
}

TEST_F(AudioPlaybackBadFrameTest, NullBufferOfMono) {
    auto bad = audioFrame(48000, {});
    bad.audio.no_channels = 1;
    bad.audio.no_samples = 480;
    EXPECT_THAT(playBad(std::move(bad)).samples, Each(0.0F));
}

TEST_F(AudioPlaybackBadFrameTest, RateOfZero) {
    EXPECT_TRUE(isSilence(playBad(audioFrame(0, {ramp(480, 0.9F, 0)}))));
}

TEST_F(AudioPlaybackBadFrameTest, NegativeRate) {
    EXPECT_TRUE(isSilence(playBad(audioFrame(-48000, {ramp(480, 0.9F, 0)}))));
}

TEST_F(AudioPlaybackBadFrameTest, RateOfOneHertz) {
    EXPECT_TRUE(isSilence(playBad(audioFrame(1, {ramp(480, 0.9F, 0)}))));
}

TEST_F(AudioPlaybackBadFrameTest, TheLargestRate) {
    playPrimed();
    fake.addCapture(audioFrame(std::numeric_limits<std::int32_t>::max(), {ramp(480, 0.9F, 0), ramp(480, 0.9F, 0)}));
    turn();
    EXPECT_LE(state().size(), 3U * 8);
    EXPECT_EQ(fake.framesOut(), 0);
}

TEST_F(AudioPlaybackBadFrameTest, MoreSamplesThanTenSecondsHold) {
    constexpr std::int32_t longest = AudioPlayback::kLongestFrameInSeconds * 48000;
    auto bad = audioFrame(48000, {ramp(480, 0.9F, 0)});
    bad.audio.no_samples = longest + 1;
    EXPECT_TRUE(isSilence(playBad(std::move(bad))));
    fake.addCapture(audioFrame(48000, {ramp(longest, 0.1F, 0)}));
    turn();
    EXPECT_EQ(state().size(), static_cast<std::uint32_t>(longest) * 8) << "the limit itself plays";
}

TEST_F(AudioPlaybackBadFrameTest, TheLargestNumberOfSamples) {
    auto bad = audioFrame(48000, {ramp(480, 0.9F, 0)});
    bad.audio.no_samples = std::numeric_limits<std::int32_t>::max();
    EXPECT_TRUE(isSilence(playBad(std::move(bad))));
}

TEST_F(AudioPlaybackBadFrameTest, AFrameForWhichThereIsNoMemory) {
    playPrimed();
    fake.addCapture(audioFrame(48000, {ramp(480, 0.5F, 0)}));
    turn();
    turn();
    const float* const stage = state().stage();
    const std::uint32_t capacity = state().capacity();
    noMemory = true;
    fake.addCapture(audioFrame(48000, {ramp(4800, 0.9F, 0)}));
    turn();
    noMemory = false;
    EXPECT_EQ(fake.framesOut(), 0) << "given back";
    EXPECT_EQ(state().stage(), stage) << "as it was";
    EXPECT_EQ(state().capacity(), capacity);
    EXPECT_EQ(state().size(), 0U);
    fake.addCapture(audioFrame(48000, {ramp(4800, 0.25F, 0)}));
    EXPECT_TRUE(isSilence(turn()));
    EXPECT_EQ(turn().samples[0], 0.25F);
}

TEST_F(AudioPlaybackBadFrameTest, NotANumber) {
    const auto nan = ramp(480, std::numeric_limits<float>::quiet_NaN(), 0);
    EXPECT_EQ(playBad(audioFrame(48000, {nan, nan})).byteSize, 480U * 8);
}
