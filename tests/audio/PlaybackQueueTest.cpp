// The player, the audio queue and the open runtime's own way from packets to frames, between a live source and a device
// that are simulated. All of it runs in the test's time, so that nothing is lost to a busy machine: what the device was
// given is judged to the last sample.

#include "audio/AudioPlayback.h"
#include "platform/NullAudioOutput.h"

#include "tests/audio/LiveSource.h"
#include "tests/audio/SoundAnalysis.h"
#include "tests/platform/EventLoop.h"
#include "tests/runtime/Patience.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <cmath>
#include <cstdint>
#include <memory>
#include <string>
#include <utility>
#include <vector>

using namespace qivo;
using namespace qivo::test;
using namespace std::chrono_literals;
using std::chrono::milliseconds;
using std::chrono::nanoseconds;

namespace {

constexpr int kRate = 48000;
constexpr double kAmplitude = 0.5;
constexpr int kTones[2] = {443, 997};    // Hz; no frame holds a whole number of their periods. NOLINT
constexpr double kStepTolerance = 1.01;  // of the largest step that a tone has
constexpr std::size_t kZerosOfATone = 2; // in a row, where it passes through zero
constexpr std::size_t kBend = 8;         // frames in which a spline gets from silence to a tone

class PlaybackQueueTest : public testing::Test {
  protected:
    void TearDown() override {
        player.reset();
        setAudioOutputDriver(nullptr);
        EXPECT_EQ(LiveSource::receiversOpen(), 0);
    }

    void start(const NullAudioDriver::Options& options, LiveSource::Script script) {
        driver = std::make_shared<NullAudioDriver>(options);
        setAudioOutputDriver(driver);
        script.now = [this] { return driver->now(); };
        script.pass = [this](milliseconds time) { driver->advance(time); };
        LiveSource::set(std::move(script));
        AppData::inst()->setMute(false);
        AppData::inst()->setQIVOSourceInfoNamed("A (1)", "u1");
        player = std::make_unique<AudioPlayback>();
        player->setSourceChangedCounter(1);
        driver->advance(0ns); // the device opens
        turn();
    }

    /// Moves time on and lets the player do what is due then.
    void advance(nanoseconds time) {
        driver->advance(time);
        turn();
    }

    static void turn() {
        constexpr int kCallbacks = 6; // twice as many as a player has buffers
        for (int i = 0; i < kCallbacks; ++i) {
            QCoreApplication::processEvents(QEventLoop::AllEvents);
        }
    }

    EventLoop loop;
    std::shared_ptr<NullAudioDriver> driver;
    std::unique_ptr<AudioPlayback> player;
};

/// The first frame of the sound in interleaved stereo, in frames.
std::size_t onset(const std::vector<float>& stereo) {
    const auto first = std::find_if(stereo.begin(), stereo.end(), [](float sample) { return sample != 0.0F; });
    return static_cast<std::size_t>(first - stereo.begin()) / 2;
}

/// Whether a channel is one unbroken tone from a frame on: no step that the tone has not, and no silence.
testing::AssertionResult isUnbroken(const std::vector<float>& samples, std::size_t from, double tone) {
    const double step = stepOf(tone, kAmplitude, kRate) * kStepTolerance;
    std::size_t zeros = 0;
    for (std::size_t i = from + 1; i < samples.size(); ++i) {
        zeros = samples[i] == 0.0F ? zeros + 1 : 0;
        if (zeros > kZerosOfATone || std::abs(samples[i] - samples[i - 1]) > step) {
            return testing::AssertionFailure()
                   << (zeros > 0 ? "a gap" : "a click") << " after " << static_cast<double>(i - from) / kRate << " s";
        }
    }
    const std::vector<float> heard(samples.begin() + static_cast<std::ptrdiff_t>(from), samples.end());
    const double frequency = frequencyOf(heard, kRate);
    return std::abs(frequency - tone) < 0.1 ? testing::AssertionSuccess()
                                            : testing::AssertionFailure() << frequency << " Hz";
}

struct Case {
    int rate;
    int packetMs;
    int burst;
    int latencyMs;
};

class EveryDevice : public PlaybackQueueTest, public testing::WithParamInterface<Case> {
  protected:
    /// A minute of tones through a device that takes so much at a time.
    void expectUnbroken(nanoseconds period, int burst, nanoseconds latency) {
        constexpr nanoseconds kTime = nanoseconds(60s) / kSanitizerPatience;
        const int rate = GetParam().rate;
        NullAudioDriver::Options options;
        options.period = period;
        options.burst = burst;
        options.latency = latency;
        options.recording = kTime + 1s;
        LiveSource::Script script;
        script.rate = rate;
        script.packet = static_cast<std::size_t>(rate * GetParam().packetMs / 1000);
        for (int i = 0; i < rate; ++i) { // tones of whole Hz repeat themselves every second
            for (const int tone : kTones) {
                script.sound.push_back(static_cast<float>(kAmplitude * std::sin(2 * M_PI * tone * i / rate)));
            }
        }
        start(options, std::move(script));
        for (nanoseconds passed{}; passed < kTime; passed += period) {
            advance(period);
        }
        const auto heard = driver->heard();
        const std::size_t from = onset(heard) + kBend;
        ASSERT_LT(from, static_cast<std::size_t>(kRate)) << "heard within a second";
        ASSERT_GT(heard.size() / 2, static_cast<std::size_t>(std::chrono::duration<double>(kTime).count() * kRate) -
                                        static_cast<std::size_t>(kRate) / 4);
        for (std::size_t channel = 0; channel < 2; ++channel) {
            EXPECT_TRUE(isUnbroken(channelOf(heard, channel), from, kTones[channel])) << "channel " << channel;
        }
        EXPECT_EQ(LiveSource::dropped(), 0);
    }
};

std::vector<Case> everyDevice() {
    std::vector<Case> all;
    for (const int rate : {44100, 48000}) {
        for (const int packet : {5, 10, 20, 40}) {
            for (const int burst : {1, 2, 3, 4}) {
                all.push_back({rate, packet, burst, 0});
                if (burst == 1 || burst == 4) {
                    all.push_back({rate, packet, burst, 40});
                }
            }
        }
    }
    return all;
}

std::string nameOf(const testing::TestParamInfo<Case>& info) {
    return std::to_string(info.param.rate) + "_Packets" + std::to_string(info.param.packetMs) + "_Burst" +
           std::to_string(info.param.burst) + "_Latency" + std::to_string(info.param.latencyMs);
}

} // namespace

TEST_P(EveryDevice, IsGivenAnUnbrokenTone) {
    expectUnbroken(10ms, GetParam().burst, milliseconds(GetParam().latencyMs));
}

INSTANTIATE_TEST_SUITE_P(PlaybackQueue, EveryDevice, testing::ValuesIn(everyDevice()), nameOf);

/// What sound servers take at a time where another program asks them for large buffers.
class ALargeQuantum : public EveryDevice {};

TEST_P(ALargeQuantum, IsGivenAnUnbrokenTone) {
    expectUnbroken(nanoseconds(2048 * 1'000'000'000LL / kRate + 1), 1, milliseconds(GetParam().latencyMs));
}

INSTANTIATE_TEST_SUITE_P(PlaybackQueue, ALargeQuantum,
                         testing::Values(Case{44100, 5, 1, 0}, Case{44100, 10, 1, 0}, Case{44100, 20, 1, 0},
                                         Case{44100, 40, 1, 0}, Case{48000, 5, 1, 0}, Case{48000, 10, 1, 0},
                                         Case{48000, 20, 1, 0}, Case{48000, 40, 1, 0}),
                         nameOf);

// --- An hour of a source whose clock differs from the device's. Where a sanitizer watches, the clocks differ the more
// and the hour is the shorter.

namespace {

class ClocksThatDiffer : public PlaybackQueueTest, public testing::WithParamInterface<int> {
  protected:
    static constexpr std::int64_t kNumbers = 1 << 20; // samples that can be told apart
    static constexpr nanoseconds kStep = 40ms;

    /// Each sample says which it is. At equal rates it comes out of the player as it went in.
    static std::vector<float> numbers() {
        std::vector<float> sound;
        sound.reserve(2 * kNumbers);
        for (std::int64_t i = 0; i < 2 * kNumbers; ++i) {
            sound.push_back(static_cast<float>(i / 2 + 1) / static_cast<float>(kNumbers));
        }
        return sound;
    }

    /// Samples between what the source has sent and what the device was given last; -1 if that was silence.
    std::int64_t behind(float last) const {
        if (last == 0.0F) {
            return -1;
        }
        const auto number = static_cast<std::int64_t>(last * static_cast<float>(kNumbers)) - 1;
        return ((LiveSource::sent() - 1 - number) % kNumbers + kNumbers) % kNumbers;
    }
};

} // namespace

TEST_P(ClocksThatDiffer, LatencyStaysBoundedForAnHourAndGrowsNoFurther) {
    constexpr nanoseconds kHour = nanoseconds(3600s) / kSanitizerPatience;
    const std::int64_t partsPerMillion = std::int64_t{GetParam()} * kSanitizerPatience;
    NullAudioDriver::Options options;
    options.burst = 4;
    options.recording = 200ms;
    LiveSource::Script script;
    script.partsPerMillion = partsPerMillion;
    script.sound = numbers();
    start(options, std::move(script));

    std::int64_t longest[3] = {0, 0, 0}; // samples behind, in each third of the hour. NOLINT
    std::int64_t silent = 0;             // frames, since the first sound
    std::size_t frames = 0;
    bool begun = false;
    for (nanoseconds passed{}; passed < kHour; passed += kStep) {
        advance(kStep);
        const auto heard = driver->heard();
        driver->forgetHeard();
        begun = begun || (!heard.empty() && heard.back() != 0.0F);
        if (begun && !heard.empty()) {
            std::int64_t& third = longest[3 * passed / kHour];
            third = std::max(third, behind(heard.back()));
            silent += std::count(heard.begin(), heard.end(), 0.0F) / 2;
        }
        frames = std::max(frames, LiveSource::framesWaiting());
    }
    // What may wait, a frame that is taken apart, three buffers, and what makes no whole frame or packet yet.
    constexpr std::int64_t kBound = kRate / 4 + 4 * 1024 + 1024 + 480;
    for (const std::int64_t each : longest) {
        EXPECT_GT(each, 0);
        EXPECT_LE(each, kBound);
    }
    EXPECT_LE(longest[2], longest[1] + 1024) << "no growth";
    EXPECT_LE(frames, 12U);
    const auto difference =
        static_cast<std::int64_t>(std::chrono::duration<double>(kHour).count() * kRate) * partsPerMillion / 1'000'000;
    const std::int64_t settling = kRate / 2; // samples that wait may grow by so much, or shrink
    EXPECT_GE(LiveSource::dropped(), difference - settling);
    EXPECT_LE(LiveSource::dropped(), std::max<std::int64_t>(difference, 0));
    EXPECT_LE(silent, std::max<std::int64_t>(-difference, 0) + 1600) << "no more silence than there is too little";
    EXPECT_GE(silent, -difference - settling);
    RecordProperty("longest", std::to_string(longest[0]) + " " + std::to_string(longest[2]));
}

INSTANTIATE_TEST_SUITE_P(PlaybackQueue, ClocksThatDiffer, testing::Values(-200, 0, 200), [](const auto& test) {
    return test.param < 0 ? "Slower" : test.param > 0 ? "Faster" : "Same";
});
