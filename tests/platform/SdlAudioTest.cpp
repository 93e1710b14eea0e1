// SDL's own stand-ins for devices: "dummy", which plays into nothing, and "disk", which plays into a file.

#include "platform/SdlAudioOutput.h"

#include "tests/platform/TemporaryDirectory.h"

#include <SDL.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <cstdlib>
#include <functional>
#include <memory>
#include <string>
#include <thread>

using namespace qivo;
using namespace std::chrono_literals;
using testing::HasSubstr;
using State = AudioOutput::State;

namespace {

class Ones : public AudioSource {
  public:
    void pull(float* out, std::size_t floats) noexcept override {
        std::fill_n(out, floats, 1.0F);
        ++pulls;
    }
    void stateChanged() noexcept override { ++changes; }
    std::atomic<int> pulls = 0;
    std::atomic<int> changes = 0;
};

class SdlAudioTest : public testing::Test {
  protected:
    void TearDown() override { close(); }

    void open(const std::string& systems) {
        close();
        source = std::make_shared<Ones>();
        ASSERT_EQ(SdlAudioDriver(systems).open(format, source, output), 0);
    }

    /// Waits until SDL is shut down: it has one system at a time.
    void close() {
        output.reset();
        EXPECT_TRUE(eventually([] { return SDL_WasInit(0) == 0; }));
    }

    static bool eventually(const std::function<bool()>& condition) {
        const auto end = std::chrono::steady_clock::now() + 10s;
        while (!condition() && std::chrono::steady_clock::now() < end) {
            std::this_thread::sleep_for(2ms);
        }
        return condition();
    }

    bool becomes(State state) {
        return eventually([&] { return output->state() == state; });
    }

    bool plays() {
        return becomes(State::Running) && eventually([this] { return source->pulls > 2; });
    }

    const AudioStreamBasicDescription format{48000.0, kAudioFormatLinearPCM, 9, 8, 1, 8, 2, 32, 0};
    std::shared_ptr<Ones> source;
    std::unique_ptr<AudioOutput> output;
};

} // namespace

TEST_F(SdlAudioTest, ADeviceThatOpensPulls) {
    open("dummy");
    EXPECT_TRUE(plays());
    EXPECT_EQ(output->description(), "a device through SDL (dummy)");
    EXPECT_GT(source->changes, 0);
}

TEST_F(SdlAudioTest, ADeviceThatEndsIsToldAndTheNextOnePlays) {
    const TemporaryDirectory folder;
    setenv("SDL_DISKAUDIOFILE", "/dev/full", 1); // the first write that does not fit in a buffer ends the device
    open("disk");
    EXPECT_TRUE(becomes(State::Failed));
    EXPECT_GT(source->pulls, 0) << "it had opened";
    EXPECT_GT(source->changes, 1);
    EXPECT_EQ(output->description(), "no device through SDL (disk: it is gone)");
    setenv("SDL_DISKAUDIOFILE", folder.path("sound").c_str(), 1);
    open("disk");
    EXPECT_TRUE(plays());
    close();
    unsetenv("SDL_DISKAUDIOFILE");
}

TEST_F(SdlAudioTest, WhereNoDeviceIsListedNoneIsOpenedAndALaterOnePlays) {
    setenv("ALSA_CONFIG_PATH", "/dev/null", 1);
    open("alsa");
    EXPECT_TRUE(becomes(State::Failed));
    EXPECT_EQ(output->description(), "no device through SDL (alsa: none is there)");
    EXPECT_EQ(source->pulls, 0);
    open("dummy");
    EXPECT_TRUE(plays());
    unsetenv("ALSA_CONFIG_PATH");
}

TEST_F(SdlAudioTest, ASystemThatDoesNotExistFailsWithSdlsReason) {
    open("gramophone");
    EXPECT_TRUE(becomes(State::Failed));
    EXPECT_THAT(output->description(), HasSubstr("gramophone"));
    EXPECT_THAT(output->description(), testing::Not(HasSubstr(": )"))) << "a reason is given";
}

TEST_F(SdlAudioTest, OpenedAndClosedInARowTheLastOnePlays) {
    const auto first = std::make_shared<Ones>();
    for (int i = 0; i < 20; ++i) {
        ASSERT_EQ(SdlAudioDriver("dummy").open(format, first, output), 0);
    }
    source = std::make_shared<Ones>();
    ASSERT_EQ(SdlAudioDriver("dummy").open(format, source, output), 0);
    EXPECT_TRUE(plays());
}
