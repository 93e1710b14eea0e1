#include "tools/publish/onvif/Discovery.h"

#include "tools/publish/Handles.h"
#include "tools/publish/onvif/Scopes.h"
#include "tools/publish/onvif/Services.h"

#include <algorithm>
#include <ctime>
#include <sstream>

namespace qivo {
namespace {

constexpr const char* discoverySpace = "http://schemas.xmlsoap.org/ws/2005/04/discovery";
constexpr const char* networkSpace = "http://www.onvif.org/ver10/network/wsdl";
constexpr const char* anonymous = "http://schemas.xmlsoap.org/ws/2004/08/addressing/role/anonymous";
constexpr const char* everybody = "urn:schemas-xmlsoap-org:ws:2005:04:discovery";
constexpr const char* types = "<d:Types>dn:NetworkVideoTransmitter tds:Device</d:Types>";

std::vector<std::string> words(const std::string& text) {
    std::istringstream stream(text);
    std::vector<std::string> found;
    for (std::string word; stream >> word;) {
        found.push_back(word);
    }
    return found;
}

// A type is a name with a prefix, whose namespace counts.
bool isType(XmlElement element, const std::string& type) {
    const std::size_t colon = type.find(':');
    const std::string prefix = colon == std::string::npos ? "" : type.substr(0, colon);
    const std::string name = colon == std::string::npos ? type : type.substr(colon + 1);
    const auto space = element.spaceOf(prefix);
    return (name == "NetworkVideoTransmitter" && space == networkSpace) || (name == "Device" && space == deviceSpace);
}

// By whole steps of the path; where it is asked for, the whole scope.
bool inScope(const std::vector<std::string>& scopes, std::string wanted, bool exact) {
    if (!exact && !wanted.empty() && wanted.back() == '/') {
        wanted.pop_back();
    }
    return std::any_of(scopes.begin(), scopes.end(), [&](const std::string& scope) {
        return scope == wanted || (!exact && scope.compare(0, wanted.size() + 1, wanted + "/") == 0);
    });
}

bool looksFor(XmlElement probe, const OnvifCamera& camera) {
    const XmlElement typesElement = probe.child("Types");
    const auto wantedTypes = words(typesElement.text());
    const XmlElement scopesElement = probe.child("Scopes");
    const auto wantedScopes = words(scopesElement.text());
    const std::string rule = scopesElement.attribute("MatchBy").value_or("");
    const bool exact = rule == std::string(discoverySpace) + "/strcmp0";
    const bool known = rule.empty() || exact || rule == std::string(discoverySpace) + "/rfc2396";
    const auto scopes = scopesOf(camera);
    return std::all_of(wantedTypes.begin(), wantedTypes.end(),
                       [&](const std::string& type) { return isType(typesElement, type); }) &&
           (known || wantedScopes.empty()) &&
           std::all_of(wantedScopes.begin(), wantedScopes.end(),
                       [&](const std::string& scope) { return inScope(scopes, scope, exact); });
}

std::string endpointXml(const OnvifCamera& camera) {
    return "<wsa:EndpointReference>" + elementXml("wsa:Address", "urn:uuid:" + camera.uuid()) +
           "</wsa:EndpointReference>";
}

std::string descriptionXml(const OnvifCamera& camera, const OnvifPlace& place) {
    std::string scopes;
    for (const std::string& scope : scopesOf(camera)) {
        scopes += (scopes.empty() ? "" : " ") + scope;
    }
    const OnvifCall call{camera, place, {}};
    return endpointXml(camera) + types + elementXml("d:Scopes", scopes) +
           elementXml("d:XAddrs", call.address("device_service")) + "<d:MetadataVersion>1</d:MetadataVersion>";
}

} // namespace

DiscoveryMessages::DiscoveryMessages() : m_instance(std::time(nullptr)) {}

std::string DiscoveryMessages::header(const std::string& action, const std::string& to, const std::string& relatesTo) {
    const Text id(g_uuid_string_random());
    return elementXml("wsa:MessageID", std::string("urn:uuid:") + id.get()) +
           (relatesTo.empty() ? "" : elementXml("wsa:RelatesTo", relatesTo)) + elementXml("wsa:To", to) +
           elementXml("wsa:Action", std::string(discoverySpace) + "/" + action) + "<d:AppSequence InstanceId=\"" +
           std::to_string(m_instance) + "\" MessageNumber=\"" + std::to_string(++m_number) + "\"/>";
}

std::vector<std::string> DiscoveryMessages::answers(const std::string& datagram,
                                                    const std::vector<const OnvifCamera*>& cameras,
                                                    const OnvifPlace& place) {
    const auto parsed = parseSoap(datagram);
    const auto* request = std::get_if<SoapRequest>(&parsed);
    if (request == nullptr || request->operation.name() != "Probe" || request->operation.space() != discoverySpace) {
        return {};
    }
    const std::string id = request->header.child("MessageID").text();
    const std::string replyTo = request->header.child("ReplyTo").child("Address").text();
    std::vector<std::string> found;
    for (const OnvifCamera* camera : cameras) {
        if (looksFor(request->operation, *camera)) {
            found.push_back(soapEnvelope("<d:ProbeMatches><d:ProbeMatch>" + descriptionXml(*camera, place) +
                                             "</d:ProbeMatch></d:ProbeMatches>",
                                         header("ProbeMatches", replyTo.empty() ? anonymous : replyTo, id)));
        }
    }
    return found;
}

std::string DiscoveryMessages::hello(const OnvifCamera& camera, const OnvifPlace& place) {
    return soapEnvelope("<d:Hello>" + descriptionXml(camera, place) + "</d:Hello>", header("Hello", everybody));
}

std::string DiscoveryMessages::bye(const OnvifCamera& camera) {
    return soapEnvelope("<d:Bye>" + endpointXml(camera) + "</d:Bye>", header("Bye", everybody));
}

} // namespace qivo
