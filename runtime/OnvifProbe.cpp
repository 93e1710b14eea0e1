#include "runtime/OnvifProbe.h"

#include "runtime/LogOnce.h"
#include "runtime/OnvifMessages.h"

#include <algorithm>
#include <utility>

namespace qivo::runtime {
namespace {

/// Profiles whose stream is asked for.
constexpr std::size_t kMostStreams = 32;

} // namespace

bool OnvifCamera::isLike(const OnvifCamera& other) const {
    return services == other.services && profile == other.profile && videoSource == other.videoSource &&
           node == other.node && imaging == other.imaging && focus == other.focus;
}

OnvifProbe::OnvifProbe(SoapClient& client, const SteeringTarget& target, std::function<bool()> ended)
    : m_client(client), m_target(target), m_ended(std::move(ended)) {}

OnvifProbe::Result OnvifProbe::run() {
    if (readClock() && readServices() && readProfile() && readNode()) {
        readPresets();
        readFocus();
        m_result.camera = std::move(m_camera);
    }
    return std::move(m_result);
}

SoapClient::Answer OnvifProbe::ask(const std::string& url, const SoapMessage& message) {
    SoapClient::Answer answer = m_client.ask(url, message, kStepLimit, m_ended);
    // A web server whose services have not started yet answers too, but not in their language.
    m_result.answered = m_result.answered || answer.reply || (answer.status >= 400 && answer.status < 500);
    return answer;
}

bool OnvifProbe::fail(std::string reason) {
    m_result.reason = std::move(reason);
    return false;
}

bool OnvifProbe::readClock() {
    const auto answer = ask(m_target.device, onvif::getSystemDateAndTime());
    if (answer.status == 0) {
        return fail(answer.failure);
    }
    m_client.takeClock(answer);
    return true;
}

/// Forgets the address of a service that is on a host which nobody but the device names.
void OnvifProbe::admit(std::string& address, const char* service) {
    if (!address.empty() && !m_target.admits(address)) {
        logOnce(m_target.device + ": its " + service + " service " + address + " is on another host and not asked");
        address.clear();
    }
}

bool OnvifProbe::readServices() {
    auto answer = ask(m_target.device, onvif::getCapabilities());
    onvif::Services services = answer.reply ? onvif::servicesOf(*answer.reply) : onvif::Services{};
    if (services.ptz.empty() || services.media.empty()) {
        auto other = ask(m_target.device, onvif::getServices());
        services = other.reply ? onvif::servicesOf(*other.reply) : services;
        answer.failure = other.failure.empty() ? "" : answer.failure;
    }
    admit(services.media, "media");
    admit(services.ptz, "PTZ");
    admit(services.imaging, "imaging");
    m_camera.services = services;
    if (services.ptz.empty() || services.media.empty()) {
        return fail(answer.accepted() ? "it offers no PTZ service that may be asked" : answer.failure);
    }
    return true;
}

std::vector<std::string> OnvifProbe::streamsOf(const std::vector<onvif::Profile>& profiles) {
    std::vector<std::string> streams;
    for (std::size_t i = 0; i < std::min(profiles.size(), kMostStreams) && !m_ended(); ++i) {
        const auto answer = ask(m_camera.services.media, onvif::getStreamUri(profiles[i].token));
        streams.push_back(answer.reply ? onvif::streamOf(*answer.reply) : "");
    }
    return streams;
}

bool OnvifProbe::readProfile() {
    const auto answer = ask(m_camera.services.media, onvif::getProfiles());
    const auto profiles = answer.reply ? onvif::profilesOf(*answer.reply) : std::vector<onvif::Profile>{};
    if (profiles.empty()) {
        return fail(answer.accepted() ? "it has no profiles" : answer.failure);
    }
    const onvif::Profile* profile =
        onvif::steeredProfile(profiles, streamsOf(profiles), m_target.streams, m_target.announced);
    if (profile == nullptr) {
        return fail("it has no PTZ for this stream");
    }
    m_camera.profile = profile->token;
    m_camera.videoSource = profile->videoSource;
    m_camera.node.token = profile->node;
    return true;
}

bool OnvifProbe::readNode() {
    const auto answer = ask(m_camera.services.ptz, onvif::getNodes());
    const auto nodes = answer.reply ? onvif::nodesOf(*answer.reply) : std::vector<onvif::Node>{};
    const auto node = std::find_if(nodes.begin(), nodes.end(),
                                   [this](const onvif::Node& one) { return one.token == m_camera.node.token; });
    if (node == nodes.end()) {
        return fail(answer.accepted() ? "it has no PTZ node for this stream" : answer.failure);
    }
    m_camera.node = *node;
    return true;
}

void OnvifProbe::readPresets() {
    const auto answer = ask(m_camera.services.ptz, onvif::getPresets(m_camera.profile));
    m_camera.presets = answer.reply ? onvif::presetsOf(*answer.reply) : std::vector<onvif::Preset>{};
}

void OnvifProbe::readFocus() {
    m_camera.imaging = !m_camera.services.imaging.empty() && !m_camera.videoSource.empty();
    if (m_camera.imaging) {
        const auto answer = ask(m_camera.services.imaging, onvif::getMoveOptions(m_camera.videoSource));
        m_camera.focus = answer.reply ? onvif::focusOf(*answer.reply) : std::nullopt;
    }
}

} // namespace qivo::runtime
