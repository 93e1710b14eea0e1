// The channels of a published source as the library hands them out.
#include "sdk/qivo.h"
#include "tests/support/Tone.h"
#include "tests/tools/Publisher.h"
#include "tools/publish/Sound.h"

#include <gtest/gtest.h>

#include <chrono>
#include <ostream>
#include <string>
#include <vector>

namespace qivo::test {
namespace {

using namespace std::chrono_literals;

struct Format {
    const char* codec;
    int rate;
    int channels;
};

void PrintTo(const Format& shown, std::ostream* out) {
    *out << shown.codec << " in " << shown.channels;
}

class PublishedChannels : public testing::TestWithParam<Format> {
  protected:
    PublishedChannels() { EXPECT_TRUE(QIVOlib_initialize()); }
    ~PublishedChannels() override { QIVOlib_destroy(); }

    /// The planes of half a second of sound without a gap, as far as it comes within 15 s.
    std::vector<std::vector<float>> hear(const std::string& url) {
        QIVOlib_recv_create_v3_t settings{};
        settings.source.p_url_address = url.c_str();
        settings.color_format = QIVOlib_recv_color_format_rgba;
        settings.bandwidth = QIVOlib_recv_bandwidth_audio_only;
        const QIVOlib_recv_instance_t receiver = QIVOlib_recv_create_v3(&settings);
        std::vector<std::vector<float>> planes(static_cast<std::size_t>(GetParam().channels));
        const auto deadline = std::chrono::steady_clock::now() + 15s;
        while (planes[0].size() < static_cast<std::size_t>(GetParam().rate / 2) &&
               std::chrono::steady_clock::now() < deadline) {
            QIVOlib_audio_frame_v2_t frame{};
            if (QIVOlib_recv_capture_v2(receiver, nullptr, &frame, nullptr, 100) == QIVOlib_frame_type_audio) {
                append(planes, frame);
                QIVOlib_recv_free_audio_v2(receiver, &frame);
            }
        }
        QIVOlib_recv_destroy(receiver);
        return planes;
    }

    static void append(std::vector<std::vector<float>>& planes, const QIVOlib_audio_frame_v2_t& frame) {
        ASSERT_EQ(frame.no_channels, GetParam().channels);
        ASSERT_EQ(frame.sample_rate, GetParam().rate);
        for (std::size_t i = 0; i < planes.size(); ++i) {
            const float* plane = frame.p_data + i * static_cast<std::size_t>(frame.no_samples);
            planes[i].insert(planes[i].end(), plane, plane + frame.no_samples);
        }
    }
};

TEST_P(PublishedChannels, AreThePlanesInTheirOrder) {
    const Format& format = GetParam();
    const PublishProcess publisher({"--size", "320x240", "--audio-codec", format.codec, "--audio-rate",
                                    std::to_string(format.rate), "--audio-channels", std::to_string(format.channels)});
    const auto planes = hear(publisher.address(0));
    for (int channel = 0; channel < format.channels; ++channel) {
        const auto& plane = planes[static_cast<std::size_t>(channel)];
        const int frequency = toneFrequency(0, channel);
        // Lost packets and the beginning of a codec cost some of the level, another channel's tone would cost all.
        EXPECT_NEAR(amplitudeAt(plane, format.rate, frequency), toneAmplitude, 0.4 * toneAmplitude) << channel;
    }
}

INSTANTIATE_TEST_SUITE_P(Sound, PublishedChannels,
                         testing::Values(Format{"l16", 48000, 1}, Format{"l16", 44100, 2}, Format{"l16", 48000, 3},
                                         Format{"l16", 48000, 4}, Format{"l16", 48000, 5}, Format{"l24", 48000, 6},
                                         Format{"l16", 48000, 7}, Format{"l24", 48000, 8}, Format{"aac", 48000, 2},
                                         Format{"opus", 48000, 2}),
                         [](const auto& test) {
                             return std::string(test.param.codec) + "_" + std::to_string(test.param.channels);
                         });

} // namespace
} // namespace qivo::test
