#pragma once

#include "app/AppData.h"
#include "audio/AudioResampler.h"
#include "platform/AudioQueue.h"
#include "sdk/qivo.h"

#include <cstdint>
#include <memory>

namespace qivo {

/// Plays the sound of the selected source: through a receiver of its own, resampled to 48000 Hz stereo, into an audio
/// queue whose callback does all the work.
///
/// Two properties are bound to the model, `mute` to its "mute" and `sourceChangedCounter` to its
/// "selectedQIVOSourceChangedCount". They start and stop the player; a running player sees for itself in the next
/// callback that another source was selected.
///
/// Thread: the one that made it, which needs a Qt event loop. The callback waits up to 16 ms for a frame.
class AudioPlayback {
  public:
    /// Bytes of a queue buffer for each channel.
    static constexpr std::uint32_t kBufferBytesPerChannel = 6400;
    /// Frames that wait in a new receiver before the first is taken.
    static constexpr std::int32_t kPrimingFrames = 3;
    /// A frame that would take longer to play is no sound of a live source and is dropped.
    static constexpr std::int32_t kLongestFrameInSeconds = 10;

    /// Not playing; neither queue nor receiver.
    AudioPlayback();
    ~AudioPlayback();
    AudioPlayback(const AudioPlayback&) = delete;
    AudioPlayback& operator=(const AudioPlayback&) = delete;

    /// Silences, or starts if a source is selected. Call it for every notice of the model's "mute".
    void setMute(bool mute);
    bool mute() const { return _mute; }

    /// Starts, unless muted or playing; stops if no source is selected. Call it for every notice of the model's
    /// "selectedQIVOSourceChangedCount".
    void setSourceChangedCounter(std::int32_t sourceChangedCounter);
    std::int32_t sourceChangedCounter() const { return _sourceChangedCounter; }

    /// Opens the queue on three buffers of silence. Without a queue nothing happens; if the queue does not start, the
    /// player counts as playing all the same. While there is a queue a second start does nothing.
    void startPlayback();
    /// Harmless when stopped.
    void stopPlayback();
    void shutdown() { stopPlayback(); }
    void setupAudioFormat();

    /// Refills one buffer and enqueues it on the player's own queue, whatever `outputQueue` is; then follows the source
    /// and, if nothing is left to play, waits for a frame.
    void AudioOutputCallbackImp(AudioQueueRef outputQueue, AudioQueueBufferRef buffer);

  private:
    friend class AudioPlaybackState; // tests read the fields through it

    struct Free {
        void operator()(void* memory) const;
    };

    bool sourceSelected() const;
    void refill(AudioQueueBufferRef buffer);
    void followSource();
    bool primed();
    bool captureFrame(QIVOlib_audio_frame_v2_t& frame);
    void stageFrame(const QIVOlib_audio_frame_v2_t& frame);
    bool reserveStage(int frames);
    int resamplePlane(int channel, SampleCursor plane, int maxLen);

    bool _mute = false;
    std::int32_t _sourceChangedCounter = 0;
    std::int32_t _activeSourceChangedCounter = 0; ///< the model's counter that the receiver was made for
    AppData* _theModel;                           ///< the shared model, which outlives everything
    QIVOlib_recv_instance_t m_pQIVO_recv = nullptr;
    bool _isPlaying = false;
    bool _newConnectionPrimed = false; ///< the receiver has had `kPrimingFrames` waiting
    std::int32_t _sampleRate = 0;      ///< unused
    AudioStreamBasicDescription dataFormat;
    AudioQueueRef queue = nullptr; ///< null when stopped
    AudioQueueBufferRef buffers[3] = {nullptr, nullptr, nullptr};
    std::unique_ptr<float, Free> p_pcm_data; ///< staged sound, interleaved stereo
    std::uint32_t pcm_data_capacity = 0;     ///< bytes that are allocated
    std::uint32_t pcm_data_size = 0;         ///< bytes that are valid
    std::uint32_t pcm_data_cursor = 0;       ///< bytes that are in the queue already
    AudioResampler _resamplers[2];           ///< left and right
};

/// The queue's callback: `player` is an `AudioPlayback`.
void AudioOutputCallback(void* player, AudioQueueRef queue, AudioQueueBufferRef buffer);

} // namespace qivo
