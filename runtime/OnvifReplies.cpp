#include "runtime/OnvifReplies.h"

#include "runtime/UrlParts.h"

#include <algorithm>
#include <array>
#include <ctime>

namespace qivo::runtime::onvif {
namespace {

/// Years for which a clock is believed.
constexpr int kFirstYear = 1970;
constexpr int kLastYear = 2200;

bool readParts(const XmlElement& element, const std::array<const char*, 3>& names, std::array<int, 3>& parts) {
    for (std::size_t i = 0; i < names.size(); ++i) {
        const auto number = element.child(names.at(i)).number();
        if (!number || *number < 0 || *number > kLastYear) {
            return false;
        }
        parts.at(i) = static_cast<int>(*number);
    }
    return true;
}

/// The service that a namespace belongs to, whatever its version.
std::string* serviceOf(Services& services, const std::string& space) {
    const auto names = [&space](const char* part) { return space.find(part) != std::string::npos; };
    return names("/ver10/media/") ? &services.media
           : names("/ptz/")       ? &services.ptz
           : names("/imaging/")   ? &services.imaging
                                  : nullptr;
}

std::vector<XmlElement> bounded(std::vector<XmlElement> elements) {
    elements.resize(std::min(elements.size(), kMostEntries));
    return elements;
}

bool samePath(const std::string& one, const std::string& other, bool withQuery) {
    const auto first = urlParts(one);
    const auto second = urlParts(other);
    if (!first || !second) {
        return false;
    }
    const auto end = [withQuery](const std::string& path) { return withQuery ? path.size() : path.find('?'); };
    return first->path.substr(0, end(first->path)) == second->path.substr(0, end(second->path));
}

/// The profile whose stream is one of the source's. Without queries only if no other video source has that path.
const Profile* matching(const std::vector<Profile>& profiles, const std::vector<std::string>& paths,
                        const std::vector<std::string>& streams, bool withQuery) {
    const Profile* found = nullptr;
    for (std::size_t i = 0; i < std::min(profiles.size(), paths.size()); ++i) {
        const bool same = std::any_of(streams.begin(), streams.end(),
                                      [&](const auto& stream) { return samePath(stream, paths[i], withQuery); });
        if (!same) {
            continue;
        }
        if (found != nullptr && found->videoSource != profiles[i].videoSource) {
            return nullptr;
        }
        found = found != nullptr && !found->node.empty() ? found : &profiles[i];
    }
    return found;
}

bool oneVideoSource(const std::vector<Profile>& profiles) {
    return std::all_of(profiles.begin(), profiles.end(),
                       [&](const Profile& profile) { return profile.videoSource == profiles.front().videoSource; });
}

} // namespace

std::optional<std::chrono::system_clock::time_point> clockOf(const SoapReply& reply) {
    const XmlElement utc = reply.content().at({"SystemDateAndTime", "UTCDateTime"});
    std::array<int, 3> date{};
    std::array<int, 3> time{};
    if (!readParts(utc.child("Date"), {"Year", "Month", "Day"}, date) ||
        !readParts(utc.child("Time"), {"Hour", "Minute", "Second"}, time) || date[0] < kFirstYear) {
        return std::nullopt;
    }
    std::tm parts{};
    parts.tm_year = date[0] - 1900;
    parts.tm_mon = date[1] - 1;
    parts.tm_mday = date[2];
    parts.tm_hour = time[0];
    parts.tm_min = time[1];
    parts.tm_sec = time[2];
    return std::chrono::system_clock::from_time_t(timegm(&parts));
}

Services servicesOf(const SoapReply& reply) {
    Services services;
    const XmlElement content = reply.content();
    const XmlElement capabilities = content.child("Capabilities");
    services.media = capabilities.at({"Media", "XAddr"}).text();
    services.ptz = capabilities.at({"PTZ", "XAddr"}).text();
    services.imaging = capabilities.at({"Imaging", "XAddr"}).text();
    for (const XmlElement& service : bounded(content.children("Service"))) {
        std::string* address = serviceOf(services, service.child("Namespace").text());
        if (address != nullptr && address->empty()) {
            *address = service.child("XAddr").text();
        }
    }
    return services;
}

std::vector<Profile> profilesOf(const SoapReply& reply) {
    std::vector<Profile> profiles;
    for (const XmlElement& element : bounded(reply.content().children("Profiles"))) {
        Profile profile{element.attribute("token"), element.at({"VideoSourceConfiguration", "SourceToken"}).text(),
                        element.at({"PTZConfiguration", "NodeToken"}).text()};
        if (!profile.token.empty()) {
            profiles.push_back(std::move(profile));
        }
    }
    return profiles;
}

std::string streamOf(const SoapReply& reply) {
    return reply.content().at({"MediaUri", "Uri"}).text();
}

std::vector<Node> nodesOf(const SoapReply& reply) {
    std::vector<Node> nodes;
    for (const XmlElement& element : bounded(reply.content().children("PTZNode"))) {
        Node node{element.attribute("token")};
        if (const XmlElement spaces = element.child("SupportedPTZSpaces")) {
            node.panTilt = static_cast<bool>(spaces.child("ContinuousPanTiltVelocitySpace"));
            node.zoom = static_cast<bool>(spaces.child("ContinuousZoomVelocitySpace"));
            node.speeds = spaces.child("PanTiltSpeedSpace") && spaces.child("ZoomSpeedSpace");
        }
        nodes.push_back(std::move(node));
    }
    return nodes;
}

std::vector<Preset> presetsOf(const SoapReply& reply) {
    std::vector<Preset> presets;
    for (const XmlElement& element : bounded(reply.content().children("Preset"))) {
        Preset preset{element.attribute("token"), element.child("Name").text()};
        if (!preset.token.empty()) {
            presets.push_back(std::move(preset));
        }
    }
    return presets;
}

std::string presetOf(const SoapReply& reply) {
    return reply.content().child("PresetToken").text();
}

std::optional<Range> focusOf(const SoapReply& reply) {
    const XmlElement position = reply.content().at({"MoveOptions", "Absolute", "Position"});
    const auto least = position.child("Min").number();
    const auto most = position.child("Max").number();
    return least && most && *least < *most ? std::optional(Range{*least, *most}) : std::nullopt;
}

const Profile* steeredProfile(const std::vector<Profile>& profiles, const std::vector<std::string>& paths,
                              const std::vector<std::string>& streams, bool single) {
    const Profile* match = matching(profiles, paths, streams, true);
    match = match != nullptr ? match : matching(profiles, paths, streams, false);
    if (match == nullptr && (!single || !oneVideoSource(profiles))) {
        return nullptr;
    }
    if (match != nullptr && (!match->node.empty() || match->videoSource.empty())) {
        return match->node.empty() ? nullptr : match;
    }
    const auto found = std::find_if(profiles.begin(), profiles.end(), [&](const Profile& profile) {
        return !profile.node.empty() && (match == nullptr || profile.videoSource == match->videoSource);
    });
    return found != profiles.end() ? &*found : nullptr;
}

} // namespace qivo::runtime::onvif
