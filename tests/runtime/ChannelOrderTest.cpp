#include "runtime/ChannelOrder.h"

#include <gtest/gtest.h>

#include <array>
#include <vector>

namespace qivo::runtime {
namespace {

GstAudioInfo infoOf(int channels, guint64 mask) {
    GstAudioInfo info;
    std::array<GstAudioChannelPosition, 64> places{};
    gst_audio_channel_positions_from_mask(channels, mask, places.data());
    gst_audio_info_set_format(&info, GST_AUDIO_FORMAT_F32, 48000, channels, places.data());
    return info;
}

struct Order {
    guint64 mask;               ///< the places, in the order of their bits
    std::vector<float> ordered; ///< which of the bits, counted from 0, comes first, second...
};

class OpusOrder : public testing::TestWithParam<Order> {};

TEST_P(OpusOrder, IsThatOfTheStandardInEverySample) {
    const std::vector<float>& once = GetParam().ordered;
    const int channels = static_cast<int>(once.size());
    std::vector<float> samples;
    std::vector<float> expected;
    for (int i = 0; i < 3 * channels; ++i) {
        samples.push_back(static_cast<float>(i));
        expected.push_back(once[static_cast<std::size_t>(i % channels)] + static_cast<float>(i / channels * channels));
    }
    const GstAudioInfo info = infoOf(channels, GetParam().mask);
    EXPECT_EQ(inOpusOrder(samples.data(), samples.size(), info), expected);
}

// Bits: left, right, centre, low frequencies, rear left, rear right, 8 rear, 10 side left, 11 side right.
INSTANTIATE_TEST_SUITE_P(Channels, OpusOrder,
                         testing::Values(Order{0x3, {0, 1}}, Order{0x7, {0, 2, 1}}, Order{0x33, {0, 1, 2, 3}},
                                         Order{0x37, {0, 2, 1, 3, 4}}, Order{0x3f, {0, 2, 1, 4, 5, 3}},
                                         Order{0xd0f, {0, 2, 1, 5, 6, 4, 3}}, Order{0xc3f, {0, 2, 1, 6, 7, 4, 5, 3}}));

TEST(OpusOrderOfOtherSound, IsLeftAsItIs) {
    const std::vector<float> samples{0, 1, 2, 3, 4, 5};
    EXPECT_EQ(inOpusOrder(samples.data(), samples.size(), infoOf(3, 0)), samples) << "no places";
    EXPECT_EQ(inOpusOrder(samples.data(), samples.size(), infoOf(3, 0x103)), samples) << "other places";
}

} // namespace
} // namespace qivo::runtime
