#include "tools/publish/onvif/Onvif.h"

#include "tools/publish/Handles.h"
#include "tools/publish/Names.h"
#include "tools/publish/onvif/Services.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <glib.h>
#include <unistd.h>

namespace qivo {
namespace {

constexpr std::size_t maximumHostCharacters = 255;

bool isHost(std::string_view host) {
    const auto fits = [](unsigned char c) { return g_ascii_isalnum(c) || c == '.' || c == '-'; };
    return !host.empty() && host.size() <= maximumHostCharacters && std::all_of(host.begin(), host.end(), fits);
}

int statusOf(const SoapFault& fault) {
    return fault.code == "Receiver" ? 500 : 400;
}

OnvifAnswer answerOf(const SoapFault& fault) {
    return {statusOf(fault), soapFaultEnvelope(fault)};
}

// An operation, and the service that it belongs to.
struct Found {
    const OnvifService* service = nullptr;
    const OnvifOperation* operation = nullptr;
};

Found operationFor(const XmlElement& element) {
    for (const OnvifService& service : onvifServices()) {
        for (std::size_t i = 0; service.space == element.space() && i < service.count; ++i) {
            if (service.first[i].name == element.name()) {
                return {&service, &service.first[i]};
            }
        }
    }
    return {};
}

std::string responseXml(const Found& found, const std::string& content) {
    const std::string name = std::string(found.service->prefix) + ":" + std::string(found.operation->name) + "Response";
    return "<" + name + ">" + content + "</" + name + ">";
}

} // namespace

std::string OnvifCamera::uuid() const {
    std::array<char, 256> host{};
    gethostname(host.data(), host.size() - 1);
    const std::string seed = std::string(host.data()) + '\0' + instanceName(machine, source);
    const Text digest(
        g_compute_checksum_for_data(G_CHECKSUM_SHA1, reinterpret_cast<const guchar*>(seed.data()), seed.size()));
    std::string uuid = std::string(digest.get()).substr(0, 32);
    uuid[12] = '5'; // made of a name
    uuid[16] = 'a'; // as RFC 4122 has it
    for (const std::size_t dash : {8U, 13U, 18U, 23U}) {
        uuid.insert(dash, "-");
    }
    return uuid;
}

const OnvifStream* OnvifCamera::stream(const std::string& token) const {
    const auto found =
        std::find_if(streams.begin(), streams.end(), [&](const OnvifStream& stream) { return stream.token == token; });
    return found != streams.end() ? &*found : nullptr;
}

OnvifPlace placeOf(const std::string& hostHeader, const std::string& localAddress, int localPort) {
    const std::size_t colon = hostHeader.find(':');
    const std::string host = hostHeader.substr(0, colon);
    if (!isHost(host)) {
        return {localAddress, localPort};
    }
    int port = localPort;
    if (colon != std::string::npos) {
        const char* const end = hostHeader.data() + hostHeader.size();
        const auto [rest, error] = std::from_chars(hostHeader.data() + colon + 1, end, port);
        if (error != std::errc{} || rest != end || port < 1 || port > 65535) {
            return {localAddress, localPort};
        }
    }
    return {host, port};
}

std::string OnvifCall::address(std::string_view service) const {
    return "http://" + place.host + ":" + std::to_string(place.port) + camera.path + std::string(service);
}

std::optional<SoapFault> profileFault(const OnvifCall& call) {
    if (call.camera.stream(call.operation.child("ProfileToken").text()) != nullptr) {
        return std::nullopt;
    }
    return invalidArgument("NoProfile", "There is no profile of this token.");
}

std::string elementXml(const std::string& name, const std::string& text) {
    return "<" + name + ">" + xmlText(text) + "</" + name + ">";
}

const std::vector<OnvifService>& onvifServices() {
    static const std::vector<OnvifService> services{deviceService(), mediaService(), ptzService(), imagingService()};
    return services;
}

OnvifDevice::OnvifDevice(OnvifCamera camera, std::shared_ptr<UsernameTokens> tokens)
    : m_camera(std::move(camera)), m_tokens(std::move(tokens)) {}

OnvifAnswer OnvifDevice::answer(const std::string& text, const OnvifPlace& place, bool authenticated) const {
    const auto parsed = parseSoap(text);
    if (const auto* fault = std::get_if<SoapFault>(&parsed)) {
        return answerOf(*fault);
    }
    const auto& request = std::get<SoapRequest>(parsed);
    const Found found = operationFor(request.operation);
    const bool open = found.operation != nullptr && found.operation->open;
    const bool question = request.operation.name().substr(0, 3) == "Get";
    if (m_tokens && !open && !authenticated && !m_tokens->accepts(request.header, question)) {
        const bool tried = static_cast<bool>(request.header.child("Security"));
        return {tried ? 400 : 401,
                soapFaultEnvelope({"Sender", {"NotAuthorized"}, "Sender not authorized: a login is needed."}), !tried};
    }
    if (found.operation == nullptr) {
        return answerOf(SoapFault{"Receiver", {"ActionNotSupported"}, "This operation is not there."});
    }
    const OnvifResult result = found.operation->run({m_camera, place, request.operation});
    const auto* fault = std::get_if<SoapFault>(&result);
    return fault != nullptr ? answerOf(*fault)
                            : OnvifAnswer{200, soapEnvelope(responseXml(found, std::get<std::string>(result)))};
}

} // namespace qivo
