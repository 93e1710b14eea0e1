#pragma once

#include "runtime/BackgroundThreads.h"
#include "runtime/Receiver.h"
#include "tests/runtime/Patience.h"
#include "tests/runtime/RtspServer.h"

#include <gtest/gtest.h>

#include <chrono>
#include <functional>
#include <memory>
#include <mutex>
#include <set>
#include <string>
#include <utility>
#include <vector>

namespace qivo::test {

using namespace std::chrono_literals;
using Clock = std::chrono::steady_clock;

/// Announcements that a test makes.
class ScriptedView final : public runtime::SourceView {
  public:
    /// Replaces everything that is announced and tells the listeners.
    void announce(std::vector<runtime::Announcement> announcements);

    std::optional<runtime::Announcement> findByName(std::string_view name) const override;
    std::optional<runtime::Announcement> findByUrl(std::string_view url) const override;
    std::shared_ptr<void> subscribe(std::function<void()> changed) override;
    int listeners() const;

  private:
    struct Listeners {
        std::mutex mutex; // protects the rest; held during a call
        std::set<const std::function<void()>*> calls;
    };

    const std::shared_ptr<Listeners> m_listeners = std::make_shared<Listeners>();
    mutable std::mutex m_mutex; // protects the rest
    std::vector<runtime::Announcement> m_announcements;
};

/// A captured picture that goes back by itself.
class Shot {
  public:
    Shot() = default;
    Shot(runtime::Receiver& receiver, const QIVOlib_video_frame_v2_t& filled) : record(filled), m_receiver(&receiver) {}
    Shot(Shot&& other) noexcept : record(other.record), m_receiver(std::exchange(other.m_receiver, nullptr)) {}
    Shot& operator=(Shot&& other) noexcept;
    ~Shot() { release(); }
    void release();
    explicit operator bool() const { return m_receiver != nullptr; }

    /// The pixel as 0xRRGGBB.
    unsigned pixel(int x, int y) const;

    QIVOlib_video_frame_v2_t record{};

  private:
    runtime::Receiver* m_receiver = nullptr;
};

class ReceiverFixture : public testing::Test {
  protected:
    static void SetUpTestSuite();
    ~ReceiverFixture() override;

    std::unique_ptr<runtime::Receiver> receive(const std::string& url, const std::string& name = "",
                                               int bandwidth = QIVOlib_recv_bandwidth_highest);

    /// The next picture; status changes before it are counted in `statusChanges`.
    Shot nextPicture(runtime::Receiver& receiver, std::chrono::milliseconds limit = 8s);
    /// The next picture if one waits already; status changes before it are counted too.
    Shot waitingPicture(runtime::Receiver& receiver);
    /// The first picture for which `wanted` is true.
    Shot pictureThat(runtime::Receiver& receiver, const std::function<bool(const Shot&)>& wanted,
                     std::chrono::milliseconds limit = 8s);
    /// Whether a status change comes; pictures before it are given back.
    bool statusChanges(runtime::Receiver& receiver, std::chrono::milliseconds limit = 8s);
    /// Captures until nothing comes for `quiet`. False if it still comes after the limit.
    bool dries(runtime::Receiver& receiver, std::chrono::milliseconds quiet, std::chrono::milliseconds limit = 5s);

    const std::shared_ptr<ScriptedView> m_view = std::make_shared<ScriptedView>();
    const std::shared_ptr<runtime::TransportMemory> m_transports = std::make_shared<runtime::TransportMemory>();
    int m_statusChanges = 0;
};

/// What a call costs its caller: the time that it takes, less the time for which other programs had the processor. A
/// call that waited for something is charged in full.
std::chrono::microseconds costOf(const std::function<void()>& call);

/// Descriptors that this process has open.
int openDescriptors();

/// Whether each of the three components is within `levels`.
bool near(unsigned pixel, unsigned expected, int levels);

} // namespace qivo::test
