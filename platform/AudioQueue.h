#pragma once

#include <cstdint>

namespace qivo {

/// An output queue for sound: its owner fills buffers and enqueues them, the device plays them one after the other
/// without a gap, and each one that has been played comes back through the callback.
///
/// Threads: a queue belongs to the thread that made it, which needs a Qt event loop. Every function here is called on
/// that thread, and the callback arrives there, one buffer a turn of the loop. The device's own thread only copies: it
/// neither allocates nor waits. None of the functions waits for the device, which is opened in the background.
///
/// Devices: the queue needs none. Until one is open, after it was unplugged or its sound server ended, the buffers are
/// drained silently at the pace of the clock, so that the owner's stream goes on and what is heard later is current.
/// A device is looked for again and again, at growing intervals of at most `AudioKeeper::kLongestRetry`.

/// How sound is laid out. The queue takes interleaved, packed 32-bit float PCM of 1 to 8 channels.
struct AudioStreamBasicDescription {
    double mSampleRate = 0.0; ///< frames a second
    std::uint32_t mFormatID = 0;
    std::uint32_t mFormatFlags = 0;
    std::uint32_t mBytesPerPacket = 0;
    std::uint32_t mFramesPerPacket = 0;
    std::uint32_t mBytesPerFrame = 0;
    std::uint32_t mChannelsPerFrame = 0;
    std::uint32_t mBitsPerChannel = 0;
    std::uint32_t mReserved = 0;
};

constexpr std::uint32_t kAudioFormatLinearPCM = 0x6C70636DU; ///< "lpcm"
constexpr std::uint32_t kAudioFormatFlagIsFloat = 1U;
constexpr std::uint32_t kAudioFormatFlagIsPacked = 8U;

/// A buffer of a queue. Its memory is the queue's.
struct AudioQueueBuffer {
    const std::uint32_t mAudioDataBytesCapacity;
    void* const mAudioData;
    std::uint32_t mAudioDataByteSize; ///< how much is to be played; whole frames
};

class AudioQueue;
using AudioQueueRef = AudioQueue*;
using AudioQueueBufferRef = AudioQueueBuffer*;

/// A buffer has been played and is its owner's again. The callback may enqueue it, stop the queue and dispose of it.
using AudioQueueOutputCallback = void (*)(void* userData, AudioQueueRef queue, AudioQueueBufferRef buffer);

/// What the functions answer.
enum AudioQueueStatus : int {
    kAudioQueueOk = 0,
    kAudioQueueErrInvalidQueue = 1,    ///< a null queue
    kAudioQueueErrInvalidArgument = 2, ///< a null pointer, or a capacity of 0 or above `kAudioQueueMaxCapacity`
    kAudioQueueErrFormat = 3,          ///< a format that the queue does not take
    kAudioQueueErrInvalidBuffer = 4,   ///< null, freed, or another queue's
    kAudioQueueErrBufferSize = 5,      ///< the byte size is 0, above the capacity, or not whole frames
    kAudioQueueErrBufferEnqueued = 6,  ///< the buffer is enqueued already, or may not be freed because it is
    kAudioQueueErrTooManyBuffers = 7,  ///< the queue has `kAudioQueueMaxBuffers`
    kAudioQueueErrNoEventLoop = 8,     ///< the thread has no event loop to call back on
    kAudioQueueErrResources = 9,       ///< no memory, descriptor or thread left
    kAudioQueueErrStarted = 10         ///< the queue has been started already
};

constexpr std::uint32_t kAudioQueueMaxBuffers = 16;
constexpr std::uint32_t kAudioQueueMaxCapacity = 16U << 20U; ///< bytes of one buffer
constexpr double kAudioQueueLowestRate = 1000.0;             ///< frames a second
constexpr double kAudioQueueHighestRate = 768000.0;

/// Makes a queue that calls back on this thread's event loop. `*queue` is the caller's to dispose of; it is left alone
/// on failure. Answers 0, InvalidArgument, Format, NoEventLoop or Resources.
int AudioQueueNewOutput(const AudioStreamBasicDescription* format, AudioQueueOutputCallback callback, void* userData,
                        AudioQueueRef* queue);

/// Makes a buffer, with a byte size of 0. Answers 0, InvalidQueue, InvalidArgument, TooManyBuffers or Resources;
/// `*buffer` is left alone on failure.
int AudioQueueAllocateBuffer(AudioQueueRef queue, std::uint32_t capacity, AudioQueueBufferRef* buffer);

/// Appends a buffer to what is to be played; its memory must not be touched until the callback returns it. Not a
/// number and infinity are played as silence. Allocates nothing. Answers 0, InvalidQueue, InvalidBuffer, BufferSize or
/// BufferEnqueued.
int AudioQueueEnqueueBuffer(AudioQueueRef queue, AudioQueueBufferRef buffer);

/// Begins to play what is enqueued. A device that is missing or slow is no failure. Answers 0, InvalidQueue, Started,
/// Resources, or a status of the output driver's own.
int AudioQueueStart(AudioQueueRef queue);

/// Stops at once: nothing more is taken from the buffers, and all of them are their owner's again without a callback.
/// A stopped queue may be started anew. Answers 0 or InvalidQueue.
int AudioQueueStop(AudioQueueRef queue);

/// Frees a buffer that is not enqueued. Answers 0, InvalidQueue, InvalidBuffer or BufferEnqueued.
int AudioQueueFreeBuffer(AudioQueueRef queue, AudioQueueBufferRef buffer);

/// Stops the queue and frees it with its buffers. No callback comes afterwards, also where one was on its way. Answers
/// 0 or InvalidQueue.
int AudioQueueDispose(AudioQueueRef queue);

} // namespace qivo
