#include "tools/publish/onvif/OnvifServer.h"

namespace qivo {
namespace {

HttpResponse responseTo(const OnvifDevice& device, const HttpRequest& request, HttpLogin* login) {
    const OnvifPlace place = placeOf(request.header("Host"), request.localAddress, request.localPort);
    const auto verdict = login != nullptr ? login->check(request) : HttpLogin::Verdict::accepted;
    OnvifAnswer answer = device.answer(request.body, place, verdict == HttpLogin::Verdict::accepted);
    HttpResponse response{answer.status, {}, {}, {}};
    if (answer.challenge && login != nullptr) {
        response = login->challenge(verdict);
    }
    response.contentType = "application/soap+xml; charset=utf-8";
    response.body = std::move(answer.body);
    return response;
}

} // namespace

OnvifServer::OnvifServer(HttpServer& http, std::vector<OnvifCamera> cameras, const std::shared_ptr<HttpLogin>& login)
    : m_http(http) {
    // One memory of tokens for all, so that none is good at two cameras.
    const auto tokens =
        login ? std::make_shared<UsernameTokens>(login->login().user, login->login().password) : nullptr;
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
