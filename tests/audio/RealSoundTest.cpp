#include "audio/AudioPlayback.h"
#include "platform/FallbackAudioOutput.h"
#include "platform/PulseAudioOutput.h"
#include "platform/SdlAudioOutput.h"

#include "tests/audio/AudioFrames.h"
#include "tests/audio/AudioPlaybackState.h"
#include "tests/audio/SoundAnalysis.h"
#include "tests/audio/SoundServer.h"
#include "tests/fake/FakeQivo.h"
#include "tests/platform/EventLoop.h"
#include "tests/platform/LogCapture.h"

#include <QSocketNotifier>
#include <SDL.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <csignal>
#include <cstdlib>
#include <ctime>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

using namespace qivo;
using namespace qivo::test;
using namespace std::chrono_literals;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::Not;
using testing::StartsWith;

namespace {

constexpr double kRate = 48000.0;
constexpr double kAmplitude = 0.5;
constexpr std::size_t kStretch = 24000; // frames that are judged: half a second, more than 20 of a source's frames

/// What a source sounds like: a tone for each channel, in frames of so many samples.
struct Sound {
    std::int32_t rate = 48000;
    std::vector<double> tones;
    std::size_t frame = 1024;
};

/// A source that always has the next frame of its tones.
class Station {
  public:
    explicit Station(Sound sound) : m_sound(std::move(sound)) {
        for (const double tone : m_sound.tones) {
            m_tones.emplace_back(tone, m_sound.rate, kAmplitude);
        }
    }
    void send() {
        std::vector<std::vector<float>> channels;
        for (Tone& tone : m_tones) {
            channels.push_back(tone.next(m_sound.frame));
        }
        FakeQivo::instance().addCapture(audioFrame(m_sound.rate, channels));
    }

  private:
    Sound m_sound;
    std::vector<Tone> m_tones;
};

class RealSoundTest : public testing::Test {
  protected:
    void SetUp() override {
        fake.reset();
        fake.setQueue({0, 3, 0});
        fake.setHook([this](const std::string& line) { answer(line); });
        AppData::inst()->setMute(false);
        AppData::inst()->setQIVOSourceInfoNamed("", "");
        setAudioOutputDriver(std::make_shared<PulseAudioDriver>()); // never a real device of this machine
        player = std::make_unique<AudioPlayback>();
        observed = player.get();
        QObject::connect(AppData::inst(), &AppData::muteChanged, &context,
                         [this] { player->setMute(AppData::inst()->mute()); });
        QObject::connect(AppData::inst(), &AppData::selectedQIVOSourceChangedCountChanged, &context, [this] {
            player->setSourceChangedCounter(AppData::inst()->selectedQIVOSourceChangedCount());
        });
    }

    void TearDown() override {
        QObject::disconnect(AppData::inst(), nullptr, &context, nullptr);
        player.reset();
        setAudioOutputDriver(nullptr);
        fake.setHook(nullptr);
        EXPECT_THAT(fake.misuse(), testing::IsEmpty());
    }

    void startServer(const std::vector<std::string>& sinks = {"speaker"}) { ASSERT_TRUE(server.start(sinks)); }

    /// A receiver begins with three frames, gets one for each that is taken, and takes its frames along when it ends.
    void answer(const std::string& line) {
        if (line.rfind("recv_destroy", 0) == 0) {
            station.reset();
            const QIVOlib_recv_instance_t receiver = AudioPlaybackState(*observed).receiver();
            QIVOlib_audio_frame_v2_t frame{};
            while (QIVOlib_recv_capture_v2(receiver, nullptr, &frame, nullptr, 0) == QIVOlib_frame_type_audio) {
                QIVOlib_recv_free_audio_v2(receiver, &frame);
            }
        } else if (line.rfind("recv_create_v3", 0) == 0) {
            station = std::make_unique<Station>(selected);
            for (int i = 0; i < 3; ++i) {
                station->send();
            }
        } else if (station && line.rfind("recv_capture_v2", 0) == 0) {
            station->send();
        }
    }

    void listenTo(const Sound& sound) {
        selected = sound;
        AppData::inst()->setQIVOSourceInfoNamed("A (1)", "u1");
    }

    /// Runs the loop until a recording holds a stretch of exactly these tones without a click or a gap. On a machine
    /// that is too busy sound breaks off now and then; what is wrong with the sound itself is in every stretch.
    testing::AssertionResult hears(const SoundServer::Recording& recording, double left, double right) {
        std::vector<float> longest;
        EventLoop::until(
            [&] {
                longest = longestUnbroken(newest(recording.samples()), stepOf(left, kAmplitude, kRate) * 1.02,
                                          stepOf(right, kAmplitude, kRate) * 1.02);
                return longest.size() >= 2 * kStretch;
            },
            25s);
        if (longest.size() < 2 * kStretch) {
            return testing::AssertionFailure()
                   << "the longest stretch without a click or a gap has " << longest.size() / 2 << " frames";
        }
        stretch = longest;
        const auto result = isTone("left", channelOf(longest, 0), left);
        return result ? isTone("right", channelOf(longest, 1), right) : result;
    }

    /// The last two seconds. To judge more of a long recording at each turn of the loop would halt the player.
    static std::vector<float> newest(const std::vector<float>& samples) {
        const std::size_t count = std::min(samples.size(), 8 * kStretch);
        return {samples.end() - static_cast<std::ptrdiff_t>(count), samples.end()};
    }

    static testing::AssertionResult isTone(const char* side, const std::vector<float>& samples, double tone) {
        const double frequency = frequencyOf(samples, kRate);
        if (std::abs(frequency - tone) > 1.0) {
            return testing::AssertionFailure() << side << ": " << frequency << " Hz in the place of " << tone;
        }
        if (std::abs(peak(samples) - kAmplitude) > 0.01) {
            return testing::AssertionFailure() << side << ": a peak of " << peak(samples);
        }
        return testing::AssertionSuccess();
    }

    /// Runs the loop until the last so many frames of a recording are silent.
    static bool fallsSilent(const SoundServer::Recording& recording, std::size_t frames = 24000) {
        return EventLoop::until([&] {
            const auto last = lastFrames(recording.samples(), frames);
            return !last.empty() && peak(last) == 0.0F;
        });
    }

    static bool isHeard(const SoundServer::Recording& recording, std::chrono::seconds deadline = 20s) {
        return EventLoop::until(
            [&] {
                const auto last = lastFrames(recording.samples(), 4800);
                return !last.empty() && peak(last) > 0.4F;
            },
            deadline);
    }

    EventLoop loop;
    FakeQivo& fake = FakeQivo::instance();
    SoundServer server;
    std::vector<float> stretch; ///< what was heard last
    QObject context;
    Sound selected;
    std::unique_ptr<Station> station; ///< of the receiver that is open
    std::unique_ptr<AudioPlayback> player;
    AudioPlayback* observed = nullptr; ///< the player, also while it is destroyed
};

} // namespace

TEST_F(RealSoundTest, LeftAndRightAreHeardOnTheirSides) {
    startServer();
    const auto recording = server.record();
    listenTo({48000, {440, 1000}});
    EXPECT_TRUE(hears(recording, 440, 1000));
    EXPECT_LT(amplitudeAt(1000, channelOf(stretch, 0), kRate), 0.001);
    EXPECT_LT(amplitudeAt(440, channelOf(stretch, 1), kRate), 0.001);
}

TEST_F(RealSoundTest, MonoIsHeardOnBothSides) {
    startServer();
    const auto recording = server.record();
    listenTo({48000, {700}, 960});
    EXPECT_TRUE(hears(recording, 700, 700));
    const auto samples = recording.samples();
    EXPECT_EQ(channelOf(samples, 0), channelOf(samples, 1));
}

TEST_F(RealSoundTest, ASourceAt44100HasNoClicks) {
    startServer();
    const auto recording = server.record();
    listenTo({44100, {440, 1000}});
    EXPECT_TRUE(hears(recording, 440, 1000));
}

TEST_F(RealSoundTest, ASourceAt96000IsHeardInTune) {
    startServer();
    const auto recording = server.record();
    listenTo({96000, {440, 1000}, 3840});
    EXPECT_TRUE(hears(recording, 440, 1000));
}

TEST_F(RealSoundTest, SilenceAfterMuteAndSoundAfterIt) {
    startServer();
    const auto recording = server.record();
    listenTo({48000, {440, 1000}});
    ASSERT_TRUE(isHeard(recording));
    AppData::inst()->setMute(true);
    EXPECT_TRUE(fallsSilent(recording));
    EXPECT_EQ(fake.openReceivers(), 0);
    EXPECT_TRUE(EventLoop::until([this] { return server.streams().find("QIVO") == std::string::npos; }))
        << "a muted player leaves the mixer";
    AppData::inst()->setMute(false);
    EXPECT_TRUE(hears(recording, 440, 1000));
}

TEST_F(RealSoundTest, TheNewSourceIsHeardAfterSilenceWithoutARepeat) {
    startServer();
    const auto recording = server.record();
    listenTo({48000, {500, 500}});
    ASSERT_TRUE(isHeard(recording));
    const std::size_t before = recording.samples().size();
    fake.setQueue({0, 0, 0}); // the new source takes its time
    listenTo({48000, {1000, 1000}});
    ASSERT_TRUE(fallsSilent(recording, 4800));
    fake.setQueue({0, 3, 0});
    EXPECT_TRUE(hears(recording, 1000, 1000));
    auto samples = recording.samples();
    samples.erase(samples.begin(), samples.begin() + static_cast<std::ptrdiff_t>(before));
    const auto left = channelOf(samples, 0);
    // From the first long silence on there is nothing of the old tone.
    std::size_t silent = 0;
    std::size_t from = 0;
    for (std::size_t i = 0; i < left.size() && from == 0; ++i) {
        silent = left[i] == 0.0F ? silent + 1 : 0;
        from = silent == 4800 ? i : 0;
    }
    ASSERT_GT(from, 0U);
    // Both tones go whole numbers of times into such a window, so that neither shows up as the other.
    constexpr std::size_t kWindow = 960;
    const double step = stepOf(1000, kAmplitude, kRate) * 1.02;
    int judged = 0;
    for (std::size_t i = from; i + kWindow <= left.size(); i += kWindow / 4) {
        const auto* const begin = samples.data() + 2 * i;
        const std::vector<float> window(begin, begin + 2 * kWindow);
        if (longestUnbroken(window, step, step).size() == window.size()) {
            EXPECT_LT(amplitudeAt(500, channelOf(window, 0), kRate), 0.1);
            ++judged;
        }
    }
    EXPECT_GT(judged, 50);
}

TEST_F(RealSoundTest, TheMixerShowsWhoPlays) {
    startServer();
    const auto recording = server.record();
    listenTo({48000, {440, 1000}});
    ASSERT_TRUE(isHeard(recording));
    EXPECT_THAT(server.streams(), HasSubstr("application.name = \"QIVO Viewer\""));
    EXPECT_THAT(server.streams(), HasSubstr("media.name = \"Source\""));
}

TEST_F(RealSoundTest, NeitherSignalsNorVideoAreTouched) {
    startServer();
    const auto recording = server.record();
    listenTo({48000, {440, 1000}});
    ASSERT_TRUE(isHeard(recording));
    for (const int number : {SIGINT, SIGTERM, SIGHUP}) {
        struct sigaction action {};
        sigaction(number, nullptr, &action);
        EXPECT_EQ(action.sa_handler, SIG_DFL);
    }
    EXPECT_EQ(SDL_WasInit(0), 0U) << "where a sound server is, SDL is not needed";
}

TEST_F(RealSoundTest, ARestartedServerIsHeardAgain) {
    startServer();
    {
        const auto recording = server.record();
        listenTo({48000, {440, 1000}});
        ASSERT_TRUE(isHeard(recording));
    }
    server.kill();
    EventLoop::run(1500ms);
    EXPECT_TRUE(AudioPlaybackState(*player).playing());
    startServer();
    const auto recording = server.record();
    EXPECT_TRUE(isHeard(recording, 8s)) << "within twice the longest pause between attempts";
    EXPECT_TRUE(hears(recording, 440, 1000));
}

TEST_F(RealSoundTest, AServerThatStartsLateIsHeard) {
    listenTo({48000, {440, 1000}});
    EventLoop::run(1s);
    startServer();
    const auto recording = server.record();
    EXPECT_TRUE(hears(recording, 440, 1000));
}

TEST_F(RealSoundTest, TheSoundFollowsTheDefault) {
    startServer({"speaker", "headphones"});
    const auto speaker = server.record("speaker");
    const auto headphones = server.record("headphones");
    listenTo({48000, {440, 1000}});
    ASSERT_TRUE(isHeard(speaker));
    server.control({"set-default-sink", "headphones"});
    EXPECT_TRUE(hears(headphones, 440, 1000));
    EXPECT_TRUE(fallsSilent(speaker));
}

TEST_F(RealSoundTest, TheSoundLeavesASinkThatIsUnplugged) {
    startServer({"speaker", "headphones"});
    const auto headphones = server.record("headphones");
    {
        const auto speaker = server.record("speaker");
        listenTo({48000, {440, 1000}});
        ASSERT_TRUE(isHeard(speaker));
    }
    server.control({"unload-module", server.moduleOf("speaker")});
    EXPECT_TRUE(hears(headphones, 440, 1000));
}

TEST_F(RealSoundTest, WithoutAnySinkThePlayerGoesOnAndIsHeardWhenOneAppears) {
    startServer();
    {
        const auto speaker = server.record();
        listenTo({48000, {440, 1000}});
        ASSERT_TRUE(isHeard(speaker));
    }
    server.control({"unload-module", "module-null-sink"}); // all
    ASSERT_THAT(server.control({"list", "short", "modules"}), Not(HasSubstr("sink")));
    const std::size_t taken = fake.callsOf("recv_capture").size();
    EventLoop::run(3s); // several attempts to open
    const double seconds = static_cast<double>(fake.callsOf("recv_capture").size() - taken) * 1024 / 48000;
    EXPECT_NEAR(seconds, 3.0, 0.4) << "at the pace of the clock";
    EXPECT_TRUE(AudioPlaybackState(*player).playing());
    server.control({"load-module", "module-null-sink", "sink_name=speaker", "format=float32le", "rate=48000"});
    const auto speaker = server.record();
    EXPECT_TRUE(isHeard(speaker, 8s)) << "within twice the longest pause between attempts";
    EXPECT_TRUE(hears(speaker, 440, 1000));
}

TEST_F(RealSoundTest, AServerWithoutAnySinkAtTheStart) {
    startServer();
    server.control({"unload-module", "module-null-sink"}); // all
    listenTo({48000, {440, 1000}});
    EventLoop::run(1s);
    server.control({"load-module", "module-null-sink", "sink_name=speaker", "format=float32le", "rate=48000"});
    const auto speaker = server.record();
    EXPECT_TRUE(hears(speaker, 440, 1000));
}

/// SDL plays into its own stand-in for a device here.
TEST_F(RealSoundTest, SdlPlaysOnlyUntilThereIsASoundServer) {
    setAudioOutputDriver(std::make_shared<FallbackAudioDriver>(std::make_shared<PulseAudioDriver>(),
                                                               std::make_shared<SdlAudioDriver>("dummy")));
    player.reset();
    player = std::make_unique<AudioPlayback>();
    observed = player.get();
    listenTo({48000, {440, 1000}});
    ASSERT_TRUE(EventLoop::until([] { return SDL_WasInit(SDL_INIT_AUDIO) != 0; }));
    EXPECT_EQ(SDL_WasInit(SDL_INIT_VIDEO), 0U);
    ASSERT_TRUE(EventLoop::until([] { return SDL_GetCurrentAudioDriver() != nullptr; }));
    EXPECT_STREQ(SDL_GetCurrentAudioDriver(), "dummy");
    startServer();
    const auto recording = server.record();
    EXPECT_TRUE(hears(recording, 440, 1000));
    EXPECT_TRUE(EventLoop::until([] { return SDL_WasInit(0) == 0; }));
}

/// The same where a server is there that turns everybody away before it is asked for anything.
TEST_F(RealSoundTest, SdlPlaysWhereASoundServerLetsNobodyIn) {
    LogCapture log;
    const std::string path = std::string(std::getenv("PULSE_RUNTIME_PATH")) + "/socket";
    sockaddr_un address{AF_UNIX, {}};
    path.copy(address.sun_path, sizeof(address.sun_path) - 1);
    const int listener = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    ASSERT_EQ(bind(listener, reinterpret_cast<const sockaddr*>(&address), sizeof(address)), 0);
    ASSERT_EQ(listen(listener, 1), 0);
    int turnedAway = 0;
    QSocketNotifier knock(listener, QSocketNotifier::Read);
    QObject::connect(&knock, &QSocketNotifier::activated, &context, [&] {
        close(accept(listener, nullptr, nullptr));
        ++turnedAway;
    });
    setAudioOutputDriver(std::make_shared<FallbackAudioDriver>(std::make_shared<PulseAudioDriver>(),
                                                               std::make_shared<SdlAudioDriver>("dummy")));
    player.reset();
    player = std::make_unique<AudioPlayback>();
    observed = player.get();
    listenTo({48000, {440, 1000}});
    std::vector<std::string> told;
    EXPECT_TRUE(EventLoop::until([&] {
        for (const std::string& line : log.take()) {
            told.push_back(line);
        }
        return !told.empty();
    }));
    EXPECT_THAT(told, ElementsAre(StartsWith("Sound plays through a device through SDL (dummy); no sound server (")));
    EXPECT_GT(turnedAway, 0);
    player->stopPlayback();
    knock.setEnabled(false);
    close(listener);
    EXPECT_TRUE(EventLoop::until([] { return SDL_WasInit(0) == 0; }));
}

TEST_F(RealSoundTest, AHungServerHaltsNeitherTheLoopNorThePlayer) {
    startServer();
    const auto recording = server.record();
    listenTo({48000, {440, 1000}});
    ASSERT_TRUE(isHeard(recording));
    server.setHalted(true);
    std::chrono::steady_clock::duration longest{};
    const auto timed = [&longest](auto work) {
        const auto begin = std::chrono::steady_clock::now();
        work();
        longest = std::max(longest, std::chrono::steady_clock::now() - begin);
    };
    const std::size_t taken = fake.callsOf("recv_capture").size();
    const auto end = std::chrono::steady_clock::now() + 3s;
    while (std::chrono::steady_clock::now() < end) {
        timed([] { QCoreApplication::processEvents(QEventLoop::AllEvents); });
        timespec pause{0, 1000000};
        nanosleep(&pause, nullptr);
    }
    EXPECT_GT(fake.callsOf("recv_capture").size(), taken + 40) << "the stream goes on, silently";
    timed([] { AppData::inst()->setMute(true); });
    timed([] { AppData::inst()->setMute(false); });
    EXPECT_LT(longest, 500ms);
    server.setHalted(false);
    EXPECT_TRUE(isHeard(recording, 8s));
    EXPECT_TRUE(hears(recording, 440, 1000));
}

TEST_F(RealSoundTest, WithoutADeviceThePlayerRunsAndDoesNotSpin) {
    listenTo({48000, {440, 1000}});
    EventLoop::run(500ms);
    const std::size_t taken = fake.callsOf("recv_capture").size();
    const std::clock_t before = std::clock();
    EventLoop::run(2s);
    const double busy = static_cast<double>(std::clock() - before) / CLOCKS_PER_SEC / 2;
    EXPECT_LT(busy, 0.25);
    const double seconds = static_cast<double>(fake.callsOf("recv_capture").size() - taken) * 1024 / 48000;
    EXPECT_NEAR(seconds, 2.0, 0.3) << "at the pace of the clock";
}

/// What the application ships with, where there is neither a sound server nor a device of the kernel's.
TEST_F(RealSoundTest, WithoutAnyDeviceTheDefaultSaysSoAndDoesNotSpin) {
    LogCapture log;
    setenv("ALSA_CONFIG_PATH", "/dev/null", 1);
    setAudioOutputDriver(nullptr);
    player.reset();
    player = std::make_unique<AudioPlayback>();
    observed = player.get();
    listenTo({48000, {440, 1000}});
    EventLoop::run(1s); // two attempts or three
    const std::size_t taken = fake.callsOf("recv_capture").size();
    const std::clock_t before = std::clock();
    EventLoop::run(2s);
    const double busy = static_cast<double>(std::clock() - before) / CLOCKS_PER_SEC / 2;
    EXPECT_LT(busy, 0.25);
    const double seconds = static_cast<double>(fake.callsOf("recv_capture").size() - taken) * 1024 / 48000;
    EXPECT_NEAR(seconds, 2.0, 0.3) << "at the pace of the clock";
    EXPECT_THAT(log.take(), ElementsAre("No sound: no device through SDL (alsa: none is there); no sound server "
                                        "(Connection refused)"))
        << "once";
    unsetenv("ALSA_CONFIG_PATH");
}
