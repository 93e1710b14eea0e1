#include "tools/publish/Feeder.h"

#include <gst/app/gstappsink.h>
#include <gst/app/gstappsrc.h>
#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <memory>
#include <optional>
#include <thread>
#include <vector>

namespace qivo {
namespace {

using namespace std::chrono_literals;
using Clock = std::chrono::steady_clock;

/// Something every 10 ms, each said to be taken so long before it is given away.
class Ticks final : public PictureSource {
  public:
    explicit Ticks(std::vector<std::chrono::milliseconds> ages) : m_ages(std::move(ages)) {}

    Picture next() override {
        std::this_thread::sleep_for(10ms);
        if (m_stopped) {
            return {};
        }
        const auto age = m_count < m_ages.size() ? m_ages[m_count] : 0ms;
        ++m_count;
        return {Buffer(gst_buffer_new_allocate(nullptr, 16, nullptr)), Clock::now() - age};
    }

    void stop() override { m_stopped = true; }

  private:
    std::vector<std::chrono::milliseconds> m_ages;
    std::size_t m_count = 0;
    std::atomic<bool> m_stopped = false;
};

class FeederTest : public testing::Test {
  protected:
    explicit FeederTest(std::vector<std::chrono::milliseconds> ages = {}) {
        gst_init(nullptr, nullptr);
        m_pipeline.reset(GST_ELEMENT(gst_object_ref_sink(gst_parse_launch(
            "appsrc name=in is-live=true format=time block=false max-buffers=1 leaky-type=downstream ! "
            "appsink name=out sync=false async=false",
            nullptr))));
        m_in.reset(GST_APP_SRC(gst_bin_get_by_name(GST_BIN(m_pipeline.get()), "in")));
        m_out.reset(GST_APP_SINK(gst_bin_get_by_name(GST_BIN(m_pipeline.get()), "out")));
        m_feeder = std::make_unique<Feeder>(m_in.get(), std::make_unique<Ticks>(std::move(ages)));
    }

    ~FeederTest() override {
        m_feeder->stop();
        gst_element_set_state(m_pipeline.get(), GST_STATE_NULL);
    }

    void set(GstState state) {
        gst_element_set_state(m_pipeline.get(), state);
        gst_element_get_state(m_pipeline.get(), nullptr, nullptr, 5 * GST_SECOND);
    }

    /// The stamps of what comes out for so long.
    std::vector<GstClockTime> stamps(std::chrono::nanoseconds time) {
        std::vector<GstClockTime> found;
        const auto end = Clock::now() + time;
        while (Clock::now() < end) {
            const Sample sample(gst_app_sink_try_pull_sample(m_out.get(), 10 * GST_MSECOND));
            if (sample) {
                found.push_back(GST_BUFFER_PTS(gst_sample_get_buffer(sample.get())));
            }
        }
        return found;
    }

    Object<GstElement> m_pipeline;
    Object<GstAppSrc> m_in;
    Object<GstAppSink> m_out;
    std::unique_ptr<Feeder> m_feeder;
};

class OldPictures : public FeederTest {
  protected:
    OldPictures() : FeederTest({5000ms, 5000ms, 5000ms, 0ms, 0ms, 500ms, 0ms}) {}
};

TEST_F(OldPictures, areLeftOutUnlessTheyComeBehindTheLast) {
    set(GST_STATE_PLAYING);
    const auto found = stamps(300ms);
    ASSERT_GE(found.size(), 4U);
    EXPECT_EQ(found[0], 0U) << "the first that is older than the pipeline's time";
    for (std::size_t i = 1; i < found.size(); ++i) {
        EXPECT_GT(found[i], found[i - 1]) << i;
    }
}

TEST_F(FeederTest, goesOnAfterAPause) {
    set(GST_STATE_PLAYING);
    ASSERT_FALSE(stamps(200ms).empty());
    set(GST_STATE_PAUSED);
    std::this_thread::sleep_for(2s);
    set(GST_STATE_PLAYING);
    stamps(100ms); // what was given during the pause
    EXPECT_GE(stamps(500ms).size(), 5U);
}

} // namespace
} // namespace qivo
