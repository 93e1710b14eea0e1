#include "audio/AudioPlayback.h"
#include "platform/NullAudioOutput.h"
#include "platform/PulseAudioOutput.h"
#include "platform/SdlAudioOutput.h"

#include "tests/audio/AllocationCount.h"
#include "tests/audio/SoundServer.h"
#include "tests/audio/SteadySource.h"
#include "tests/audio/WaitCount.h"
#include "tests/platform/EventLoop.h"

#include <gtest/gtest.h>

#include <atomic>
#include <cerrno>
#include <condition_variable>
#include <cstdlib>
#include <ctime>
#include <linux/futex.h>
#include <malloc.h>
#include <memory>
#include <mutex>
#include <new>
#include <semaphore.h>
#include <shared_mutex>
#include <sys/syscall.h>
#include <thread>
#include <unistd.h>
#include <utility>
#include <vector>

using namespace qivo;
using namespace qivo::test;
using namespace std::chrono_literals;

namespace {

std::atomic<std::uint64_t> deviceAllocations = 0;
std::atomic<std::uint64_t> devicePulls = 0;
std::atomic<std::uint64_t> deviceWaits = 0;

/// On the device's thread: of allocations everything between the end of the first pull and that of the last is counted,
/// the waiting in between too; of waits those of the pulls.
void countOnDevice(bool after) {
    thread_local std::uint64_t before = 0;
    thread_local std::uint64_t waits = 0;
    if (!after) {
        waits = waitsOfThisThread();
        return;
    }
    deviceWaits += waitsOfThisThread() - waits;
    const std::uint64_t now = allocationsOfThisThread();
    if (++devicePulls > 1) {
        deviceAllocations += now - before;
    }
    before = now;
}

/// Stands between a device and its source and counts what a pull allocates, and how often it may have waited.
class CountingSource : public AudioSource {
  public:
    explicit CountingSource(std::shared_ptr<AudioSource> source) : m_source(std::move(source)) {}
    void pull(float* out, std::size_t floats) noexcept override {
        const AllocationCount count;
        const std::uint64_t waits = waitsOfThisThread();
        m_source->pull(out, floats);
        deviceAllocations += count.soFar();
        deviceWaits += waitsOfThisThread() - waits;
        ++devicePulls;
    }
    void stateChanged() noexcept override { m_source->stateChanged(); }

  private:
    const std::shared_ptr<AudioSource> m_source;
};

/// A real driver whose devices' pulls are counted.
template <class Driver>
class Counting : public Driver {
  public:
    using Driver::Driver;
    int open(const AudioStreamBasicDescription& format, std::shared_ptr<AudioSource> source,
             std::unique_ptr<AudioOutput>& output) override {
        return Driver::open(format, std::make_shared<CountingSource>(std::move(source)), output);
    }
};

class AllocationTest : public testing::Test {
  protected:
    void SetUp() override {
        deviceAllocations = 0;
        devicePulls = 0;
        deviceWaits = 0;
        AppData::inst()->setMute(false);
        AppData::inst()->setQIVOSourceInfoNamed("A (1)", "u1");
    }
    void TearDown() override {
        setAudioOutputDriver(nullptr);
        EXPECT_EQ(SteadySource::receiversOpen(), 0);
    }

    EventLoop loop;
};

/// Keeps the compiler from leaving out an allocation whose memory nobody uses.
void use(void* memory) {
    asm volatile("" : : "r"(memory) : "memory");
}

} // namespace

TEST_F(AllocationTest, TheCounterCountsEveryWayToAllocate) {
    // NOLINTBEGIN(cppcoreguidelines-no-malloc)
    const AllocationCount count;
    void* memory = std::malloc(10);
    use(memory);
    EXPECT_EQ(count.soFar(), 1U);
    memory = std::realloc(memory, 1000);
    use(memory);
    std::free(memory);
    EXPECT_EQ(count.soFar(), 2U);
    memory = std::calloc(2, 8);
    use(memory);
    std::free(memory);
    // NOLINTEND(cppcoreguidelines-no-malloc)
    auto one = std::make_unique<int>(1);
    use(one.get());
    memory = ::operator new(64, std::align_val_t(64));
    use(memory);
    ::operator delete(memory, std::align_val_t(64));
    EXPECT_EQ(count.soFar(), 5U);
    // NOLINTBEGIN(cppcoreguidelines-no-malloc)
    for (void* aligned :
         {memalign(64, 64), valloc(64), pvalloc(64), reallocarray(nullptr, 8, 8), aligned_alloc(64, 64)}) {
        use(aligned);
        std::free(aligned);
    }
    EXPECT_EQ(count.soFar(), 10U);
    ASSERT_EQ(posix_memalign(&memory, 64, 64), 0);
    use(memory);
    std::free(memory);
    EXPECT_EQ(count.soFar(), 11U);
    // NOLINTEND(cppcoreguidelines-no-malloc)
}

TEST_F(AllocationTest, TheCounterCountsEveryWayToWait) {
    std::uint64_t before = waitsOfThisThread();
    const auto counted = [&before] {
        const std::uint64_t now = waitsOfThisThread();
        return now - std::exchange(before, now);
    };
    std::mutex mutex;
    std::unique_lock lock(mutex);
    EXPECT_EQ(counted(), 1U);
    std::condition_variable condition;
    condition.wait_for(lock, 1ms);
    EXPECT_EQ(counted(), 1U);
    std::thread waker([&] {
        const std::lock_guard guard(mutex); // free from the wait on
        condition.notify_all();
    });
    condition.wait(lock);
    EXPECT_EQ(counted(), 1U);
    waker.join();
    lock.unlock();
    counted();
    std::shared_mutex shared;
    shared.lock();
    shared.unlock();
    shared.lock_shared();
    shared.unlock_shared();
    EXPECT_EQ(counted(), 2U);
    sem_t semaphore;
    sem_init(&semaphore, 0, 1);
    sem_wait(&semaphore);
    EXPECT_EQ(counted(), 1U);
    const timespec past{};
    EXPECT_NE(sem_timedwait(&semaphore, &past), 0);
    EXPECT_NE(sem_clockwait(&semaphore, CLOCK_MONOTONIC, &past), 0);
    EXPECT_EQ(counted(), 2U);
    sem_destroy(&semaphore);
    lock.lock();
    counted();
    EXPECT_EQ(pthread_cond_timedwait(condition.native_handle(), mutex.native_handle(), &past), ETIMEDOUT);
    EXPECT_EQ(pthread_mutex_timedlock(mutex.native_handle(), &past), ETIMEDOUT);
    EXPECT_EQ(pthread_mutex_clocklock(mutex.native_handle(), CLOCK_MONOTONIC, &past), ETIMEDOUT);
    EXPECT_EQ(counted(), 3U);
    int word = 0;
    EXPECT_EQ(syscall(SYS_futex, &word, FUTEX_LOCK_PI_PRIVATE, 0, nullptr, nullptr, 0), 0);
    EXPECT_EQ(counted(), 1U);
    EXPECT_EQ(syscall(SYS_futex, &word, FUTEX_UNLOCK_PI_PRIVATE, 0, nullptr, nullptr, 0), 0);
    word = 0;
    EXPECT_EQ(syscall(SYS_futex, &word, FUTEX_WAIT_PRIVATE, 1, nullptr, nullptr, 0), -1) << "not what it waits for";
    EXPECT_EQ(counted(), 1U);
    EXPECT_EQ(syscall(SYS_futex, &word, FUTEX_WAKE_PRIVATE, 1, nullptr, nullptr, 0), 0);
    EXPECT_EQ(counted(), 0U);
}

TEST_F(AllocationTest, TheCounterCountsEachThreadByItself) {
    std::uint64_t others = 0;
    std::uint64_t own = 0;
    std::thread other([&] {
        const AllocationCount count;
        const auto one = std::make_unique<int>(1);
        use(one.get());
        others = count.soFar();
    });
    {
        const AllocationCount count;
        other.join();
        own = count.soFar();
    }
    EXPECT_EQ(others, 1U);
    EXPECT_EQ(own, 0U);
}

/// Everything that both threads do in steady playback, the event loop and the waking of it included.
TEST_F(AllocationTest, SteadyPlaybackAllocatesNothingOnEitherThreadAndTheDevicesWaitsForNobody) {
    struct Case {
        std::int32_t rate;
        std::int32_t channels;
        std::int32_t samples;
    };
    for (const Case& each : {Case{48000, 2, 1024}, Case{44100, 2, 1024}, Case{96000, 1, 1920}, Case{8000, 8, 320}}) {
        SCOPED_TRACE(each.rate);
        SteadySource::set(each.rate, each.channels, each.samples);
        const auto driver = std::make_shared<NullAudioDriver>();
        setAudioOutputDriver(driver);
        AudioPlayback player;
        player.setSourceChangedCounter(1);
        const auto play = [&driver](int periods) {
            for (int i = 0; i < periods; ++i) {
                driver->advance(10ms);
                EventLoop::settle();
            }
        };
        play(100);
        deviceAllocations = 0;
        devicePulls = 0;
        deviceWaits = 0;
        driver->setProbe(countOnDevice);
        const std::int64_t framesBefore = SteadySource::framesTaken();
        const AllocationCount count;
        play(500);
        EXPECT_EQ(count.soFar(), 0U) << "on the main thread";
        EXPECT_EQ(deviceAllocations, 0U) << "on the device's thread";
        EXPECT_EQ(deviceWaits, 0U) << "on the device's thread";
        EXPECT_GE(devicePulls, 499U);
        EXPECT_GT(SteadySource::framesTaken(), framesBefore + 100);
    }
}

/// The real output, into SDL's own stand-in for a device, and the real event loop.
TEST_F(AllocationTest, APullOfSdlsDeviceAllocatesNothingAndWaitsForNobody) {
    SteadySource::set(44100, 2, 1024);
    setAudioOutputDriver(std::make_shared<Counting<SdlAudioDriver>>("dummy"));
    AudioPlayback player;
    player.setSourceChangedCounter(1);
    ASSERT_TRUE(EventLoop::until([] { return devicePulls > 50; }));
    EXPECT_EQ(deviceAllocations, 0U);
    EXPECT_EQ(deviceWaits, 0U);
    EXPECT_GT(SteadySource::framesTaken(), 10);
}

/// The real output, to a real sound server. What its client library allocates between pulls is its own affair.
TEST_F(AllocationTest, APullOfASoundServersStreamAllocatesNothingAndWaitsForNobody) {
    SoundServer server;
    ASSERT_TRUE(server.start());
    SteadySource::set(44100, 2, 1024);
    setAudioOutputDriver(std::make_shared<Counting<PulseAudioDriver>>());
    AudioPlayback player;
    player.setSourceChangedCounter(1);
    ASSERT_TRUE(EventLoop::until([] { return devicePulls > 50; }));
    EXPECT_EQ(deviceAllocations, 0U);
    EXPECT_EQ(deviceWaits, 0U);
    EXPECT_GT(SteadySource::framesTaken(), 10);
}
