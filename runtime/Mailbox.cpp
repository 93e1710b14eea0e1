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

bool Mailbox::fullLocked() const {
    return m_waiting.size() + m_out.size() + m_ending + m_making > kPictures;
}

void Mailbox::makeRoom(Clock::duration patience) {
    Pictures replaced;
    std::unique_lock lock(m_mutex);
    ++m_making;
    const auto worthWaiting = [this] { return !m_closed && fullLocked() && pictureReadyLocked() && m_pace.keepsUp(); };
    if (worthWaiting()) {
        const auto now = m_now();
        const auto until = m_inside > 0 ? now + patience : std::min(now + patience, m_pace.looksBy());
        for (auto left = until - now; left > left.zero() && worthWaiting(); left = until - m_now()) {
            m_changed.wait_for(lock, left);
        }
    }
    replaced.swap(m_late);
    while (fullLocked() && !m_waiting.empty()) {
        replaced.push_back(std::move(m_waiting.front()));
        m_waiting.pop_front();
    }
}

void Mailbox::offer(std::unique_ptr<Picture> picture) {
    std::deque<std::unique_ptr<Picture>> replaced;
    {
        const std::lock_guard guard(m_mutex);
        --m_making;
        if (!m_closed) {
            if (!m_pace.keepsUp()) {
                replaced.swap(m_waiting);
            }
            m_waiting.push_back(std::move(picture));
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
    Pictures late;
    std::deque<std::unique_ptr<Picture>> dropped;
    SoundQueue::Frames sounds;
    {
        const std::lock_guard guard(m_mutex);
        late.swap(m_late);
        dropped.swap(m_waiting);
        sounds = m_sounds.dropWaiting();
    }
    m_changed.notify_all();
}

bool Mailbox::pictureReadyLocked() const {
    return !m_waiting.empty() && m_out.size() + m_ending < kPicturesOut;
}

/// A caller asks for pictures. What it is too late for is left to the maker, as it may take a while to end.
void Mailbox::lookLocked() {
    m_pace.looks(m_now(), !m_waiting.empty());
    if (!m_pace.keepsUp()) {
        for (; m_waiting.size() > 1; m_waiting.pop_front()) {
            m_late.push_back(std::move(m_waiting.front()));
        }
        m_changed.notify_all(); // the maker may be waiting for this caller
    }
}

bool Mailbox::readyLocked(bool wantsVideo, bool wantsAudio) const {
    return m_closed || m_status || (wantsVideo && pictureReadyLocked()) || (wantsAudio && m_sounds.ready());
}

int32_t Mailbox::capture(QIVOlib_video_frame_v2_t* video, QIVOlib_audio_frame_v2_t* audio, Clock::time_point deadline) {
    const auto ready = [&] { return readyLocked(video != nullptr, audio != nullptr); };
    std::unique_lock lock(m_mutex);
    if (video != nullptr) {
        lookLocked();
    }
    const bool foundNone = m_waiting.empty();
    // A deadline that has passed is not even asked of the condition: that alone would give the processor away.
    if (!ready() && Clock::now() < deadline) {
        const int caller = video != nullptr ? 1 : 0;
        m_inside += caller;
        m_changed.wait_until(lock, deadline, ready);
        m_inside -= caller;
    }
    if (video != nullptr && foundNone) {
        m_pace.waited(m_now());
    }
    if (m_closed || !ready()) {
        return QIVOlib_frame_type_none;
    }
    if (m_status) {
        m_status = false;
        return QIVOlib_frame_type_status_change;
    }
    if (video != nullptr && pictureReadyLocked()) {
        m_out.push_back(std::move(m_waiting.front()));
        m_waiting.pop_front();
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
    return {static_cast<int32_t>(m_waiting.size()), static_cast<int32_t>(m_sounds.waiting()), 0};
}

void Mailbox::close() {
    {
        const std::lock_guard guard(m_mutex);
        m_closed = true;
    }
    m_changed.notify_all();
}

void Mailbox::drain() {
    Pictures late;
    Pictures out;
    std::deque<std::unique_ptr<Picture>> waiting;
    SoundQueue::Frames sounds;
    {
        const std::lock_guard guard(m_mutex);
        sounds = m_sounds.dropAll();
        late.swap(m_late);
        out.swap(m_out);
        waiting.swap(m_waiting);
    }
}

} // namespace qivo::runtime
