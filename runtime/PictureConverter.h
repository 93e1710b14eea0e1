#pragma once

#include <gst/gst.h>

namespace qivo::runtime {

/// An element that converts decoded pictures as videoconvert does, whose properties and caps it has. What decoders
/// bring of nearly all sources, progressive pictures of 8 bits whose rows share colour differences between two
/// neighbours, it turns to RGBA in a fraction of videoconvert's time where the processor has AVX2. Floating; null and a
/// line in the log if videoconvert is missing.
GstElement* makePictureConverter();

} // namespace qivo::runtime
