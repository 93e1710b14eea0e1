#include "tests/tools/Publisher.h"
#include "tests/tools/Watcher.h"
#include "tools/publish/PositionCode.h"

#include <gtest/gtest.h>

#include <chrono>
#include <cstring>
#include <memory>
#include <onvif.h>
#include <string>
#include <thread>

// The library beneath onvif-util, whose commands steer nothing: what it is asked here is what its window does.
namespace qivo::test {
namespace {

using namespace std::chrono_literals;

struct Session {
    Session() { initializeSession(session.get()); }
    ~Session() { closeSession(session.get()); }
    Session(const Session&) = delete;
    Session& operator=(const Session&) = delete;

    std::unique_ptr<OnvifSession> session = std::make_unique<OnvifSession>();
    std::unique_ptr<OnvifData> camera = std::make_unique<OnvifData>();
};

class OnvifLibraryPeers : public testing::Test {
  protected:
    // Finds the camera and learns its addresses and its profile.
    void find(const char* user, const char* password) {
        ASSERT_EQ(broadcast(m_session.session.get()), 1);
        prepareOnvifData(0, m_session.session.get(), m_camera);
        std::strcpy(m_camera->username, user);
        std::strcpy(m_camera->password, password);
        ASSERT_EQ(getTimeOffset(m_camera), 0) << m_camera->last_error;
        ASSERT_EQ(getCapabilities(m_camera), 0) << m_camera->last_error;
        ASSERT_EQ(fillRTSPn(m_camera, 0), 0) << m_camera->last_error;
    }

    // A library's function, which takes text that it does not change.
    int preset(int (*function)(char*, OnvifData*), const char* token) {
        std::string text = token;
        return function(text.data(), m_camera);
    }

    // Waits for a picture of the camera for which the condition holds.
    template <typename Condition>
    bool shows(Watcher& watcher, const Condition& condition) {
        const auto deadline = std::chrono::steady_clock::now() + 15s;
        while (std::chrono::steady_clock::now() < deadline) {
            const auto frame = watcher.next(5s);
            const auto at = frame ? readPositionCode(frame->pixels.data(), frame->width, frame->height,
                                                     static_cast<std::ptrdiff_t>(4) * frame->width)
                                  : std::nullopt;
            m_last = at.value_or(m_last);
            if (at && condition(*at)) {
                return true;
            }
        }
        return false;
    }

    PositionCode m_last;
    Session m_session;
    OnvifData* m_camera = m_session.camera.get();
};

TEST_F(OnvifLibraryPeers, findsReadsMovesStopsAndRecalls) {
    const PublishProcess publisher({"--machine", "STUDIO", "--ptz"}, 4);
    ASSERT_NO_FATAL_FAILURE(find("admin", "x"));
    EXPECT_EQ(m_camera->stream_uri, publisher.address(0));
    EXPECT_STREQ(m_camera->profileToken, "full");
    Watcher watcher(publisher.address(0), "tcp");
    EXPECT_EQ(preset(setPreset, "3"), 0) << m_camera->last_error;
    EXPECT_EQ(continuousMove(0.5F, 0.25F, 0.1F, m_camera), 0) << m_camera->last_error;
    EXPECT_TRUE(shows(watcher, [](const PositionCode& at) { return at.pan > 0.05 && at.tilt > 0.02 && at.zoom > 0; }));
    EXPECT_EQ(moveStop(PAN_TILT_STOP, m_camera), 0) << m_camera->last_error;
    // Pictures of before the stop may still be on their way.
    PositionCode stopped = m_last;
    EXPECT_TRUE(shows(watcher, [&](const PositionCode& at) {
        stopped = at.pan == stopped.pan && at.tilt == stopped.tilt ? stopped : at;
        return at.zoom > stopped.zoom + 0.03;
    })) << "it turns on, or zooms no more";
    EXPECT_LT(stopped.pan, 1) << "it turned as far as it goes";
    EXPECT_EQ(moveStop(ZOOM_STOP, m_camera), 0) << m_camera->last_error;
    int pictures = 0;
    double zoom = -1;
    EXPECT_TRUE(shows(watcher, [&](const PositionCode& at) {
        pictures = at.zoom == zoom ? pictures + 1 : 0;
        zoom = at.zoom;
        return pictures == 10;
    })) << "it zooms on";
    EXPECT_EQ(preset(gotoPreset, "3"), 0) << m_camera->last_error;
    EXPECT_TRUE(shows(watcher, [](const PositionCode& at) { return at.pan == 0 && at.tilt == 0 && at.zoom == 0; }));
    EXPECT_NE(preset(gotoPreset, "4"), 0);
    EXPECT_STREQ(m_camera->last_error, "ter:InvalidArgVal");
}

TEST_F(OnvifLibraryPeers, steersWithALoginAndNotWithAWrongOne) {
    const PublishProcess publisher({"--machine", "STUDIO", "--ptz", "--login", "admin:secret"}, 4);
    ASSERT_NO_FATAL_FAILURE(find("admin", "secret"));
    // The library's login repeats itself within a second, and a login is good for one command.
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(5);
    int result = continuousMove(0.5F, 0, 0, m_camera);
    while (result != 0 && std::chrono::steady_clock::now() < deadline) {
        std::this_thread::sleep_for(std::chrono::milliseconds(200));
        result = continuousMove(0.5F, 0, 0, m_camera);
    }
    EXPECT_EQ(result, 0) << m_camera->last_error;
    std::strcpy(m_camera->password, "wrong");
    EXPECT_NE(moveStop(PAN_TILT_STOP, m_camera), 0);
}

} // namespace
} // namespace qivo::test
