#pragma once

#include "runtime/GstHandles.h"

#include <cstdint>
#include <vector>

namespace qivo::runtime {

/// Null if there is none, which is logged. The reference is floating.
GstElement* makeElement(const char* factory);

/// Lets through what the caps say.
GstElement* makeFilter(GstCaps* caps);

/// Takes everything the moment that it comes and keeps nothing: whoever wants the data looks at it on the sink's pad.
GstElement* makeSink();

/// Puts the elements into the bin, one behind the other behind the pad, in the state of the bin. False if one of them
/// is null or they do not fit; they are the bin's all the same.
bool appendChain(GstBin* bin, GstPad* pad, const std::vector<GstElement*>& chain);

/// Calls for everything that arrives at the element. `mask` says of what kind.
void watchInput(GstElement* element, GstPadProbeType mask, GstPadProbeCallback call, gpointer data);

/// Buffers and lists of them.
inline constexpr auto kDataProbe =
    static_cast<GstPadProbeType>(GST_PAD_PROBE_TYPE_BUFFER | GST_PAD_PROBE_TYPE_BUFFER_LIST); // NOLINT

/// The time since the stream's beginning, in units of 100 ns; 0 if there is none.
std::int64_t timecodeOf(GstBuffer* buffer, const GstSegment* segment);

/// Units of 100 ns since the Unix epoch.
std::int64_t wallClock();

} // namespace qivo::runtime
