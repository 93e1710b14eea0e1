#pragma once

#include "platform/DisplayLink.h"
#include "platform/RefreshPacer.h"

#include <condition_variable>
#include <mutex>
#include <thread>

namespace qivo {

/// A display link that runs a thread for its callback: held back by the callback's buffer swaps where these wait for
/// the vertical retrace, by the clock where they do not (see RefreshPacer).
class ThreadDisplayLink final : public DisplayLink {
  public:
    ThreadDisplayLink() = default;
    /// Stops.
    ~ThreadDisplayLink() override;

    void setOutputCallback(OutputCallback callback, void* context) override;
    void setCurrentDisplayFromContext(const GLContext& context, const PixelFormat& format) override;
    void start() override;
    /// From within the callback, it lets that callback be the last one and returns without waiting for it.
    void stop() override;
    bool isRunning() const override;

  private:
    void run();
    bool waitUntilDue(const RefreshPacer& pacer);

    // Set while the thread does not run, then only read.
    OutputCallback m_callback = nullptr;
    void* m_context = nullptr;
    std::shared_ptr<const DisplayRefresh> m_display = std::make_shared<DisplayRefresh>();
    std::thread m_thread;

    mutable std::mutex m_mutex; // protects m_running
    std::condition_variable m_changed;
    bool m_running = false;
};

} // namespace qivo
