#pragma once

#include "platform/GLContext.h"

#include <chrono>

namespace qivo {

class PixelFormat;

/// When a refresh was begun, on the steady clock.
struct TimeStamp {
    std::chrono::steady_clock::time_point hostTime;
};

/// Calls back once for every refresh of a display, in a thread of its own.
///
/// Thread: all operations from the thread that made it, which the callback must never wait for.
class DisplayLink {
  public:
    /// What a callback answers when all went well. The answer has no effect.
    static constexpr int kSuccess = 0;
    using OutputCallback = int (*)(DisplayLink* link, const TimeStamp& outputTime, void* context);

    DisplayLink() = default;
    virtual ~DisplayLink() = default;
    DisplayLink(const DisplayLink&) = delete;
    DisplayLink& operator=(const DisplayLink&) = delete;

    /// To be set before start().
    virtual void setOutputCallback(OutputCallback callback, void* context) = 0;
    /// Follows the display that the context's drawable is on, also when it goes to another one. The format has no
    /// effect: the context knows its display.
    virtual void setCurrentDisplayFromContext(const GLContext& context, const PixelFormat& format) = 0;
    /// Does nothing if it runs already or has no callback.
    virtual void start() = 0;
    /// Does nothing if it does not run. Waits for a callback that is under way; no callback runs after it returns.
    virtual void stop() = 0;
    virtual bool isRunning() const = 0;
};

} // namespace qivo
