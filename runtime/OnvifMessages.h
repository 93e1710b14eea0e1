#pragma once

#include "runtime/SoapMessage.h"

#include <optional>
#include <string>

/// The requests that are made of ONVIF services. Tokens are as the device gave them.
namespace qivo::runtime::onvif {

SoapMessage getSystemDateAndTime();
SoapMessage getCapabilities();
SoapMessage getServices();
SoapMessage getProfiles();
SoapMessage getStreamUri(const std::string& profile);
SoapMessage getNodes();
SoapMessage getPresets(const std::string& profile);
SoapMessage getMoveOptions(const std::string& videoSource);

/// Speeds from -1 to 1 in ONVIF's directions: right, up and in are positive. An axis that is left out goes on as it is.
struct Velocity {
    struct PanTilt {
        float x = 0;
        float y = 0;
    };
    std::optional<PanTilt> panTilt;
    std::optional<float> zoom;
};

/// The device stops by itself after `seconds` unless it is told to move again.
SoapMessage continuousMove(const std::string& profile, const Velocity& velocity, int seconds);
SoapMessage stop(const std::string& profile, bool panTilt, bool zoom);
/// `token` is empty for a new preset.
SoapMessage setPreset(const std::string& profile, const std::string& name, const std::string& token);
/// `speed` from 0 to 1; nothing for the device's own.
SoapMessage gotoPreset(const std::string& profile, const std::string& token, std::optional<float> speed);
SoapMessage setAutoFocus(const std::string& videoSource, bool automatic);
/// `position` in the device's own range.
SoapMessage moveFocus(const std::string& videoSource, float position);

} // namespace qivo::runtime::onvif
