#pragma once

#include "runtime/SoapReply.h"

#include <chrono>
#include <optional>
#include <string>
#include <vector>

/// What ONVIF services answer, as far as steering needs it. Everything is bounded; what is unusable is left out.
namespace qivo::runtime::onvif {

/// Entries of any list that are looked at.
inline constexpr std::size_t kMostEntries = 256;

/// Addresses of services; empty where the device has none.
struct Services {
    std::string media;
    std::string ptz;
    std::string imaging;

    bool operator==(const Services&) const = default;
};

struct Profile {
    std::string token;
    std::string videoSource; ///< token of the source of its pictures; empty if it has none
    std::string node;        ///< token of its PTZ node; empty if it is not to be steered
};

/// What a PTZ node can do.
struct Node {
    std::string token;
    bool panTilt = true;
    bool zoom = true;
    bool speeds = false; ///< takes a speed with a preset

    bool operator==(const Node&) const = default;
};

struct Preset {
    std::string token;
    std::string name;
};

struct Range {
    float least = 0;
    float most = 1;

    bool operator==(const Range&) const = default;
};

/// The device's UTC clock.
std::optional<std::chrono::system_clock::time_point> clockOf(const SoapReply& reply);
/// From the answer to GetCapabilities or GetServices.
Services servicesOf(const SoapReply& reply);
std::vector<Profile> profilesOf(const SoapReply& reply);
std::string streamOf(const SoapReply& reply);
std::vector<Node> nodesOf(const SoapReply& reply);
std::vector<Preset> presetsOf(const SoapReply& reply);
/// The token that SetPreset answered; empty if there is none.
std::string presetOf(const SoapReply& reply);
/// The positions of the focus, from near to far; nothing if it cannot be put anywhere.
std::optional<Range> focusOf(const SoapReply& reply);

/// The profile by which the source with these stream URLs is steered.
///
/// `paths` are the stream URLs of the profiles, in their order, empty where not known. The profile whose stream is one
/// of the source's tells the video source; of the profiles of that video source the first that can be steered counts,
/// the matching one before others. Where none matches and `single` allows it, a device with only one video source is
/// taken to be the camera. Null if there is none.
const Profile* steeredProfile(const std::vector<Profile>& profiles, const std::vector<std::string>& paths,
                              const std::vector<std::string>& streams, bool single);

} // namespace qivo::runtime::onvif
