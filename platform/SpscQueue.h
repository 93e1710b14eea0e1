#pragma once

#include <array>
#include <atomic>
#include <cstddef>
#include <cstdio>
#include <cstdlib>
#include <thread>
#include <type_traits>

namespace qivo {

#ifdef NDEBUG
constexpr bool kCheckThreadRoles = false;
#else
constexpr bool kCheckThreadRoles = true;
#endif

/// A queue of at most `Capacity` small values from one thread to another. Both ends are wait-free and allocate nothing.
///
/// The first thread that pushes is the producer, the first that pops the consumer; they may be the same. Another thread
/// may take over a role after `releaseProducer` or `releaseConsumer`, if something else makes the hand-over known to it
/// (a lock, a flag with release and acquire). In builds with assertions a thread that takes another's role ends the
/// program with a message.
template <typename T, std::size_t Capacity, bool CheckRoles = kCheckThreadRoles>
class SpscQueue {
    static_assert(Capacity > 0 && (Capacity & (Capacity - 1)) == 0, "the indices wrap around: a power of two");
    static_assert(std::is_trivially_copyable_v<T>, "copying must not allocate or lock");

  public:
    /// False if the queue is full. Producer.
    bool push(T value) noexcept {
        checkRole(m_producer, "producer");
        const std::size_t tail = m_tail.load(std::memory_order_relaxed);
        if (tail - m_head.load(std::memory_order_acquire) == Capacity) {
            return false;
        }
        m_items[tail % Capacity] = value;
        m_tail.store(tail + 1, std::memory_order_release);
        return true;
    }

    /// False if the queue is empty; then `value` is left alone. Consumer.
    bool pop(T& value) noexcept {
        checkRole(m_consumer, "consumer");
        const std::size_t head = m_head.load(std::memory_order_relaxed);
        if (head == m_tail.load(std::memory_order_acquire)) {
            return false;
        }
        value = m_items[head % Capacity];
        m_head.store(head + 1, std::memory_order_release);
        return true;
    }

    /// Whether a pop would fail now. Consumer.
    bool empty() const noexcept {
        return m_head.load(std::memory_order_relaxed) == m_tail.load(std::memory_order_acquire);
    }

    void releaseProducer() noexcept { m_producer.store(std::thread::id(), std::memory_order_relaxed); }
    void releaseConsumer() noexcept { m_consumer.store(std::thread::id(), std::memory_order_relaxed); }

  private:
    static void checkRole(std::atomic<std::thread::id>& role, const char* name) noexcept {
        if constexpr (CheckRoles) {
            std::thread::id holder;
            const std::thread::id self = std::this_thread::get_id();
            if (!role.compare_exchange_strong(holder, self, std::memory_order_relaxed) && holder != self) {
                std::fprintf(stderr, "SpscQueue: a second thread acts as the %s\n", name);
                std::abort();
            }
        }
    }

    // The ends lie on cache lines of their own, so that they do not slow each other down.
    static constexpr std::size_t kCacheLine = 64;
    alignas(kCacheLine) std::atomic<std::size_t> m_head = 0; // written by the consumer
    std::atomic<std::thread::id> m_consumer;
    alignas(kCacheLine) std::atomic<std::size_t> m_tail = 0; // written by the producer
    std::atomic<std::thread::id> m_producer;
    std::array<T, Capacity> m_items{};
};

} // namespace qivo
