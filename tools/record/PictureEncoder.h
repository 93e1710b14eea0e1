#pragma once

#include "tools/record/EncoderChoice.h"
#include "tools/record/Fragmenter.h"
#include "tools/record/Handles.h"
#include "tools/record/PictureFitter.h"

#include <gst/app/app.h>

#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <string>

namespace qivo::record {

/** Encodes received pictures as H.264, all of one shape. Thread: one, apart from `problem`. */
class PictureEncoder {
  public:
    /** Both are called on a thread of the encoder's, in order; they may wait, which holds the encoder up. */
    struct Calls {
        std::function<void(PictureFormat)> format; ///< once, before the first picture
        std::function<void(CodedPicture)> picture;
    };

    /** Null, with the reason, if that encoder cannot be started. */
    [[nodiscard]] static std::unique_ptr<PictureEncoder>
    create(const PictureShape& shape, const EncoderCandidate& encoder, Calls calls, std::string& problem);
    ~PictureEncoder();
    PictureEncoder(const PictureEncoder&) = delete;
    PictureEncoder& operator=(const PictureEncoder&) = delete;

    /** What becomes of a picture. */
    enum class Taken {
        yes,
        behind,    ///< left out, since the encoder is so far behind
        unreadable ///< left out, since it is in no form that can be read
    };
    /** Takes a picture that belongs at that time, later than the one before. The frame can be given back after. */
    [[nodiscard]] Taken encode(const QIVOlib_video_frame_v2_t& frame, Nanoseconds time);
    /** Waits until all that was taken has been handed on, but not longer than `limit` plus what a picture that is
     *  being handed on waits for the disk. Nothing is encoded or handed on after. How many pictures were taken and
     *  will not be handed on. */
    std::uint64_t finish(Nanoseconds limit);

    /** The name of the encoder's element. */
    [[nodiscard]] const std::string& element() const { return m_element; }
    /** Why encoding has ended by itself; empty if it has not. Thread: any. */
    [[nodiscard]] std::string problem() const;

  private:
    struct Callbacks;

    PictureEncoder(const PictureShape& shape, Calls calls);
    [[nodiscard]] bool start(const EncoderCandidate& encoder);
    void noteFailure(GstMessage* message) const;
    void handOn(GstSample* sample);
    void handOnFormat(GstSample* sample);

    const PictureShape m_shape;
    const Calls m_calls;
    std::string m_element;
    PictureFitter m_fitter;
    bool m_formatKnown = false; // appsink's thread only
    bool m_running = false;
    std::uint64_t m_taken = 0;
    std::mutex m_handing; // held while a picture is handed on; protects the next two
    std::uint64_t m_handedOn = 0;
    bool m_ended = false;          // nothing is handed on any more
    mutable std::mutex m_mutex;    // protects the next
    mutable std::string m_problem; // the bus tells it once
    Media<GstElement> m_pipeline;
    Media<GstElement> m_in;
    Media<GstElement> m_out;
};

} // namespace qivo::record
