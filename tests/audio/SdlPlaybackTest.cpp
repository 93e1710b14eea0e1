// The player and a real device's thread, SDL's, in real time.

#include "audio/AudioPlayback.h"
#include "platform/SdlAudioOutput.h"

#include "tests/audio/LiveSource.h"
#include "tests/platform/EventLoop.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <memory>
#include <thread>
#include <utility>

using namespace qivo;
using namespace qivo::test;

namespace {

/// SDL's stand-in for a device, behind which frames that are not silent are counted.
class ListeningSdl : public SdlAudioDriver {
  public:
    explicit ListeningSdl(std::shared_ptr<std::atomic<int>> heard)
        : SdlAudioDriver("dummy"), m_heard(std::move(heard)) {}

    int open(const AudioStreamBasicDescription& format, std::shared_ptr<AudioSource> source,
             std::unique_ptr<AudioOutput>& output) override {
        return SdlAudioDriver::open(format, std::make_shared<Listener>(std::move(source), m_heard), output);
    }

  private:
    class Listener : public AudioSource {
      public:
        Listener(std::shared_ptr<AudioSource> source, std::shared_ptr<std::atomic<int>> heard)
            : m_source(std::move(source)), m_heard(std::move(heard)) {}
        void pull(float* out, std::size_t floats) noexcept override {
            m_source->pull(out, floats);
            *m_heard += static_cast<int>(std::count(out, out + floats, 0.5F) / 2);
        }
        void stateChanged() noexcept override { m_source->stateChanged(); }

      private:
        const std::shared_ptr<AudioSource> m_source;
        const std::shared_ptr<std::atomic<int>> m_heard;
    };

    const std::shared_ptr<std::atomic<int>> m_heard;
};

} // namespace

TEST(SdlPlayback, ThePlayersThreadAndTheDevicesShareTheQueue) {
    const EventLoop loop;
    const auto begin = std::chrono::steady_clock::now();
    LiveSource::Script script;
    script.sound.assign(2, 0.5F);
    script.now = [begin] { return std::chrono::steady_clock::now() - begin; };
    script.pass = [](std::chrono::milliseconds time) { std::this_thread::sleep_for(time); };
    LiveSource::set(std::move(script));
    const auto heard = std::make_shared<std::atomic<int>>(0);
    setAudioOutputDriver(std::make_shared<ListeningSdl>(heard));
    AppData::inst()->setMute(false);
    AppData::inst()->setQIVOSourceInfoNamed("A (1)", "u1");
    for (int i = 0; i < 3; ++i) {
        AudioPlayback player;
        player.setSourceChangedCounter(1);
        *heard = 0;
        EXPECT_TRUE(EventLoop::until([&heard] { return *heard > 48000 / 4; }));
        player.setMute(true);
        player.setMute(false);
    }
    setAudioOutputDriver(nullptr);
    EXPECT_EQ(LiveSource::receiversOpen(), 0);
}
