#include "runtime/OnvifMessages.h"

#include <array>
#include <charconv>

namespace qivo::runtime::onvif {
namespace {

SoapMessage message(const char* service, const std::string& prefix, const std::string& operation,
                    const std::string& content = "") {
    const std::string name = prefix + ":" + operation;
    return {std::string("http://www.onvif.org/") + service + "/wsdl/" + operation,
            "<" + name + ">" + content + "</" + name + ">"};
}

SoapMessage device(const std::string& operation, const std::string& content = "") {
    return message("ver10/device", "tds", operation, content);
}

SoapMessage media(const std::string& operation, const std::string& content = "") {
    return message("ver10/media", "trt", operation, content);
}

SoapMessage ptz(const std::string& operation, const std::string& content = "") {
    return message("ver20/ptz", "tptz", operation, content);
}

SoapMessage imaging(const std::string& operation, const std::string& content) {
    return message("ver20/imaging", "timg", operation, content);
}

std::string element(const std::string& name, const std::string& text) {
    return "<" + name + ">" + xmlText(text) + "</" + name + ">";
}

std::string ptzProfile(const std::string& profile) {
    return element("tptz:ProfileToken", profile);
}

/// Never in exponents, whatever the locale; without the sign of a negative zero.
std::string number(float value) {
    std::array<char, 64> text{};
    const auto end = std::to_chars(text.data(), text.data() + text.size(), value + 0.0F, std::chars_format::fixed, 4);
    return {text.data(), end.ptr};
}

std::string vector(const Velocity& velocity) {
    std::string text;
    if (velocity.panTilt) {
        text += "<tt:PanTilt x=\"" + number(velocity.panTilt->x) + "\" y=\"" + number(velocity.panTilt->y) + "\"/>";
    }
    if (velocity.zoom) {
        text += "<tt:Zoom x=\"" + number(*velocity.zoom) + "\"/>";
    }
    return text;
}

std::string flag(bool value) {
    return value ? "true" : "false";
}

} // namespace

SoapMessage getSystemDateAndTime() {
    SoapMessage request = device("GetSystemDateAndTime");
    request.open = true;
    return request;
}

SoapMessage getCapabilities() {
    return device("GetCapabilities", element("tds:Category", "All"));
}

SoapMessage getServices() {
    return device("GetServices", element("tds:IncludeCapability", "false"));
}

SoapMessage getProfiles() {
    return media("GetProfiles");
}

SoapMessage getStreamUri(const std::string& profile) {
    return media("GetStreamUri", "<trt:StreamSetup><tt:Stream>RTP-Unicast</tt:Stream><tt:Transport><tt:Protocol>RTSP"
                                 "</tt:Protocol></tt:Transport></trt:StreamSetup>" +
                                     element("trt:ProfileToken", profile));
}

SoapMessage getNodes() {
    return ptz("GetNodes");
}

SoapMessage getPresets(const std::string& profile) {
    return ptz("GetPresets", ptzProfile(profile));
}

SoapMessage getMoveOptions(const std::string& videoSource) {
    return imaging("GetMoveOptions", element("timg:VideoSourceToken", videoSource));
}

SoapMessage continuousMove(const std::string& profile, const Velocity& velocity, int seconds) {
    return ptz("ContinuousMove", ptzProfile(profile) + "<tptz:Velocity>" + vector(velocity) +
                                     "</tptz:Velocity><tptz:Timeout>PT" + std::to_string(seconds) + "S</tptz:Timeout>");
}

SoapMessage stop(const std::string& profile, bool panTilt, bool zoom) {
    return ptz("Stop", ptzProfile(profile) + element("tptz:PanTilt", flag(panTilt)) + element("tptz:Zoom", flag(zoom)));
}

SoapMessage setPreset(const std::string& profile, const std::string& name, const std::string& token) {
    return ptz("SetPreset", ptzProfile(profile) + element("tptz:PresetName", name) +
                                (token.empty() ? "" : element("tptz:PresetToken", token)));
}

SoapMessage gotoPreset(const std::string& profile, const std::string& token, std::optional<float> speed) {
    std::string content = ptzProfile(profile) + element("tptz:PresetToken", token);
    if (speed) {
        content += "<tptz:Speed>" + vector({Velocity::PanTilt{*speed, *speed}, *speed}) + "</tptz:Speed>";
    }
    return ptz("GotoPreset", content);
}

SoapMessage setAutoFocus(const std::string& videoSource, bool automatic) {
    return imaging("SetImagingSettings",
                   element("timg:VideoSourceToken", videoSource) + "<timg:ImagingSettings><tt:Focus>" +
                       element("tt:AutoFocusMode", automatic ? "AUTO" : "MANUAL") +
                       "</tt:Focus></timg:ImagingSettings>" + element("timg:ForcePersistence", "false"));
}

SoapMessage moveFocus(const std::string& videoSource, float position) {
    return imaging("Move", element("timg:VideoSourceToken", videoSource) + "<timg:Focus><tt:Absolute>" +
                               element("tt:Position", number(position)) + "</tt:Absolute></timg:Focus>");
}

} // namespace qivo::runtime::onvif
