// The publisher and the library that ships, as an application has them together: found, received, and back in time.

#include "tests/runtime/Patience.h"
#include "tests/tools/Publisher.h"

#include "sdk/Timecode.h"
#include "sdk/qivo.h"
#include "tools/publish/TimeCode.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <csignal>
#include <cstdlib>
#include <vector>

namespace qivo::test {
namespace {

using namespace std::chrono_literals;
using Clock = std::chrono::steady_clock;

constexpr const char* kName = "STUDIO (Cam 1)";

class Receiving : public testing::Test {
  protected:
    Receiving() {
        EXPECT_TRUE(QIVOlib_initialize());
        QIVOlib_recv_create_v3_t settings{};
        settings.source.p_name = kName;
        settings.color_format = QIVOlib_recv_color_format_rgba;
        settings.bandwidth = QIVOlib_recv_bandwidth_highest;
        m_receiver = QIVOlib_recv_create_v3(&settings);
        m_finder = QIVOlib_find_create_v2(nullptr);
    }
    ~Receiving() override { QIVOlib_destroy(); }

    /// A picture of this width.
    bool pictureComes(int width, std::chrono::milliseconds limit) {
        for (const auto deadline = Clock::now() + limit; Clock::now() < deadline;) {
            QIVOlib_video_frame_v2_t frame{};
            if (QIVOlib_recv_capture_v2(m_receiver, &frame, nullptr, nullptr, 20) != QIVOlib_frame_type_video) {
                continue;
            }
            QIVOlib_recv_free_video_v2(m_receiver, &frame);
            if (frame.xres == width) {
                return true;
            }
        }
        return false;
    }

    /// The address under which the source is found; empty if it is not.
    std::string foundAt(std::chrono::milliseconds limit) {
        for (const auto deadline = Clock::now() + limit; Clock::now() < deadline;) {
            std::uint32_t count = 0;
            const QIVOlib_source_t* sources = QIVOlib_find_get_current_sources(m_finder, &count);
            for (std::uint32_t i = 0; i < count; ++i) {
                if (std::string(sources[i].p_name) == kName) {
                    return sources[i].p_url_address;
                }
            }
            QIVOlib_find_wait_for_sources(m_finder, 50);
        }
        return {};
    }

    static std::unique_ptr<PublishProcess> publish(const std::string& size, const std::string& port) {
        return std::make_unique<PublishProcess>(
            std::vector<std::string>{"--machine", "STUDIO", "--source", "Cam 1", "--size", size, "--port", port});
    }

    QIVOlib_recv_instance_t m_receiver = nullptr;
    QIVOlib_find_instance_t m_finder = nullptr;
};

TEST_F(Receiving, SourceIsBackWithinTwoSecondsOfItsReturnAlsoAtAnotherAddress) {
    auto publisher = publish("320x240", "8801");
    ASSERT_TRUE(pictureComes(320, 10s));
    for (const char* port : {"8801", "8802"}) {
        const std::string size = std::string(port) == "8801" ? "640x360" : "480x270";
        publisher->process().signal(SIGKILL); // says no goodbye
        publisher->process().wait(5s);
        EXPECT_FALSE(pictureComes(1, 3s)) << "time for the pauses to grow";
        publisher = publish(size, port);
        const auto returned = Clock::now();
        EXPECT_TRUE(pictureComes(size == "640x360" ? 640 : 480, 10s)) << port;
        const auto took = std::chrono::duration_cast<std::chrono::milliseconds>(Clock::now() - returned);
        EXPECT_LT(took, 2s * kSanitizerPatience) << port;
        RecordProperty("back_ms_" + std::string(port), static_cast<int>(took.count()));
    }
}

TEST_F(Receiving, TimecodeIsWhatStandsInThePicture) {
    const auto publisher = publish("640x360", "8801");
    ASSERT_TRUE(pictureComes(640, 10s));
    EXPECT_FALSE(pictureComes(1, 2s)) << "time for the first reports of the clock";
    std::vector<double> differences; // from what stands in the picture, in milliseconds
    for (const auto deadline = Clock::now() + 20s; differences.size() < 15 && Clock::now() < deadline;) {
        QIVOlib_video_frame_v2_t frame{};
        if (QIVOlib_recv_capture_v2(m_receiver, &frame, nullptr, nullptr, 20) != QIVOlib_frame_type_video) {
            continue;
        }
        constexpr int bytesAPixel = 4;
        const auto published =
            readTimeCode(frame.p_data, frame.xres, frame.yres, frame.line_stride_in_bytes, bytesAPixel);
        if (published && frame.timecode >= firstWallTimecode) {
            differences.push_back(static_cast<double>(frame.timecode) * 1e-4 - static_cast<double>(*published));
        }
        QIVOlib_recv_free_video_v2(m_receiver, &frame);
    }
    ASSERT_EQ(differences.size(), 15U) << publisher->errors();
    std::sort(differences.begin(), differences.end());
    RecordProperty("difference_us", static_cast<int>(differences[7] * 1000));
    EXPECT_NEAR(differences[7], 0, 5);
}

/// The publisher on another machine, at the other end of a cable.
class Neighbour {
  public:
    explicit Neighbour(const std::vector<std::string>& arguments) {
        std::string command = "until ip link set far up 2>/dev/null; do sleep 0.02; done; ip link set lo up; "
                              "ip address add 10.9.0.2/24 dev far; exec " +
                              std::string(PUBLISH) + " --machine STUDIO --source 'Cam 1' --port 8801";
        for (const std::string& argument : arguments) {
            command += " " + argument;
        }
        m_process = Process::start({"/usr/bin/unshare", "--net", "/bin/sh", "-c", command}, {withoutLeakCheck});
        const std::string plug = "ip link add near type veth peer name far && ip address add 10.9.0.1/24 dev near && "
                                 "ip link set near up && for try in $(seq 250); do "
                                 "ip link show far >/dev/null 2>&1 || exit 0; ip link set far netns " +
                                 std::to_string(m_process->pid()) + "; sleep 0.02; done; exit 1";
        EXPECT_EQ(std::system(plug.c_str()), 0);
        EXPECT_TRUE(m_process->waitForOutput("low bandwidth")) << m_process->errors();
    }
    ~Neighbour() {
        m_process->signal(SIGTERM);
        EXPECT_EQ(m_process->wait(5s), 0);
        // The other end's machine may linger, or be gone already and this end with it.
        EXPECT_EQ(std::system("ip link delete near 2>/dev/null || ! ip link show near >/dev/null 2>&1"), 0);
    }
    Neighbour(const Neighbour&) = delete;
    Neighbour& operator=(const Neighbour&) = delete;

    [[nodiscard]] std::string output() const { return m_process->output(); }

  private:
    std::unique_ptr<Process> m_process;
};

TEST_F(Receiving, NeighbourIsFoundAndReceivedOverACable) {
    const Neighbour neighbour({});
    EXPECT_THAT(neighbour.output(), testing::StartsWith("rtsp://10.9.0.2:8801/source-1  STUDIO (Cam 1)\n"));
    EXPECT_EQ(foundAt(10s), "rtsp://10.9.0.2:8801/source-1");
    EXPECT_TRUE(pictureComes(1280, 10s));
}

TEST_F(Receiving, NeighbourThatKeepsToItselfIsNeitherFoundNorReached) {
    const Neighbour neighbour({"--loopback-only"});
    EXPECT_THAT(neighbour.output(), testing::StartsWith("rtsp://127.0.0.1:8801/source-1  STUDIO (Cam 1)\n"));
    EXPECT_EQ(foundAt(3s), "");
    const auto knock = Process::start({"/bin/bash", "-c", "exec 3<>/dev/tcp/10.9.0.2/8801"});
    EXPECT_NE(knock->wait(5s).value_or(0), 0);
    EXPECT_THAT(knock->errors(), testing::HasSubstr("refused"));
}

} // namespace
} // namespace qivo::test
