#pragma once

#include <gst/audio/audio.h>

#include <cstddef>
#include <vector>

namespace qivo::runtime {

/// Whose order the channels of decoded sound are in, which is not always that of the stream: GStreamer sorts channels
/// by their places.
enum class ChannelOrder {
    decoder, ///< GStreamer's, sorted by places
    stream,  ///< the stream's
    opus,    ///< GStreamer's, where the stream has the one that RFC 7845 gives in 5.1.1.2
};

/// Keeps an L16 or L24 depayloader, before it gets its first caps, from sorting the channels. Packets that end within a
/// sample are dropped.
void leaveUnsorted(GstElement* depayloader);

/// The same sound with its channels as an Opus stream has them. Interleaved, `count` floats in all. Sound whose places
/// are not those of Opus stays as it is.
std::vector<float> inOpusOrder(const float* samples, std::size_t count, const GstAudioInfo& info);

} // namespace qivo::runtime
