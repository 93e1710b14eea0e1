#include "tools/publish/onvif/Services.h"

#include <algorithm>
#include <array>
#include <cmath>

namespace qivo {
namespace {

std::optional<SoapFault> sourceFault(const OnvifCall& call) {
    if (call.operation.child("VideoSourceToken").text() == onvifVideoSource) {
        return std::nullopt;
    }
    return invalidArgument("NoSource", "There is no video source of this token.");
}

SoapFault focusFault() {
    return invalidArgument("SettingsInvalid", "The focus or its speed is no number or out of its range.");
}

OnvifResult done(bool accepted) {
    if (accepted) {
        return "";
    }
    return focusFault();
}

OnvifResult getImagingSettings(const OnvifCall& call) {
    if (auto fault = sourceFault(call)) {
        return *fault;
    }
    const bool automatic = call.camera.camera->state().automaticFocus;
    return "<timg:ImagingSettings><tt:Focus>" + elementXml("tt:AutoFocusMode", automatic ? "AUTO" : "MANUAL") +
           "<tt:DefaultSpeed>1</tt:DefaultSpeed></tt:Focus></timg:ImagingSettings>";
}

// Settings that this camera has not got are left alone, as ONVIF wants it.
OnvifResult setImagingSettings(const OnvifCall& call) {
    if (auto fault = sourceFault(call)) {
        return *fault;
    }
    const XmlElement mode = call.operation.child("ImagingSettings").child("Focus").child("AutoFocusMode");
    const std::string text = mode.text();
    if (mode && text != "AUTO" && text != "MANUAL") {
        return invalidArgument("SettingsInvalid", "The focus is AUTO or MANUAL.");
    }
    if (mode) {
        call.camera.camera->setAutomaticFocus(text == "AUTO");
    }
    return "";
}

OnvifResult getOptions(const OnvifCall& call) {
    if (auto fault = sourceFault(call)) {
        return *fault;
    }
    return "<timg:ImagingOptions><tt:Focus><tt:AutoFocusModes>AUTO</tt:AutoFocusModes>"
           "<tt:AutoFocusModes>MANUAL</tt:AutoFocusModes>" +
           rangeXml("tt:DefaultSpeed", "1", "1") + "</tt:Focus></timg:ImagingOptions>";
}

OnvifResult getMoveOptions(const OnvifCall& call) {
    if (auto fault = sourceFault(call)) {
        return *fault;
    }
    return "<timg:MoveOptions><tt:Absolute>" + rangeXml("tt:Position", "0", "1") + "</tt:Absolute><tt:Relative>" +
           rangeXml("tt:Distance", "-1", "1") + "</tt:Relative><tt:Continuous>" + rangeXml("tt:Speed", "-1", "1") +
           "</tt:Continuous></timg:MoveOptions>";
}

OnvifResult move(const OnvifCall& call) {
    if (auto fault = sourceFault(call)) {
        return *fault;
    }
    Camera& camera = *call.camera.camera;
    const XmlElement focus = call.operation.child("Focus");
    const double none = std::nan("");
    if (const XmlElement absolute = focus.child("Absolute")) {
        return done(camera.setFocus(numberIn(absolute.child("Position").text()).value_or(none)));
    }
    if (const XmlElement relative = focus.child("Relative")) {
        const double step = numberIn(relative.child("Distance").text()).value_or(none);
        if (!(step >= -1 && step <= 1)) {
            return focusFault();
        }
        return done(camera.setFocus(std::clamp(camera.state().focus + step, 0.0, 1.0)));
    }
    if (const XmlElement continuous = focus.child("Continuous")) {
        return done(camera.moveFocus(numberIn(continuous.child("Speed").text()).value_or(none)));
    }
    return invalidArgument("NoImagingForSource", "The focus moves absolutely, relatively or continuously.");
}

OnvifResult stop(const OnvifCall& call) {
    if (auto fault = sourceFault(call)) {
        return *fault;
    }
    call.camera.camera->stopFocus();
    return "";
}

OnvifResult getStatus(const OnvifCall& call) {
    if (auto fault = sourceFault(call)) {
        return *fault;
    }
    const CameraState state = call.camera.camera->state();
    return "<timg:Status><tt:FocusStatus20>" + elementXml("tt:Position", xmlNumber(state.focus)) +
           elementXml("tt:MoveStatus", state.focusing ? "MOVING" : "IDLE") + "</tt:FocusStatus20></timg:Status>";
}

OnvifResult getServiceCapabilities(const OnvifCall&) {
    return imagingCapabilitiesXml();
}

constexpr std::array operations{
    OnvifOperation{"GetServiceCapabilities", getServiceCapabilities, true},
    OnvifOperation{"GetImagingSettings", getImagingSettings},
    OnvifOperation{"SetImagingSettings", setImagingSettings},
    OnvifOperation{"GetOptions", getOptions},
    OnvifOperation{"GetMoveOptions", getMoveOptions},
    OnvifOperation{"Move", move},
    OnvifOperation{"Stop", stop},
    OnvifOperation{"GetStatus", getStatus},
};

} // namespace

std::string imagingCapabilitiesXml() {
    return R"(<timg:Capabilities ImageStabilization="false" Presets="false"/>)";
}

OnvifService imagingService() {
    return {"imaging", imagingSpace, "timg", operations.data(), operations.size()};
}

} // namespace qivo
