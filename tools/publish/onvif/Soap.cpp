#include "tools/publish/onvif/Soap.h"

#include <algorithm>

namespace qivo {
namespace {

constexpr const char* oldSoapSpace = "http://schemas.xmlsoap.org/soap/envelope/";

constexpr const char* envelopeStart =
    R"(<?xml version="1.0" encoding="UTF-8"?>)"
    R"(<env:Envelope xmlns:env="http://www.w3.org/2003/05/soap-envelope")"
    R"( xmlns:ter="http://www.onvif.org/ver10/error" xmlns:tt="http://www.onvif.org/ver10/schema")"
    R"( xmlns:tds="http://www.onvif.org/ver10/device/wsdl" xmlns:trt="http://www.onvif.org/ver10/media/wsdl")"
    R"( xmlns:tptz="http://www.onvif.org/ver20/ptz/wsdl" xmlns:timg="http://www.onvif.org/ver20/imaging/wsdl")"
    R"( xmlns:dn="http://www.onvif.org/ver10/network/wsdl" xmlns:d="http://schemas.xmlsoap.org/ws/2005/04/discovery")"
    R"( xmlns:wsa="http://schemas.xmlsoap.org/ws/2004/08/addressing">)";

SoapFault malformed(const std::string& reason) {
    return {"Sender", {"WellFormed"}, reason};
}

std::string subcodeXml(const std::vector<std::string>& subcodes, std::size_t first) {
    return first == subcodes.size() ? ""
                                    : "<env:Subcode><env:Value>ter:" + subcodes[first] + "</env:Value>" +
                                          subcodeXml(subcodes, first + 1) + "</env:Subcode>";
}

} // namespace

bool SoapFault::is(const std::string& subcode) const {
    return std::find(subcodes.begin(), subcodes.end(), subcode) != subcodes.end();
}

SoapFault invalidArgument(const std::string& subcode, const std::string& reason) {
    return {"Sender", {"InvalidArgVal", subcode}, reason};
}

std::variant<SoapRequest, SoapFault> parseSoap(const std::string& text) {
    auto document = XmlDocument::parse(text);
    if (!document) {
        return malformed("The request is no XML document, is too long or has a document type.");
    }
    const XmlElement envelope = document->root();
    if (envelope.name() != "Envelope" || envelope.space() != soapSpace) {
        return envelope.space() == oldSoapSpace ? SoapFault{"VersionMismatch", {}, "SOAP 1.2 is spoken here."}
                                                : malformed("The request is no SOAP envelope.");
    }
    const XmlElement operation = envelope.child("Body").child();
    if (!operation || operation.next()) {
        return malformed("The envelope's body holds no element, or several.");
    }
    return SoapRequest{std::move(*document), envelope.child("Header"), operation};
}

std::string soapEnvelope(const std::string& body, const std::string& header) {
    const std::string head = header.empty() ? "" : "<env:Header>" + header + "</env:Header>";
    return envelopeStart + head + "<env:Body>" + body + "</env:Body></env:Envelope>";
}

std::string soapFaultEnvelope(const SoapFault& fault) {
    return soapEnvelope("<env:Fault><env:Code><env:Value>env:" + fault.code + "</env:Value>" +
                        subcodeXml(fault.subcodes, 0) + "</env:Code><env:Reason><env:Text xml:lang=\"en\">" +
                        xmlText(fault.reason) + "</env:Text></env:Reason></env:Fault>");
}

} // namespace qivo
