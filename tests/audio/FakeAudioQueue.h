#pragma once

#include "platform/AudioQueue.h"

#include <memory>
#include <string>
#include <vector>

namespace qivo::test {

/// A scripted audio queue: link it in the place of the real one. It records every call, answers what the test says and
/// keeps what was enqueued.
///
/// Thread: one.
class FakeAudioQueue {
  public:
    struct Enqueued {
        std::uint32_t byteSize = 0;
        std::vector<float> samples; ///< what the buffer held within its byte size
    };

    static FakeAudioQueue& instance();
    void reset();

    // --- The script: what the next calls answer; 0 is success.
    int newStatus = 0;
    int allocateStatus = 0; ///< other than 0, no buffer is handed out
    int enqueueStatus = 0;
    int startStatus = 0;
    int stopStatus = 0;
    int freeStatus = 0;
    int disposeStatus = 0;

    // --- What happened.
    /// As in `NewOutput`, `AllocateBuffer(12800)`, `EnqueueBuffer(b1, 12800)`, `FreeBuffer(b1)`; buffers are numbered
    /// in order of creation over all queues. Lines of a queue other than the newest end in ` on another queue`.
    std::vector<std::string> calls;
    std::vector<Enqueued> enqueued;
    AudioStreamBasicDescription format;
    AudioQueueOutputCallback callback = nullptr;
    void* userData = nullptr;
    AudioQueueRef queue = nullptr; ///< the newest; null once it is disposed of
    /// Every buffer that is allocated and not freed.
    std::vector<AudioQueueBufferRef> buffers() const;
    std::vector<std::string> takeCalls();
    /// Calls back for a buffer, as the queue does once it has been played.
    void playOut(AudioQueueBufferRef buffer) const { callback(userData, queue, buffer); }

    struct Buffer {
        std::vector<std::byte> memory;
        std::unique_ptr<AudioQueueBuffer> buffer;
        std::string name;
    };
    std::vector<Buffer> allocated;
    int bufferCount = 0;
};

} // namespace qivo::test
