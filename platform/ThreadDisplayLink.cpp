#include "platform/ThreadDisplayLink.h"

namespace qivo {
namespace {

/// The link whose callback runs in this thread. Asking the thread object instead would race with its creation.
thread_local const ThreadDisplayLink* t_running = nullptr;

} // namespace

ThreadDisplayLink::~ThreadDisplayLink() {
    stop();
}

void ThreadDisplayLink::setOutputCallback(OutputCallback callback, void* context) {
    m_callback = callback;
    m_context = context;
}

void ThreadDisplayLink::setCurrentDisplayFromContext(const GLContext& context, const PixelFormat& /*format*/) {
    m_display = context.display();
}

void ThreadDisplayLink::start() {
    if (isRunning() || m_callback == nullptr) {
        return;
    }
    stop(); // collects a thread that its own callback stopped
    {
        const std::lock_guard guard(m_mutex);
        m_running = true;
    }
    m_thread = std::thread([this] { run(); });
}

void ThreadDisplayLink::stop() {
    {
        const std::lock_guard guard(m_mutex);
        m_running = false;
    }
    m_changed.notify_all();
    if (t_running != this && m_thread.joinable()) {
        m_thread.join();
    }
}

bool ThreadDisplayLink::isRunning() const {
    const std::lock_guard guard(m_mutex);
    return m_running;
}

bool ThreadDisplayLink::waitUntilDue(const RefreshPacer& pacer) {
    std::unique_lock guard(m_mutex);
    return !m_changed.wait_until(guard, pacer.due(), [this] { return !m_running; });
}

void ThreadDisplayLink::run() {
    t_running = this;
    RefreshPacer pacer(RefreshPacer::periodOfRate(m_display->rate));
    std::uint32_t generation = m_display->generation;
    while (waitUntilDue(pacer)) {
        if (const std::uint32_t latest = m_display->generation; latest != generation) {
            generation = latest;
            pacer.setPeriod(RefreshPacer::periodOfRate(m_display->rate));
            pacer.restart();
        }
        const auto now = std::chrono::steady_clock::now();
        pacer.begin(now);
        m_callback(this, TimeStamp{now}, m_context);
        pacer.end(std::chrono::steady_clock::now());
    }
}

} // namespace qivo
