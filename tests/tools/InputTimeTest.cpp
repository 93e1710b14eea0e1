// When a file's pictures and sound were taken.
#include "tests/tools/MediaFile.h"
#include "tools/publish/Input.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <optional>
#include <vector>

namespace qivo::test {
namespace {

using namespace std::chrono_literals;
using Clock = std::chrono::steady_clock;

constexpr int rate = 48000;

/// Half a second black and silent, then half a second white and loud; twenty pictures a second, and sound in pieces of
/// a length that no pictures have.
MediaFile darkThenBright() {
    const std::string picture = "video/x-raw,format=I420,width=64,height=64,framerate=20/1";
    const std::string sound = "audio/x-raw,format=S16LE,rate=48000,channels=1,layout=interleaved";
    return {"concat name=v ! " + picture + " ! matroskamux name=m concat name=a ! " + sound +
                " ! m. videotestsrc num-buffers=10 pattern=black ! " + picture +
                " ! v. videotestsrc num-buffers=10 pattern=white ! " + picture +
                " ! v. audiotestsrc num-buffers=30 samplesperbuffer=800 wave=silence ! " + sound +
                " ! a. audiotestsrc num-buffers=30 samplesperbuffer=800 wave=square volume=0.5 ! " + sound + " ! a. m.",
            ".mkv"};
}

bool isBright(GstBuffer* buffer) {
    GstMapInfo map;
    EXPECT_TRUE(gst_buffer_map(buffer, &map, GST_MAP_READ));
    const bool bright = map.data[0] > 128;
    gst_buffer_unmap(buffer, &map);
    return bright;
}

class InputTime : public testing::Test {
  protected:
    const MediaFile m_film = darkThenBright();
    const PictureFormat m_format{{64, 64}, {20, 1}, bt601};
    const std::shared_ptr<Input> m_input =
        std::make_shared<Input>(InputPlace{InputKind::file, m_film.path(), true}, m_format, m_format,
                                SoundFormat{rate, 1}, [](const std::string& line) { ADD_FAILURE() << line; });
};

TEST(SystemClock, tellsTheSteadyClocksTime) {
    gst_init(nullptr, nullptr);
    const Object<GstClock> clock(gst_system_clock_obtain());
    const auto before = Clock::now().time_since_epoch();
    const std::chrono::nanoseconds told(gst_clock_get_time(clock.get()));
    EXPECT_GE(told, before);
    EXPECT_LE(told, Clock::now().time_since_epoch());
}

// No thread is ever woken to the microsecond, so that each of these came a little late, and another time.
TEST_F(InputTime, picturesOfAFileAreTakenWhenTheyAreDueNotWhenTheyCome) {
    const auto pictures = Input::watch(m_input, Input::Branch::full, {});
    std::optional<Clock::time_point> last;
    int neighbours = 0;
    for (int i = 0; i < 50; ++i) {
        const Picture picture = pictures->next();
        ASSERT_TRUE(picture.buffer);
        EXPECT_LE(picture.taken, Clock::now());
        const std::chrono::nanoseconds apart = picture.taken - last.value_or(picture.taken - 1s);
        neighbours += apart == 50ms ? 1 : 0;
        last = picture.taken;
    }
    EXPECT_GE(neighbours, 20) << "all but those at a round's beginning, or after some that nobody took";
}

TEST_F(InputTime, pictureAndSoundOfAFileAreTogetherInEveryRound) {
    const auto pictures = Input::watch(m_input, Input::Branch::full, {});
    const auto sound = Input::listen(m_input, Input::Branch::full);
    constexpr auto blockTime = 10ms;
    std::vector<float> block(rate / 100);
    auto begin = Clock::now();
    std::vector<Clock::time_point> seen;
    std::vector<Clock::time_point> heard;
    Clock::time_point last;
    bool wasBright = false;
    bool wasLoud = false;
    while (seen.size() < 4 || heard.empty() || heard.back() < seen[3] - 100ms) {
        ASSERT_LE(seen.size(), 8U) << "no sound";
        const Picture picture = pictures->next();
        ASSERT_TRUE(picture.buffer);
        const bool bright = isBright(picture.buffer.get());
        // Not where the first bright one was replaced before it was taken.
        if (bright && !wasBright && picture.taken - last < 60ms) {
            seen.push_back(picture.taken);
        }
        last = picture.taken;
        wasBright = bright;
        for (; begin + blockTime <= Clock::now(); begin += blockTime) {
            sound->fill(block.data(), block.size(), begin);
            const auto loud =
                std::find_if(block.begin(), block.end(), [](float sample) { return std::abs(sample) > 0.1F; });
            if (loud != block.end() && !wasLoud) {
                heard.push_back(begin - sound->age() + (loud - block.begin()) * std::chrono::nanoseconds(1s) / rate);
            }
            wasLoud = loud != block.end();
        }
    }
    // The first round may have begun without anybody who listened.
    for (std::size_t round = 1; round < 4; ++round) {
        std::chrono::duration<double, std::milli> after = 1h;
        for (const auto time : heard) {
            const std::chrono::duration<double, std::milli> here = time - seen[round];
            after = std::abs(here.count()) < std::abs(after.count()) ? here : after;
        }
        // A file of this kind tells times in whole milliseconds.
        EXPECT_NEAR(after.count(), 0, 1.5) << round;
    }
}

} // namespace
} // namespace qivo::test
