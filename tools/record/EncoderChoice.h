#pragma once

#include "tools/record/PictureShape.h"

#include <atomic>
#include <chrono>
#include <optional>
#include <string>
#include <vector>

namespace qivo::record {

/** An H.264 encoder of GStreamer: its element and the properties it is given. */
struct EncoderCandidate {
    std::string element;
    std::string properties;
    bool hardware = false; ///< may be installed without working
};

/** All that is known, the best first; the last one runs on every machine. */
[[nodiscard]] std::vector<EncoderCandidate> encoderCandidates(const PictureShape& shape, unsigned processors);

/** Which encoder records, and why not one before it. */
struct EncoderChoice {
    std::optional<EncoderCandidate> encoder; ///< empty if there is none
    std::string passedOver; ///< what is installed without working, with the reasons; empty if nothing is
};

/** How long trying hardware may take, all of it together. */
inline constexpr std::chrono::milliseconds trialLimit{1500};

/** The first that is installed and, if it is hardware, has encoded a few pictures of that shape when asked to. Takes as
 *  long as that trial, but little longer than its limit, and ends soon after `stopped` is set: hardware that has not
 *  been tried by then is passed over. GStreamer must be initialised. */
[[nodiscard]] EncoderChoice chooseEncoder(const std::vector<EncoderCandidate>& candidates, const PictureShape& shape,
                                          const std::atomic<bool>& stopped);

/** The pipeline from an appsrc named "in" to an appsink named "out", which hands out pictures with their lengths in
 *  front. */
[[nodiscard]] std::string encoderPipeline(const EncoderCandidate& encoder);

} // namespace qivo::record
