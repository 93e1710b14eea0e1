#pragma once

#include <string>
#include <string_view>

namespace qivo::runtime {

/// One request to an ONVIF service.
struct SoapMessage {
    std::string action; ///< URI of the operation
    std::string body;   ///< what stands in the envelope's body
    bool open = false;  ///< is sent without a login
};

/// The whole XML document. `header` is what stands in the envelope's header; empty for none.
std::string envelope(const SoapMessage& message, std::string_view header);

/// The text with what XML reserves escaped, and without the characters that XML cannot hold.
std::string xmlText(std::string_view text);

} // namespace qivo::runtime
