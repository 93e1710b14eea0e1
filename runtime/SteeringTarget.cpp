#include "runtime/SteeringTarget.h"

#include "runtime/Log.h"

#include <algorithm>

namespace qivo::runtime {
namespace {

std::vector<std::string> streamsOf(const Request& request, const std::optional<Announcement>& announcement) {
    std::vector<std::string> streams;
    for (const std::string& url :
         announcement ? std::vector{announcement->url, announcement->lowUrl} : std::vector{request.url}) {
        if (!url.empty()) {
            streams.push_back(withoutLogins(url));
        }
    }
    return streams;
}

/// The address itself may carry a login; otherwise it is the one of the URL that was asked for, for that URL's host.
void takeLogin(SteeringTarget& target, const UrlParts& device, const Request& request) {
    const auto asked = urlParts(request.url);
    if (device.login) {
        target.login = device.login;
        target.loginHost = device.host;
    } else if (asked && asked->login) {
        target.login = asked->login;
        target.loginHost = asked->host;
    }
}

} // namespace

bool SteeringTarget::admits(const std::string& url) const {
    const auto parts = urlParts(url);
    return parts && (parts->scheme == "http" || parts->scheme == "https") &&
           std::any_of(hosts.begin(), hosts.end(), [&](const auto& host) { return sameHost(host, parts->host); });
}

std::optional<SteeringTarget> steeringTarget(const Request& request, const std::optional<Announcement>& announcement,
                                             bool guess) {
    const auto source = urlParts(announcement ? announcement->url : request.url);
    if (!source) {
        return std::nullopt;
    }
    SteeringTarget target;
    target.announced = announcement && !announcement->onvif.empty();
    auto device = target.announced ? urlParts(announcement->onvif)
                                   : std::optional(UrlParts{"http", {}, source->host, 0, kUsualDeviceService});
    if (!device || (!target.announced && !guess)) {
        return std::nullopt;
    }
    target.device = urlOf(*device);
    target.hosts = {source->host};
    if (!sameHost(device->host, source->host)) {
        target.hosts.push_back(device->host);
    }
    target.streams = streamsOf(request, announcement);
    takeLogin(target, *device, request);
    return target;
}

} // namespace qivo::runtime
