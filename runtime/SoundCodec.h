#pragma once

#include "runtime/ChannelOrder.h"

#include <gst/gst.h>

#include <string>

namespace qivo::runtime {

/// How a payload becomes samples. The parser and the decoder may be null.
struct SoundCodec {
    const char* encoding;
    const char* depayloader;
    const char* parser;
    const char* decoder;
    bool described; ///< the rate and the channels are what the server says of the payload
    ChannelOrder order;
};

/// Null if sound of this encoding, named in capitals as in SDP, is not received.
const SoundCodec* soundCodecFor(const std::string& encoding);

/// The name of the payload's encoding as SDP has it, in capitals, also for a payload type that needs no mapping.
std::string encodingOf(const GstStructure* rtp);

/// What the encoding's parameters say of the channels, one where they say nothing; 0 where they make no sense.
int describedChannels(const GstStructure* rtp);

/// Why sound that is so described is not received, for the log; empty if it is, as far as the description tells.
std::string soundProblem(const GstStructure* rtp);

/// The same of a rate and a number of channels.
std::string soundProblem(int rate, int channels);

} // namespace qivo::runtime
