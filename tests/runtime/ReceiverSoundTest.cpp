// What a receiver makes of a source's sound.

#include "runtime/SoundCutter.h"
#include "runtime/SoundQueue.h"
#include "sdk/Timecode.h"
#include "tests/runtime/RawServer.h"
#include "tests/runtime/ReceiverFixture.h"
#include "tests/runtime/RtpPackets.h"
#include "tests/support/Tone.h"

#include <gmock/gmock.h>

#include <cmath>
#include <functional>
#include <map>
#include <ostream>
#include <thread>

namespace qivo::test {
namespace {

using runtime::Receiver;
using runtime::SoundCutter;
using runtime::SoundQueue;

constexpr double kTone = 440.0;

/// How loud each channel is of a source that is made here, so that they can be told apart.
double levelOf(int channel, int channels) {
    return 0.5 * (channels - channel) / channels;
}

/// Places that a codec has for so many channels, in the order of GStreamer's: left, right, centre, low frequencies,
/// rear, sides.
std::string places(int channels) {
    const std::map<int, std::string> masks{{2, "0x3"},  {3, "0x7"},   {4, "0x33"}, {5, "0x37"},
                                           {6, "0x3f"}, {7, "0xd0f"}, {8, "0xc3f"}};
    return channels == 1 ? "" : ",channel-mask=(bitmask)" + masks.at(channels);
}

/// A live tone with a level of its own on each channel, up to the raw sound.
std::string tone(int rate, int channels) {
    std::string matrix;
    for (int channel = 0; channel < channels; ++channel) {
        const double level = levelOf(channel, channels) / 0.5;
        matrix += (channel == 0 ? "<(float)" : ",<(float)") + std::to_string(level) + ">";
    }
    const std::string caps = "audio/x-raw,rate=" + std::to_string(rate);
    return "audiotestsrc name=tone is-live=true volume=0.5 freq=440 samplesperbuffer=" + std::to_string(rate / 100) +
           " ! capsfilter caps=\"" + caps + ",format=F32LE,channels=1\" ! audioconvert mix-matrix=\"<" + matrix +
           ">\" ! capsfilter caps=\"" + caps + ",channels=" + std::to_string(channels) + places(channels) + "\"";
}

/// Channels at no places, which nobody sorts by them.
std::string placeless(int channels) {
    return channels <= 2 ? "" : " ! capssetter caps=\"audio/x-raw,channel-mask=(bitmask)0x0\"";
}

std::string payloader(const std::string& codec, int number = 0) {
    const std::string name = " name=pay" + std::to_string(number) + " pt=";
    const std::map<std::string, std::string> ends{
        {"L16", "audioconvert dithering=none ! rtpL16pay" + name + "97"},
        {"L24", "audioconvert dithering=none ! rtpL24pay" + name + "97"},
        {"PCMU", "audioconvert ! mulawenc ! rtppcmupay" + name + "0"},
        {"PCMA", "audioconvert ! alawenc ! rtppcmapay" + name + "8"},
        {"AAC", "audioconvert ! avenc_aac ! aacparse ! rtpmp4gpay" + name + "97"},
        {"LATM", "audioconvert ! avenc_aac ! aacparse ! rtpmp4apay" + name + "97"},
        {"OPUS", "audioconvert ! opusenc ! rtpopuspay" + name + "97"},
    };
    return " ! " + ends.at(codec);
}

/// Sound that goes on without a gap, channel by channel.
struct Recording {
    int rate = 0;
    int channels = 0;
    std::vector<std::vector<float>> planes;
    bool whole = true; ///< every frame had the same format and its right length

    double seconds() const { return planes.empty() ? 0.0 : static_cast<double>(planes[0].size()) / rate; }
};

class ReceiverSound : public ReceiverFixture {
  protected:
    static void SetUpTestSuite() {
        ReceiverFixture::SetUpTestSuite();
        for (const char* factory : {"audiotestsrc", "audioconvert", "rtpL16pay",  "rtpL16depay",  "rtpL24pay",
                                    "rtpL24depay",  "mulawenc",     "mulawdec",   "alawenc",      "alawdec",
                                    "rtppcmupay",   "rtppcmudepay", "rtppcmapay", "rtppcmadepay", "avenc_aac",
                                    "avdec_aac",    "aacparse",     "rtpmp4gpay", "rtpmp4gdepay", "rtpmp4apay",
                                    "rtpmp4adepay", "opusenc",      "opusdec",    "rtpopuspay",   "rtpopusdepay"}) {
            if (GstElement* element = gst_element_factory_make(factory, nullptr)) {
                gst_object_unref(gst_object_ref_sink(element));
            }
        }
    }

    std::unique_ptr<Receiver> listen(const std::string& url) {
        return receive(url, "", QIVOlib_recv_bandwidth_audio_only);
    }

    /// One frame, appended; false if nothing came in time.
    bool hear(Receiver& receiver, Recording& recording, std::chrono::milliseconds limit) {
        const auto deadline = Clock::now() + limit;
        QIVOlib_audio_frame_v2_t frame{};
        int32_t type = QIVOlib_frame_type_none;
        do {
            type = receiver.capture(nullptr, &frame, nullptr, 50ms);
            m_statusChanges += type == QIVOlib_frame_type_status_change ? 1 : 0;
        } while (type != QIVOlib_frame_type_audio && Clock::now() < deadline);
        if (type != QIVOlib_frame_type_audio) {
            return false;
        }
        append(recording, frame);
        receiver.freeAudio(&frame);
        return true;
    }

    static void append(Recording& recording, const QIVOlib_audio_frame_v2_t& frame) {
        if (recording.planes.empty()) {
            recording.rate = frame.sample_rate;
            recording.channels = frame.no_channels;
            recording.planes.resize(static_cast<std::size_t>(frame.no_channels));
        }
        const std::int64_t milliseconds = std::int64_t{1000} * frame.no_samples;
        recording.whole = recording.whole && frame.sample_rate == recording.rate &&
                          frame.no_channels == recording.channels &&
                          frame.channel_stride_in_bytes == 4 * frame.no_samples &&
                          milliseconds >= SoundCutter::kShortest.count() * frame.sample_rate &&
                          milliseconds <= SoundCutter::kLongest.count() * frame.sample_rate && frame.timestamp > 0;
        for (int channel = 0; channel < recording.channels; ++channel) {
            const float* plane = frame.p_data + static_cast<std::ptrdiff_t>(channel) * frame.no_samples;
            auto& all = recording.planes[static_cast<std::size_t>(channel)];
            all.insert(all.end(), plane, plane + frame.no_samples);
        }
    }

    /// So many seconds; less if the source stops before. Begun anew, a few times, where a busy machine kept the
    /// listener away for so long that what waits for him may not all be held.
    Recording record(Receiver& receiver, double seconds, double skipped = 0.0) {
        Recording begin;
        while (begin.seconds() < skipped && hear(receiver, begin, 8s)) {
        }
        constexpr auto longestAbsence = runtime::SoundQueue::kHeld * 4 / 5;
        Recording recording;
        bool absent = true;
        for (int attempts = 5; absent && attempts > 0; --attempts) {
            recording = {};
            absent = false;
            for (auto last = Clock::now(); recording.seconds() < seconds && hear(receiver, recording, 8s);) {
                absent = absent || Clock::now() - last > longestAbsence;
                last = Clock::now();
            }
        }
        return recording;
    }
};

struct Case {
    const char* codec;
    int rate;
    int channels;
    double tolerance; ///< of the level
    const char* transport = "udp";
};

void PrintTo(const Case& shown, std::ostream* out) {
    *out << shown.codec << shown.rate << "x" << shown.channels;
}

class EachSound : public ReceiverSound, public testing::WithParamInterface<Case> {};

TEST_P(EachSound, HasItsOwnRateChannelsAndTone) {
    const Case& wanted = GetParam();
    const RtspServer server(
        {.launch = tone(wanted.rate, wanted.channels) + placeless(wanted.channels) + payloader(wanted.codec),
         .tcpOnly = std::string(wanted.transport) == "tcp"});
    const auto receiver = listen(server.url());
    const Recording recording = record(*receiver, 0.6, 0.3); // encoders that look ahead begin with silence
    ASSERT_GE(recording.seconds(), 0.6);
    EXPECT_EQ(m_statusChanges, 1) << "the status change comes before the first sound";
    EXPECT_EQ(recording.rate, wanted.rate);
    ASSERT_EQ(recording.channels, wanted.channels);
    EXPECT_TRUE(recording.whole);
    for (int channel = 0; channel < wanted.channels; ++channel) {
        const auto& plane = recording.planes[static_cast<std::size_t>(channel)];
        const double level = levelOf(channel, wanted.channels);
        EXPECT_NEAR(frequencyOf(plane, recording.rate), kTone, 1.0) << channel;
        EXPECT_NEAR(amplitudeAt(plane, recording.rate, kTone), level, wanted.tolerance * level) << channel;
        const double step = level * 2.0 * std::acos(-1.0) * kTone / recording.rate;
        EXPECT_LE(largestStep(plane), step * (1.0 + wanted.tolerance) + wanted.tolerance * level) << channel;
    }
}

INSTANTIATE_TEST_SUITE_P(
    Receiver, EachSound,
    testing::Values(Case{"L16", 8000, 1, 0.001}, Case{"L16", 44100, 2, 0.001}, Case{"L16", 48000, 2, 0.001, "tcp"},
                    Case{"L16", 48000, 8, 0.001}, Case{"L16", 48001, 3, 0.001}, Case{"L16", 192000, 2, 0.001},
                    Case{"L24", 48000, 2, 0.001}, Case{"L24", 96000, 8, 0.001}, Case{"L24", 192000, 8, 0.001, "tcp"},
                    Case{"PCMU", 8000, 1, 0.05}, Case{"PCMA", 8000, 1, 0.05}, Case{"AAC", 48000, 2, 0.1},
                    Case{"AAC", 44100, 1, 0.1}, Case{"AAC", 96000, 2, 0.1}, Case{"AAC", 8000, 1, 0.1},
                    Case{"LATM", 44100, 2, 0.1}, Case{"OPUS", 48000, 1, 0.1}, Case{"OPUS", 48000, 2, 0.1, "tcp"}),
    [](const auto& test) {
        return std::string(test.param.codec) + "_" + std::to_string(test.param.rate) + "_" +
               std::to_string(test.param.channels) + "_" + test.param.transport;
    });

// --- The order of channels

class SoundOrder : public ReceiverSound {
  protected:
    /// Whether plane n holds the channel `channels[n]` of a source that gives each of them a place.
    void expectOrder(const std::string& end, const std::vector<int>& channels) {
        const auto count = static_cast<int>(channels.size());
        const RtspServer server({.launch = tone(48000, count) + end});
        const auto receiver = listen(server.url());
        const Recording recording = record(*receiver, 0.4, 0.4);
        ASSERT_EQ(recording.channels, count);
        std::vector<double> heard;
        double whole = 0; // of all planes: a gap, which a busy machine may leave, takes as much from each
        double sent = 0;
        for (std::size_t plane = 0; plane < channels.size(); ++plane) {
            heard.push_back(amplitudeAt(recording.planes[plane], recording.rate, kTone));
            whole += heard.back();
            sent += levelOf(channels[plane], count);
        }
        ASSERT_GT(whole, 0.3 * sent);
        const double nextLevel = 0.5 / count;
        for (std::size_t plane = 0; plane < channels.size(); ++plane) {
            EXPECT_NEAR(heard[plane] * sent / whole, levelOf(channels[plane], count), 0.3 * nextLevel) << plane;
        }
    }
};

class EachNumberOfChannels : public SoundOrder, public testing::WithParamInterface<int> {};

// At five, seven and eight channels GStreamer's encoder of 1.22 sends another order than it says.
TEST_P(EachNumberOfChannels, OfOpusIsInTheOrderOfTheStream) {
    const std::map<int, std::vector<int>> orders{
        {1, {0}},
        {2, {0, 1}},
        {3, {0, 2, 1}},          // left, centre, right
        {4, {0, 1, 2, 3}},       // left, right, rear left, rear right
        {6, {0, 2, 1, 4, 5, 3}}, // left, centre, right, rear left, rear right, low frequencies
    };
    expectOrder(" ! audioconvert ! opusenc bitrate=640000 ! rtpopuspay name=pay0 pt=97", orders.at(GetParam()));
}

INSTANTIATE_TEST_SUITE_P(Receiver, EachNumberOfChannels, testing::Values(1, 2, 3, 4, 6));

// In the stream the centre is the first.
TEST_F(SoundOrder, OfAacIsInTheOrderOfThePlaces) {
    for (const char* payload : {"AAC", "LATM"}) {
        expectOrder(payloader(payload), {0, 1, 2, 3, 4});
    }
}

struct Described {
    int bits;
    int channels;
    const char* order = ""; ///< a line of the server's description
};

void PrintTo(const Described& shown, std::ostream* out) {
    *out << "L" << shown.bits << " in " << shown.channels << " " << shown.order;
}

class EachPcm : public ReceiverSound, public testing::WithParamInterface<Described> {
  protected:
    /// Ten milliseconds at 48000 Hz: channel n is n + 1 hundredths of the loudest.
    static std::string samples() {
        std::string bytes;
        for (int i = 0; i < 480 * GetParam().channels; ++i) {
            const std::string sample = big16(static_cast<unsigned>(valueOf(i % GetParam().channels)));
            bytes += GetParam().bits == 16 ? sample : sample + '\0';
        }
        return bytes;
    }

    static int valueOf(int channel) { return 328 * (channel + 1); }

    static std::string description() {
        const std::string encoding = "L" + std::to_string(GetParam().bits);
        return "v=0\r\no=- 0 0 IN IP4 127.0.0.1\r\ns=-\r\nt=0 0\r\nm=audio 0 RTP/AVP 97\r\na=rtpmap:97 " + encoding +
               "/48000/" + std::to_string(GetParam().channels) + "\r\n" + GetParam().order + "a=control:stream=0\r\n";
    }

    using Payload = std::function<std::string(unsigned)>;

    static void serve(Connection& connection, const Payload& payload) {
        for (std::string request = connection.request(); !request.empty(); request = connection.request()) {
            if (request.rfind("DESCRIBE ", 0) == 0) {
                connection.send(answer(request, "200 OK", "Content-Type: application/sdp\r\n", description()));
            } else if (request.rfind("SETUP ", 0) == 0 && request.find("TCP") == std::string::npos) {
                connection.send(answer(request, "461 Unsupported Transport"));
            } else if (request.rfind("SETUP ", 0) == 0) {
                connection.send(answer(request, "200 OK",
                                       "Transport: RTP/AVP/TCP;unicast;interleaved=0-1;ssrc=12345678\r\n"
                                       "Session: 1;timeout=60\r\n"));
            } else {
                connection.send(answer(request, "200 OK", "Session: 1\r\n"));
            }
            if (request.rfind("PLAY ", 0) == 0) {
                play(connection, payload);
            }
        }
    }

    static void play(Connection& connection, const Payload& payload) {
        for (unsigned i = 0; connection.send(interleaved(rtp(i, i * 480, payload(i), 97))); ++i) {
            std::this_thread::sleep_for(10ms);
        }
    }
};

TEST_P(EachPcm, HasItsChannelsInTheOrderInWhichTheyCome) {
    RawServer server;
    server.setScript([](Connection& connection) {
        const std::string payload = samples();
        serve(connection, [&](unsigned) { return payload; });
    });
    const auto receiver = listen(server.url());
    const Recording recording = record(*receiver, 0.1);
    ASSERT_GE(recording.seconds(), 0.1);
    ASSERT_EQ(recording.channels, GetParam().channels);
    for (int channel = 0; channel < recording.channels; ++channel) {
        const auto& plane = recording.planes[static_cast<std::size_t>(channel)];
        EXPECT_THAT(plane, testing::Each(static_cast<float>(valueOf(channel)) / 32768.0F)) << channel;
    }
}

INSTANTIATE_TEST_SUITE_P(Receiver, EachPcm,
                         testing::Values(Described{16, 1}, Described{16, 2}, Described{16, 3}, Described{16, 4},
                                         Described{16, 5}, Described{16, 6}, Described{16, 7}, Described{16, 8},
                                         Described{24, 3}, Described{24, 4}, Described{24, 5}, Described{24, 6},
                                         Described{24, 7}, Described{24, 8},
                                         Described{16, 4, "a=fmtp:97 channel-order=DV.LRCS\r\n"},
                                         Described{24, 6, "a=fmtp:97 channel-order=DV.LRLsRsCS\r\n"}));

class OddPcm : public EachPcm {};

TEST_P(OddPcm, PacketsThatEndWithinASampleDoNoHarm) {
    RawServer server;
    server.setScript([](Connection& connection) {
        serve(connection, [](unsigned i) { return samples().substr(0, i % 4 == 3 ? 401 + i % 7 : std::string::npos); });
    });
    const auto receiver = listen(server.url());
    const Recording recording = record(*receiver, 0.3);
    EXPECT_GE(recording.seconds(), 0.3);
    EXPECT_EQ(recording.channels, GetParam().channels);
    EXPECT_EQ(server.connections(), 1) << "it was connected again";
}

INSTANTIATE_TEST_SUITE_P(Receiver, OddPcm, testing::Values(Described{16, 2}, Described{16, 8}, Described{24, 6}));

// --- Exactness

TEST_F(ReceiverSound, SamplesOfPcmAreExact) {
    RtspServer server({.launch =
                           "audiotestsrc is-live=true wave=square volume=0.5 freq=100 ! "
                           "audio/x-raw,rate=48000,channels=2,format=S16LE ! audioconvert ! rtpL16pay name=pay0"});
    const auto receiver = listen(server.url());
    const Recording recording = record(*receiver, 0.2);
    ASSERT_GE(recording.seconds(), 0.2);
    for (const auto& plane : recording.planes) {
        for (const float sample : plane) {
            ASSERT_EQ(sample * 32768.0F, std::round(sample * 32768.0F));
            ASSERT_NEAR(std::abs(sample), 0.5F, 1.0F / 32768.0F);
        }
    }
}

TEST_F(ReceiverSound, LoudestSamplesStayWithinOne) {
    RtspServer server({.launch =
                           "audiotestsrc is-live=true wave=square volume=1 freq=100 ! "
                           "audio/x-raw,rate=48000,channels=1,format=S16LE ! audioconvert ! rtpL16pay name=pay0"});
    const auto receiver = listen(server.url());
    const Recording recording = record(*receiver, 0.1);
    ASSERT_GE(recording.seconds(), 0.1);
    for (const float sample : recording.planes[0]) {
        ASSERT_GE(std::abs(sample), 0.99F);
        ASSERT_LE(std::abs(sample), 1.0F);
    }
}

TEST_F(ReceiverSound, SetsUpOnlyTheSoundByTheRequestsItSends) {
    const RtspServer server(
        {.launch = h264("width=320,height=240,framerate=30/1") + " " + tone(48000, 2) + payloader("L16", 1)});
    std::mutex mutex; // these two are the proxy's too, which goes before them
    std::string sent;
    RawServer proxy;
    proxy.forwardTo(server.port(), [&](std::string bytes) {
        const std::lock_guard guard(mutex);
        sent += bytes;
        return bytes;
    });
    const auto receiver = listen(proxy.url());
    EXPECT_GE(record(*receiver, 0.1).seconds(), 0.1);
    const std::lock_guard guard(mutex);
    std::vector<std::string> setups;
    for (std::size_t at = sent.find("SETUP "); at != std::string::npos; at = sent.find("SETUP ", at + 1)) {
        setups.push_back(sent.substr(at, sent.find("\r\n", at) - at));
    }
    ASSERT_EQ(setups.size(), 1U) << sent;
    EXPECT_THAT(setups[0], testing::HasSubstr("/live/stream=1 RTSP/1.0")) << "the second stream is the sound";
    EXPECT_EQ(server.setups(), 1);
}

TEST_F(ReceiverSound, ReceiversOfPicturesSetUpNoSound) {
    const RtspServer server(
        {.launch = h264("width=320,height=240,framerate=30/1") + " " + tone(48000, 2) + payloader("L16", 1)});
    for (const int bandwidth : {QIVOlib_recv_bandwidth_lowest, QIVOlib_recv_bandwidth_highest}) {
        const int before = server.setups();
        const auto receiver = receive(server.url(), "", bandwidth);
        EXPECT_TRUE(nextPicture(*receiver));
        QIVOlib_audio_frame_v2_t frame{};
        EXPECT_NE(receiver->capture(nullptr, &frame, nullptr, 300ms), QIVOlib_frame_type_audio);
        EXPECT_EQ(server.setups(), before + 1);
    }
}

TEST_F(ReceiverSound, TimecodeIsTheSendersClockOnceItIsReported) {
    const RtspServer server({.launch = tone(48000, 2) + payloader("AAC"), .reports = 100ms});
    const auto receiver = listen(server.url());
    const auto deadline = Clock::now() + 8s;
    QIVOlib_audio_frame_v2_t frame{};
    while (frame.timecode < firstWallTimecode && Clock::now() < deadline) {
        if (receiver->capture(nullptr, &frame, nullptr, 50ms) == QIVOlib_frame_type_audio) {
            receiver->freeAudio(&frame);
        }
    }
    ASSERT_GE(frame.timecode, firstWallTimecode);
    const auto delay = static_cast<double>(frame.timestamp - frame.timecode) * 1e-4;
    EXPECT_NEAR(delay, 0, 500.0 * kSanitizerPatience) << "both are this machine's clock, in milliseconds";
}

TEST_F(ReceiverSound, QueueDepthIsTrueAndTheOldestComesFirst) {
    RtspServer server({.launch = tone(48000, 2) + payloader("L16")});
    const auto receiver = listen(server.url());
    const auto deadline = Clock::now() + 8s;
    while (receiver->queue().audio_frames < 5 && Clock::now() < deadline) {
        std::this_thread::sleep_for(1ms);
    }
    server.setSilent(true);
    std::this_thread::sleep_for(100ms); // what is on its way arrives
    EXPECT_TRUE(statusChanges(*receiver));
    int depth = receiver->queue().audio_frames;
    ASSERT_GE(depth, 5);
    std::int64_t timecode = -1;
    for (; depth > 0; --depth) {
        EXPECT_EQ(receiver->queue().audio_frames, depth);
        QIVOlib_audio_frame_v2_t frame{};
        ASSERT_EQ(receiver->capture(nullptr, &frame, nullptr, 0ms), QIVOlib_frame_type_audio);
        EXPECT_GT(frame.timecode, timecode);
        timecode = frame.timecode;
        receiver->freeAudio(&frame);
    }
    QIVOlib_audio_frame_v2_t frame{};
    EXPECT_EQ(receiver->capture(nullptr, &frame, nullptr, 0ms), QIVOlib_frame_type_none);
    EXPECT_EQ(receiver->queue().audio_frames, 0);
    EXPECT_EQ(receiver->queue().video_frames, 0);
}

TEST_F(ReceiverSound, NobodyWhoListensKeepsAtMostAQuarterOfASecondOfTheNewest) {
    RtspServer server({.launch = tone(48000, 2) + payloader("L16")});
    const auto receiver = listen(server.url());
    EXPECT_TRUE(statusChanges(*receiver));
    const auto until = Clock::now() + 1s; // four times what is held
    while (Clock::now() < until) {
        EXPECT_LE(receiver->queue().audio_frames, 250 / 5);
        std::this_thread::sleep_for(10ms);
    }
    server.setSilent(true);
    const std::int64_t now =
        std::chrono::duration_cast<std::chrono::milliseconds>(std::chrono::system_clock::now().time_since_epoch())
            .count() *
        10'000;
    std::this_thread::sleep_for(100ms);
    Recording rest;
    QIVOlib_audio_frame_v2_t frame{};
    while (receiver->capture(nullptr, &frame, nullptr, 0ms) == QIVOlib_frame_type_audio) {
        EXPECT_GT(frame.timestamp, now - 5'000'000) << "the oldest is gone";
        append(rest, frame);
        receiver->freeAudio(&frame);
    }
    EXPECT_LE(rest.seconds(), 0.25);
    EXPECT_GE(rest.seconds(), 0.2);
}

TEST_F(ReceiverSound, FramesOutAreBoundedAndEndWithTheReceiver) {
    const RtspServer server({.launch = tone(48000, 2) + payloader("L16")});
    auto receiver = listen(server.url());
    std::vector<QIVOlib_audio_frame_v2_t> out;
    const auto deadline = Clock::now() + 8s;
    while (out.size() < SoundQueue::kOut && Clock::now() < deadline) {
        QIVOlib_audio_frame_v2_t frame{};
        if (receiver->capture(nullptr, &frame, nullptr, 50ms) == QIVOlib_frame_type_audio) {
            out.push_back(frame);
        }
    }
    ASSERT_EQ(out.size(), SoundQueue::kOut);
    QIVOlib_audio_frame_v2_t frame{};
    EXPECT_EQ(receiver->capture(nullptr, &frame, nullptr, 300ms), QIVOlib_frame_type_none);
    const QIVOlib_audio_frame_v2_t foreign{};
    receiver->freeAudio(&foreign);
    receiver->freeAudio(nullptr);
    EXPECT_EQ(receiver->capture(nullptr, &frame, nullptr, 100ms), QIVOlib_frame_type_none);
    receiver->freeAudio(&out[7]);
    EXPECT_EQ(receiver->capture(nullptr, &frame, nullptr, 1s), QIVOlib_frame_type_audio);
}

TEST_F(ReceiverSound, SilentSourceIsConnectedAgain) {
    RtspServer server({.launch = tone(8000, 1) + payloader("PCMU")});
    const auto receiver = listen(server.url());
    ASSERT_GE(record(*receiver, 0.1).seconds(), 0.1);
    const int before = server.connections();
    server.setSilent(true);
    const auto deadline = Clock::now() + 10s;
    while (server.connections() == before && Clock::now() < deadline) {
        std::this_thread::sleep_for(5ms);
    }
    EXPECT_GT(server.connections(), before);
    server.setSilent(false);
    EXPECT_TRUE(statusChanges(*receiver)) << "not told that it is connected again";
    Recording more;
    EXPECT_TRUE(hear(*receiver, more, 10s));
}

TEST_F(ReceiverSound, SourceWithoutSoundBringsNoneAndIsLeftInPeace) {
    const RtspServer server({.launch = h264("width=320,height=240,framerate=30/1")});
    const auto receiver = listen(server.url());
    Recording none;
    EXPECT_FALSE(hear(*receiver, none, 2s));
    EXPECT_EQ(m_statusChanges, 0);
    EXPECT_EQ(server.connections(), 1);
    EXPECT_EQ(server.setups(), 0);
}

// --- Sound that no player could use

struct Absurd {
    const char* name;
    const char* media; ///< in the server's description
    const char* line;  ///< in the log
};

class AbsurdSound : public ReceiverSound, public testing::WithParamInterface<Absurd> {};

TEST_P(AbsurdSound, IsRefusedWithALineBeforeAnythingIsSetUp) {
    std::atomic<int> setups = 0; // the server's too, which goes before it
    RawServer server;
    server.setScript([&](Connection& connection) {
        for (std::string request = connection.request(); !request.empty(); request = connection.request()) {
            if (request.rfind("DESCRIBE ", 0) == 0) {
                connection.send(answer(request, "200 OK", "Content-Type: application/sdp\r\n",
                                       std::string("v=0\r\no=- 0 0 IN IP4 127.0.0.1\r\ns=-\r\nt=0 0\r\n") +
                                           GetParam().media + "a=control:stream=0\r\n"));
            } else {
                setups += request.rfind("SETUP ", 0) == 0 ? 1 : 0;
                connection.send(answer(request));
            }
        }
    });
    testing::internal::CaptureStderr();
    const auto receiver = listen(server.url());
    Recording none;
    EXPECT_FALSE(hear(*receiver, none, 1s));
    EXPECT_EQ(setups, 0);
    EXPECT_EQ(server.connections(), 1);
    EXPECT_THAT(testing::internal::GetCapturedStderr(), testing::HasSubstr(GetParam().line));
}

INSTANTIATE_TEST_SUITE_P(
    Receiver, AbsurdSound,
    testing::Values(
        Absurd{"RateOfOne", "m=audio 0 RTP/AVP 97\r\na=rtpmap:97 L16/1/2\r\n",
               "sound of 1 Hz in 2 channels is not received: rates go from 8000 to 192000 Hz, channels from 1 to 8\n"},
        Absurd{"RateBelow", "m=audio 0 RTP/AVP 97\r\na=rtpmap:97 L16/7999/1\r\n", "sound of 7999 Hz in 1 channels"},
        Absurd{"RateAbove", "m=audio 0 RTP/AVP 97\r\na=rtpmap:97 L24/192001/1\r\n", "sound of 192001 Hz in 1 channels"},
        Absurd{"GiantRate", "m=audio 0 RTP/AVP 97\r\na=rtpmap:97 L16/2147483647/2\r\n", "sound of 2147483647 Hz"},
        Absurd{"NoChannels", "m=audio 0 RTP/AVP 97\r\na=rtpmap:97 L16/48000/0\r\n", "sound of 48000 Hz in 0 channels"},
        Absurd{"NineChannels", "m=audio 0 RTP/AVP 97\r\na=rtpmap:97 L16/48000/9\r\n", "in 9 channels"},
        Absurd{"ManyChannels", "m=audio 0 RTP/AVP 97\r\na=rtpmap:97 PCMU/8000/1000\r\n", "in 1000 channels"},
        Absurd{"UnknownEncoding", "m=audio 0 RTP/AVP 97\r\na=rtpmap:97 ABSURD/48000/2\r\n",
               "sound as ABSURD is not received\n"}),
    [](const auto& test) { return test.param.name; });

TEST_F(ReceiverSound, RateThatOnlyTheStreamTellsIsRefusedToo) {
    const RtspServer server({.launch = tone(7350, 1) + payloader("AAC")});
    testing::internal::CaptureStderr();
    const auto receiver = listen(server.url());
    Recording none;
    EXPECT_FALSE(hear(*receiver, none, 2s));
    EXPECT_EQ(server.connections(), 1) << "it is left in peace";
    EXPECT_THAT(testing::internal::GetCapturedStderr(), testing::HasSubstr("sound of 7350 Hz in 1 channels"));
}

} // namespace
} // namespace qivo::test
