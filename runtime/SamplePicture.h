#pragma once

#include "runtime/GstHandles.h"
#include "runtime/Mailbox.h"

#include <gst/video/video.h>

#include <cstdint>
#include <optional>

namespace qivo::runtime {

/// A decoded and converted picture, in the buffer that the conversion wrote.
class SamplePicture final : public Picture {
  public:
    /// Null if the sample is no RGBA picture that can be read. `taken` is when, by the sender's clock, and `arrived` by
    /// this machine's, in units of 100 ns since the Unix epoch. Where it is not known the time of the stream counts.
    static std::unique_ptr<Picture> map(GstOwned<GstSample> sample, std::optional<std::int64_t> taken,
                                        std::int64_t arrived);

    SamplePicture(const SamplePicture&) = delete;
    SamplePicture& operator=(const SamplePicture&) = delete;
    ~SamplePicture() override;

    QIVOlib_video_frame_v2_t record() const override { return m_record; }

  private:
    SamplePicture() = default;

    GstOwned<GstSample> m_sample;
    GstVideoFrame m_frame{};
    QIVOlib_video_frame_v2_t m_record{};
};

} // namespace qivo::runtime
