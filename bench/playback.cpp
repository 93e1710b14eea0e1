// What a player's callback costs in steady playback: allocations, and processor time against that of what it cannot do
// without, resampling both channels of the same frames. The queue and the source are stand-ins that cost next to
// nothing, so that the callback alone is measured: filling the buffer, taking a frame, resampling it. Both sides take
// turns, and the ratio is the median of the rounds' own. Ends with 1 if the callback allocated anything.

#include "audio/AudioPlayback.h"
#include "bench/Timing.h"
#include "tests/audio/AllocationCount.h"
#include "tests/audio/SteadySource.h"

#include <array>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <ctime>
#include <utility>
#include <vector>

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
constexpr double kSecondsARound = 20;
constexpr std::size_t kRounds = 31;

double processorSeconds() {
    timespec time{};
    clock_gettime(CLOCK_THREAD_CPUTIME_ID, &time);
    return static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_nsec) * 1e-9;
}

/// Processor time of a function.
template <class Function>
double timed(const Function& function) {
    const double before = processorSeconds();
    function();
    return processorSeconds() - before;
}

/// The bare resampling of so many samples a plane into interleaved stereo, mono into the left slots alone.
class Bare {
  public:
    Bare(std::int32_t rate, std::int32_t channels, std::int32_t samples)
        : m_rate(rate), m_channels(channels), m_planes(static_cast<std::size_t>(channels * samples)),
          m_stereo(2 * kRatio * static_cast<std::size_t>(samples) + 1) {
        for (std::size_t i = 0; i < m_planes.size(); ++i) {
            m_planes[i] = 0.5F * std::sin(0.05F * static_cast<float>(i));
        }
    }

    void resample(double seconds) {
        const std::size_t samples = m_planes.size() / static_cast<std::size_t>(m_channels);
        for (double done = 0; done < seconds * m_rate; done += static_cast<double>(samples)) {
            for (std::size_t channel = 0; channel < static_cast<std::size_t>(m_channels); ++channel) {
                qivo::AudioResampler& resampler = m_resamplers[channel];
                resampler.setSourceSampleRate(static_cast<float>(m_rate), 48000.0F);
                float* const plane = m_planes.data() + channel * samples;
                float* const out = m_stereo.data() + channel;
                qivo::SampleCursor src{plane, plane + samples};
                qivo::SampleCursor dst{out, out + m_stereo.size() - 1};
                resampler.processSrc(&src, &dst, 1, 2);
            }
        }
    }

  private:
    static constexpr std::size_t kRatio = 7; // more than 48000 Hz are to the lowest rate here

    const std::int32_t m_rate;
    const std::int32_t m_channels;
    std::vector<float> m_planes;
    std::vector<float> m_stereo;
    std::array<qivo::AudioResampler, 2> m_resamplers;
};

/// Returns how often the callback allocated.
std::uint64_t measure(std::int32_t rate, std::int32_t channels, std::int32_t samples) {
    SteadySource::set(rate, channels, samples);
    qivo::AudioPlayback player;
    player.startPlayback();
    const auto play = [&player](double seconds) {
        qivo::theQueue.bytes = 0;
        while (static_cast<double>(qivo::theQueue.bytes) < seconds * kBytesPerSecond) {
            player.AudioOutputCallbackImp(&qivo::theQueue, &qivo::theQueue.buffer);
        }
    };
    Bare bare(rate, channels, samples);
    play(1);
    bare.resample(1);
    std::vector<double> ratios;
    std::vector<double> times;
    std::uint64_t allocated = 0;
    for (std::size_t round = 0; round < kRounds; ++round) {
        const AllocationCount allocations;
        const double spent = timed([&] { play(kSecondsARound); });
        allocated += allocations.soFar();
        times.push_back(spent);
        ratios.push_back(spent / timed([&] { bare.resample(kSecondsARound); }));
    }
    std::printf("%6d Hz  %d channels  %4d samples a frame  %6.1f us of processor a second of sound"
                "   %5.2f x the bare resampling   %llu allocations\n",
                rate, channels, samples, 1e6 * median(std::move(times)) / kSecondsARound, median(std::move(ratios)),
                static_cast<unsigned long long>(allocated));
    return allocated;
}

} // namespace

int main() {
    qivo::AppData::inst()->setQIVOSourceInfoNamed("A (1)", "u1");
    std::uint64_t allocated = 0;
    for (const std::int32_t rate : {48000, 44100, 96000, 8000}) {
        allocated += measure(rate, 1, 1024);
        allocated += measure(rate, 2, 1024);
    }
    return allocated == 0 ? 0 : 1;
}
