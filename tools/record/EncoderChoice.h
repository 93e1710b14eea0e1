#pragma once

#include "tools/record/PictureShape.h"

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

/** The first that is installed and, if it is hardware, has encoded a few pictures of that shape when asked to. Null if
 * none is. Takes as long as that trial. GStreamer must be initialised. */
[[nodiscard]] const EncoderCandidate* chooseEncoder(const std::vector<EncoderCandidate>& candidates,
                                                    const PictureShape& shape);

/** The pipeline from an appsrc named "in" to an appsink named "out", which hands out pictures with their lengths in
 *  front. */
[[nodiscard]] std::string encoderPipeline(const EncoderCandidate& encoder);

} // namespace qivo::record
