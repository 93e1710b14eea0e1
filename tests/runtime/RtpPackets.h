#pragma once

#include <string>

namespace qivo::test {

/// Bytes as they are on the wire, most significant first.
inline std::string big16(unsigned value) {
    return {static_cast<char>(value >> 8U & 0xffU), static_cast<char>(value & 0xffU)};
}

inline std::string big32(unsigned value) {
    return big16(value >> 16U) + big16(value & 0xffffU);
}

/// A packet as it is sent on an RTSP connection.
inline std::string interleaved(const std::string& packet, unsigned channel = 0) {
    return "$" + std::string(1, static_cast<char>(channel)) + big16(static_cast<unsigned>(packet.size())) + packet;
}

inline std::string rtp(unsigned sequence, unsigned time, const std::string& payload, unsigned type = 96,
                       bool marker = true) {
    return big16(0x8000U | (marker ? 0x80U : 0U) | type) + big16(sequence & 0xffffU) + big32(time) + big32(0x12345678) +
           payload;
}

} // namespace qivo::test
