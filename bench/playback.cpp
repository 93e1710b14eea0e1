// What a player's callback costs in steady playback: allocations, and processor time for a second of sound. The queue
// and the source are stand-ins that cost next to nothing, so that the callback alone is measured: filling the buffer,
// taking a frame, resampling it.

#include "audio/AudioPlayback.h"
#include "tests/audio/AllocationCount.h"
#include "tests/audio/SteadySource.h"

#include <array>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <ctime>

using qivo::test::AllocationCount;
using qivo::test::SteadySource;

namespace qivo {

/// A queue that takes everything and plays nothing.
class AudioQueue {
  public:
    std::array<std::byte, 12800> memory{};
    AudioQueueBuffer buffer{12800, memory.data(), 0};
    std::uint64_t bytes = 0;
};

namespace {
AudioQueue theQueue;
} // namespace

int AudioQueueNewOutput(const AudioStreamBasicDescription* /*format*/, AudioQueueOutputCallback /*callback*/,
                        void* /*userData*/, AudioQueueRef* queue) {
    *queue = &theQueue;
    return 0;
}
int AudioQueueAllocateBuffer(AudioQueueRef queue, std::uint32_t /*capacity*/, AudioQueueBufferRef* buffer) {
    *buffer = &queue->buffer;
    return 0;
}
int AudioQueueEnqueueBuffer(AudioQueueRef queue, AudioQueueBufferRef buffer) {
    queue->bytes += buffer->mAudioDataByteSize;
    return 0;
}
int AudioQueueStart(AudioQueueRef /*queue*/) {
    return 0;
}
int AudioQueueStop(AudioQueueRef /*queue*/) {
    return 0;
}
int AudioQueueFreeBuffer(AudioQueueRef /*queue*/, AudioQueueBufferRef /*buffer*/) {
    return 0;
}
int AudioQueueDispose(AudioQueueRef /*queue*/) {
    return 0;
}

} // namespace qivo

namespace {

constexpr double kBytesPerSecond = 48000.0 * 8;
constexpr double kSecondsOfSound = 600;

double processorSeconds() {
    timespec time{};
    clock_gettime(CLOCK_THREAD_CPUTIME_ID, &time);
    return static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_nsec) * 1e-9;
}

void measure(std::int32_t rate, std::int32_t channels, std::int32_t samples) {
    SteadySource::set(rate, channels, samples);
    qivo::AudioPlayback player;
    player.startPlayback();
    const auto play = [&player](double seconds) {
        qivo::theQueue.bytes = 0;
        std::uint64_t callbacks = 0;
        for (; static_cast<double>(qivo::theQueue.bytes) < seconds * kBytesPerSecond; ++callbacks) {
            player.AudioOutputCallbackImp(&qivo::theQueue, &qivo::theQueue.buffer);
        }
        return callbacks;
    };
    play(1);
    const AllocationCount allocations;
    const double before = processorSeconds();
    const std::uint64_t callbacks = play(kSecondsOfSound);
    const double spent = processorSeconds() - before;
    std::printf("%6d Hz  %d channels  %4d samples a frame  %6.1f us of processor a second of sound  %5.2f us a callback"
                "  %llu allocations\n",
                rate, channels, samples, 1e6 * spent / kSecondsOfSound, 1e6 * spent / static_cast<double>(callbacks),
                static_cast<unsigned long long>(allocations.soFar()));
}

} // namespace

int main() {
    qivo::AppData::inst()->setQIVOSourceInfoNamed("A (1)", "u1");
    for (const std::int32_t rate : {48000, 44100, 96000, 8000}) {
        measure(rate, 1, 1024);
        measure(rate, 2, 1024);
    }
    return 0;
}
