#include "tests/audio/FakeAudioQueue.h"

#include <algorithm>
#include <cstring>
#include <utility>

namespace qivo {

class AudioQueue {};

namespace test {

FakeAudioQueue& FakeAudioQueue::instance() {
    static FakeAudioQueue fake;
    return fake;
}

void FakeAudioQueue::reset() {
    if (queue != nullptr) {
        AudioQueueDispose(queue);
    }
    *this = FakeAudioQueue();
}

std::vector<AudioQueueBufferRef> FakeAudioQueue::buffers() const {
    std::vector<AudioQueueBufferRef> all;
    for (const auto& each : allocated) {
        all.push_back(each.buffer.get());
    }
    return all;
}

std::vector<std::string> FakeAudioQueue::takeCalls() {
    return std::exchange(calls, {});
}

namespace {

FakeAudioQueue& fake() {
    return FakeAudioQueue::instance();
}

void note(AudioQueueRef queue, std::string line) {
    fake().calls.push_back(std::move(line) + (queue != fake().queue ? " on another queue" : ""));
}

std::string nameOf(AudioQueueBufferRef buffer) {
    for (const auto& each : fake().allocated) {
        if (each.buffer.get() == buffer) {
            return each.name;
        }
    }
    return buffer != nullptr ? "unknown" : "null";
}

} // namespace
} // namespace test

using test::fake;
using test::nameOf;
using test::note;

int AudioQueueNewOutput(const AudioStreamBasicDescription* format, AudioQueueOutputCallback callback, void* userData,
                        AudioQueueRef* queue) {
    fake().calls.emplace_back("NewOutput");
    if (fake().newStatus != 0) {
        return fake().newStatus;
    }
    fake().format = *format;
    fake().callback = callback;
    fake().userData = userData;
    fake().queue = std::make_unique<AudioQueue>().release();
    *queue = fake().queue;
    return 0;
}

int AudioQueueAllocateBuffer(AudioQueueRef queue, std::uint32_t capacity, AudioQueueBufferRef* buffer) {
    note(queue, "AllocateBuffer(" + std::to_string(capacity) + ")");
    if (fake().allocateStatus != 0) {
        return fake().allocateStatus;
    }
    test::FakeAudioQueue::Buffer made;
    made.memory.assign(capacity, std::byte{0xAB});
    made.buffer = std::make_unique<AudioQueueBuffer>(AudioQueueBuffer{capacity, made.memory.data(), 0});
    made.name = "b" + std::to_string(++fake().bufferCount);
    *buffer = made.buffer.get();
    fake().allocated.push_back(std::move(made));
    return 0;
}

int AudioQueueEnqueueBuffer(AudioQueueRef queue, AudioQueueBufferRef buffer) {
    note(queue, "EnqueueBuffer(" + nameOf(buffer) + ", " + std::to_string(buffer->mAudioDataByteSize) + ")");
    test::FakeAudioQueue::Enqueued entry{buffer->mAudioDataByteSize, {}};
    entry.samples.resize(entry.byteSize / sizeof(float));
    std::memcpy(entry.samples.data(), buffer->mAudioData, entry.samples.size() * sizeof(float));
    fake().enqueued.push_back(std::move(entry));
    return fake().enqueueStatus;
}

int AudioQueueStart(AudioQueueRef queue) {
    note(queue, "Start");
    return fake().startStatus;
}

int AudioQueueStop(AudioQueueRef queue) {
    note(queue, "Stop");
    return fake().stopStatus;
}

int AudioQueueFreeBuffer(AudioQueueRef queue, AudioQueueBufferRef buffer) {
    note(queue, "FreeBuffer(" + nameOf(buffer) + ")");
    std::erase_if(fake().allocated, [buffer](const auto& each) { return each.buffer.get() == buffer; });
    return fake().freeStatus;
}

int AudioQueueDispose(AudioQueueRef queue) {
    note(queue, "Dispose");
    const std::unique_ptr<AudioQueue> disposed(queue);
    fake().queue = nullptr;
    fake().allocated.clear();
    return fake().disposeStatus;
}

} // namespace qivo
