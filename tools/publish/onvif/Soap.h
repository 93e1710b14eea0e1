#pragma once

#include "tools/publish/onvif/Xml.h"

#include <optional>
#include <string>
#include <variant>
#include <vector>

namespace qivo {

inline constexpr const char* soapSpace = "http://www.w3.org/2003/05/soap-envelope";

/** Why a request is not followed, in the words of SOAP 1.2 and ONVIF. */
struct SoapFault {
    std::string code;                  ///< "Sender", "Receiver", "VersionMismatch" or "MustUnderstand"
    std::vector<std::string> subcodes; ///< ONVIF's, from wide to narrow, for instance "InvalidArgVal", "NoProfile"
    std::string reason;                ///< one English sentence

    [[nodiscard]] bool is(const std::string& subcode) const;
};

/** "Sender" with ONVIF's "InvalidArgVal" and what exactly is wrong. */
[[nodiscard]] SoapFault invalidArgument(const std::string& subcode, const std::string& reason);

/** A SOAP 1.2 request. */
struct SoapRequest {
    XmlDocument document;
    XmlElement header;    ///< may be nothing
    XmlElement operation; ///< the only element of the body
};

/** Reads an envelope of bounded size without a document type. */
[[nodiscard]] std::variant<SoapRequest, SoapFault> parseSoap(const std::string& text);

/** An envelope around the XML of a body. */
[[nodiscard]] std::string soapEnvelope(const std::string& body, const std::string& header = {});

/** The envelope of a fault. */
[[nodiscard]] std::string soapFaultEnvelope(const SoapFault& fault);

} // namespace qivo
