#include "tools/publish/onvif/OnvifServer.h"

namespace qivo {
namespace {

HttpResponse responseTo(const OnvifDevice& device, const HttpRequest& request) {
    const OnvifPlace place = placeOf(request.header("Host"), request.localAddress, request.localPort);
    OnvifAnswer answer = device.answer(request.body, place, false);
    return {answer.status, "application/soap+xml; charset=utf-8", std::move(answer.body), {}};
}

} // namespace

OnvifServer::OnvifServer(HttpServer& http, std::vector<OnvifCamera> cameras) : m_http(http) {
    for (OnvifCamera& camera : cameras) {
        const auto device = std::make_shared<OnvifDevice>(std::move(camera), nullptr);
        for (const OnvifService& service : onvifServices()) {
            http.route(
                "POST", device->camera().path + std::string(service.name),
                [device](const HttpRequest& request, HttpReply reply) { reply.send(responseTo(*device, request)); });
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
