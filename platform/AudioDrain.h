#pragma once

#include "platform/AudioOutput.h"
#include "platform/SpscQueue.h"

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <memory>

namespace qivo {

/// The enqueued buffers of a queue and the way they take: from the owner to whoever drains them, and back.
///
/// One thread at a time drains: a device's, or the owner's where there is no device. `releaseDrainer` hands that role
/// on; the hand-over itself is the business of `AudioTap`.
class AudioDrain {
  public:
    /// Null if no descriptor is left.
    static std::shared_ptr<AudioDrain> create();
    ~AudioDrain();
    AudioDrain(const AudioDrain&) = delete;
    AudioDrain& operator=(const AudioDrain&) = delete;

    // --- Owner.
    bool enqueue(AudioQueueBuffer* buffer) noexcept { return m_pending.push(buffer); }
    /// The next buffer that has been played; null if there is none.
    AudioQueueBuffer* takeFinished() noexcept;
    bool hasFinished() const noexcept { return !m_finished.empty(); }
    /// Forgets all buffers. Only while nobody else drains.
    void clear() noexcept;
    /// Readable after `signal`, until `acknowledge`.
    int wakeDescriptor() const noexcept { return m_wake; }
    void acknowledge() noexcept;

    // --- Drainer: wait-free, allocates nothing.
    /// Copies the next floats out, silence where there are none, and signals if buffers have been used up. Null `out`
    /// means to discard them.
    void pull(float* out, std::size_t floats) noexcept;

    // --- Any thread.
    /// Makes the descriptor readable.
    void signal() noexcept;
    void releaseDrainer() noexcept;

  private:
    explicit AudioDrain(int wake) : m_wake(wake) {}
    bool nextBuffer() noexcept;

    SpscQueue<AudioQueueBuffer*, kAudioQueueMaxBuffers> m_pending;
    SpscQueue<AudioQueueBuffer*, kAudioQueueMaxBuffers> m_finished;
    // Drainer only.
    AudioQueueBuffer* m_current = nullptr;
    std::size_t m_taken = 0; // floats of m_current

    const int m_wake; // an event counter of the system
};

/// What one device pulls from: the drain while it is attached, else silence. A device that hangs keeps its tap for as
/// long as it likes, and the drain goes on without it.
class AudioTap : public AudioSource {
  public:
    explicit AudioTap(std::shared_ptr<AudioDrain> drain) : m_drain(std::move(drain)) {}

    void pull(float* out, std::size_t floats) noexcept override;
    void stateChanged() noexcept override { m_drain->signal(); }

    // --- Owner.
    /// Lets the device drain. Nobody else may.
    void attach() noexcept;
    /// From its return on the device takes nothing more and touches no buffer. Waits for a copy that is under way, some
    /// microseconds.
    void detach() noexcept;
    /// How often the device has pulled.
    std::uint64_t pulls() const noexcept { return m_pulls.load(std::memory_order_relaxed); }

  private:
    const std::shared_ptr<AudioDrain> m_drain;
    // The device raises m_pulling before it looks at m_attached, the owner lowers m_attached before it looks at
    // m_pulling: in the single order of these four, one of them sees the other.
    std::atomic<bool> m_attached = false;
    std::atomic<bool> m_pulling = false;
    std::atomic<std::uint64_t> m_pulls = 0;
};

} // namespace qivo
