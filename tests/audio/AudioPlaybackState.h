#pragma once

#include "audio/AudioPlayback.h"

namespace qivo {

/// The fields of a player, for tests.
class AudioPlaybackState {
  public:
    explicit AudioPlaybackState(AudioPlayback& player) : m_player(player) {}

    bool playing() const { return m_player._isPlaying; }
    bool primed() const { return m_player._newConnectionPrimed; }
    std::int32_t activeCounter() const { return m_player._activeSourceChangedCounter; }
    std::int32_t sampleRate() const { return m_player._sampleRate; }
    QIVOlib_recv_instance_t receiver() const { return m_player.m_pQIVO_recv; }
    AudioQueueRef queue() const { return m_player.queue; }
    AudioQueueBufferRef buffer(int number) const { return m_player.buffers[number]; }
    const AudioStreamBasicDescription& format() const { return m_player.dataFormat; }
    const float* stage() const { return m_player.p_pcm_data.get(); }
    std::uint32_t capacity() const { return m_player.pcm_data_capacity; }
    std::uint32_t size() const { return m_player.pcm_data_size; }
    std::uint32_t cursor() const { return m_player.pcm_data_cursor; }
    AppData* model() const { return m_player._theModel; }

  private:
    AudioPlayback& m_player;
};

} // namespace qivo
