#include "runtime/Mailbox.h"

#include <algorithm>
#include <utility>

namespace qivo::runtime {

void Mailbox::raiseStatus() {
    {
        const std::lock_guard guard(m_mutex);
        m_status = true;
    }
    m_changed.notify_all();
}

void Mailbox::makeRoom() {
    std::unique_ptr<Picture> late;
    std::unique_ptr<Picture> before;
    std::unique_ptr<Picture> replaced;
    const std::lock_guard guard(m_mutex);
    ++m_making;
    late = std::move(m_late);
    const auto tooMany = [this] {
        return m_out.size() + m_ending + (m_before ? 1 : 0) + (m_waiting ? 1 : 0) + m_making > kPictures;
    };
    if (tooMany()) {
        before = std::move(m_before);
    }
    if (tooMany()) {
        replaced = std::move(m_waiting);
    }
}

void Mailbox::offer(std::unique_ptr<Picture> picture) {
    {
        const std::lock_guard guard(m_mutex);
        --m_making;
        if (!m_closed) {
            std::swap(m_waiting, picture);
            if (m_keepsUp && picture) {
                std::swap(m_before, picture);
            }
        }
    }
    m_changed.notify_all();
}

void Mailbox::abandon() {
    const std::lock_guard guard(m_mutex);
    --m_making;
}

void Mailbox::offer(std::unique_ptr<Sound> sound) {
    SoundQueue::Frames gone;
    {
        const std::lock_guard guard(m_mutex);
        if (m_closed) {
            return;
        }
        gone = m_sounds.push(std::move(sound));
    }
    m_changed.notify_all();
}

void Mailbox::dropWaiting() {
    std::unique_ptr<Picture> late;
    std::unique_ptr<Picture> before;
    std::unique_ptr<Picture> dropped;
    SoundQueue::Frames sounds;
    const std::lock_guard guard(m_mutex);
    late = std::move(m_late);
    before = std::move(m_before);
    dropped = std::move(m_waiting);
    sounds = m_sounds.dropWaiting();
}

bool Mailbox::pictureReadyLocked() const {
    return m_waiting && m_out.size() + m_ending < kPicturesOut;
}

/// A caller asks for pictures. What it is too late for is left to the maker, as it may take a while to end.
void Mailbox::lookLocked(Clock::time_point now) {
    if (!m_waiting) {
        m_foundNone = now;
    }
    m_keepsUp = !m_waiting || (now - m_looked <= kLooksOften && now - m_foundNone <= kCatchesUp);
    if (!m_keepsUp && m_before) {
        m_late = std::move(m_before);
    }
}

bool Mailbox::readyLocked(bool wantsVideo, bool wantsAudio) const {
    return m_closed || m_status || (wantsVideo && pictureReadyLocked()) || (wantsAudio && m_sounds.ready());
}

int32_t Mailbox::capture(QIVOlib_video_frame_v2_t* video, QIVOlib_audio_frame_v2_t* audio, Clock::time_point deadline) {
    const auto ready = [&] { return readyLocked(video != nullptr, audio != nullptr); };
    std::unique_lock lock(m_mutex);
    if (video != nullptr) {
        lookLocked(Clock::now());
    }
    const bool foundNone = !m_waiting;
    // A deadline that has passed is not even asked of the condition: that alone would give the processor away.
    if (!ready() && Clock::now() < deadline) {
        m_changed.wait_until(lock, deadline, ready);
    }
    if (video != nullptr) {
        m_looked = Clock::now();
        m_foundNone = foundNone ? m_looked : m_foundNone;
    }
    if (m_closed || !ready()) {
        return QIVOlib_frame_type_none;
    }
    if (m_status) {
        m_status = false;
        return QIVOlib_frame_type_status_change;
    }
    if (video != nullptr && pictureReadyLocked()) {
        m_out.push_back(std::move(m_before ? m_before : m_waiting));
        *video = m_out.back()->record();
        return QIVOlib_frame_type_video;
    }
    *audio = m_sounds.take();
    return QIVOlib_frame_type_audio;
}

void Mailbox::giveBack(const void* data) {
    std::unique_ptr<Picture> picture;
    {
        const std::lock_guard guard(m_mutex);
        const auto it =
            std::find_if(m_out.begin(), m_out.end(), [data](const auto& out) { return out->record().p_data == data; });
        if (it == m_out.end()) {
            return;
        }
        picture = std::move(*it);
        m_out.erase(it);
        ++m_ending;
    }
    picture.reset();
    {
        const std::lock_guard guard(m_mutex);
        --m_ending;
    }
    m_changed.notify_all();
}

void Mailbox::giveSoundBack(const void* data) {
    std::unique_ptr<Sound> sound;
    {
        const std::lock_guard guard(m_mutex);
        sound = m_sounds.giveBack(data);
    }
    if (sound) {
        m_changed.notify_all();
    }
}

QIVOlib_recv_queue_t Mailbox::waiting() const {
    const std::lock_guard guard(m_mutex);
    return {(m_before ? 1 : 0) + (m_waiting ? 1 : 0), static_cast<int32_t>(m_sounds.waiting()), 0};
}

void Mailbox::close() {
    {
        const std::lock_guard guard(m_mutex);
        m_closed = true;
    }
    m_changed.notify_all();
}

void Mailbox::drain() {
    std::vector<std::unique_ptr<Picture>> ended;
    SoundQueue::Frames sounds;
    {
        const std::lock_guard guard(m_mutex);
        sounds = m_sounds.dropAll();
        ended.swap(m_out);
        ended.push_back(std::move(m_late));
        ended.push_back(std::move(m_before));
        ended.push_back(std::move(m_waiting));
    }
}

} // namespace qivo::runtime
