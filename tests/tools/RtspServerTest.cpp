// Viewers of the server in this process: one who is cut off, and one who stays.

#include "tests/tools/Watcher.h"

#include "tools/publish/PictureSource.h"
#include "tools/publish/RtspServer.h"
#include "tools/publish/Stream.h"

#include <gtest/gtest.h>

#include <arpa/inet.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <functional>
#include <thread>

namespace qivo::test {
namespace {

using namespace std::chrono_literals;

/// The default main context at work, as in the program.
class RunningLoop {
  public:
    RunningLoop() : m_thread([this] { g_main_loop_run(m_loop); }) {}
    ~RunningLoop() {
        g_main_context_invoke(nullptr, quit, m_loop);
        m_thread.join();
        g_main_loop_unref(m_loop);
    }
    RunningLoop(const RunningLoop&) = delete;
    RunningLoop& operator=(const RunningLoop&) = delete;

  private:
    static gboolean quit(gpointer loop) {
        g_main_loop_quit(static_cast<GMainLoop*>(loop));
        return G_SOURCE_REMOVE;
    }

    GMainLoop* m_loop = g_main_loop_new(nullptr, FALSE);
    std::thread m_thread;
};

/// A viewer who asks for a stream over UDP and then neither reads, asks nor reports, as one who has lost its power: his
/// sockets stay, so that no refusal tells the server.
class CutOffViewer {
  public:
    explicit CutOffViewer(int port) {
        const timeval limit{5, 0};
        setsockopt(m_control, SOL_SOCKET, SO_RCVTIMEO, &limit, sizeof limit);
        sockaddr_in any = loopback(0);
        socklen_t length = sizeof any;
        bind(m_media, reinterpret_cast<const sockaddr*>(&any), length);
        getsockname(m_media, reinterpret_cast<sockaddr*>(&any), &length);
        const sockaddr_in server = loopback(port);
        connect(m_control, reinterpret_cast<const sockaddr*>(&server), sizeof server);
        const std::string address = "rtsp://127.0.0.1:" + std::to_string(port) + "/live";
        const int first = ntohs(any.sin_port);
        const std::string setUp = ask("SETUP " + address + "/stream=0 RTSP/1.0\r\nCSeq: 1\r\n" +
                                      "Transport: RTP/AVP;unicast;client_port=" + std::to_string(first) + "-" +
                                      std::to_string(first) + "\r\n\r\n");
        const std::size_t session = setUp.find("Session: ");
        const std::string name =
            session == std::string::npos ? "" : setUp.substr(session, setUp.find_first_of(";\r", session) - session);
        m_played = ask("PLAY " + address + " RTSP/1.0\r\nCSeq: 2\r\n" + name + "\r\n\r\n");
    }
    ~CutOffViewer() {
        close(m_control);
        close(m_media);
    }
    CutOffViewer(const CutOffViewer&) = delete;
    CutOffViewer& operator=(const CutOffViewer&) = delete;

    [[nodiscard]] const std::string& played() const { return m_played; }

  private:
    static sockaddr_in loopback(int port) {
        sockaddr_in address{};
        address.sin_family = AF_INET;
        address.sin_port = htons(static_cast<std::uint16_t>(port));
        address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        return address;
    }

    [[nodiscard]] std::string ask(const std::string& request) const {
        send(m_control, request.data(), request.size(), MSG_NOSIGNAL);
        std::string answer;
        std::array<char, 4096> bytes{};
        while (answer.find("\r\n\r\n") == std::string::npos) {
            const ssize_t length = recv(m_control, bytes.data(), bytes.size(), 0);
            if (length <= 0) {
                break;
            }
            answer.append(bytes.data(), static_cast<std::size_t>(length));
        }
        return answer;
    }

    const int m_control = socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
    const int m_media = socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0);
    std::string m_played;
};

/// Pictures that tell whether they are still wanted.
MakePictures countedPictures(const PictureFormat& format, const std::shared_ptr<int>& token) {
    return [format, token] {
        return std::make_unique<DrawnPictureSource>(
            format, [token](const PicturePlanes&, std::chrono::system_clock::time_point) {});
    };
}

bool becomes(const std::function<bool()>& condition, std::chrono::milliseconds limit) {
    const auto deadline = std::chrono::steady_clock::now() + limit;
    while (!condition() && std::chrono::steady_clock::now() < deadline) {
        std::this_thread::sleep_for(10ms);
    }
    return condition();
}

TEST(RtspServer, viewerWhoIsCutOffIsGivenUpAndOneWhoStaysIsNot) {
    gst_init(nullptr, nullptr);
    const PictureFormat format{{128, 72}, {25, 1}, colourSpaceFor(72)};
    const auto token = std::make_shared<int>();
    RtspServer server(1s);
    server.mount("/live", makeStreamFactory(format, Codec::h264, countedPictures(format, token)));
    const long idle = token.use_count();
    ASSERT_EQ(server.listen(0, true), "");
    {
        const RunningLoop loop;
        {
            Watcher stays("rtsp://127.0.0.1:" + std::to_string(server.port()) + "/live");
            ASSERT_TRUE(stays.next());
            EXPECT_TRUE(becomes([&] { return server.viewers("/live") == 1; }, 2s)); // counted after it is answered
            EXPECT_GT(token.use_count(), idle) << "nothing is drawn for it";
            const CutOffViewer gone(server.port()); // last: its time runs
            ASSERT_EQ(gone.played().find("RTSP/1.0 200"), 0U) << gone.played();
            EXPECT_TRUE(becomes([&] { return server.viewers("/live") == 2; }, 2s));
            EXPECT_TRUE(becomes([&] { return server.viewers("/live") == 1; }, 15s));
            for (int i = 0; i < 50; ++i) {
                ASSERT_TRUE(stays.next(2s)) << "the other's stream ended too";
            }
            EXPECT_EQ(server.viewers("/live"), 1);
        }
        EXPECT_TRUE(becomes([&] { return token.use_count() == idle; }, 5s)) << "pictures are drawn for nobody";
    }
    server.stop();
}

} // namespace
} // namespace qivo::test
