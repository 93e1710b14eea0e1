// A published camera as the library steers it, beside the control page.
#include "sdk/qivo.h"
#include "tests/support/Screen.h"
#include "tests/tools/HttpClient.h"
#include "tests/tools/Publisher.h"
#include "tests/tools/Watcher.h"
#include "tools/publish/PositionCode.h"

#include <algorithm>
#include <chrono>
#include <cmath>
#include <cstdint>
#include <functional>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <optional>
#include <string>
#include <vector>

namespace qivo::test {
namespace {

using namespace std::chrono_literals;

/// Watches a camera and steers it.
class PublishedCamera : public testing::Test {
  protected:
    PublishedCamera() { EXPECT_TRUE(QIVOlib_initialize()); }
    ~PublishedCamera() override {
        QIVOlib_recv_destroy(m_receiver);
        QIVOlib_destroy();
    }

    /// Waits until the camera can be steered. `login` is "USER:PASSWORD@" or empty.
    bool receive(const std::string& login = "") {
        const std::string url = "rtsp://" + login + m_publisher->address(0).substr(std::string("rtsp://").size());
        m_watcher.emplace(url, "tcp");
        QIVOlib_recv_create_v3_t settings{};
        settings.source.p_name = "STUDIO (Cam 1)";
        settings.source.p_url_address = url.c_str();
        settings.color_format = QIVOlib_recv_color_format_rgba;
        settings.bandwidth = QIVOlib_recv_bandwidth_highest;
        m_receiver = QIVOlib_recv_create_v3(&settings);
        return eventually([this] {
            return QIVOlib_recv_capture_v2(m_receiver, nullptr, nullptr, nullptr, 100) ==
                       QIVOlib_frame_type_status_change &&
                   QIVOlib_recv_ptz_is_supported(m_receiver);
        });
    }

    /// Waits for a picture of the camera for which the condition holds.
    bool shows(const std::function<bool(const PositionCode&)>& condition) {
        return eventually([&] {
            const auto frame = m_watcher->next(5s);
            const auto at = frame ? readPositionCode(frame->pixels.data(), frame->width, frame->height,
                                                     static_cast<std::ptrdiff_t>(4) * frame->width)
                                  : std::nullopt;
            m_last = at ? at : m_last;
            return at && condition(*at);
        });
    }

    /// Turns right until the camera has gone by that much, and stops it.
    void turn(double by) {
        const double from = m_last->pan;
        EXPECT_TRUE(QIVOlib_recv_ptz_pan_tilt_speed(m_receiver, -0.5F, 0));
        EXPECT_TRUE(shows([&](const PositionCode& at) { return at.pan > from + by; }));
        EXPECT_TRUE(QIVOlib_recv_ptz_pan_tilt_speed(m_receiver, 0, 0));
        EXPECT_TRUE(stands());
    }

    bool stands() {
        int same = 0;
        double pan = NAN;
        return shows([&](const PositionCode& at) {
            same = at.pan == pan ? same + 1 : 0;
            pan = at.pan;
            return same == 10;
        });
    }

    /// As the page's own script does it.
    int command(const std::string& json) {
        const std::string page = m_publisher->address(2);
        const std::string host = page.substr(7, page.find('/', 7) - 7);
        return statusOf(
            ask(std::stoi(host.substr(host.find(':') + 1)),
                jsonPost("/source-1/command", json,
                         "Host: " + host + "\r\nOrigin: http://" + host + "\r\nContent-Type: application/json\r\n")));
    }

    void publish(const std::vector<std::string>& more = {}) {
        std::vector<std::string> arguments{"--machine", "STUDIO", "--source", "Cam 1", "--ptz", "--http-port", "0"};
        arguments.insert(arguments.end(), more.begin(), more.end());
        m_publisher.emplace(arguments, 4);
    }

    /// Waits until the camera is known by its name.
    static bool isAnnounced() {
        QIVOlib_find_instance_t const finder = QIVOlib_find_create_v2(nullptr);
        const bool found = eventually([finder] {
            std::uint32_t count = 0;
            const QIVOlib_source_t* sources = QIVOlib_find_get_current_sources(finder, &count);
            return std::any_of(sources, sources + count, [](const QIVOlib_source_t& source) {
                return std::string(source.p_name) == "STUDIO (Cam 1)";
            });
        });
        QIVOlib_find_destroy(finder);
        return found;
    }

    std::optional<PublishProcess> m_publisher;
    std::optional<Watcher> m_watcher;
    std::optional<PositionCode> m_last;
    QIVOlib_recv_instance_t m_receiver = nullptr;
};

TEST_F(PublishedCamera, isSteeredWithTheLoginOfTheStreamsAddress) {
    publish({"--login", "ann:se cret"});
    ASSERT_TRUE(receive("ann:se%20cret@"));
    ASSERT_TRUE(shows([](const PositionCode&) { return true; }));
    turn(0.05);
    EXPECT_TRUE(QIVOlib_recv_ptz_focus(m_receiver, 1));
    EXPECT_TRUE(shows([](const PositionCode& at) { return at.focus == 0; })) << "by hand, the nearest";
    EXPECT_TRUE(QIVOlib_recv_ptz_focus(m_receiver, 0));
    EXPECT_TRUE(shows([](const PositionCode& at) { return at.focus == 1; })) << "the farthest";
    EXPECT_TRUE(QIVOlib_recv_ptz_auto_focus(m_receiver));
    EXPECT_TRUE(shows([](const PositionCode& at) { return std::abs(at.focus - 0.5) < 0.01; }));
}

TEST_F(PublishedCamera, isNotSteeredWithoutItsLogin) {
    publish({"--login", "ann:secret"});
    ASSERT_TRUE(isAnnounced());
    QIVOlib_recv_create_v3_t settings{};
    settings.source.p_name = "STUDIO (Cam 1)";
    settings.color_format = QIVOlib_recv_color_format_rgba;
    settings.bandwidth = QIVOlib_recv_bandwidth_highest;
    m_receiver = QIVOlib_recv_create_v3(&settings);
    EXPECT_FALSE(eventually([this] { return QIVOlib_recv_ptz_is_supported(m_receiver); }, 2s));
    EXPECT_FALSE(QIVOlib_recv_ptz_pan_tilt_speed(m_receiver, 0.5F, 0));
}

TEST_F(PublishedCamera, hasTheSamePresetsForTheLibraryAndForThePage) {
    publish();
    ASSERT_TRUE(receive());
    ASSERT_TRUE(stands());
    const double first = m_last->pan;
    EXPECT_TRUE(QIVOlib_recv_ptz_store_preset(m_receiver, 3));
    turn(0.1);
    const double second = m_last->pan;
    EXPECT_EQ(command("{\"command\":\"recall\",\"preset\":1}"), 400) << "the page knows nothing of a preset 1";
    EXPECT_EQ(command("{\"command\":\"store\",\"preset\":4}"), 204);
    EXPECT_EQ(command("{\"command\":\"recall\",\"preset\":3}"), 204);
    EXPECT_TRUE(shows([&](const PositionCode& at) { return std::abs(at.pan - first) < 0.001; }));
    EXPECT_TRUE(QIVOlib_recv_ptz_recall_preset(m_receiver, 4, 1));
    EXPECT_TRUE(shows([&](const PositionCode& at) { return std::abs(at.pan - second) < 0.001; }));
    turn(0.1);
    const double third = m_last->pan;
    EXPECT_TRUE(QIVOlib_recv_ptz_store_preset(m_receiver, 4));
    turn(0.1);
    EXPECT_EQ(command("{\"command\":\"recall\",\"preset\":4}"), 204);
    EXPECT_TRUE(shows([&](const PositionCode& at) { return std::abs(at.pan - third) < 0.001; }));
}

} // namespace
} // namespace qivo::test
