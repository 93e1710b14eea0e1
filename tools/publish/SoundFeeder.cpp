#include "tools/publish/SoundFeeder.h"

#include <algorithm>

namespace qivo {
namespace {

using namespace std::chrono_literals;
using Clock = std::chrono::steady_clock;

constexpr auto blockTime = 1000ms / SoundFeeder::blocksASecond;

// A process that was stopped for longer does not make up for it.
constexpr auto longestDelay = 250ms;

} // namespace

SoundFeeder::SoundFeeder(GstAppSrc* destination, const SoundFormat& format, std::unique_ptr<SoundSource> source)
    : m_destination(share(destination)), m_format(format), m_source(std::move(source)) {
    GstAppSrcCallbacks callbacks{};
    callbacks.need_data = [](GstAppSrc*, guint, gpointer self) {
        auto* feeder = static_cast<SoundFeeder*>(self);
        {
            const std::lock_guard lock(feeder->m_mutex);
            feeder->m_wanted = true;
        }
        feeder->m_changed.notify_all();
    };
    gst_app_src_set_callbacks(destination, &callbacks, this, nullptr);
    m_thread = std::thread([this] { run(); });
}

SoundFeeder::~SoundFeeder() {
    {
        const std::lock_guard lock(m_mutex);
        m_stopped = true;
    }
    m_changed.notify_all();
    m_thread.join();
    GstAppSrcCallbacks none{};
    gst_app_src_set_callbacks(m_destination.get(), &none, nullptr, nullptr);
}

// False once it is time to stop.
bool SoundFeeder::waitUntil(Time time) {
    std::unique_lock lock(m_mutex);
    return !m_changed.wait_until(lock, time, [this] { return m_stopped; });
}

void SoundFeeder::run() {
    {
        std::unique_lock lock(m_mutex);
        m_changed.wait(lock, [this] { return m_wanted || m_stopped; });
    }
    Time second = Clock::now();
    // Blocks lie on a grid that begins anew every second, so that rates that they do not divide do not drift.
    for (std::int64_t block = 0; waitUntil(second + (block + 1) * blockTime);) {
        const Time begin = second + block * blockTime;
        push(static_cast<std::size_t>((block + 1) * m_format.rate / blocksASecond -
                                      block * m_format.rate / blocksASecond),
             begin);
        if (++block == blocksASecond) {
            second += 1s;
            block = 0;
        }
        if (Clock::now() - begin > longestDelay) {
            second = Clock::now();
            block = 0;
        }
    }
}

void SoundFeeder::push(std::size_t count, Time taken) {
    const Object<GstClock> clock(gst_element_get_clock(GST_ELEMENT(m_destination.get())));
    const std::size_t bytes = count * static_cast<std::size_t>(m_format.channels) * sizeof(float);
    Buffer buffer(gst_buffer_new_allocate(nullptr, bytes, nullptr));
    GstMapInfo map;
    if (!buffer || gst_buffer_map(buffer.get(), &map, GST_MAP_WRITE) == FALSE) {
        return;
    }
    m_source->fill(reinterpret_cast<float*>(map.data), count, taken);
    gst_buffer_unmap(buffer.get(), &map);
    if (!clock) {
        return;
    }
    const GstClockTimeDiff now =
        GST_CLOCK_DIFF(gst_element_get_base_time(GST_ELEMENT(m_destination.get())), gst_clock_get_time(clock.get()));
    const std::chrono::nanoseconds age = Clock::now() - taken + m_source->age();
    GST_BUFFER_PTS(buffer.get()) = static_cast<GstClockTime>(std::max<GstClockTimeDiff>(0, now - age.count()));
    GST_BUFFER_DURATION(buffer.get()) = gst_util_uint64_scale(count, GST_SECOND, static_cast<guint64>(m_format.rate));
    gst_app_src_push_buffer(m_destination.get(), buffer.release());
}

} // namespace qivo
