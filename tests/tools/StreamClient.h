#pragma once

#include "tools/publish/Handles.h"

#include <chrono>
#include <string>

namespace qivo::test {

/// One medium of an RTSP address, "video" or "audio", by GStreamer's own receiver. It asks the server for no other.
class StreamClient {
  public:
    /// `behind` is what its packets go through, as gst-launch takes it, and ends in an appsink "out". `latency` is in
    /// milliseconds.
    StreamClient(const std::string& address, const std::string& protocol, const char* medium, int latency,
                 const std::string& behind);
    ~StreamClient();
    StreamClient(const StreamClient&) = delete;
    StreamClient& operator=(const StreamClient&) = delete;

    /// What comes next; null after the deadline, or once the stream has ended.
    [[nodiscard]] Sample next(std::chrono::nanoseconds deadline);
    [[nodiscard]] Object<GstElement> element(const char* name) const;
    [[nodiscard]] Object<GstBus> bus() const;

  private:
    Object<GstElement> m_pipeline;
    Object<GstElement> m_sink;
};

} // namespace qivo::test
