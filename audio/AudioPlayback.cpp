#include "audio/AudioPlayback.h"

#include <QByteArray>
#include <QString>

#include <algorithm>
#include <cstddef>
#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace qivo {
namespace {

constexpr std::uint32_t kBytesPerStagedFrame = 2 * sizeof(float);

/// A frame whose samples are where it says and last a sensible time.
bool isSound(const QIVOlib_audio_frame_v2_t& frame, double outputRate) {
    if (frame.sample_rate <= 0 || frame.no_channels <= 0 || frame.no_samples < 0) {
        return false;
    }
    const double longest = AudioPlayback::kLongestFrameInSeconds * outputRate;
    const double rate = frame.sample_rate;
    return frame.no_samples <= longest && frame.no_samples * (outputRate / rate) <= longest;
}

} // namespace

void AudioPlayback::Free::operator()(void* memory) const {
    std::free(memory); // NOLINT(cppcoreguidelines-no-malloc): grown in place, without an exception where it fails
}

AudioPlayback::AudioPlayback() : _theModel(AppData::inst()) {
    setupAudioFormat();
}

AudioPlayback::~AudioPlayback() {
    stopPlayback();
}

void AudioPlayback::setupAudioFormat() {
    dataFormat.mSampleRate = 48000.0;
    dataFormat.mFormatID = kAudioFormatLinearPCM;
    dataFormat.mFormatFlags = kAudioFormatFlagIsFloat | kAudioFormatFlagIsPacked;
    dataFormat.mBytesPerPacket = kBytesPerStagedFrame;
    dataFormat.mFramesPerPacket = 1;
    dataFormat.mBytesPerFrame = kBytesPerStagedFrame;
    dataFormat.mChannelsPerFrame = 2;
    dataFormat.mBitsPerChannel = 32;
    dataFormat.mReserved = 0;
}

bool AudioPlayback::sourceSelected() const {
    return !_theModel->selectedQIVOSourceName().isEmpty() || !_theModel->selectedQIVOSourceURL().isEmpty();
}

void AudioPlayback::setMute(bool mute) {
    _mute = mute;
    if (mute) {
        if (_isPlaying) {
            stopPlayback();
        }
    } else if (!_isPlaying && sourceSelected()) {
        startPlayback();
    }
}

void AudioPlayback::setSourceChangedCounter(std::int32_t sourceChangedCounter) {
    _sourceChangedCounter = sourceChangedCounter;
    if (!sourceSelected()) {
        stopPlayback();
    } else if (!_isPlaying && !_mute) {
        startPlayback();
    }
}

void AudioPlayback::startPlayback() {
    if (queue != nullptr || AudioQueueNewOutput(&dataFormat, AudioOutputCallback, this, &queue) != 0) {
        return;
    }
    const std::uint32_t capacity = dataFormat.mChannelsPerFrame * kBufferBytesPerChannel;
    for (AudioQueueBufferRef& buffer : buffers) {
        AudioQueueAllocateBuffer(queue, capacity, &buffer);
        if (buffer != nullptr) {
            std::memset(buffer->mAudioData, 0, capacity);
            buffer->mAudioDataByteSize = capacity;
            AudioQueueEnqueueBuffer(queue, buffer);
        }
    }
    _newConnectionPrimed = false;
    _activeSourceChangedCounter = 0;
    const int status = AudioQueueStart(queue);
    if (status != 0) {
        std::printf("AudioQueueStart returned status %d \n", status);
    } else {
        std::puts("Playing ");
    }
    std::fflush(stdout);
    _isPlaying = true;
}

void AudioPlayback::stopPlayback() {
    if (queue != nullptr) {
        AudioQueueStop(queue);
        for (AudioQueueBufferRef& buffer : buffers) {
            if (buffer != nullptr) {
                AudioQueueFreeBuffer(queue, buffer);
                buffer = nullptr;
            }
        }
        AudioQueueDispose(queue);
        queue = nullptr;
    }
    if (m_pQIVO_recv != nullptr) {
        QIVOlib_recv_destroy(m_pQIVO_recv);
        m_pQIVO_recv = nullptr;
    }
    p_pcm_data.reset();
    _isPlaying = false;
    pcm_data_capacity = 0;
    pcm_data_size = 0;
    pcm_data_cursor = 0;
}

void AudioPlayback::AudioOutputCallbackImp(AudioQueueRef /*outputQueue*/, AudioQueueBufferRef buffer) {
    refill(buffer);
    followSource();
    if (pcm_data_cursor < pcm_data_size || !primed()) {
        return;
    }
    QIVOlib_audio_frame_v2_t frame{};
    if (captureFrame(frame)) {
        stageFrame(frame);
        QIVOlib_recv_free_audio_v2(m_pQIVO_recv, &frame);
        pcm_data_cursor = 0;
    }
}

void AudioPlayback::refill(AudioQueueBufferRef buffer) {
    if (pcm_data_size <= pcm_data_cursor) {
        std::memset(buffer->mAudioData, 0, buffer->mAudioDataBytesCapacity);
        buffer->mAudioDataByteSize = buffer->mAudioDataBytesCapacity;
    } else {
        const std::uint32_t bytes = std::min(buffer->mAudioDataBytesCapacity, pcm_data_size - pcm_data_cursor);
        const auto* const staged = reinterpret_cast<const std::byte*>(p_pcm_data.get());
        std::memcpy(buffer->mAudioData, staged + pcm_data_cursor, bytes);
        buffer->mAudioDataByteSize = bytes;
        pcm_data_cursor += bytes;
    }
    const int status = AudioQueueEnqueueBuffer(queue, buffer);
    if (status != 0) {
        std::printf("enqueuebuffer result %d \n", status);
        std::fflush(stdout);
    }
}

void AudioPlayback::followSource() {
    const std::int32_t counter = _theModel->selectedQIVOSourceChangedCount();
    if (counter == _activeSourceChangedCounter) {
        return;
    }
    if (m_pQIVO_recv != nullptr) {
        QIVOlib_recv_destroy(m_pQIVO_recv);
        m_pQIVO_recv = nullptr;
    }
    QString name;
    QString url;
    _theModel->getQIVOSourceInfoNamed(name, url);
    const QByteArray nameText = name.toUtf8();
    const QByteArray urlText = url.toUtf8();
    QIVOlib_recv_create_v3_t settings{};
    settings.source.p_name = name.isNull() ? nullptr : nameText.constData();
    settings.source.p_url_address = url.isNull() ? nullptr : urlText.constData();
    settings.color_format = QIVOlib_recv_color_format_fastest;
    settings.bandwidth = QIVOlib_recv_bandwidth_audio_only;
    settings.allow_video_fields = true;
    settings.p_qivo_recv_name = nullptr;
    m_pQIVO_recv = QIVOlib_recv_create_v3(&settings);
    for (AudioResampler& resampler : _resamplers) {
        resampler.reset();
    }
    _newConnectionPrimed = false;
    _activeSourceChangedCounter = counter;
}

/// Whether the receiver has built up its backlog. Asked of the receiver only until it has.
bool AudioPlayback::primed() {
    if (!_newConnectionPrimed) {
        QIVOlib_recv_queue_t waiting{};
        QIVOlib_recv_get_queue(m_pQIVO_recv, &waiting);
        _newConnectionPrimed = waiting.audio_frames >= kPrimingFrames;
    }
    return _newConnectionPrimed;
}

bool AudioPlayback::captureFrame(QIVOlib_audio_frame_v2_t& frame) {
    std::uint32_t timeout = 800000U / static_cast<std::uint32_t>(dataFormat.mSampleRate);
    std::int32_t captured = QIVOlib_frame_type_none;
    do {
        captured = QIVOlib_recv_capture_v2(m_pQIVO_recv, nullptr, &frame, nullptr, timeout);
        timeout >>= 1U;
    } while (captured == QIVOlib_frame_type_status_change);
    return captured == QIVOlib_frame_type_audio;
}

/// Replaces what is staged. A frame that makes no sense, or for which there is no memory, stages nothing.
void AudioPlayback::stageFrame(const QIVOlib_audio_frame_v2_t& frame) {
    pcm_data_size = 0;
    if (!isSound(frame, dataFormat.mSampleRate)) {
        return;
    }
    for (AudioResampler& resampler : _resamplers) {
        resampler.setSourceSampleRate(static_cast<float>(frame.sample_rate),
                                      static_cast<float>(dataFormat.mSampleRate));
    }
    const int maxLen = _resamplers[0].getMaxBufferLengthInSamples(frame.no_samples);
    if (!reserveStage(maxLen)) {
        return;
    }
    // A frame without data is silence on both sides.
    const auto plane = [&frame](int number) {
        float* const first =
            frame.p_data != nullptr ? frame.p_data + std::ptrdiff_t{number} * frame.no_samples : nullptr;
        return SampleCursor{first, first != nullptr ? first + frame.no_samples : nullptr};
    };
    int frames = resamplePlane(0, plane(0), maxLen);
    if (frame.no_channels == 1) {
        float* const staged = p_pcm_data.get();
        for (std::ptrdiff_t i = 0; i < frames; ++i) {
            staged[2 * i + 1] = staged[2 * i];
        }
    } else {
        frames = resamplePlane(1, plane(1), maxLen);
    }
    pcm_data_size = static_cast<std::uint32_t>(frames) * kBytesPerStagedFrame;
}

/// Makes room for so many frames. False if there is no memory; then the stage stays as it was.
bool AudioPlayback::reserveStage(int frames) {
    const std::uint32_t bytes = static_cast<std::uint32_t>(frames) * kBytesPerStagedFrame;
    if (bytes <= pcm_data_capacity) {
        return true;
    }
    // One float more than counts: the right channel's region ends that far behind the last slot.
    const std::size_t size = bytes + sizeof(float);
    // NOLINTNEXTLINE(cppcoreguidelines-no-malloc): grown in place, without an exception where it fails
    void* const grown = std::realloc(p_pcm_data.get(), size);
    if (grown == nullptr) {
        return false;
    }
    static_cast<void>(p_pcm_data.release());
    p_pcm_data.reset(static_cast<float*>(grown));
    // The two channels may yield different numbers of samples where a source changes its channels.
    std::memset(grown, 0, size);
    pcm_data_capacity = bytes;
    return true;
}

/// Resamples into every second slot of the stage and returns how many frames there are now.
int AudioPlayback::resamplePlane(int channel, SampleCursor plane, int maxLen) {
    float* const first = p_pcm_data.get() + channel;
    SampleCursor region{first, first + std::ptrdiff_t{2} * maxLen};
    _resamplers[channel].processSrc(&plane, &region, 1, 2);
    return maxLen - static_cast<int>((region.end - region.position) / 2);
}

void AudioOutputCallback(void* player, AudioQueueRef queue, AudioQueueBufferRef buffer) {
    static_cast<AudioPlayback*>(player)->AudioOutputCallbackImp(queue, buffer);
}

} // namespace qivo
