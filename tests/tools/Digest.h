#pragma once

#include <string>

namespace qivo::test {

/// What a client says when it logs in by digest; each field can be spoilt.
struct DigestAnswer {
    std::string user = "ada";
    std::string password = "secret:1";
    std::string nonce;
    std::string count = "00000001";
    std::string method = "GET";
    std::string uri = "/page";
    std::string realm = "qivo-publish";

    /// The value of an Authorization header; without a count in the older form that RTSP uses.
    [[nodiscard]] std::string header() const;
};

/// The nonce in a challenge; empty if there is none.
std::string nonceIn(const std::string& challenge);

} // namespace qivo::test
