#include "tools/publish/onvif/Duration.h"
#include "tools/publish/onvif/Services.h"

#include <array>

namespace qivo {
namespace {

constexpr const char* spaces = "http://www.onvif.org/ver10/tptz/";
constexpr const char* turnPosition = "PanTiltSpaces/PositionGenericSpace";
constexpr const char* turnStep = "PanTiltSpaces/TranslationGenericSpace";
constexpr const char* turnVelocity = "PanTiltSpaces/VelocityGenericSpace";
constexpr const char* turnSpeed = "PanTiltSpaces/GenericSpeedSpace";
constexpr const char* zoomPosition = "ZoomSpaces/PositionGenericSpace";
constexpr const char* zoomStep = "ZoomSpaces/TranslationGenericSpace";
constexpr const char* zoomVelocity = "ZoomSpaces/VelocityGenericSpace";
constexpr const char* zoomSpeed = "ZoomSpaces/ZoomGenericSpeedSpace";

std::string spaceUri(const char* space) {
    return std::string(spaces) + space;
}

std::string seconds(std::chrono::milliseconds time) {
    return "PT" + xmlNumber(std::chrono::duration<double>(time).count()) + "S";
}

std::string rangeXml(const std::string& element, int minimum) {
    return "<" + element + ">" + elementXml("tt:Min", std::to_string(minimum)) + elementXml("tt:Max", "1") + "</" +
           element + ">";
}

// A space of one range for pan and tilt, or for one of them alone. The largest is 1.
std::string spaceXml(const std::string& element, const char* space, int minimum, bool both = false) {
    return "<" + element + ">" + elementXml("tt:URI", spaceUri(space)) + rangeXml("tt:XRange", minimum) +
           (both ? rangeXml("tt:YRange", minimum) : "") + "</" + element + ">";
}

std::string allSpacesXml() {
    return spaceXml("tt:AbsolutePanTiltPositionSpace", turnPosition, -1, true) +
           spaceXml("tt:AbsoluteZoomPositionSpace", zoomPosition, 0) +
           spaceXml("tt:RelativePanTiltTranslationSpace", turnStep, -1, true) +
           spaceXml("tt:RelativeZoomTranslationSpace", zoomStep, -1) +
           spaceXml("tt:ContinuousPanTiltVelocitySpace", turnVelocity, -1, true) +
           spaceXml("tt:ContinuousZoomVelocitySpace", zoomVelocity, -1) +
           spaceXml("tt:PanTiltSpeedSpace", turnSpeed, 0) + spaceXml("tt:ZoomSpeedSpace", zoomSpeed, 0);
}

// x and y in a space, as ONVIF gives positions and speeds.
std::string vectorXml(const CameraPosition& position, const char* turnSpace, const char* zoomSpace) {
    return "<tt:PanTilt x=\"" + xmlNumber(position.direction.pan) + "\" y=\"" + xmlNumber(position.direction.tilt) +
           "\" space=\"" + spaceUri(turnSpace) + "\"/><tt:Zoom x=\"" + xmlNumber(position.zoom) + "\" space=\"" +
           spaceUri(zoomSpace) + "\"/>";
}

std::string nodeXml(const std::string& element) {
    return "<" + element + " token=\"" + onvifNode + "\" FixedHomePosition=\"true\">" + elementXml("tt:Name", "Head") +
           "<tt:SupportedPTZSpaces>" + allSpacesXml() + "</tt:SupportedPTZSpaces>" +
           elementXml("tt:MaximumNumberOfPresets", std::to_string(Camera::maximumPresets)) +
           elementXml("tt:HomeSupported", "true") + "</" + element + ">";
}

// What a request says of pan, tilt and zoom.
struct Vector {
    std::optional<PanTilt> turn;
    std::optional<double> zoom;
};

SoapFault spaceFault() {
    return invalidArgument("SpaceNotSupported", "This coordinate space is not there.");
}

bool inSpace(XmlElement element, const char* space) {
    const std::string given = element.attribute("space").value_or("");
    return given.empty() || given == spaceUri(space);
}

// Reads an element that holds PanTilt, Zoom or both; `invalid` names the fault for what is no number.
std::variant<Vector, SoapFault> vectorIn(XmlElement element, const char* turnSpace, const char* zoomSpace,
                                         const char* invalid) {
    const SoapFault wrong = invalidArgument(invalid, "Pan, tilt or zoom is no number or out of its range.");
    Vector vector;
    if (const XmlElement turn = element.child("PanTilt")) {
        const auto x = numberIn(turn.attribute("x").value_or(""));
        const auto y = numberIn(turn.attribute("y").value_or(""));
        if (!x || !y) {
            return wrong;
        }
        if (!inSpace(turn, turnSpace)) {
            return spaceFault();
        }
        vector.turn = PanTilt{*x, *y};
    }
    if (const XmlElement zoom = element.child("Zoom")) {
        vector.zoom = numberIn(zoom.attribute("x").value_or(""));
        if (!vector.zoom) {
            return wrong;
        }
        if (!inSpace(zoom, zoomSpace)) {
            return spaceFault();
        }
    }
    return vector;
}

OnvifResult done(bool accepted, const char* invalid) {
    if (accepted) {
        return "";
    }
    return invalidArgument(invalid, "Pan, tilt or zoom is no number or out of its range.");
}

OnvifResult continuousMove(const OnvifCall& call) {
    if (auto fault = profileFault(call)) {
        return *fault;
    }
    const auto parsed = vectorIn(call.operation.child("Velocity"), turnVelocity, zoomVelocity, "InvalidVelocity");
    if (const auto* fault = std::get_if<SoapFault>(&parsed)) {
        return *fault;
    }
    std::chrono::milliseconds timeout = Camera::defaultTimeout;
    if (const XmlElement given = call.operation.child("Timeout")) {
        const auto time = durationIn(given.text());
        if (!time || *time < std::chrono::milliseconds(0) || *time > Camera::maximumTimeout) {
            return invalidArgument("TimeoutNotSupported", "The time-out is no duration or not between PT0S and " +
                                                              seconds(Camera::maximumTimeout) + ".");
        }
        timeout = *time;
    }
    const Vector& velocity = std::get<Vector>(parsed);
    return done(call.camera.camera->move(velocity.turn, velocity.zoom, timeout), "InvalidVelocity");
}

// The speeds that a request gives, or full speed.
struct Speeds {
    PanTilt turn{1, 1};
    double zoom = 1;
};

std::variant<Speeds, SoapFault> speedsIn(const OnvifCall& call) {
    const auto parsed = vectorIn(call.operation.child("Speed"), turnSpeed, zoomSpeed, "InvalidSpeed");
    if (const auto* fault = std::get_if<SoapFault>(&parsed)) {
        return *fault;
    }
    const Vector& given = std::get<Vector>(parsed);
    const Speeds speeds{given.turn.value_or(PanTilt{1, 1}), given.zoom.value_or(1)};
    const auto fits = [](double speed) { return speed >= 0 && speed <= 1; };
    if (!fits(speeds.turn.pan) || !fits(speeds.turn.tilt) || !fits(speeds.zoom)) {
        return invalidArgument("InvalidSpeed", "Speeds go from 0 to 1.");
    }
    return speeds;
}

using Go = bool (Camera::*)(std::optional<PanTilt>, std::optional<double>, PanTilt, double);

OnvifResult goTo(const OnvifCall& call, const std::variant<Vector, SoapFault>& parsed, Go go, const char* invalid) {
    if (auto fault = profileFault(call)) {
        return *fault;
    }
    const auto speeds = speedsIn(call);
    for (const SoapFault* fault : {std::get_if<SoapFault>(&parsed), std::get_if<SoapFault>(&speeds)}) {
        if (fault != nullptr) {
            return *fault;
        }
    }
    const auto& [turn, zoom] = std::get<Vector>(parsed);
    const auto& [turning, zooming] = std::get<Speeds>(speeds);
    return done((*call.camera.camera.*go)(turn, zoom, turning, zooming), invalid);
}

OnvifResult absoluteMove(const OnvifCall& call) {
    constexpr const char* invalid = "InvalidPosition";
    return goTo(call, vectorIn(call.operation.child("Position"), turnPosition, zoomPosition, invalid), &Camera::moveTo,
                invalid);
}

OnvifResult relativeMove(const OnvifCall& call) {
    constexpr const char* invalid = "InvalidTranslation";
    return goTo(call, vectorIn(call.operation.child("Translation"), turnStep, zoomStep, invalid), &Camera::moveBy,
                invalid);
}

OnvifResult stop(const OnvifCall& call) {
    if (auto fault = profileFault(call)) {
        return *fault;
    }
    // What is not mentioned is stopped too: better one axis too many than one that runs away.
    const auto asked = [&](const char* name) {
        const std::string text = call.operation.child(name).text();
        return text != "false" && text != "0";
    };
    call.camera.camera->stop(asked("PanTilt"), asked("Zoom"));
    return "";
}

OnvifResult getStatus(const OnvifCall& call) {
    if (auto fault = profileFault(call)) {
        return *fault;
    }
    const CameraState state = call.camera.camera->state();
    const auto moving = [](const char* element, bool moves) { return elementXml(element, moves ? "MOVING" : "IDLE"); };
    return "<tptz:PTZStatus><tt:Position>" + vectorXml(state.position, turnPosition, zoomPosition) +
           "</tt:Position><tt:MoveStatus>" + moving("tt:PanTilt", state.turning) + moving("tt:Zoom", state.zooming) +
           "</tt:MoveStatus>" + elementXml("tt:UtcTime", utcText(std::chrono::system_clock::now())) +
           "</tptz:PTZStatus>";
}

OnvifResult getPresets(const OnvifCall& call) {
    if (auto fault = profileFault(call)) {
        return *fault;
    }
    std::string presets;
    for (const auto& [number, preset] : call.camera.camera->presets()) {
        presets += "<tptz:Preset token=\"" + std::to_string(number) + "\">" + elementXml("tt:Name", preset.name) +
                   "<tt:PTZPosition>" + vectorXml(preset.position, turnPosition, zoomPosition) +
                   "</tt:PTZPosition></tptz:Preset>";
    }
    return presets;
}

SoapFault noPreset() {
    return invalidArgument("NoToken", "There is no preset of this token.");
}

bool nameTaken(const Camera& camera, const std::string& name, const std::string& token) {
    for (const auto& [number, preset] : camera.presets()) {
        if (preset.name == name && std::to_string(number) != token) {
            return true;
        }
    }
    return false;
}

OnvifResult setPreset(const OnvifCall& call) {
    if (auto fault = profileFault(call)) {
        return *fault;
    }
    Camera& camera = *call.camera.camera;
    const std::string name = call.operation.child("PresetName").text();
    std::string token = call.operation.child("PresetToken").text();
    // A token that no preset has yet makes one: there are clients that number their presets themselves.
    if (!token.empty() && !Camera::isPresetToken(token)) {
        return noPreset();
    }
    if (!name.empty() && nameTaken(camera, name, token)) {
        return invalidArgument("PresetExist", "Another preset has this name.");
    }
    token = token.empty() ? camera.freePreset(name) : token;
    if (token.empty()) {
        return SoapFault{"Receiver", {"Action", "TooManyPresets"}, "All presets are taken."};
    }
    if (!camera.storePreset(token, name)) {
        return invalidArgument("InvalidPresetName", "The name is too long or holds control characters.");
    }
    return elementXml("tptz:PresetToken", token);
}

OnvifResult gotoPreset(const OnvifCall& call) {
    if (auto fault = profileFault(call)) {
        return *fault;
    }
    const auto speeds = speedsIn(call);
    if (const auto* fault = std::get_if<SoapFault>(&speeds)) {
        return *fault;
    }
    const auto& [turn, zoom] = std::get<Speeds>(speeds);
    const auto presets = call.camera.camera->presets();
    for (const auto& [number, preset] : presets) {
        if (std::to_string(number) == call.operation.child("PresetToken").text()) {
            call.camera.camera->moveTo(preset.position.direction, preset.position.zoom, turn, zoom);
            return "";
        }
    }
    return noPreset();
}

OnvifResult removePreset(const OnvifCall& call) {
    if (auto fault = profileFault(call)) {
        return *fault;
    }
    if (!call.camera.camera->removePreset(call.operation.child("PresetToken").text())) {
        return noPreset();
    }
    return "";
}

OnvifResult gotoHomePosition(const OnvifCall& call) {
    return goTo(call, Vector{PanTilt{}, 0.0}, &Camera::moveTo, "InvalidPosition");
}

OnvifResult setHomePosition(const OnvifCall&) {
    return SoapFault{"Receiver", {"Action", "CannotOverwriteHome"}, "The home position is fixed."};
}

OnvifResult getNodes(const OnvifCall&) {
    return nodeXml("tptz:PTZNode");
}

OnvifResult getNode(const OnvifCall& call) {
    if (call.operation.child("NodeToken").text() != onvifNode) {
        return invalidArgument("NoEntity", "There is no node of this token.");
    }
    return nodeXml("tptz:PTZNode");
}

OnvifResult getConfigurations(const OnvifCall& call) {
    return ptzConfigurationXml(call.camera, "tptz:PTZConfiguration");
}

std::optional<SoapFault> configurationFault(const OnvifCall& call, const char* element) {
    if (call.operation.child(element).text() == onvifPtzConfiguration) {
        return std::nullopt;
    }
    return invalidArgument("NoConfig", "There is no PTZ configuration of this token.");
}

OnvifResult getConfiguration(const OnvifCall& call) {
    if (auto fault = configurationFault(call, "PTZConfigurationToken")) {
        return *fault;
    }
    return ptzConfigurationXml(call.camera, "tptz:PTZConfiguration");
}

OnvifResult getConfigurationOptions(const OnvifCall& call) {
    if (auto fault = configurationFault(call, "ConfigurationToken")) {
        return *fault;
    }
    return "<tptz:PTZConfigurationOptions><tt:Spaces>" + allSpacesXml() + "</tt:Spaces><tt:PTZTimeout>" +
           elementXml("tt:Min", "PT0S") + elementXml("tt:Max", seconds(Camera::maximumTimeout)) +
           "</tt:PTZTimeout></tptz:PTZConfigurationOptions>";
}

OnvifResult getCompatibleConfigurations(const OnvifCall& call) {
    if (auto fault = profileFault(call)) {
        return *fault;
    }
    return ptzConfigurationXml(call.camera, "tptz:PTZConfiguration");
}

OnvifResult getServiceCapabilities(const OnvifCall&) {
    return ptzCapabilitiesXml();
}

constexpr std::array operations{
    OnvifOperation{"GetServiceCapabilities", getServiceCapabilities, true},
    OnvifOperation{"GetNodes", getNodes},
    OnvifOperation{"GetNode", getNode},
    OnvifOperation{"GetConfigurations", getConfigurations},
    OnvifOperation{"GetConfiguration", getConfiguration},
    OnvifOperation{"GetConfigurationOptions", getConfigurationOptions},
    OnvifOperation{"GetCompatibleConfigurations", getCompatibleConfigurations},
    OnvifOperation{"GetStatus", getStatus},
    OnvifOperation{"ContinuousMove", continuousMove},
    OnvifOperation{"AbsoluteMove", absoluteMove},
    OnvifOperation{"RelativeMove", relativeMove},
    OnvifOperation{"Stop", stop},
    OnvifOperation{"GetPresets", getPresets},
    OnvifOperation{"SetPreset", setPreset},
    OnvifOperation{"GotoPreset", gotoPreset},
    OnvifOperation{"RemovePreset", removePreset},
    OnvifOperation{"GotoHomePosition", gotoHomePosition},
    OnvifOperation{"SetHomePosition", setHomePosition},
};

} // namespace

std::string ptzConfigurationXml(const OnvifCamera& camera, const std::string& element) {
    const auto uri = [](const char* name, const char* space) { return elementXml(name, spaceUri(space)); };
    return "<" + element + " token=\"" + onvifPtzConfiguration + "\">" + elementXml("tt:Name", "PTZ") +
           elementXml("tt:UseCount", std::to_string(camera.streams.size())) + elementXml("tt:NodeToken", onvifNode) +
           uri("tt:DefaultAbsolutePantTiltPositionSpace", turnPosition) +
           uri("tt:DefaultAbsoluteZoomPositionSpace", zoomPosition) +
           uri("tt:DefaultRelativePanTiltTranslationSpace", turnStep) +
           uri("tt:DefaultRelativeZoomTranslationSpace", zoomStep) +
           uri("tt:DefaultContinuousPanTiltVelocitySpace", turnVelocity) +
           uri("tt:DefaultContinuousZoomVelocitySpace", zoomVelocity) + "<tt:DefaultPTZSpeed>" +
           vectorXml({{1, 1}, 1}, turnSpeed, zoomSpeed) + "</tt:DefaultPTZSpeed>" +
           elementXml("tt:DefaultPTZTimeout", seconds(Camera::defaultTimeout)) + "<tt:PanTiltLimits>" +
           spaceXml("tt:Range", turnPosition, -1, true) + "</tt:PanTiltLimits><tt:ZoomLimits>" +
           spaceXml("tt:Range", zoomPosition, 0) + "</tt:ZoomLimits></" + element + ">";
}

std::string ptzCapabilitiesXml() {
    return R"(<tptz:Capabilities EFlip="false" Reverse="false" GetCompatibleConfigurations="true" MoveStatus="true")"
           R"( StatusPosition="true"/>)";
}

OnvifService ptzService() {
    return {"ptz", ptzSpace, "tptz", operations.data(), operations.size()};
}

} // namespace qivo
