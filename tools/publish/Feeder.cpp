#include "tools/publish/Feeder.h"

#include <algorithm>

namespace qivo {

Feeder::Feeder(GstAppSrc* destination, std::unique_ptr<PictureSource> source)
    : m_destination(share(destination)), m_source(std::move(source)) {
    GstAppSrcCallbacks callbacks{};
    callbacks.need_data = [](GstAppSrc*, guint, gpointer self) {
        auto* feeder = static_cast<Feeder*>(self);
        {
            const std::lock_guard lock(feeder->m_mutex);
            feeder->m_wanted = true;
        }
        feeder->m_changed.notify_all();
    };
    gst_app_src_set_callbacks(destination, &callbacks, this, nullptr);
    m_thread = std::thread([this] { run(); });
}

Feeder::~Feeder() {
    stop();
}

void Feeder::stop() {
    {
        const std::lock_guard lock(m_mutex);
        m_stopped = true;
    }
    m_changed.notify_all();
    m_source->stop();
    if (m_thread.joinable()) {
        m_thread.join();
    }
    GstAppSrcCallbacks none{};
    gst_app_src_set_callbacks(m_destination.get(), &none, nullptr, nullptr);
}

void Feeder::run() {
    {
        std::unique_lock lock(m_mutex);
        m_changed.wait(lock, [this] { return m_wanted || m_stopped; });
        if (m_stopped) {
            return;
        }
    }
    for (Picture picture = m_source->next(); picture.buffer; picture = m_source->next()) {
        push(std::move(picture));
    }
}

void Feeder::push(Picture picture) {
    const Object<GstClock> clock(gst_element_get_clock(GST_ELEMENT(m_destination.get())));
    if (!clock) {
        return;
    }
    const GstClockTime base = gst_element_get_base_time(GST_ELEMENT(m_destination.get()));
    const GstClockTimeDiff now = GST_CLOCK_DIFF(base, gst_clock_get_time(clock.get()));
    const std::chrono::nanoseconds age = std::chrono::steady_clock::now() - picture.taken;
    const GstClockTimeDiff stamp = std::max<GstClockTimeDiff>(0, now - age.count());
    // After a pause running time goes on from where it stood.
    if (base != m_base) {
        m_base = base;
        m_last.reset();
    }
    // Pictures come one behind the other. Not so those of a time before the pipeline's.
    if (m_last && stamp <= *m_last) {
        return;
    }
    m_last = stamp;
    // The pool's buffers and those of an input may be shared with another stream; stamps are a stream's own.
    Buffer stamped(gst_buffer_make_writable(picture.buffer.release()));
    GST_BUFFER_PTS(stamped.get()) = static_cast<GstClockTime>(stamp);
    GST_BUFFER_DTS(stamped.get()) = GST_CLOCK_TIME_NONE;
    gst_app_src_push_buffer(m_destination.get(), stamped.release());
}

} // namespace qivo
