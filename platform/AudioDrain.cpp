#include "platform/AudioDrain.h"

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <sys/eventfd.h>
#include <thread>
#include <unistd.h>

namespace qivo {
namespace {

/// What is no number must not reach a mixer: it would spread to everything that plays with it.
void copyFinite(const float* from, std::size_t floats, float* to) {
    for (std::size_t i = 0; i < floats; ++i) {
        to[i] = std::isfinite(from[i]) ? from[i] : 0.0F;
    }
}

} // namespace

std::shared_ptr<AudioDrain> AudioDrain::create() {
    const int wake = eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK);
    if (wake < 0) {
        return nullptr;
    }
    return std::shared_ptr<AudioDrain>(new AudioDrain(wake)); // the constructor is private
}

AudioDrain::~AudioDrain() {
    close(m_wake);
}

AudioQueueBuffer* AudioDrain::takeFinished() noexcept {
    AudioQueueBuffer* buffer = nullptr;
    return m_finished.pop(buffer) ? buffer : nullptr;
}

void AudioDrain::clear() noexcept {
    AudioQueueBuffer* buffer = nullptr;
    while (m_pending.pop(buffer) || m_finished.pop(buffer)) {
    }
    m_current = nullptr;
    releaseDrainer();
    acknowledge();
}

void AudioDrain::acknowledge() noexcept {
    std::uint64_t count = 0;
    [[maybe_unused]] const ssize_t bytes = read(m_wake, &count, sizeof(count)); // nothing to read is fine
}

void AudioDrain::signal() noexcept {
    const std::uint64_t one = 1;
    [[maybe_unused]] const ssize_t bytes = write(m_wake, &one, sizeof(one)); // a full counter is readable as well
}

void AudioDrain::releaseDrainer() noexcept {
    m_pending.releaseConsumer();
    m_finished.releaseProducer();
}

bool AudioDrain::nextBuffer() noexcept {
    m_taken = 0;
    return m_pending.pop(m_current);
}

void AudioDrain::pull(float* out, std::size_t floats) noexcept {
    bool finished = false;
    while (floats > 0 && (m_current != nullptr || nextBuffer())) {
        const std::size_t size = m_current->mAudioDataByteSize / sizeof(float);
        const std::size_t count = std::min(floats, size - m_taken);
        if (out != nullptr) {
            copyFinite(static_cast<const float*>(m_current->mAudioData) + m_taken, count, out);
            out += count;
        }
        floats -= count;
        m_taken += count;
        if (m_taken == size) {
            m_finished.push(m_current); // cannot be full: it holds every buffer that a queue may have
            m_current = nullptr;
            finished = true;
        }
    }
    if (out != nullptr) {
        std::fill_n(out, floats, 0.0F);
    }
    if (finished) {
        signal();
    }
}

void AudioTap::pull(float* out, std::size_t floats) noexcept {
    m_pulling.store(true);
    if (m_attached.load()) {
        m_drain->pull(out, floats);
    } else {
        std::fill_n(out, floats, 0.0F);
    }
    m_pulling.store(false);
    m_pulls.fetch_add(1, std::memory_order_relaxed);
}

void AudioTap::attach() noexcept {
    m_drain->releaseDrainer();
    m_attached.store(true);
}

void AudioTap::detach() noexcept {
    m_attached.store(false);
    while (m_pulling.load()) {
        std::this_thread::yield();
    }
    m_drain->releaseDrainer();
}

} // namespace qivo
