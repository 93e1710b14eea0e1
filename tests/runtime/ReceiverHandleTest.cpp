// The C operations of the library as it is installed.

#include "sdk/qivo.h"
#include "tests/runtime/ReceiverFixture.h"
#include "tests/runtime/RtspServer.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <chrono>
#include <cstdio>
#include <filesystem>
#include <memory>
#include <set>
#include <string>
#include <thread>
#include <vector>

namespace qivo::test {
namespace {

using namespace std::chrono_literals;
using Clock = std::chrono::steady_clock;

QIVOlib_recv_instance_t receiveFrom(const std::string& url, int bandwidth = QIVOlib_recv_bandwidth_highest) {
    QIVOlib_recv_create_v3_t settings{};
    settings.source.p_url_address = url.c_str();
    settings.color_format = QIVOlib_recv_color_format_rgba;
    settings.bandwidth = bandwidth;
    return QIVOlib_recv_create_v3(&settings);
}

/// Captures until a picture comes.
bool nextPicture(QIVOlib_recv_instance_t receiver, QIVOlib_video_frame_v2_t& frame) {
    const auto deadline = Clock::now() + 8s;
    while (Clock::now() < deadline) {
        if (QIVOlib_recv_capture_v2(receiver, &frame, nullptr, nullptr, 100) == QIVOlib_frame_type_video) {
            return true;
        }
    }
    return false;
}

/// Every operation on a handle that is to be refused.
void expectRefused(QIVOlib_recv_instance_t receiver) {
    QIVOlib_video_frame_v2_t video{};
    QIVOlib_audio_frame_v2_t audio{};
    QIVOlib_metadata_frame_t metadata{};
    EXPECT_EQ(QIVOlib_recv_capture_v2(receiver, &video, &audio, &metadata, 1000), QIVOlib_frame_type_none);
    EXPECT_EQ(video.p_data, nullptr);
    QIVOlib_recv_free_video_v2(receiver, &video);
    QIVOlib_recv_free_video_v2(receiver, nullptr);
    QIVOlib_recv_free_audio_v2(receiver, &audio);
    QIVOlib_recv_free_string(receiver, "text");
    EXPECT_EQ(QIVOlib_recv_get_web_control(receiver), nullptr);
    QIVOlib_recv_queue_t queue{7, 7, 7};
    QIVOlib_recv_get_queue(receiver, &queue);
    EXPECT_EQ(queue.video_frames + queue.audio_frames + queue.metadata_frames, 0);
    QIVOlib_recv_get_queue(receiver, nullptr);
    EXPECT_FALSE(QIVOlib_recv_ptz_is_supported(receiver));
    EXPECT_FALSE(QIVOlib_recv_ptz_zoom_speed(receiver, 1));
    EXPECT_FALSE(QIVOlib_recv_ptz_pan_tilt_speed(receiver, 1, 1));
    EXPECT_FALSE(QIVOlib_recv_ptz_auto_focus(receiver));
    EXPECT_FALSE(QIVOlib_recv_ptz_focus(receiver, 1));
    EXPECT_FALSE(QIVOlib_recv_ptz_store_preset(receiver, 1));
    EXPECT_FALSE(QIVOlib_recv_ptz_recall_preset(receiver, 1, 1));
    QIVOlib_recv_destroy(receiver);
}

class ReceiverHandles : public testing::Test {
  protected:
    ReceiverHandles() { EXPECT_TRUE(QIVOlib_initialize()); }
    ~ReceiverHandles() override { QIVOlib_destroy(); }
};

TEST(Library, ExportsTheOperationsAndNothingElse) {
    const std::set<std::string> expected{"QIVOlib_initialize",
                                         "QIVOlib_destroy",
                                         "QIVOlib_find_create_v2",
                                         "QIVOlib_find_destroy",
                                         "QIVOlib_find_wait_for_sources",
                                         "QIVOlib_find_get_current_sources",
                                         "QIVOlib_recv_create_v3",
                                         "QIVOlib_recv_destroy",
                                         "QIVOlib_recv_capture_v2",
                                         "QIVOlib_recv_free_video_v2",
                                         "QIVOlib_recv_free_audio_v2",
                                         "QIVOlib_recv_free_string",
                                         "QIVOlib_recv_get_web_control",
                                         "QIVOlib_recv_get_queue",
                                         "QIVOlib_recv_ptz_is_supported",
                                         "QIVOlib_recv_ptz_zoom_speed",
                                         "QIVOlib_recv_ptz_pan_tilt_speed",
                                         "QIVOlib_recv_ptz_auto_focus",
                                         "QIVOlib_recv_ptz_focus",
                                         "QIVOlib_recv_ptz_store_preset",
                                         "QIVOlib_recv_ptz_recall_preset"};
    ASSERT_EQ(expected.size(), 21U);
    const std::unique_ptr<FILE, int (*)(FILE*)> list(
        popen("nm --dynamic --defined-only --format=posix " QIVO_LIBRARY, "r"), pclose);
    ASSERT_TRUE(list);
    std::set<std::string> exported;
    std::array<char, 512> line{};
    while (fgets(line.data(), line.size(), list.get()) != nullptr) {
        const std::string text(line.data());
        exported.insert(text.substr(0, text.find(' ')));
    }
    EXPECT_EQ(exported, expected);
}

TEST(Library, NothingIsMadeBeforeItIsInitialised) {
    EXPECT_EQ(receiveFrom("rtsp://127.0.0.1:9/"), nullptr);
    EXPECT_EQ(QIVOlib_find_create_v2(nullptr), nullptr);
    QIVOlib_destroy();
}

TEST(Library, InitialisationsNest) {
    ASSERT_TRUE(QIVOlib_initialize());
    ASSERT_TRUE(QIVOlib_initialize());
    QIVOlib_destroy();
    QIVOlib_recv_instance_t const receiver = receiveFrom("rtsp://127.0.0.1:9/");
    EXPECT_NE(receiver, nullptr);
    QIVOlib_destroy();
    expectRefused(receiver);
    EXPECT_EQ(receiveFrom("rtsp://127.0.0.1:9/"), nullptr);
}

TEST(Library, LastEndEndsAWaitForSources) {
    ASSERT_TRUE(QIVOlib_initialize());
    QIVOlib_find_instance_t const finder = QIVOlib_find_create_v2(nullptr);
    ASSERT_NE(finder, nullptr);
    std::thread waiting([finder] { EXPECT_FALSE(QIVOlib_find_wait_for_sources(finder, 60'000)); });
    std::this_thread::sleep_for(100ms); // a wait that has not begun is refused, which is right as well
    const auto before = Clock::now();
    QIVOlib_destroy();
    waiting.join();
    EXPECT_LT(Clock::now() - before, 5s);
}

TEST(Library, NothingOutlivesALastEndThatItWasMadeBeside) {
    const auto threads = [] {
        const std::filesystem::directory_iterator all("/proc/self/task");
        return std::distance(begin(all), end(all));
    };
    QIVOlib_recv_create_v3_t settings{};
    settings.source.p_name = "NOWHERE (Cam 1)";
    settings.color_format = QIVOlib_recv_color_format_rgba;
    for (int round = 0; round < 40; ++round) {
        const auto idle = threads();
        ASSERT_TRUE(QIVOlib_initialize());
        std::atomic<bool> going = false;
        std::thread making([&] {
            bool made = true;
            for (int i = 0; made && i < 50; ++i) {
                made = QIVOlib_recv_create_v3(&settings) != nullptr;
                going = true;
            }
        });
        while (!going) {
            std::this_thread::yield();
        }
        QIVOlib_destroy();
        making.join();
        const auto deadline = Clock::now() + 3s;
        while (threads() > idle && Clock::now() < deadline) {
            std::this_thread::sleep_for(1ms);
        }
        ASSERT_LE(threads(), idle) << "a receiver is still there, round " << round;
    }
}

TEST_F(ReceiverHandles, NullIsRefused) {
    expectRefused(nullptr);
    EXPECT_EQ(QIVOlib_recv_create_v3(nullptr), nullptr);
}

TEST_F(ReceiverHandles, ForeignPointersAreRefused) {
    int local = 0;
    expectRefused(reinterpret_cast<QIVOlib_recv_instance_t>(&local));
    for (const std::uintptr_t value : {std::uintptr_t{1}, ~std::uintptr_t{0}, std::uintptr_t{0xdeadbeef}}) {
        expectRefused(reinterpret_cast<QIVOlib_recv_instance_t>(value));
    }
}

TEST_F(ReceiverHandles, DestroyedReceiverIsRefused) {
    QIVOlib_recv_instance_t const receiver = receiveFrom("rtsp://127.0.0.1:9/");
    ASSERT_NE(receiver, nullptr);
    QIVOlib_recv_destroy(receiver);
    expectRefused(receiver);
    QIVOlib_recv_instance_t const next = receiveFrom("rtsp://127.0.0.1:9/");
    EXPECT_NE(next, receiver) << "a handle is used again";
    expectRefused(receiver);
    QIVOlib_recv_destroy(next);
}

TEST_F(ReceiverHandles, FinderIsRefusedAsAReceiverAndTheOtherWayRound) {
    QIVOlib_find_instance_t const finder = QIVOlib_find_create_v2(nullptr);
    ASSERT_NE(finder, nullptr);
    expectRefused(reinterpret_cast<QIVOlib_recv_instance_t>(finder));
    QIVOlib_recv_instance_t const receiver = receiveFrom("rtsp://127.0.0.1:9/");
    auto* const wrong = reinterpret_cast<QIVOlib_find_instance_t>(receiver);
    EXPECT_FALSE(QIVOlib_find_wait_for_sources(wrong, 1000));
    std::uint32_t count = 7;
    EXPECT_EQ(QIVOlib_find_get_current_sources(wrong, &count), nullptr);
    EXPECT_EQ(count, 0U);
    QIVOlib_find_destroy(wrong);
    QIVOlib_recv_queue_t queue{};
    QIVOlib_recv_get_queue(receiver, &queue);
    QIVOlib_recv_destroy(receiver);
    QIVOlib_find_destroy(finder);
    EXPECT_EQ(QIVOlib_find_get_current_sources(finder, nullptr), nullptr);
}

TEST_F(ReceiverHandles, PictureIsKnownByItsDataAndStringsByTheirAddress) {
    const RtspServer server({.launch = h264("width=320,height=240,framerate=30/1")});
    QIVOlib_recv_instance_t const receiver = receiveFrom(server.url());
    QIVOlib_recv_instance_t const other = receiveFrom(server.url());
    QIVOlib_video_frame_v2_t frame{};
    ASSERT_TRUE(nextPicture(receiver, frame));
    std::uint8_t own = 0;
    QIVOlib_video_frame_v2_t wrong = frame;
    wrong.p_data = &own;
    QIVOlib_recv_free_video_v2(receiver, &wrong);
    wrong.p_data = nullptr;
    QIVOlib_recv_free_video_v2(receiver, &wrong);
    QIVOlib_recv_free_video_v2(other, &frame);
    unsigned sum = 0;
    for (int row = 0; row < frame.yres; ++row) {
        sum += frame.p_data[row * frame.line_stride_in_bytes + 3];
    }
    EXPECT_EQ(sum, 255U * 240U) << "alpha is opaque, and the picture is still there";
    QIVOlib_recv_free_video_v2(receiver, &frame);
    QIVOlib_recv_free_video_v2(receiver, &frame);
    QIVOlib_recv_free_string(receiver, nullptr);
    QIVOlib_recv_free_string(receiver, "never handed out");
    EXPECT_FALSE(QIVOlib_recv_ptz_is_supported(receiver));
    QIVOlib_recv_destroy(other);
    QIVOlib_recv_destroy(receiver);
}

TEST_F(ReceiverHandles, PicturesThatAreOutAreTakenBackAtTheEnd) {
    const RtspServer server({.launch = h264("width=320,height=240,framerate=30/1")});
    QIVOlib_recv_instance_t const receiver = receiveFrom(server.url());
    QIVOlib_video_frame_v2_t frame{};
    for (int i = 0; i < 3; ++i) {
        ASSERT_TRUE(nextPicture(receiver, frame));
    }
    QIVOlib_recv_destroy(receiver);
    QIVOlib_recv_free_video_v2(receiver, &frame);
}

TEST_F(ReceiverHandles, ManyReceiversComeAndGoQuickly) {
    const RtspServer server({.launch = h264("width=160,height=120,framerate=15/1")});
    std::vector<Clock::duration> creations;
    std::vector<Clock::duration> destructions;
    for (int i = 0; i < 40; ++i) {
        auto before = Clock::now();
        QIVOlib_recv_instance_t const receiver = receiveFrom(server.url());
        creations.push_back(Clock::now() - before);
        QIVOlib_video_frame_v2_t frame{};
        if (i % 4 == 0) {
            ASSERT_TRUE(nextPicture(receiver, frame));
        } else if (i % 4 == 1) {
            QIVOlib_recv_capture_v2(receiver, &frame, nullptr, nullptr, static_cast<std::uint32_t>(i));
        }
        before = Clock::now();
        QIVOlib_recv_destroy(receiver);
        destructions.push_back(Clock::now() - before);
    }
    // Of forty, one or two may meet another program on the processor.
    for (auto* times : {&creations, &destructions}) {
        std::sort(times->begin(), times->end());
        EXPECT_LT((*times)[36], 5ms * kSanitizerPatience);
    }
}

TEST_F(ReceiverHandles, LastEndTakesEverythingApart) {
    const RtspServer server({.launch = h264("width=160,height=120,framerate=15/1")});
    ASSERT_TRUE(QIVOlib_initialize());
    std::vector<QIVOlib_recv_instance_t> receivers;
    for (int i = 0; i < 4; ++i) {
        receivers.push_back(receiveFrom(i % 2 == 0 ? server.url() : "rtsp://192.0.2.1/"));
    }
    QIVOlib_video_frame_v2_t frame{};
    ASSERT_TRUE(nextPicture(receivers.front(), frame));
    QIVOlib_destroy();
    ASSERT_TRUE(nextPicture(receivers.front(), frame)) << "ended too early";
    QIVOlib_destroy();
    for (auto* const receiver : receivers) {
        expectRefused(receiver);
    }
    ASSERT_TRUE(QIVOlib_initialize());
}

} // namespace
} // namespace qivo::test
