// The publisher's sound as others hear it.

#include "tests/support/Tone.h"
#include "tests/tools/Listener.h"
#include "tests/tools/MediaFile.h"
#include "tests/tools/Publisher.h"
#include "tests/tools/Watcher.h"

#include "tools/publish/Sound.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cmath>
#include <thread>

namespace qivo::test {
namespace {

using namespace std::chrono_literals;

/// Whether every channel carries its tone of the source, in this order; a packet that a busy machine loses costs a new
/// try.
template <typename AnyListener>
void expectTones(AnyListener& listener, std::size_t source, int rate, int channels, double tolerance) {
    Heard heard;
    for (int tries = 0; tries < 4; ++tries) {
        heard = listener.hear(500ms);
        const bool whole = !heard.planes.empty() && heard.rate == rate &&
                           std::abs(frequencyOf(heard.planes[0], rate) - toneFrequency(source, 0)) <= 1.0;
        if (whole) {
            break;
        }
    }
    ASSERT_EQ(heard.planes.size(), static_cast<std::size_t>(channels));
    EXPECT_EQ(heard.rate, rate);
    for (int channel = 0; channel < channels; ++channel) {
        const auto& plane = heard.planes[static_cast<std::size_t>(channel)];
        const int frequency = toneFrequency(source, channel);
        EXPECT_NEAR(frequencyOf(plane, rate), frequency, 1.0) << channel;
        EXPECT_NEAR(amplitudeAt(plane, rate, frequency), toneAmplitude, tolerance * toneAmplitude) << channel;
    }
}

TEST(SoundServing, everySourceHasItsToneInBothStreamsOverUdpAndTcp) {
    const PublishProcess publisher({"--source", "A", "--source", "B", "--size", "320x240"}, 4);
    for (const char* protocol : {"udp", "tcp"}) {
        for (std::size_t line = 0; line < 4; ++line) {
            Listener listener(publisher.address(line), protocol);
            listener.hear(200ms);
            expectTones(listener, line / 2, 48000, 2, 0.01);
        }
    }
}

struct Format {
    const char* codec;
    int rate;
    int channels;
    double tolerance = 0.01; ///< of the level
};

template <typename AnyListener>
void expectTonesAs(const std::vector<Format>& formats) {
    for (const Format& wanted : formats) {
        const PublishProcess publisher({"--size", "320x240", "--audio-codec", wanted.codec, "--audio-rate",
                                        std::to_string(wanted.rate), "--audio-channels",
                                        std::to_string(wanted.channels)});
        SCOPED_TRACE(std::string(wanted.codec) + " " + std::to_string(wanted.rate) + " " +
                     std::to_string(wanted.channels));
        AnyListener listener(publisher.address(0));
        listener.hear(300ms);
        expectTones(listener, 0, wanted.rate, wanted.channels, wanted.tolerance);
    }
}

TEST(SoundServing, everyCodecRateAndChannel) {
    expectTonesAs<Listener>({{"l16", 44100, 1},
                             {"l16", 192000, 2},
                             {"aac", 44100, 2, 0.1},
                             {"opus", 48000, 2, 0.1},
                             {"pcmu", 8000, 1, 0.1}});
}

TEST(SoundServing, channelsLieInThePacketsInTheirOrder) {
    expectTonesAs<PacketListener>({{"l16", 48000, 3},
                                   {"l16", 44100, 4},
                                   {"l16", 48000, 5},
                                   {"l16", 48000, 6},
                                   {"l16", 48000, 7},
                                   {"l16", 8000, 8},
                                   {"l24", 96000, 6},
                                   {"l24", 48000, 8}});
}

TEST(SoundServing, toneGoesOnWithoutAClick) {
    const PublishProcess publisher({"--size", "320x240", "--audio-rate", "44100"});
    Listener listener(publisher.address(0), "tcp");
    listener.hear(200ms);
    const Heard heard = listener.hear(2s);
    ASSERT_GE(heard.seconds(), 2.0);
    for (int channel = 0; channel < 2; ++channel) {
        const double step = toneAmplitude * 2.0 * std::acos(-1.0) * toneFrequency(0, channel) / 44100;
        EXPECT_LE(largestStep(heard.planes[static_cast<std::size_t>(channel)]), step + 2.0 / 32768);
    }
}

TEST(SoundServing, viewersAndListenersComeAndGoInAnyOrder) {
    const PublishProcess publisher({"--size", "320x240"});
    for (int i = 0; i < 3; ++i) {
        auto watcher = std::make_unique<Watcher>(publisher.address(0));
        ASSERT_TRUE(watcher->next()) << i;
        Listener listener(publisher.address(0));
        EXPECT_GE(listener.hear(200ms).seconds(), 0.2) << i;
        ASSERT_TRUE(watcher->next()) << i;
        watcher.reset();
        EXPECT_GE(listener.hear(200ms).seconds(), 0.2) << i;
        Watcher another(publisher.address(0));
        ASSERT_TRUE(another.next()) << i;
    }
}

TEST(SoundServing, whoeverComesWhileTheLastOneLeavesIsServed) {
    const PublishProcess publisher({"--size", "320x240"});
    auto watcher = std::make_unique<Watcher>(publisher.address(0));
    ASSERT_TRUE(watcher->next());
    for (int i = 0; i < 20; ++i) {
        std::thread leaving([last = std::move(watcher)]() mutable { last.reset(); });
        std::this_thread::sleep_for(i * 1ms); // the leaving has come so far
        watcher = std::make_unique<Watcher>(publisher.address(0));
        leaving.join();
        ASSERT_TRUE(watcher->next()) << i;
    }
}

TEST(SoundServing, sourceWithoutAudioDescribesNone) {
    const PublishProcess publisher({"--source", "A", "--no-audio", "--source", "B", "--size", "320x240"}, 4);
    for (const std::size_t silent : {0U, 1U}) {
        const std::string description = descriptionOf(publisher.address(silent));
        EXPECT_THAT(description, testing::HasSubstr("m=video"));
        EXPECT_THAT(description, testing::Not(testing::HasSubstr("m=audio")));
    }
    for (const std::size_t heard : {2U, 3U}) {
        EXPECT_THAT(descriptionOf(publisher.address(heard)), testing::HasSubstr("L16/48000/2"));
    }
}

// --- Inputs

const std::string kFilm = "videotestsrc num-buffers=60 ! video/x-raw,format=I420,width=320,height=240,framerate=20/1 ! "
                          "x264enc tune=zerolatency ! ";

TEST(SoundServing, soundOfAFileIsHeardAtTheRateAndChannelsThatWereAskedFor) {
    const MediaFile film(kFilm + "mp4mux name=m audiotestsrc freq=1000 num-buffers=130 samplesperbuffer=1024 ! "
                                 "audio/x-raw,rate=44100,channels=1 ! avenc_aac ! m. m.",
                         ".mp4");
    const PublishProcess publisher({"--input", film.path(), "--size", "320x240", "--audio-codec", "l24"});
    for (const std::size_t line : {0U, 1U}) {
        Listener listener(publisher.address(line));
        double frequency = 0.0;
        Heard heard;
        for (int tries = 0; tries < 20 && std::abs(frequency - 1000.0) > 1.0; ++tries) {
            heard = listener.hear(300ms);
            frequency = heard.planes.empty() ? 0.0 : frequencyOf(heard.planes[0], heard.rate);
        }
        EXPECT_EQ(heard.rate, 48000);
        ASSERT_EQ(heard.planes.size(), 2U);
        EXPECT_NEAR(frequency, 1000.0, 1.0) << line;
        EXPECT_NEAR(frequencyOf(heard.planes[1], heard.rate), 1000.0, 1.0);
    }
}

TEST(SoundServing, fileWithSoundLoopsInPictureAndSound) {
    const MediaFile film("videotestsrc num-buffers=20 ! video/x-raw,format=I420,width=320,height=240,framerate=20/1 ! "
                         "x264enc tune=zerolatency ! matroskamux name=m audiotestsrc freq=1000 num-buffers=47 "
                         "samplesperbuffer=1024 ! audio/x-raw,rate=48000,channels=2 ! opusenc ! m. m.",
                         ".mkv");
    const PublishProcess publisher({"--input", film.path(), "--size", "320x240"});
    Watcher watcher(publisher.address(0));
    Listener listener(publisher.address(0));
    // Four rounds of a second each: sound is there in every one, and pictures go on.
    for (int round = 0; round < 4; ++round) {
        ASSERT_TRUE(watcher.next(5s)) << round;
        const Heard heard = listener.hear(1s);
        ASSERT_GE(heard.seconds(), 1.0) << round;
        EXPECT_GT(amplitudeAt(heard.planes[0], heard.rate, 1000.0), 0.2) << round;
    }
}

TEST(SoundServing, fileWithoutSoundAndAStillPictureDescribeNone) {
    const MediaFile film(kFilm + "mp4mux name=m", ".mp4");
    const MediaFile still("videotestsrc num-buffers=1 ! video/x-raw,width=200,height=150 ! videoconvert ! pngenc",
                          ".png");
    const PublishProcess publisher(
        {"--source", "A", "--input", film.path(), "--source", "B", "--input", still.path(), "--size", "320x240"}, 4);
    for (const std::size_t line : {0U, 2U}) {
        const std::string description = descriptionOf(publisher.address(line));
        EXPECT_THAT(description, testing::HasSubstr("m=video"));
        EXPECT_THAT(description, testing::Not(testing::HasSubstr("m=audio")));
    }
}

TEST(SoundServing, relayedStreamBringsItsSound) {
    const PublishProcess origin({"--source", "Origin", "--size", "320x240"});
    const PublishProcess relay({"--source", "Relay", "--size", "320x240", "--input", origin.address(0)});
    Listener listener(relay.address(0));
    double left = 0.0;
    double right = 0.0;
    for (int tries = 0; tries < 30 && (std::abs(left - 440) > 1.0 || std::abs(right - 696) > 1.0); ++tries) {
        const Heard heard = listener.hear(300ms);
        ASSERT_EQ(heard.planes.size(), 2U);
        left = frequencyOf(heard.planes[0], heard.rate);
        right = frequencyOf(heard.planes[1], heard.rate);
    }
    EXPECT_NEAR(left, toneFrequency(0, 0), 1.0);
    EXPECT_NEAR(right, toneFrequency(0, 1), 1.0);
}

TEST(SoundServing, relayOfAStreamWithoutSoundShowsItsPicturesAndIsSilent) {
    const PublishProcess origin({"--source", "Origin", "--size", "320x240", "--no-audio"});
    const PublishProcess relay({"--source", "Relay", "--size", "320x240", "--input", origin.address(0)});
    Watcher watcher(relay.address(0));
    ASSERT_TRUE(watcher.next());
    Listener listener(relay.address(0));
    const Heard heard = listener.hear(300ms);
    ASSERT_GE(heard.seconds(), 0.3);
    EXPECT_EQ(amplitudeOf(heard.planes[0]), 0.0);
}

} // namespace
} // namespace qivo::test
