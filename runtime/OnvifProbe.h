#pragma once

#include "runtime/OnvifReplies.h"
#include "runtime/SoapClient.h"
#include "runtime/SteeringTarget.h"

#include <chrono>
#include <functional>
#include <optional>
#include <string>
#include <vector>

namespace qivo::runtime {

/// A camera that can be steered: everything that is asked once.
struct OnvifCamera {
    onvif::Services services;
    std::string profile;
    std::string videoSource;
    onvif::Node node;
    std::vector<onvif::Preset> presets;
    bool imaging = false;              ///< has an imaging service for its pictures
    std::optional<onvif::Range> focus; ///< nothing if the focus cannot be put to a position

    /// Whether it takes the same commands. Presets come and go and are looked up again.
    bool isLike(const OnvifCamera& other) const;
};

/// Asks a device whether and how the source is steered.
///
/// Thread: the client's.
class OnvifProbe {
  public:
    /// The longest that a device may take for one answer.
    static constexpr std::chrono::milliseconds kStepLimit{5000};

    struct Result {
        std::optional<OnvifCamera> camera;
        bool answered = false; ///< whether the services have spoken at all; if not, they may yet
        std::string reason;    ///< why there is no camera
    };

    /// `ended` tells that nobody waits for the result any more.
    OnvifProbe(SoapClient& client, const SteeringTarget& target, std::function<bool()> ended);

    /// Asks step by step until all is known.
    Result run();

  private:
    SoapClient::Answer ask(const std::string& url, const SoapMessage& message);
    bool fail(std::string reason);
    bool readClock();
    bool readServices();
    bool readProfile();
    bool readNode();
    void readPresets();
    void readFocus();
    void admit(std::string& address, const char* service);
    std::vector<std::string> streamsOf(const std::vector<onvif::Profile>& profiles);

    SoapClient& m_client;
    const SteeringTarget& m_target;
    const std::function<bool()> m_ended;
    Result m_result;
    OnvifCamera m_camera;
};

} // namespace qivo::runtime
