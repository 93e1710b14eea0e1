#include "runtime/SoundQueue.h"

#include <algorithm>
#include <iterator>
#include <utility>

namespace qivo::runtime {

SoundQueue::Frames SoundQueue::push(std::unique_ptr<Sound> sound) {
    m_held += sound->length();
    m_waiting.push_back(std::move(sound));
    Frames gone;
    while (m_held > kHeld) {
        gone.push_back(pop());
    }
    return gone;
}

std::unique_ptr<Sound> SoundQueue::pop() {
    std::unique_ptr<Sound> sound = std::move(m_waiting.front());
    m_waiting.pop_front();
    m_held -= sound->length();
    return sound;
}

QIVOlib_audio_frame_v2_t SoundQueue::take() {
    m_out.push_back(pop());
    return m_out.back()->record();
}

std::unique_ptr<Sound> SoundQueue::giveBack(const void* data) {
    const auto it =
        std::find_if(m_out.begin(), m_out.end(), [data](const auto& out) { return out->identity() == data; });
    if (it == m_out.end()) {
        return nullptr;
    }
    std::unique_ptr<Sound> sound = std::move(*it);
    m_out.erase(it);
    return sound;
}

SoundQueue::Frames SoundQueue::dropWaiting() {
    Frames gone(std::make_move_iterator(m_waiting.begin()), std::make_move_iterator(m_waiting.end()));
    m_waiting.clear();
    m_held = {};
    return gone;
}

SoundQueue::Frames SoundQueue::dropAll() {
    Frames gone = dropWaiting();
    std::move(m_out.begin(), m_out.end(), std::back_inserter(gone));
    m_out.clear();
    return gone;
}

} // namespace qivo::runtime
