// The sound of a published source as a listener hears it: publisher and viewer as processes, a sound server of the
// test's own, and a recording of what its sink was given.
#include "tests/audio/SoundAnalysis.h"
#include "tests/audio/SoundServer.h"
#include "tests/end-to-end/ViewerFixture.h"

#include <cmath>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>

namespace qivo::test {
namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;

constexpr double kRate = 48000;
constexpr double kAmplitude = 0.1;        // 20 dB below the loudest
constexpr double kFrequencyTolerance = 1; // Hz
constexpr double kStepTolerance = 1.05;   // of the largest step a tone of that amplitude has
constexpr std::size_t kStretch = 24000;   // frames without a break that are judged: half a second
constexpr std::size_t kSilence = 24000;   // frames
constexpr double kLeft[] = {440, 456};    // of a publisher's first and second source; NOLINT
constexpr double kRight[] = {696, 712};   // NOLINT

class SoundTest : public ViewerTest {
  protected:
    void SetUp() override {
        ViewerTest::SetUp();
        ASSERT_TRUE(m_server.start());
    }

    /// What the viewer finds as its user's settings. The sound server has given both of us a folder for them.
    static void saveSettings(const std::string& text) {
        const std::filesystem::path folder = std::string(std::getenv("XDG_CONFIG_HOME")) + "/Orvane";
        std::filesystem::create_directories(folder);
        std::ofstream(folder / "QIVO Viewer.conf") << text;
    }

    static testing::AssertionResult isTone(const std::vector<float>& samples, double tone) {
        const double heard = frequencyOf(samples, kRate);
        return std::abs(heard - tone) <= kFrequencyTolerance
                   ? testing::AssertionSuccess()
                   : testing::AssertionFailure() << heard << " Hz in the place of " << tone;
    }

    /// Waits for half a second of exactly these tones, without a gap and without a step that the tones do not have.
    static testing::AssertionResult hears(const SoundServer::Recording& recording, double left, double right) {
        testing::AssertionResult heard = testing::AssertionFailure() << "nothing was recorded";
        eventually(
            [&] {
                heard = judge(longestUnbroken(lastFrames(recording.samples(), 3 * kStretch),
                                              stepOf(left, kAmplitude, kRate) * kStepTolerance,
                                              stepOf(right, kAmplitude, kRate) * kStepTolerance),
                              left, right);
                return static_cast<bool>(heard);
            },
            seconds(25));
        return heard;
    }

    static testing::AssertionResult judge(const std::vector<float>& unbroken, double left, double right) {
        if (unbroken.size() < 2 * kStretch) {
            return testing::AssertionFailure()
                   << "the longest stretch without a click or a gap has " << unbroken.size() / 2 << " frames";
        }
        const auto result = isTone(channelOf(unbroken, 0), left);
        return result ? isTone(channelOf(unbroken, 1), right) : result;
    }

    static bool fallsSilent(const SoundServer::Recording& recording) {
        return eventually([&] {
            const auto last = lastFrames(recording.samples(), kSilence);
            return !last.empty() && peak(last) == 0.0F;
        });
    }

    SoundServer m_server;
};

TEST_F(SoundTest, TheChosenSourceIsHeardOnTheRightChannels) {
    const auto publisher = publish("STUDIO", {"Cam 1", "Cam 2"});
    startViewer();
    const auto recording = m_server.record();
    choose(0, 1, "STUDIO (Cam 2)");
    EXPECT_TRUE(hears(recording, kLeft[1], kRight[1]));
    EXPECT_TRUE(picturesArrive(now())) << "the picture goes on beside the sound";
}

TEST_F(SoundTest, ASourceAt44100IsHeardWithoutClicks) {
    const auto publisher = publish("STUDIO", {"Cam 1"}, {"--audio-rate", "44100"});
    startViewer();
    const auto recording = m_server.record();
    choose(0, 0, "STUDIO (Cam 1)");
    EXPECT_TRUE(hears(recording, kLeft[0], kRight[0]));
}

TEST_F(SoundTest, MonoIsHeardOnBothSides) {
    const auto publisher = publish("STUDIO", {"Cam 1"}, {"--audio-channels", "1"});
    startViewer();
    const auto recording = m_server.record();
    choose(0, 0, "STUDIO (Cam 1)");
    EXPECT_TRUE(hears(recording, kLeft[0], kLeft[0]));
}

TEST_F(SoundTest, MuteIsSilenceAndSoundComesBack) {
    const auto publisher = publish("STUDIO", {"Cam 1"});
    startViewer();
    const auto recording = m_server.record();
    choose(0, 0, "STUDIO (Cam 1)");
    ASSERT_TRUE(hears(recording, kLeft[0], kRight[0]));
    pressSwitch("Control+m");
    EXPECT_TRUE(fallsSilent(recording));
    pressSwitch("Control+m");
    EXPECT_TRUE(hears(recording, kLeft[0], kRight[0]));
}

TEST_F(SoundTest, AMuteThatWasSavedIsSilenceUntilItIsTurnedOff) {
    const auto publisher = publish("STUDIO", {"Cam 1"});
    saveSettings("[General]\nORVQIVOViewer_mute=true\n");
    startViewer();
    const auto recording = m_server.record();
    choose(0, 0, "STUDIO (Cam 1)");
    ASSERT_TRUE(picturesArrive());
    ASSERT_TRUE(fallsSilent(recording));
    EXPECT_EQ(peak(recording.samples()), 0.0F) << "from the beginning on";
    pressSwitch("Control+m");
    EXPECT_TRUE(hears(recording, kLeft[0], kRight[0]));
}

TEST_F(SoundTest, AfterSwitchingTheNewSourceIsHeardAndNothingOfTheOldOne) {
    const auto publisher = publish("STUDIO", {"Cam 1", "Cam 2"});
    startViewer();
    const auto recording = m_server.record();
    choose(0, 0, "STUDIO (Cam 1)");
    ASSERT_TRUE(hears(recording, kLeft[0], kRight[0]));
    const std::size_t before = recording.samples().size();
    choose(0, 1, "STUDIO (Cam 2)");
    ASSERT_TRUE(hears(recording, kLeft[1], kRight[1]));
    auto left = channelOf(recording.samples(), 0);
    left.erase(left.begin(), left.begin() + static_cast<std::ptrdiff_t>(before / 2));
    // Between the two lies silence; from its end on there is nothing of the old tone. In a window of 1/8 s both tones,
    // 16 Hz apart, have run a whole number of periods against each other.
    constexpr std::size_t kQuiet = 480;
    constexpr std::size_t kWindow = 6000;
    std::size_t silent = 0;
    std::size_t from = 0;
    for (std::size_t i = 0; i < left.size() && from == 0; ++i) {
        silent = left[i] == 0.0F ? silent + 1 : 0;
        from = silent == kQuiet ? i : 0;
    }
    ASSERT_GT(from, 0U) << "no silence between the two sources";
    while (from < left.size() && left[from] == 0.0F) {
        ++from;
    }
    int judged = 0;
    for (std::size_t i = from; i + kWindow <= left.size(); i += kWindow) {
        const std::vector<float> window(left.begin() + static_cast<std::ptrdiff_t>(i),
                                        left.begin() + static_cast<std::ptrdiff_t>(i + kWindow));
        if (std::count(window.begin(), window.end(), 0.0F) < static_cast<std::ptrdiff_t>(kQuiet)) {
            EXPECT_LT(amplitudeAt(kLeft[0], window, kRate), amplitudeAt(kLeft[1], window, kRate) / 4);
            ++judged;
        }
    }
    EXPECT_GT(judged, 2);
}

TEST_F(SoundTest, ASourceWithoutSoundIsSilentAndShown) {
    const auto publisher = publish("STUDIO", {"Cam 1"}, {"--no-audio"});
    startViewer();
    const auto recording = m_server.record();
    choose(0, 0, "STUDIO (Cam 1)");
    ASSERT_TRUE(picturesArrive());
    ASSERT_TRUE(fallsSilent(recording));
    EXPECT_EQ(peak(recording.samples()), 0.0F) << "from the beginning on";
}

TEST_F(SoundTest, ARestartedSoundServerIsHeardAgain) {
    const auto publisher = publish("STUDIO", {"Cam 1"});
    startViewer();
    choose(0, 0, "STUDIO (Cam 1)");
    {
        const auto recording = m_server.record();
        ASSERT_TRUE(hears(recording, kLeft[0], kRight[0]));
    }
    m_server.kill();
    EXPECT_TRUE(picturesArrive(now())) << "without a sound server the picture goes on";
    ASSERT_TRUE(m_server.start());
    const auto recording = m_server.record();
    EXPECT_TRUE(hears(recording, kLeft[0], kRight[0]));
}

} // namespace
} // namespace qivo::test
