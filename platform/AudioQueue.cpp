#include "platform/AudioQueue.h"

#include "platform/AudioDrain.h"
#include "platform/AudioKeeper.h"
#include "platform/AudioOutput.h"

#include <QAbstractEventDispatcher>
#include <QSocketNotifier>
#include <QThread>
#include <QTimer>

#include <algorithm>
#include <cassert>
#include <memory>
#include <new>
#include <utility>
#include <vector>

namespace qivo {

class AudioQueue {
  public:
    AudioQueue(const AudioStreamBasicDescription& format, AudioQueueOutputCallback callback, void* userData,
               std::shared_ptr<AudioDrain> drain);
    ~AudioQueue();
    AudioQueue(const AudioQueue&) = delete;
    AudioQueue& operator=(const AudioQueue&) = delete;

    int allocate(std::uint32_t capacity, AudioQueueBufferRef* buffer);
    int enqueue(AudioQueueBufferRef buffer);
    int start();
    void stop();
    int free(AudioQueueBufferRef buffer);
    bool onItsThread() const { return m_timer->thread() == QThread::currentThread(); }

  private:
    struct Slot {
        std::unique_ptr<std::byte[]> memory;
        AudioQueueBuffer buffer;
        bool enqueued = false;
    };

    Slot* slotOf(const AudioQueueBuffer* buffer);
    void wake();
    void turn();

    const AudioStreamBasicDescription m_format;
    const AudioQueueOutputCallback m_callback;
    void* const m_userData;
    const std::shared_ptr<AudioDrain> m_drain;
    AudioKeeper m_keeper;
    std::vector<std::unique_ptr<Slot>> m_slots;
    std::unique_ptr<QSocketNotifier> m_notifier;
    std::unique_ptr<QTimer> m_timer;
    // How many turns are on the stack: a callback may run an event loop of its own. They outlive the queue if a
    // callback disposes of it.
    const std::shared_ptr<int> m_turns = std::make_shared<int>(0);
};

AudioQueue::AudioQueue(const AudioStreamBasicDescription& format, AudioQueueOutputCallback callback, void* userData,
                       std::shared_ptr<AudioDrain> drain)
    : m_format(format), m_callback(callback), m_userData(userData), m_drain(std::move(drain)),
      m_keeper(format, m_drain, audioOutputDriver()),
      m_notifier(std::make_unique<QSocketNotifier>(m_drain->wakeDescriptor(), QSocketNotifier::Read)),
      m_timer(std::make_unique<QTimer>()) {
    m_slots.reserve(kAudioQueueMaxBuffers);
    m_notifier->setEnabled(false);
    m_timer->setTimerType(Qt::PreciseTimer);
    QObject::connect(m_notifier.get(), &QSocketNotifier::activated, m_timer.get(), [this] { wake(); });
    QObject::connect(m_timer.get(), &QTimer::timeout, m_timer.get(), [this] { turn(); });
}

AudioQueue::~AudioQueue() {
    stop();
    if (*m_turns > 0) {
        // One of the two is sending the signal that led here.
        m_notifier->disconnect();
        m_timer->disconnect();
        m_notifier.release()->deleteLater();
        m_timer.release()->deleteLater();
    }
}

AudioQueue::Slot* AudioQueue::slotOf(const AudioQueueBuffer* buffer) {
    const auto found =
        std::find_if(m_slots.begin(), m_slots.end(), [buffer](const auto& slot) { return &slot->buffer == buffer; });
    return found != m_slots.end() ? found->get() : nullptr;
}

int AudioQueue::allocate(std::uint32_t capacity, AudioQueueBufferRef* buffer) {
    if (buffer == nullptr || capacity == 0 || capacity > kAudioQueueMaxCapacity) {
        return kAudioQueueErrInvalidArgument;
    }
    if (m_slots.size() == kAudioQueueMaxBuffers) {
        return kAudioQueueErrTooManyBuffers;
    }
    std::unique_ptr<std::byte[]> memory(new (std::nothrow) std::byte[capacity]);
    if (!memory) {
        return kAudioQueueErrResources;
    }
    void* const data = memory.get();
    m_slots.push_back(std::make_unique<Slot>(Slot{std::move(memory), {capacity, data, 0}, false}));
    *buffer = &m_slots.back()->buffer;
    return kAudioQueueOk;
}

int AudioQueue::enqueue(AudioQueueBufferRef buffer) {
    Slot* const slot = slotOf(buffer);
    if (slot == nullptr) {
        return kAudioQueueErrInvalidBuffer;
    }
    if (slot->enqueued) {
        return kAudioQueueErrBufferEnqueued;
    }
    const std::uint32_t size = buffer->mAudioDataByteSize;
    if (size == 0 || size > buffer->mAudioDataBytesCapacity || size % m_format.mBytesPerFrame != 0) {
        return kAudioQueueErrBufferSize;
    }
    slot->enqueued = true;
    m_drain->enqueue(buffer); // cannot be full: it holds every buffer that a queue may have
    return kAudioQueueOk;
}

int AudioQueue::start() {
    if (m_keeper.started()) {
        return kAudioQueueErrStarted;
    }
    const int status = m_keeper.start();
    if (status == kAudioQueueOk) {
        m_notifier->setEnabled(true);
        m_timer->start(m_keeper.interval());
    }
    return status;
}

void AudioQueue::stop() {
    m_notifier->setEnabled(false);
    m_timer->stop();
    m_keeper.stop();
    m_drain->clear();
    for (const auto& slot : m_slots) {
        slot->enqueued = false;
    }
}

int AudioQueue::free(AudioQueueBufferRef buffer) {
    Slot* const slot = slotOf(buffer);
    if (slot == nullptr) {
        return kAudioQueueErrInvalidBuffer;
    }
    if (slot->enqueued) {
        return kAudioQueueErrBufferEnqueued;
    }
    std::erase_if(m_slots, [slot](const auto& each) { return each.get() == slot; });
    return kAudioQueueOk;
}

void AudioQueue::wake() {
    m_drain->acknowledge();
    turn();
}

/// Looks after the device and calls back for one buffer. The others wait for further turns of the event loop, since a
/// callback may take its time and the thread has other things to do.
void AudioQueue::turn() {
    m_keeper.service();
    if (m_keeper.interval() != m_timer->intervalAsDuration()) {
        m_timer->setInterval(m_keeper.interval());
    }
    AudioQueueBuffer* const buffer = m_drain->takeFinished();
    if (buffer == nullptr) {
        return;
    }
    if (m_drain->hasFinished()) {
        m_drain->signal();
    }
    slotOf(buffer)->enqueued = false;
    const std::shared_ptr<int> turns = m_turns;
    ++*turns;
    m_callback(m_userData, this, buffer);
    --*turns;
}

namespace {

bool takes(const AudioStreamBasicDescription& format) {
    constexpr std::uint32_t kMaxChannels = 8;
    const std::uint32_t frame = format.mChannelsPerFrame * static_cast<std::uint32_t>(sizeof(float));
    return format.mFormatID == kAudioFormatLinearPCM &&
           format.mFormatFlags == (kAudioFormatFlagIsFloat | kAudioFormatFlagIsPacked) &&
           format.mSampleRate >= kAudioQueueLowestRate && format.mSampleRate <= kAudioQueueHighestRate &&
           format.mChannelsPerFrame >= 1 && format.mChannelsPerFrame <= kMaxChannels && format.mBitsPerChannel == 32 &&
           format.mBytesPerFrame == frame && format.mFramesPerPacket == 1 && format.mBytesPerPacket == frame;
}

} // namespace

int AudioQueueNewOutput(const AudioStreamBasicDescription* format, AudioQueueOutputCallback callback, void* userData,
                        AudioQueueRef* queue) {
    if (format == nullptr || callback == nullptr || queue == nullptr) {
        return kAudioQueueErrInvalidArgument;
    }
    if (!takes(*format)) {
        return kAudioQueueErrFormat;
    }
    if (QAbstractEventDispatcher::instance() == nullptr) {
        return kAudioQueueErrNoEventLoop;
    }
    auto drain = AudioDrain::create();
    if (!drain) {
        return kAudioQueueErrResources;
    }
    *queue = std::make_unique<AudioQueue>(*format, callback, userData, std::move(drain)).release();
    return kAudioQueueOk;
}

int AudioQueueAllocateBuffer(AudioQueueRef queue, std::uint32_t capacity, AudioQueueBufferRef* buffer) {
    assert(queue == nullptr || queue->onItsThread());
    return queue != nullptr ? queue->allocate(capacity, buffer) : kAudioQueueErrInvalidQueue;
}

int AudioQueueEnqueueBuffer(AudioQueueRef queue, AudioQueueBufferRef buffer) {
    assert(queue == nullptr || queue->onItsThread());
    return queue != nullptr ? queue->enqueue(buffer) : kAudioQueueErrInvalidQueue;
}

int AudioQueueStart(AudioQueueRef queue) {
    assert(queue == nullptr || queue->onItsThread());
    return queue != nullptr ? queue->start() : kAudioQueueErrInvalidQueue;
}

int AudioQueueStop(AudioQueueRef queue) {
    if (queue == nullptr) {
        return kAudioQueueErrInvalidQueue;
    }
    assert(queue->onItsThread());
    queue->stop();
    return kAudioQueueOk;
}

int AudioQueueFreeBuffer(AudioQueueRef queue, AudioQueueBufferRef buffer) {
    assert(queue == nullptr || queue->onItsThread());
    return queue != nullptr ? queue->free(buffer) : kAudioQueueErrInvalidQueue;
}

int AudioQueueDispose(AudioQueueRef queue) {
    if (queue == nullptr) {
        return kAudioQueueErrInvalidQueue;
    }
    assert(queue->onItsThread());
    const std::unique_ptr<AudioQueue> disposed(queue);
    return kAudioQueueOk;
}

} // namespace qivo
