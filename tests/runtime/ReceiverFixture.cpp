#include "tests/runtime/ReceiverFixture.h"

#include <algorithm>
#include <cstdlib>
#include <ctime>
#include <filesystem>
#include <iterator>
#include <sys/resource.h>

namespace qivo::test {

using runtime::Announcement;
using runtime::Receiver;

void ScriptedView::announce(std::vector<Announcement> announcements) {
    {
        const std::lock_guard guard(m_mutex);
        m_announcements = std::move(announcements);
    }
    const std::lock_guard guard(m_listeners->mutex);
    for (const auto* call : m_listeners->calls) {
        (*call)();
    }
}

std::optional<Announcement> ScriptedView::findByName(std::string_view name) const {
    const std::lock_guard guard(m_mutex);
    const auto it = std::find_if(m_announcements.begin(), m_announcements.end(),
                                 [&](const Announcement& a) { return a.name == name; });
    return it != m_announcements.end() ? std::optional(*it) : std::nullopt;
}

std::optional<Announcement> ScriptedView::findByUrl(std::string_view url) const {
    const std::lock_guard guard(m_mutex);
    const auto it = std::find_if(m_announcements.begin(), m_announcements.end(),
                                 [&](const Announcement& a) { return a.url == url || a.lowUrl == url; });
    return it != m_announcements.end() ? std::optional(*it) : std::nullopt;
}

std::shared_ptr<void> ScriptedView::subscribe(std::function<void()> changed) {
    auto* call = new std::function<void()>(std::move(changed)); // NOLINT(cppcoreguidelines-owning-memory)
    const std::lock_guard guard(m_listeners->mutex);
    m_listeners->calls.insert(call);
    return std::shared_ptr<void>(call, [listeners = m_listeners](std::function<void()>* ended) {
        const std::lock_guard ending(listeners->mutex);
        listeners->calls.erase(ended);
        delete ended; // NOLINT(cppcoreguidelines-owning-memory)
    });
}

int ScriptedView::listeners() const {
    const std::lock_guard guard(m_listeners->mutex);
    return static_cast<int>(m_listeners->calls.size());
}

Shot& Shot::operator=(Shot&& other) noexcept {
    if (this != &other) {
        release();
        m_receiver = std::exchange(other.m_receiver, nullptr);
        record = other.record;
    }
    return *this;
}

void Shot::release() {
    if (m_receiver != nullptr) {
        std::exchange(m_receiver, nullptr)->freeVideo(&record);
    }
}

unsigned Shot::pixel(int x, int y) const {
    const std::uint8_t* at = record.p_data + static_cast<std::ptrdiff_t>(y) * record.line_stride_in_bytes + x * 4;
    return static_cast<unsigned>(at[0]) << 16U | static_cast<unsigned>(at[1]) << 8U | at[2];
}

void ReceiverFixture::SetUpTestSuite() {
    gst_init(nullptr, nullptr);
    // Loading these takes longer than a receiver waits for its first packet where sanitizers watch.
    for (const char* factory : {"x264enc", "rtph264pay", "videotestsrc", "rtspsrc", "rtpbin", "rtph264depay",
                                "h264parse", "avdec_h264", "videoconvert", "udpsrc", "multiudpsink", "appsrc"}) {
        if (GstElement* element = gst_element_factory_make(factory, nullptr)) {
            gst_object_unref(gst_object_ref_sink(element));
        }
    }
}

ReceiverFixture::~ReceiverFixture() {
    EXPECT_TRUE(runtime::BackgroundThreads::waitForAll(15s * kSanitizerPatience)) << "a receiver was not taken apart";
    EXPECT_EQ(m_view->listeners(), 0);
}

std::unique_ptr<Receiver> ReceiverFixture::receive(const std::string& url, const std::string& name, int bandwidth) {
    QIVOlib_recv_create_v3_t settings{};
    settings.source.p_url_address = url.empty() ? nullptr : url.c_str();
    settings.source.p_name = name.empty() ? nullptr : name.c_str();
    settings.color_format = QIVOlib_recv_color_format_rgba;
    settings.bandwidth = bandwidth;
    return Receiver::create(&settings, {[view = m_view] { return view; }, m_transports});
}

Shot ReceiverFixture::nextPicture(Receiver& receiver, std::chrono::milliseconds limit) {
    return pictureThat(
        receiver, [](const Shot&) { return true; }, limit);
}

Shot ReceiverFixture::waitingPicture(Receiver& receiver) {
    QIVOlib_video_frame_v2_t record{};
    int32_t type = QIVOlib_frame_type_none;
    while ((type = receiver.capture(&record, nullptr, nullptr, 0ms)) == QIVOlib_frame_type_status_change) {
        ++m_statusChanges;
    }
    return type == QIVOlib_frame_type_video ? Shot(receiver, record) : Shot();
}

Shot ReceiverFixture::pictureThat(Receiver& receiver, const std::function<bool(const Shot&)>& wanted,
                                  std::chrono::milliseconds limit) {
    const auto deadline = Clock::now() + limit;
    while (Clock::now() < deadline) {
        QIVOlib_video_frame_v2_t record{};
        switch (receiver.capture(&record, nullptr, nullptr, 100ms)) {
        case QIVOlib_frame_type_video: {
            Shot shot(receiver, record);
            if (wanted(shot)) {
                return shot;
            }
            break;
        }
        case QIVOlib_frame_type_status_change:
            ++m_statusChanges;
            break;
        default:
            break;
        }
    }
    return {};
}

bool ReceiverFixture::statusChanges(Receiver& receiver, std::chrono::milliseconds limit) {
    const auto deadline = Clock::now() + limit;
    while (Clock::now() < deadline) {
        if (receiver.capture(nullptr, nullptr, nullptr, 100ms) == QIVOlib_frame_type_status_change) {
            ++m_statusChanges;
            return true;
        }
    }
    return false;
}

bool ReceiverFixture::dries(Receiver& receiver, std::chrono::milliseconds quiet, std::chrono::milliseconds limit) {
    const auto deadline = Clock::now() + limit;
    while (Clock::now() < deadline) {
        if (!nextPicture(receiver, quiet)) {
            return true;
        }
    }
    return false;
}

std::chrono::microseconds costOf(const std::function<void()>& call) {
    const auto waits = [] {
        rusage usage{};
        getrusage(RUSAGE_THREAD, &usage);
        return usage.ru_nvcsw;
    };
    const auto processor = [] {
        timespec time{};
        clock_gettime(CLOCK_THREAD_CPUTIME_ID, &time);
        return std::chrono::seconds(time.tv_sec) + std::chrono::nanoseconds(time.tv_nsec);
    };
    const auto waitsBefore = waits();
    const auto processorBefore = processor();
    const auto before = Clock::now();
    call();
    const std::chrono::nanoseconds wall = Clock::now() - before;
    const std::chrono::nanoseconds own = processor() - processorBefore;
    return std::chrono::duration_cast<std::chrono::microseconds>(waits() == waitsBefore ? own : wall);
}

int openDescriptors() {
    const std::filesystem::directory_iterator all("/proc/self/fd");
    return static_cast<int>(std::distance(begin(all), end(all)));
}

bool near(unsigned pixel, unsigned expected, int levels) {
    for (unsigned shift : {0U, 8U, 16U}) {
        const int difference = static_cast<int>(pixel >> shift & 0xffU) - static_cast<int>(expected >> shift & 0xffU);
        if (std::abs(difference) > levels) {
            return false;
        }
    }
    return true;
}

} // namespace qivo::test
