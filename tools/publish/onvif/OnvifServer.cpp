#include "tools/publish/onvif/OnvifServer.h"

namespace qivo {
namespace {

constexpr const char* soapType = "application/soap+xml; charset=utf-8";

// A browser names the page whose script asks; the services are for programs, not for the scripts of any page that
// somebody on this network looks at.
HttpResponse refusalOfPages() {
    return {403, soapType, soapFaultEnvelope({"Sender", {"NotAuthorized"}, "Pages are not answered."}), {}};
}

HttpResponse responseTo(const OnvifDevice& device, const HttpRequest& request, HttpLogin* login) {
    if (!request.header("Origin").empty()) {
        return refusalOfPages();
    }
    const OnvifPlace place = placeOf(request.header("Host"), request.localAddress, request.localPort);
    const auto verdict = login != nullptr ? login->check(request) : HttpLogin::Verdict::accepted;
    OnvifAnswer answer = device.answer(request.body, place, verdict == HttpLogin::Verdict::accepted);
    HttpResponse response{answer.status, {}, {}, {}};
    if (answer.challenge && login != nullptr) {
        response = login->challenge(verdict);
    }
    response.contentType = soapType;
    response.body = std::move(answer.body);
    return response;
}

} // namespace

OnvifServer::OnvifServer(HttpServer& http, std::vector<OnvifCamera> cameras, const std::shared_ptr<HttpLogin>& login)
    : m_http(http) {
    // One memory of tokens for all, so that none is good at two cameras.
    const auto tokens = login ? std::make_shared<UsernameTokens>(login->login()) : nullptr;
    for (OnvifCamera& camera : cameras) {
        const auto device = std::make_shared<OnvifDevice>(std::move(camera), tokens);
        for (const OnvifService& service : onvifServices()) {
            http.route("POST", device->camera().path + std::string(service.name),
                       [device, login](const HttpRequest& request, HttpReply reply) {
                           reply.send(responseTo(*device, request, login.get()));
                       });
        }
        m_devices.push_back(device);
    }
}

std::string OnvifServer::announce(bool loopbackOnly) {
    std::vector<const OnvifCamera*> cameras;
    for (const auto& device : m_devices) {
        cameras.push_back(&device->camera());
    }
    m_discovery = std::make_unique<WsDiscovery>(std::move(cameras), m_http.port(), loopbackOnly);
    return m_discovery->start();
}

} // namespace qivo
