#include "runtime/Receiver.h"

#include "runtime/BackgroundThreads.h"
#include "runtime/Log.h"
#include "runtime/ReceiverLoop.h"

#include <cstring>
#include <optional>
#include <utility>

namespace qivo::runtime {
namespace {

bool isKnownFormat(int32_t format) {
    return format == QIVOlib_recv_color_format_rgba || format == QIVOlib_recv_color_format_fastest;
}

bool isKnownBandwidth(int32_t bandwidth) {
    return bandwidth == QIVOlib_recv_bandwidth_lowest || bandwidth == QIVOlib_recv_bandwidth_audio_only ||
           bandwidth == QIVOlib_recv_bandwidth_highest;
}

/// Empty for null; nothing if it is too long.
std::optional<std::string> bounded(const char* text) {
    if (text == nullptr) {
        return std::string();
    }
    const std::size_t length = strnlen(text, Receiver::kTextLimit + 1);
    return length > Receiver::kTextLimit ? std::nullopt : std::optional(std::string(text, length));
}

std::optional<Request> requestOf(const QIVOlib_recv_create_v3_t& settings) {
    auto name = bounded(settings.source.p_name);
    auto url = bounded(settings.source.p_url_address);
    if (!name || !url) {
        log("a receiver is refused: the source's name or address is too long");
        return std::nullopt;
    }
    if (name->empty() && url->empty()) {
        return std::nullopt;
    }
    if (!isKnownFormat(settings.color_format) || !isKnownBandwidth(settings.bandwidth)) {
        log("a receiver is refused: colour format " + std::to_string(settings.color_format) + ", bandwidth " +
            std::to_string(settings.bandwidth));
        return std::nullopt;
    }
    return Request{std::move(*name), std::move(*url), settings.bandwidth};
}

} // namespace

std::unique_ptr<Receiver> Receiver::create(const QIVOlib_recv_create_v3_t* settings, Environment environment) {
    auto request = settings != nullptr ? requestOf(*settings) : std::nullopt;
    if (!request) {
        return nullptr;
    }
    auto loop = std::make_shared<ReceiverLoop>(std::move(*request), std::move(environment));
    if (!BackgroundThreads::start([loop] { loop->run(); })) {
        log("a receiver is refused: the system gives no thread");
        return nullptr;
    }
    return std::unique_ptr<Receiver>(new Receiver(std::move(loop)));
}

Receiver::Receiver(std::shared_ptr<ReceiverLoop> loop) : m_loop(std::move(loop)) {}

Receiver::~Receiver() {
    m_loop->stop();
}

int32_t Receiver::capture(QIVOlib_video_frame_v2_t* video, QIVOlib_audio_frame_v2_t* audio, QIVOlib_metadata_frame_t*,
                          std::chrono::milliseconds timeout) {
    return m_loop->mailbox().capture(video, audio, Mailbox::Clock::now() + timeout);
}

void Receiver::freeVideo(const QIVOlib_video_frame_v2_t* video) {
    if (video != nullptr && video->p_data != nullptr) {
        m_loop->mailbox().giveBack(video->p_data);
    }
}

void Receiver::freeAudio(const QIVOlib_audio_frame_v2_t* audio) {
    if (audio != nullptr && audio->p_data != nullptr) {
        m_loop->mailbox().giveSoundBack(audio->p_data);
    }
}

QIVOlib_recv_queue_t Receiver::queue() const {
    return m_loop->mailbox().waiting();
}

const char* Receiver::webControl() {
    std::string address = m_loop->webControl();
    if (address.empty()) {
        return nullptr;
    }
    auto owned = std::make_unique<const std::string>(std::move(address));
    const char* text = owned->c_str();
    const std::lock_guard guard(m_mutex);
    m_strings.emplace(text, std::move(owned));
    return text;
}

void Receiver::freeString(const char* text) {
    const std::lock_guard guard(m_mutex);
    m_strings.erase(text);
}

std::shared_ptr<Steering> Receiver::steering() const {
    return m_loop->steering();
}

} // namespace qivo::runtime
