#include "tools/publish/page/PagePictures.h"

namespace qivo {
namespace {

using News = std::weak_ptr<PagePictures*>;

constexpr guint lookAroundMilliseconds = 250;
constexpr const char* pipeline =
    "appsrc name=picture is-live=true format=time block=false max-buffers=1 max-bytes=0 max-time=0 "
    "leaky-type=downstream ! jpegenc quality=75 ! appsink name=jpeg sync=false max-buffers=1 drop=true";

void freeNews(gpointer news) {
    std::default_delete<News>()(static_cast<News*>(news));
}

} // namespace

PagePictures::PagePictures(const PictureFormat& format, MakePictures make)
    : m_format(format), m_make(std::move(make)) {}

PagePictures::~PagePictures() {
    end();
}

void PagePictures::next(std::uint64_t last, Taker taker) {
    m_asked = std::chrono::steady_clock::now();
    const bool running = m_pipeline != nullptr || begin();
    if (running && m_number != 0 && m_number != last) {
        taker(m_newest, m_number);
    } else if (running && m_waiting.size() < maximumWaiting) {
        m_waiting.push_back({std::move(taker), m_asked});
    } else {
        taker({}, 0);
    }
}

bool PagePictures::begin() {
    GError* failure = nullptr;
    GstElement* made = gst_parse_launch(pipeline, &failure);
    const Error error(failure);
    if (made == nullptr) {
        return false;
    }
    m_pipeline.reset(GST_ELEMENT(gst_object_ref_sink(made)));
    m_sink.reset(gst_bin_get_by_name(GST_BIN(made), "jpeg"));
    GstAppSinkCallbacks callbacks{};
    callbacks.new_sample = onPicture;
    gst_app_sink_set_callbacks(GST_APP_SINK(m_sink.get()), &callbacks, std::make_unique<News>(m_self).release(),
                               freeNews);
    const Object<GstElement> source(gst_bin_get_by_name(GST_BIN(made), "picture"));
    gst_app_src_set_caps(GST_APP_SRC(source.get()), m_format.caps().get());
    m_feeder = std::make_unique<Feeder>(GST_APP_SRC(source.get()), m_make());
    gst_element_set_state(made, GST_STATE_PLAYING);
    m_timer = g_timeout_add(
        lookAroundMilliseconds,
        [](gpointer self) -> gboolean {
            static_cast<PagePictures*>(self)->lookAround();
            return G_SOURCE_CONTINUE;
        },
        this);
    return true;
}

void PagePictures::end() {
    if (m_pipeline == nullptr) {
        return;
    }
    g_source_remove(m_timer);
    m_feeder.reset();
    gst_element_set_state(m_pipeline.get(), GST_STATE_NULL);
    m_sink.reset();
    m_pipeline.reset();
    m_newest.clear();
    m_number = 0;
}

// On the encoder's thread: only tells the other that there is something to take.
GstFlowReturn PagePictures::onPicture(GstAppSink*, gpointer data) {
    const auto take = [](gpointer news) -> gboolean {
        if (const auto self = static_cast<News*>(news)->lock()) {
            (*self)->takePicture();
        }
        return G_SOURCE_REMOVE;
    };
    g_idle_add_full(G_PRIORITY_DEFAULT, take, std::make_unique<News>(*static_cast<News*>(data)).release(), freeNews);
    return GST_FLOW_OK;
}

void PagePictures::takePicture() {
    const Sample sample(m_sink ? gst_app_sink_try_pull_sample(GST_APP_SINK(m_sink.get()), 0) : nullptr);
    GstBuffer* buffer = sample ? gst_sample_get_buffer(sample.get()) : nullptr;
    GstMapInfo map;
    if (buffer == nullptr || gst_buffer_map(buffer, &map, GST_MAP_READ) == FALSE) {
        return;
    }
    m_newest.assign(reinterpret_cast<const char*>(map.data), map.size);
    gst_buffer_unmap(buffer, &map);
    m_number = ++m_taken;
    handOut();
}

void PagePictures::handOut() {
    for (const Waiting& waiting : std::exchange(m_waiting, {})) {
        waiting.taker(m_newest, m_number);
    }
}

void PagePictures::lookAround() {
    const auto now = std::chrono::steady_clock::now();
    std::erase_if(m_waiting, [now](const Waiting& waiting) {
        const bool late = now - waiting.since > patience;
        if (late) {
            waiting.taker({}, 0);
        }
        return late;
    });
    if (m_waiting.empty() && now - m_asked > patience) {
        end();
    }
}

} // namespace qivo
