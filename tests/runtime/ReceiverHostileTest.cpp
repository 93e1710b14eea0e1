// What a receiver makes of servers that do not conform: it survives, costs its caller no time, and is back as soon as
// the server behaves.

#include "tests/runtime/RawServer.h"
#include "tests/runtime/ReceiverFixture.h"
#include "tests/runtime/RtpPackets.h"

#include <atomic>
#include <ostream>
#include <string>
#include <thread>
#include <vector>

namespace qivo::test {
namespace {

using runtime::BackgroundThreads;
using runtime::Receiver;

constexpr auto kCallLimit = 5ms * kSanitizerPatience;
/// Threads of GStreamer's pools keep a few, and a source that was refused its transport four times keeps the ports of
/// each, once.
constexpr int kSpareDescriptors = 32;

const std::string kVideo = "v=0\r\no=- 0 0 IN IP4 127.0.0.1\r\ns=-\r\nt=0 0\r\nm=video 0 RTP/AVP 96\r\n"
                           "a=rtpmap:96 H264/90000\r\na=control:video\r\n";
const std::string kStillPictures = "v=0\r\no=- 0 0 IN IP4 127.0.0.1\r\ns=-\r\nt=0 0\r\nm=video 0 RTP/AVP 26\r\n"
                                   "a=control:video\r\n";

std::string describe(const std::string& request, const std::string& sdp) {
    return answer(request, "200 OK", "Content-Type: application/sdp\r\nContent-Base: rtsp://127.0.0.1/live/\r\n", sdp);
}

bool is(const std::string& request, const char* method) {
    return request.rfind(method, 0) == 0;
}

/// How a server behaves at one stage of the handshake; it conforms before.
struct Behaviour {
    std::string sdp = kVideo;
    /// Answers a request or not; false ends the connection. Empty where it conforms.
    std::function<bool(Connection&, const std::string&)> options = {};
    std::function<bool(Connection&, const std::string&)> described = {};
    std::function<bool(Connection&, const std::string&)> setUp = {};
    std::function<bool(Connection&, const std::string&)> play = {};
    std::function<bool(Connection&, const std::string&)> tearDown = {};
    /// Called once playing.
    std::function<void(Connection&)> stream = {};
};

bool conform(Connection& connection, const std::string& request, const Behaviour& behaviour) {
    if (is(request, "OPTIONS")) {
        return connection.send(
            answer(request, "200 OK", "Public: OPTIONS, DESCRIBE, SETUP, PLAY, PAUSE, TEARDOWN, GET_PARAMETER\r\n"));
    }
    if (is(request, "DESCRIBE")) {
        return connection.send(describe(request, behaviour.sdp));
    }
    if (is(request, "SETUP") && request.find("TCP") == std::string::npos) {
        return connection.send(answer(request, "461 Unsupported Transport"));
    }
    if (is(request, "SETUP")) {
        return connection.send(answer(request, "200 OK",
                                      "Transport: RTP/AVP/TCP;unicast;interleaved=0-1;ssrc=12345678\r\n"
                                      "Session: 1;timeout=60\r\n"));
    }
    return connection.send(answer(request, "200 OK", "Session: 1\r\nRange: npt=0-\r\n"));
}

void serve(Connection& connection, const Behaviour& behaviour) {
    for (;;) {
        const std::string request = connection.request();
        if (request.empty()) {
            return;
        }
        const auto& special = is(request, "OPTIONS")    ? behaviour.options
                              : is(request, "DESCRIBE") ? behaviour.described
                              : is(request, "SETUP")    ? behaviour.setUp
                              : is(request, "TEARDOWN") ? behaviour.tearDown
                                                        : behaviour.play;
        const bool isPlay = is(request, "PLAY");
        const bool goesOn = special ? special(connection, request) : conform(connection, request, behaviour);
        if (!goesOn) {
            return;
        }
        if (isPlay && behaviour.stream) {
            behaviour.stream(connection);
            return;
        }
    }
}

// --- Ways to misbehave.

using Step = std::function<bool(Connection&, const std::string&)>;

Step closes() {
    return [](Connection&, const std::string&) { return false; };
}

Step hangs() {
    return [](Connection& connection, const std::string&) {
        connection.untilClosed();
        return false;
    };
}

Step says(const std::string& bytes) {
    return [bytes](Connection& connection, const std::string&) { return connection.send(bytes); };
}

Step refuses(const std::string& status, const std::string& lines = "") {
    return [status, lines](Connection& connection, const std::string& request) {
        return connection.send(answer(request, status, lines));
    };
}

/// Repeats a piece up to 64 MiB, or until the other side has had enough.
Step repeats(const std::string& begin, const std::string& piece) {
    return [begin, piece](Connection& connection, const std::string&) {
        // Megabytes that are still to be read after the end take seconds, byte by byte, and tell nothing more.
        connection.keepNoMoreThan(16384);
        std::string block;
        while (block.size() < 65536) {
            block += piece;
        }
        bool open = connection.send(begin);
        for (int i = 0; open && i < 1024; ++i) {
            open = connection.send(block);
        }
        return false;
    };
}

std::string noise(std::size_t length) {
    std::string bytes(length, '\0');
    unsigned state = 12345;
    for (char& byte : bytes) {
        state = state * 1664525U + 1013904223U;
        byte = static_cast<char>(state >> 24U);
    }
    return bytes;
}

// --- Packets.

/// Sends packets at fifty a second until the other side closes.
std::function<void(Connection&)> packets(const std::function<std::string(unsigned)>& bytes) {
    return [bytes](Connection& connection) {
        for (unsigned i = 0; connection.send(bytes(i)); ++i) {
            std::this_thread::sleep_for(20ms); // the rate of the source that is simulated
        }
    };
}

/// Writes the bits of a parameter set.
class Bits {
  public:
    Bits& fixed(unsigned value, int count) {
        for (int i = count - 1; i >= 0; --i) {
            m_bits.push_back((value >> static_cast<unsigned>(i) & 1U) != 0);
        }
        return *this;
    }
    Bits& golomb(unsigned value) {
        int length = 0;
        while ((value + 1) >> static_cast<unsigned>(length + 1) != 0) {
            ++length;
        }
        return fixed(0, length).fixed(value + 1, length + 1);
    }
    std::string bytes() {
        fixed(1, 1);
        while (m_bits.size() % 8 != 0) {
            m_bits.push_back(false);
        }
        std::string text;
        for (std::size_t i = 0; i < m_bits.size(); i += 8) {
            unsigned byte = 0;
            for (std::size_t bit = 0; bit < 8; ++bit) {
                byte = byte << 1U | (m_bits[i + bit] ? 1U : 0U);
            }
            text += static_cast<char>(byte);
        }
        return text;
    }

  private:
    std::vector<bool> m_bits;
};

/// An H.264 sequence parameter set for so many macroblocks (of 16 x 16 pixels).
std::string sequenceSet(unsigned columns, unsigned rows) {
    Bits bits;
    bits.fixed(66, 8).fixed(0, 8).fixed(52, 8).golomb(0); // profile, constraints, level, number
    bits.golomb(0).golomb(2).golomb(1).fixed(0, 1);       // frame numbers, order, references, gaps
    bits.golomb(columns - 1).golomb(rows - 1);
    bits.fixed(1, 1).fixed(1, 1).fixed(0, 1).fixed(0, 1); // frames only, inference, no cropping, no usability
    return "\x67" + bits.bytes();
}

std::string pictureSet() {
    Bits bits;
    bits.golomb(0).golomb(0).fixed(0, 2).golomb(0).golomb(0).golomb(0).fixed(0, 3).golomb(0).golomb(0).golomb(0);
    bits.fixed(0, 3);
    return "\x68" + bits.bytes();
}

std::string hugePicture(unsigned i) {
    const unsigned time = i * 1800;
    return interleaved(rtp(i * 3, time, sequenceSet(4096, 4096), 96, false)) +
           interleaved(rtp(i * 3 + 1, time, pictureSet(), 96, false)) +
           interleaved(rtp(i * 3 + 2, time, "\x65" + noise(1000)));
}

/// A payload for RFC 2435 with no picture in it; sizes are in units of 8 pixels.
std::string jpegPayload(char width, char height) {
    return std::string("\0\0\0\0\1\x32", 6) + width + height + noise(500);
}

std::string manyStreams() {
    std::string sdp = "v=0\r\no=- 0 0 IN IP4 127.0.0.1\r\ns=-\r\nt=0 0\r\n";
    for (int i = 0; i < 20000; ++i) {
        sdp += "m=video " + std::to_string(i) + " RTP/AVP 96\r\na=rtpmap:96 H264/" + std::to_string(i) + "\r\n";
    }
    return sdp;
}

struct Case {
    const char* name;
    std::function<void(Connection&)> script;
    /// The connection cannot be given up before the server has finished what it says.
    bool endless = false;
};

void PrintTo(const Case& shown, std::ostream* out) {
    *out << shown.name;
}

std::function<void(Connection&)> at(Behaviour behaviour) {
    return [behaviour = std::move(behaviour)](Connection& connection) { serve(connection, behaviour); };
}

/// Runs a step at the very beginning, before anything has been asked.
std::function<void(Connection&)> atOnce(const Step& step) {
    return [step](Connection& connection) {
        step(connection, "");
        connection.untilClosed();
    };
}

std::vector<Case> cases() {
    return {
        {"ClosesOnConnect", [](Connection&) {}},
        {"HangsOnConnect", [](Connection& connection) { connection.untilClosed(); }},
        {"SaysNonsenseOnConnect", atOnce(says(noise(4000)))},
        {"SendsEndlessLineOnConnect", atOnce(repeats("", "x")), true},
        {"SendsEndlessHeadersOnConnect", atOnce(repeats("RTSP/1.0 200 OK\r\n", "X-Header: absurd\r\n")), true},
        {"SendsEndlessBinaryOnConnect", atOnce(repeats("", "$\1\xff\xff" + noise(65535)))},
        {"HangsAtOptions", at({.options = hangs()})},
        {"ClosesAtOptions", at({.options = closes()})},
        {"SaysNonsenseAtOptions", at({.options = says("HTTP/1.1 200 OK\r\n\r\nRTSP/9.9 abc\r\n\r\n")})},
        {"RefusesOptions", at({.options = refuses("500 Internal Server Error")})},
        {"AnswersOptionsInHalves", at({.options =
                                           [](Connection& connection, const std::string&) {
                                               connection.send("RTSP/1.0 200 OK\r\nCSe");
                                               connection.untilClosed();
                                               return false;
                                           }})},
        {"HangsAtDescribe", at({.described = hangs()})},
        {"ClosesAtDescribe", at({.described = closes()})},
        {"SaysNonsenseAtDescribe", at({.described = says(noise(4000))})},
        {"DoesNotKnowThePath", at({.described = refuses("404 Not Found")})},
        {"AsksForALoginForEver",
         at({.described = refuses("401 Unauthorized", "WWW-Authenticate: Basic realm=\"x\"\r\n")})},
        {"RedirectsToItself",
         [](Connection& connection) {
             Behaviour behaviour;
             behaviour.described = [](Connection& to, const std::string& request) {
                 const std::size_t begin = request.find(' ') + 1;
                 const std::string own = request.substr(begin, request.find(' ', begin) - begin);
                 return to.send(answer(request, "302 Found", "Location: " + own + "\r\n"));
             };
             serve(connection, behaviour);
         }},
        {"PromisesAGigabyte",
         at({.described =
                 [](Connection& connection, const std::string& request) {
                     connection.send(
                         answer(request, "200 OK", "Content-Type: application/sdp\r\nContent-Length: 2147483647\r\n"));
                     connection.untilClosed();
                     return false;
                 }})},
        {"PromisesLessThanNothing",
         at({.described = refuses("200 OK", "Content-Type: application/sdp\r\nContent-Length: -1\r\n")})},
        {"DescribesNothing", at({.described = refuses("200 OK", "Content-Type: application/sdp\r\n")})},
        {"DescribesNoise", at({.sdp = noise(4000)})},
        {"DescribesTooMuch", at({.sdp = manyStreams()})},
        {"DescribesNoVideo", at({.sdp = "v=0\r\ns=-\r\nt=0 0\r\nm=audio 0 RTP/AVP 0\r\na=control:a\r\n"})},
        {"DescribesUnknownVideo",
         at({.sdp = "v=0\r\ns=-\r\nt=0 0\r\nm=video 0 RTP/AVP 96\r\na=rtpmap:96 ABSURD/90000\r\na=control:v\r\n"})},
        {"HangsAtSetup", at({.setUp = hangs()})},
        {"ClosesAtSetup", at({.setUp = closes()})},
        {"SaysNonsenseAtSetup", at({.setUp = says(noise(4000))})},
        {"RefusesEveryTransport", at({.setUp = refuses("461 Unsupported Transport")})},
        {"AnswersAnAbsurdTransport",
         at({.setUp = refuses("200 OK", "Transport: RTP/AVP/TCP;interleaved=999-;;ssrc=zz\r\nSession: 1\r\n")})},
        {"AnswersNoTransport", at({.setUp = refuses("200 OK", "Session: 1\r\n")})},
        {"HangsAtPlay", at({.play = hangs()})},
        {"ClosesAtPlay", at({.play = closes()})},
        {"SaysNonsenseAtPlay", at({.play = says(noise(4000))})},
        {"RefusesToPlay", at({.play = refuses("454 Session Not Found")})},
        {"HangsAtTeardown", at({.tearDown = hangs()})},
        {"ClosesAtTeardown", at({.tearDown = closes()})},
        {"SaysNonsenseAtTeardown", at({.tearDown = says(noise(4000))})},
        {"RefusesTeardown", at({.tearDown = refuses("500 Internal Server Error")})},
        {"PlaysNothing", at({.stream = [](Connection& connection) { connection.untilClosed(); }})},
        {"ClosesWhilePlaying", at({.stream = [](Connection&) {}})},
        {"StreamsNoise", at({.stream = packets([](unsigned) { return noise(1400); })})},
        {"StreamsNoiseAsPackets", at({.stream = packets([](unsigned) { return interleaved(noise(1400)); })})},
        {"StreamsNoiseAsH264",
         at({.stream = packets([](unsigned i) { return interleaved(rtp(i, i * 1800, noise(1400))); })})},
        {"StreamsAnotherPayload",
         at({.stream = packets([](unsigned i) { return interleaved(rtp(i, i * 1800, noise(1400), 33)); })})},
        {"StreamsEmptyPackets", at({.stream = packets([](unsigned i) { return interleaved(rtp(i, i * 1800, "")); })})},
        {"StreamsShortPackets", at({.stream = packets([](unsigned) { return interleaved("\x80"); })})},
        {"StreamsOnUnknownChannels",
         at({.stream = packets([](unsigned i) { return interleaved(rtp(i, i * 1800, noise(100)), 77); })})},
        {"StreamsNoiseAsControl", at({.stream = packets([](unsigned) { return interleaved(noise(100), 1); })})},
        {"StreamsAPictureWithoutEnd", at({.stream =
                                              [](Connection& connection) {
                                                  const std::string part = "\x7c\x05" + noise(60000);
                                                  for (unsigned i = 0;
                                                       connection.send(interleaved(rtp(i, 0, part, 96, false))); ++i) {
                                                  }
                                              }})},
        {"StreamsAHugePicture", at({.stream = packets(hugePicture)})},
        {"StreamsAnEmptyJpeg",
         at({.sdp = kStillPictures,
             .stream = packets([](unsigned i) { return interleaved(rtp(i, i * 1800, jpegPayload(0, 0), 26)); })})},
        {"StreamsABrokenJpeg",
         at({.sdp = kStillPictures,
             .stream = packets([](unsigned i) { return interleaved(rtp(i, i * 1800, jpegPayload(40, 30), 26)); })})},
    };
}

class Hostile : public ReceiverFixture, public testing::WithParamInterface<Case> {
  protected:
    /// Until the server has been tried twice or an attempt has had time to settle.
    void watch(Receiver& receiver, const RawServer& server) {
        const auto deadline = Clock::now() + 2500ms;
        while (Clock::now() < deadline && server.connections() < 3) {
            QIVOlib_video_frame_v2_t record{};
            EXPECT_LT(costOf([&] {
                          if (receiver.capture(&record, nullptr, nullptr, 0ms) == QIVOlib_frame_type_video) {
                              receiver.freeVideo(&record);
                          }
                      }),
                      kCallLimit);
            receiver.capture(nullptr, nullptr, nullptr, 20ms);
        }
        EXPECT_GT(server.connections(), 0) << "the server was never tried";
    }
};

TEST_P(Hostile, ServerIsSurvived) {
    const RtspServer good({.launch = h264("width=320,height=240,framerate=30/1")});
    RawServer server;
    server.setScript(GetParam().script);

    std::unique_ptr<Receiver> receiver;
    EXPECT_LT(costOf([&] { receiver = receive(server.url()); }), kCallLimit);
    watch(*receiver, server);

    server.forwardTo(good.port());
    server.closeAll();
    EXPECT_TRUE(pictureThat(
        *receiver, [](const Shot& shot) { return shot.record.xres == 320 && shot.record.yres == 240; }, 10s))
        << "no picture after the server behaves again";

    EXPECT_LT(costOf([&] { receiver.reset(); }), kCallLimit);
}

TEST_P(Hostile, ServerDoesNotHoldUpTheEnd) {
    RawServer server;
    server.setScript(GetParam().script);
    const int descriptors = openDescriptors();
    auto receiver = receive(server.url());
    const auto deadline = Clock::now() + 1s;
    while (Clock::now() < deadline && server.connections() == 0) {
        receiver->capture(nullptr, nullptr, nullptr, 1ms);
    }
    receiver->capture(nullptr, nullptr, nullptr, 50ms);
    EXPECT_LT(costOf([&] { receiver.reset(); }), kCallLimit);
    if (GetParam().endless) {
        server.closeAll();
    }
    // A description may already be under way whose twenty thousand streams keep a busy machine for seconds.
    EXPECT_TRUE(BackgroundThreads::waitForAll(15s * kSanitizerPatience));
    server.closeAll();
    EXPECT_LE(openDescriptors(), descriptors + kSpareDescriptors);
}

INSTANTIATE_TEST_SUITE_P(Receiver, Hostile, testing::ValuesIn(cases()),
                         [](const auto& test) { return std::string(test.param.name); });

class HostileServer : public ReceiverFixture {};

TEST_F(HostileServer, ThatDoesNotAnswerKeepAlivesIsReceivedAsLongAsItSends) {
    const RtspServer good({.launch = h264("width=320,height=240,framerate=30/1"), .sessionTimeout = 2s});
    std::atomic<bool> playing = false; // these two are the server's too, which goes before them
    std::atomic<int> unanswered = 0;
    RawServer deaf;
    deaf.forwardTo(good.port(), [&](std::string bytes) {
        playing = playing || is(bytes, "PLAY");
        if (playing && (is(bytes, "GET_PARAMETER") || is(bytes, "OPTIONS"))) {
            ++unanswered;
            return std::string("\r\n"); // nothing, to an RTSP server
        }
        return bytes;
    });
    const auto receiver = receive(deaf.url());
    ASSERT_TRUE(nextPicture(*receiver));
    const auto deadline = Clock::now() + 4s;
    while (Clock::now() < deadline) {
        ASSERT_TRUE(nextPicture(*receiver, 1s));
    }
    EXPECT_GT(unanswered, 0);
    EXPECT_EQ(deaf.connections(), 1);
}

TEST_F(HostileServer, ThatSendsVideoOfAnUnknownKindIsNamed) {
    static int kinds = 0; // each is named once in a process
    const std::string kind = "VP" + std::to_string(8 + kinds++);
    RawServer server;
    server.setScript(at(
        {.sdp = "v=0\r\ns=-\r\nt=0 0\r\nm=video 0 RTP/AVP 96\r\na=rtpmap:96 " + kind + "/90000\r\na=control:v\r\n"}));
    testing::internal::CaptureStderr();
    {
        const auto receiver = receive(server.url());
        EXPECT_EQ(receiver->capture(nullptr, nullptr, nullptr, 1s * kSanitizerPatience), QIVOlib_frame_type_none);
    }
    BackgroundThreads::waitForAll(2s * kSanitizerPatience);
    const std::string text = testing::internal::GetCapturedStderr();
    EXPECT_NE(text.find("libqivo: video in " + kind + " is not received, only H.264, H.265 and JPEG\n"),
              std::string::npos)
        << text;
}

class HostileAddress : public ReceiverFixture {
  protected:
    void expectQuickLife(const std::string& url) {
        std::unique_ptr<Receiver> receiver;
        EXPECT_LT(costOf([&] { receiver = receive(url); }), kCallLimit);
        ASSERT_TRUE(receiver);
        EXPECT_EQ(receiver->capture(nullptr, nullptr, nullptr, 300ms), QIVOlib_frame_type_none);
        EXPECT_LT(costOf([&] { receiver.reset(); }), kCallLimit);
        EXPECT_TRUE(BackgroundThreads::waitForAll(2s));
    }
};

TEST_F(HostileAddress, ThatNeverAnswersCostsNothing) {
    RawServer server(0, false);
    server.fill();
    expectQuickLife(server.url());
}

TEST_F(HostileAddress, ThatRefusesCostsNothing) {
    expectQuickLife("rtsp://127.0.0.1:9/live");
}

TEST_F(HostileAddress, ThatCannotBeReachedCostsNothing) {
    expectQuickLife("rtsp://192.0.2.1:554/live");
}

TEST_F(HostileAddress, ThatIsNoAddressCostsNothing) {
    for (const char* url : {"rtsp://", "rtsp://:0/", "rtsp://127.0.0.1:99999/", "http://127.0.0.1/", "nonsense",
                            "rtsp://[::/x", "rtsp://user:pass@", "file:///etc/passwd", "rtsp-sdp://127.0.0.1/x"}) {
        SCOPED_TRACE(url);
        expectQuickLife(url);
    }
}

TEST_F(HostileAddress, ThatIsTooLongIsRefused) {
    EXPECT_TRUE(receive("rtsp://127.0.0.1/" + std::string(Receiver::kTextLimit - 17, 'x')));
    EXPECT_FALSE(receive("rtsp://127.0.0.1/" + std::string(Receiver::kTextLimit - 16, 'x')));
}

TEST_F(HostileAddress, ThatComesBackAfterSilenceIsSeenWithinTwoSeconds) {
    const RtspServer good({.launch = h264("width=320,height=240,framerate=30/1")});
    auto silent = std::make_unique<RawServer>(0, false);
    silent->fill();
    const int port = silent->port();
    const auto receiver = receive(silent->url());
    // Long enough for the pauses to have grown to their cap.
    EXPECT_EQ(receiver->capture(nullptr, nullptr, nullptr, 4s), QIVOlib_frame_type_none);
    silent.reset();
    RawServer back(port);
    back.forwardTo(good.port());
    const auto returned = Clock::now();
    EXPECT_TRUE(nextPicture(*receiver));
    EXPECT_LT(Clock::now() - returned, 2s);
}

} // namespace
} // namespace qivo::test
