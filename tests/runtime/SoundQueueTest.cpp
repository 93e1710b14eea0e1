// Sound on its way from pieces to captured frames, without a network.

#include "runtime/SoundQueue.h"
#include "runtime/Mailbox.h"
#include "runtime/SoundCutter.h"
#include "tests/runtime/Patience.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <cmath>
#include <cstring>
#include <limits>
#include <thread>
#include <utility>
#include <vector>

namespace qivo::runtime {
namespace {

using namespace std::chrono_literals;

constexpr std::int64_t kUnitsPerSecond = 10'000'000;

/// A frame whose samples are all `value`.
std::unique_ptr<Sound> soundOf(int samples, float value = 0.0F, SoundFormat format = {48000, 2}) {
    return std::make_unique<Sound>(
        format, std::vector<float>(static_cast<std::size_t>(samples * format.channels), value), 0, 0);
}

// --- SoundCutter

/// What a cutter made: every frame copied out of the form in which it is handed out.
struct Cut {
    QIVOlib_audio_frame_v2_t record{};
    std::vector<std::vector<float>> planes;
};

class SoundCutterTest : public testing::Test {
  protected:
    /// Feeds `count` samples that go on counting, each channel a thousandth further.
    void feed(SoundFormat format, std::size_t count, bool afterGap = false) {
        std::vector<float> samples;
        for (std::size_t i = 0; i < count; ++i) {
            for (int channel = 0; channel < format.channels; ++channel) {
                samples.push_back(valueAt(m_fed + i, channel));
            }
        }
        const auto timecode = static_cast<std::int64_t>(m_sinceFormat) * kUnitsPerSecond / std::max(1, format.rate);
        m_cutter.add({format, samples.data(), count, timecode, 7, afterGap, m_taken});
        m_fed += count;
        m_sinceFormat += count;
    }

    static float valueAt(std::size_t index, int channel) {
        return static_cast<float>(index % 1000) / 1024.0F + static_cast<float>(channel) / 65536.0F;
    }

    void expectBounds() const {
        for (const Cut& cut : m_cuts) {
            const std::int64_t milliseconds = std::int64_t{1000} * cut.record.no_samples;
            EXPECT_GE(milliseconds, SoundCutter::kShortest.count() * cut.record.sample_rate);
            EXPECT_LE(milliseconds, SoundCutter::kLongest.count() * cut.record.sample_rate);
            EXPECT_EQ(cut.record.channel_stride_in_bytes, 4 * cut.record.no_samples);
            EXPECT_EQ(cut.planes.size(), static_cast<std::size_t>(cut.record.no_channels));
        }
    }

    std::size_t samplesOut() const {
        std::size_t all = 0;
        for (const Cut& cut : m_cuts) {
            all += cut.planes.at(0).size();
        }
        return all;
    }

    std::vector<Cut> m_cuts;
    SoundCutter m_cutter{[this](std::unique_ptr<Sound> sound) {
        Cut cut{sound->record(), {}};
        for (int channel = 0; channel < cut.record.no_channels; ++channel) {
            const float* plane = cut.record.p_data + static_cast<std::ptrdiff_t>(channel) * cut.record.no_samples;
            cut.planes.emplace_back(plane, plane + cut.record.no_samples);
        }
        m_cuts.push_back(std::move(cut));
    }};
    std::size_t m_fed = 0;
    std::size_t m_sinceFormat = 0;
    std::optional<std::int64_t> m_taken; // by the sender's clock, of the next piece
};

struct Pieces {
    int rate;
    int channels;
    std::size_t samples; ///< in each piece
};

class EachPiece : public SoundCutterTest, public testing::WithParamInterface<Pieces> {};

/// Two whole frames and a rest are on their way to a device, which may take 2048 samples at 48000 Hz at a time.
constexpr std::size_t kTwo = 2 * 48000;
constexpr std::size_t kMostAtATime = 2048;

TEST_P(EachPiece, BecomesFramesThatLastLongEnoughAndNothingIsLost) {
    const auto [rate, channels, samples] = GetParam();
    while (m_fed < static_cast<std::size_t>(rate)) {
        feed({rate, channels}, samples);
    }
    ASSERT_FALSE(m_cuts.empty());
    expectBounds();
    for (const Cut& cut : m_cuts) {
        EXPECT_GE(kTwo * cut.planes[0].size(), kMostAtATime * static_cast<std::size_t>(rate));
    }
    std::size_t at = 0;
    for (const Cut& cut : m_cuts) {
        EXPECT_EQ(cut.record.sample_rate, rate);
        EXPECT_EQ(cut.record.timestamp, 7);
        EXPECT_NEAR(static_cast<double>(cut.record.timecode), 1e7 * static_cast<double>(at) / rate, 2.0);
        for (std::size_t i = 0; i < cut.planes[0].size(); ++i, ++at) {
            for (int channel = 0; channel < channels; ++channel) {
                ASSERT_EQ(cut.planes[static_cast<std::size_t>(channel)][i], valueAt(at, channel)) << at;
            }
        }
    }
    EXPECT_LT(m_fed - at, static_cast<std::size_t>(rate) / 46) << "what is held back is less than a joined frame";
}

INSTANTIATE_TEST_SUITE_P(SoundCutter, EachPiece,
                         testing::Values(Pieces{48000, 2, 6}, Pieces{48000, 2, 48}, Pieces{48000, 2, 350},
                                         Pieces{48000, 2, 960}, Pieces{48000, 2, 1920}, Pieces{48000, 2, 1921},
                                         Pieces{48000, 2, 1600}, Pieces{48000, 2, 840}, Pieces{48000, 2, 48000},
                                         Pieces{44100, 1, 1024}, Pieces{44100, 2, 441}, Pieces{8000, 1, 160},
                                         Pieces{8000, 1, 65000}, Pieces{11025, 3, 55}, Pieces{192000, 8, 45},
                                         Pieces{192000, 8, 20000}, Pieces{8001, 8, 1}),
                         [](const auto& test) {
                             return std::to_string(test.param.rate) + "_" + std::to_string(test.param.channels) + "_" +
                                    std::to_string(test.param.samples);
                         });

TEST_F(SoundCutterTest, PieceOfAGoodLengthPassesAsItIs) {
    feed({48000, 2}, 1024);
    feed({48000, 2}, 1584);
    ASSERT_EQ(m_cuts.size(), 2U);
    EXPECT_EQ(m_cuts[0].planes[0].size(), 1024U);
    EXPECT_EQ(m_cuts[1].planes[0].size(), 1584U);
}

TEST_F(SoundCutterTest, FramesAreOfOneLengthWhereThePiecesAreNot) {
    for (const std::size_t samples : {480U, 960U, 1440U, 1600U, 6000U}) {
        feed({48000, 2}, samples);
    }
    ASSERT_EQ(m_cuts.size(), 10U);
    for (const Cut& cut : m_cuts) {
        EXPECT_EQ(cut.planes[0].size(), 1024U);
    }
}

TEST_F(SoundCutterTest, FrameNeverSpansAGap) {
    feed({48000, 1}, 300); // 6.25 ms: long enough for a frame of its own
    feed({48000, 1}, 1024, true);
    ASSERT_EQ(m_cuts.size(), 2U);
    EXPECT_EQ(m_cuts[0].planes[0].size(), 300U);
    EXPECT_EQ(m_cuts[1].planes[0].front(), valueAt(300, 0));
    expectBounds();
}

TEST_F(SoundCutterTest, RestBeforeAGapThatIsTooShortForAFrameIsDropped) {
    feed({48000, 1}, 239);
    feed({48000, 1}, 1024, true);
    ASSERT_EQ(m_cuts.size(), 1U);
    EXPECT_EQ(m_cuts[0].planes[0].front(), valueAt(239, 0));
}

TEST_F(SoundCutterTest, JumpInTimeIsAGap) {
    feed({48000, 1}, 300);
    m_sinceFormat += 48 * SoundCutter::kGap.count() + 1;
    feed({48000, 1}, 1024);
    EXPECT_EQ(m_cuts.size(), 2U);
    feed({48000, 1}, 300);
    m_sinceFormat += 48 * SoundCutter::kGap.count() / 2; // what a jitter buffer corrects
    feed({48000, 1}, 1024);
    EXPECT_EQ(m_cuts.size(), 3U);
}

TEST_F(SoundCutterTest, SendersClockIsShownAndItsReportIsNoGap) {
    feed({48000, 1}, 239);
    m_taken = 1000 * kUnitsPerSecond;
    feed({48000, 1}, 785);
    ASSERT_EQ(m_cuts.size(), 1U) << "in one frame";
    EXPECT_EQ(m_cuts[0].record.timecode, 0) << "of its first sample";
    feed({48000, 1}, 2 * 1024 + 768);
    ASSERT_EQ(m_cuts.size(), 3U);
    EXPECT_EQ(m_cuts[1].record.timecode, 1000 * kUnitsPerSecond);
    EXPECT_EQ(m_cuts[2].record.timecode, 1000 * kUnitsPerSecond + 213'333);
    m_taken = 2000 * kUnitsPerSecond;
    feed({48000, 1}, 256 + 1024);
    ASSERT_EQ(m_cuts.size(), 5U);
    EXPECT_EQ(m_cuts[3].record.timecode, 1000 * kUnitsPerSecond + 426'666) << "of what was left over";
    EXPECT_NEAR(static_cast<double>(m_cuts[4].record.timecode), 1000.0 * kUnitsPerSecond + 640'000, 1);
}

TEST_F(SoundCutterTest, FrameNeverSpansAChangeOfFormat) {
    feed({48000, 2}, 300);
    m_sinceFormat = 0;
    feed({44100, 1}, 1024);
    ASSERT_EQ(m_cuts.size(), 2U);
    EXPECT_EQ(m_cuts[0].record.no_channels, 2);
    EXPECT_EQ(m_cuts[1].record.no_channels, 1);
    EXPECT_EQ(m_cuts[1].record.sample_rate, 44100);
    expectBounds();
}

TEST_F(SoundCutterTest, EmptyPieceIsNothing) {
    feed({48000, 2}, 0);
    m_cutter.flush();
    EXPECT_TRUE(m_cuts.empty());
}

TEST_F(SoundCutterTest, WhatIsNoNumberIsSilenceAndGiantsAreHeld) {
    std::vector<float> samples(1024, 0.5F);
    samples[0] = std::numeric_limits<float>::quiet_NaN();
    samples[1] = std::numeric_limits<float>::infinity();
    samples[2] = -std::numeric_limits<float>::infinity();
    samples[3] = std::numeric_limits<float>::max();
    samples[4] = std::numeric_limits<float>::lowest();
    m_cutter.add({{48000, 1}, samples.data(), samples.size(), 0, 0, false});
    ASSERT_EQ(m_cuts.size(), 1U);
    const std::vector<float> begin(m_cuts[0].planes[0].begin(), m_cuts[0].planes[0].begin() + 6);
    EXPECT_EQ(begin, (std::vector<float>{0, 0, 0, SoundCutter::kLoudest, -SoundCutter::kLoudest, 0.5F}));
}

// --- SoundQueue

TEST(SoundQueue, OldestComesFirst) {
    SoundQueue queue;
    EXPECT_FALSE(queue.ready());
    for (const float value : {1.0F, 2.0F, 3.0F}) {
        EXPECT_TRUE(queue.push(soundOf(480, value)).empty());
    }
    EXPECT_EQ(queue.waiting(), 3U);
    EXPECT_EQ(queue.take().p_data[0], 1.0F);
    EXPECT_EQ(queue.take().p_data[0], 2.0F);
    EXPECT_EQ(queue.waiting(), 1U);
}

TEST(SoundQueue, HoldsExactlyAQuarterOfASecondAndTheOldestGoes) {
    SoundQueue queue;
    for (int i = 0; i < 25; ++i) {
        EXPECT_TRUE(queue.push(soundOf(480, static_cast<float>(i))).empty()) << i;
    }
    EXPECT_EQ(queue.held(), SoundQueue::kHeld);
    const auto gone = queue.push(soundOf(480, 25.0F));
    ASSERT_EQ(gone.size(), 1U);
    EXPECT_EQ(gone[0]->record().p_data[0], 0.0F);
    EXPECT_EQ(queue.waiting(), 25U);
    EXPECT_EQ(queue.take().p_data[0], 1.0F);
}

TEST(SoundQueue, BoundIsOfTimeAlsoWhereFormatsMix) {
    SoundQueue queue;
    for (int i = 0; i < 100; ++i) {
        const SoundFormat format = i % 2 == 0 ? SoundFormat{8000, 1} : SoundFormat{192000, 8};
        const auto gone = queue.push(soundOf(format.rate / 50, 0.0F, format));
        EXPECT_LE(queue.held(), SoundQueue::kHeld);
    }
    EXPECT_EQ(queue.waiting(), 12U); // of 20 ms each
}

TEST(SoundQueue, FramesOutAreBounded) {
    SoundQueue queue;
    std::vector<QIVOlib_audio_frame_v2_t> out;
    while (out.size() < SoundQueue::kOut) {
        EXPECT_TRUE(queue.push(soundOf(480)).empty());
        ASSERT_TRUE(queue.ready());
        out.push_back(queue.take());
    }
    EXPECT_TRUE(queue.push(soundOf(480)).empty());
    EXPECT_FALSE(queue.ready());
    EXPECT_TRUE(queue.giveBack(out.front().p_data));
    EXPECT_TRUE(queue.ready());
    EXPECT_FALSE(queue.giveBack(out.front().p_data)) << "twice";
    EXPECT_FALSE(queue.giveBack(nullptr));
    EXPECT_EQ(queue.dropAll().size(), SoundQueue::kOut);
    EXPECT_EQ(queue.waiting(), 0U);
}

/// An hour of a source whose clock differs from the listener's. The time is the test's own: samples of the listener.
/// Where a sanitizer watches, the clocks differ the more and the hour is the shorter.
struct Drift {
    const char* name;
    int partsPerMillion;
};

class ClockDifference : public testing::TestWithParam<Drift> {};

TEST_P(ClockDifference, LatencyStaysBoundedForAnHourAndSoDoesMemory) {
    constexpr std::int64_t kRate = 48000;
    constexpr std::int64_t kPacket = 350;
    constexpr std::int64_t kBuffer = 1600; // what the listener's device asks for at a time
    constexpr std::int64_t kHour = 3600 * kRate / test::kSanitizerPatience;
    const std::int64_t partsPerMillion = std::int64_t{GetParam().partsPerMillion} * test::kSanitizerPatience;
    SoundQueue queue;
    std::int64_t dropped = 0;
    std::int64_t silent = 0;
    std::int64_t sent = 0;
    std::size_t mostFrames = 0;
    std::chrono::nanoseconds mostHeld{};
    SoundCutter cutter([&](std::unique_ptr<Sound> sound) {
        for (const auto& gone : queue.push(std::move(sound))) {
            dropped += gone->record().no_samples;
        }
    });
    const std::vector<float> samples(kPacket);
    std::int64_t staged = 0;
    std::int64_t played = 0;
    for (std::int64_t now = 0; now < kHour; now += kBuffer) {
        const std::int64_t due = now + now * partsPerMillion / 1'000'000;
        for (; sent + kPacket <= due; sent += kPacket) {
            cutter.add({{kRate, 1}, samples.data(), kPacket, sent * kUnitsPerSecond / kRate, 0, false});
        }
        mostFrames = std::max(mostFrames, queue.waiting());
        mostHeld = std::max(mostHeld, queue.held());
        while (staged < kBuffer && queue.ready()) {
            const QIVOlib_audio_frame_v2_t frame = queue.take();
            staged += frame.no_samples;
            EXPECT_TRUE(queue.giveBack(frame.p_data));
        }
        const std::int64_t heard = std::min(staged, kBuffer);
        silent += kBuffer - heard;
        played += heard;
        staged -= heard;
    }
    const auto ahead = sent - played - dropped;
    EXPECT_LE(mostHeld, SoundQueue::kHeld);
    EXPECT_LE(mostFrames, 250U / 5U);
    EXPECT_GE(ahead, 0);
    EXPECT_LE(ahead, kRate / 4 + kBuffer + kRate / 46) << "samples that are received and not played";
    const std::int64_t difference = kHour * partsPerMillion / 1'000'000;
    if (difference > 0) {
        EXPECT_GE(dropped, difference - kRate / 2) << "what is too much goes";
        EXPECT_LE(dropped, difference + kRate / 2) << "and no more than that";
    } else {
        EXPECT_EQ(dropped, 0);
        EXPECT_LE(silent, kBuffer * 2 - difference) << "no more silence than there is too little";
    }
}

INSTANTIATE_TEST_SUITE_P(SoundQueue, ClockDifference,
                         testing::Values(Drift{"Faster", 200}, Drift{"Same", 0}, Drift{"Slower", -200}),
                         [](const auto& test) { return test.param.name; });

// --- Mailbox

class SoundMailbox : public testing::Test {
  protected:
    ~SoundMailbox() override { m_mailbox.drain(); }

    int32_t capture(std::chrono::milliseconds timeout = 0ms) {
        return m_mailbox.capture(nullptr, &m_record, Mailbox::Clock::now() + timeout);
    }
    void offer(float value) { m_mailbox.offer(soundOf(480, value)); }

    Mailbox m_mailbox;
    QIVOlib_audio_frame_v2_t m_record{};
};

TEST_F(SoundMailbox, StatusChangeComesFirstThenTheOldestSound) {
    offer(1.0F);
    offer(2.0F);
    m_mailbox.raiseStatus();
    EXPECT_EQ(m_mailbox.waiting().audio_frames, 2);
    EXPECT_EQ(capture(), QIVOlib_frame_type_status_change);
    ASSERT_EQ(capture(), QIVOlib_frame_type_audio);
    EXPECT_EQ(m_record.p_data[0], 1.0F);
    EXPECT_EQ(m_record.p_data[959], 1.0F);
    EXPECT_EQ(m_mailbox.waiting().audio_frames, 1);
    ASSERT_EQ(capture(), QIVOlib_frame_type_audio);
    EXPECT_EQ(m_record.p_data[0], 2.0F);
    EXPECT_EQ(capture(), QIVOlib_frame_type_none);
}

TEST_F(SoundMailbox, CallerWithoutSoundGetsNone) {
    offer(1.0F);
    EXPECT_EQ(m_mailbox.capture(nullptr, nullptr, Mailbox::Clock::now()), QIVOlib_frame_type_none);
    QIVOlib_video_frame_v2_t video{};
    EXPECT_EQ(m_mailbox.capture(&video, nullptr, Mailbox::Clock::now()), QIVOlib_frame_type_none);
    EXPECT_EQ(m_mailbox.waiting().audio_frames, 1);
}

TEST_F(SoundMailbox, FramesOutAreBoundedAndComeBackByTheirData) {
    std::vector<QIVOlib_audio_frame_v2_t> out;
    for (std::size_t i = 0; i < SoundQueue::kOut; ++i) {
        offer(static_cast<float>(i));
        ASSERT_EQ(capture(), QIVOlib_frame_type_audio);
        out.push_back(m_record);
    }
    offer(99.0F);
    EXPECT_EQ(capture(), QIVOlib_frame_type_none);
    const float stray = 0.0F;
    m_mailbox.giveSoundBack(&stray);
    m_mailbox.giveSoundBack(nullptr);
    EXPECT_EQ(capture(), QIVOlib_frame_type_none);
    m_mailbox.giveSoundBack(out[3].p_data);
    EXPECT_EQ(capture(), QIVOlib_frame_type_audio);
    EXPECT_EQ(out[0].p_data[0], 0.0F) << "what is out stays readable";
}

TEST_F(SoundMailbox, WaitEndsWithSoundAndWithTheEnd) {
    std::thread maker([this] { offer(1.0F); });
    EXPECT_EQ(capture(10s), QIVOlib_frame_type_audio);
    maker.join();
    std::thread closer([this] { m_mailbox.close(); });
    EXPECT_EQ(capture(10s), QIVOlib_frame_type_none);
    closer.join();
    offer(2.0F);
    EXPECT_EQ(m_mailbox.waiting().audio_frames, 0) << "a closed mailbox keeps nothing";
}

TEST_F(SoundMailbox, SoundOfAConnectionThatEndedIsDropped) {
    offer(1.0F);
    m_mailbox.dropWaiting();
    EXPECT_EQ(capture(), QIVOlib_frame_type_none);
}

TEST_F(SoundMailbox, SoundThatComesAndGoesOnSeveralThreadsStaysWhole) {
    constexpr int kRounds = 5000;
    std::atomic<bool> ended = false;
    std::atomic<int> torn = 0;
    std::thread maker([&] {
        for (int i = 0; i < kRounds; ++i) {
            offer(static_cast<float>(i));
        }
        ended = true;
    });
    std::vector<std::thread> takers;
    for (int i = 0; i < 2; ++i) {
        takers.emplace_back([&] {
            QIVOlib_audio_frame_v2_t record{};
            while (!ended) {
                if (m_mailbox.capture(nullptr, &record, Mailbox::Clock::now() + 1ms) == QIVOlib_frame_type_audio) {
                    torn += record.p_data[0] == record.p_data[959] ? 0 : 1;
                    m_mailbox.giveSoundBack(record.p_data);
                }
            }
        });
    }
    maker.join();
    for (std::thread& taker : takers) {
        taker.join();
    }
    EXPECT_EQ(torn, 0);
    EXPECT_LE(m_mailbox.waiting().audio_frames, 25);
}

} // namespace
} // namespace qivo::runtime
