#include "tools/publish/onvif/Services.h"

#include <array>
#include <cmath>

namespace qivo {
namespace {

constexpr const char* sourceConfiguration = "video-configuration";

std::string sizeXml(const std::string& element, PictureSize size) {
    return "<" + element + ">" + elementXml("tt:Width", std::to_string(size.width)) +
           elementXml("tt:Height", std::to_string(size.height)) + "</" + element + ">";
}

// ONVIF counts whole pictures.
std::string rateOf(PictureRate rate) {
    return std::to_string(std::lround(static_cast<double>(rate.numerator) / rate.denominator));
}

std::string encodingOf(Codec codec) {
    return codec == Codec::mjpeg ? "JPEG" : "H264";
}

const OnvifStream& main(const OnvifCamera& camera) {
    return camera.streams.front();
}

std::string sourceConfigurationXml(const OnvifCamera& camera, const std::string& element) {
    const PictureSize size = main(camera).size;
    return "<" + element + " token=\"" + sourceConfiguration + "\">" + elementXml("tt:Name", camera.source) +
           elementXml("tt:UseCount", std::to_string(camera.streams.size())) +
           elementXml("tt:SourceToken", onvifVideoSource) + "<tt:Bounds x=\"0\" y=\"0\" width=\"" +
           std::to_string(size.width) + "\" height=\"" + std::to_string(size.height) + "\"/></" + element + ">";
}

std::string encoderConfigurationXml(const OnvifStream& stream, const std::string& element) {
    return "<" + element + " token=\"" + stream.token + "\">" + elementXml("tt:Name", stream.name) +
           "<tt:UseCount>1</tt:UseCount>" + elementXml("tt:Encoding", encodingOf(stream.codec)) +
           sizeXml("tt:Resolution", stream.size) + "<tt:Quality>1</tt:Quality><tt:RateControl>" +
           elementXml("tt:FrameRateLimit", rateOf(stream.rate)) + "<tt:EncodingInterval>1</tt:EncodingInterval>" +
           elementXml("tt:BitrateLimit", std::to_string(stream.kilobits)) + "</tt:RateControl>" +
           (stream.codec == Codec::mjpeg ? ""
                                         : "<tt:H264>" + elementXml("tt:GovLength", rateOf(stream.rate)) +
                                               "<tt:H264Profile>Baseline</tt:H264Profile></tt:H264>") +
           "<tt:Multicast><tt:Address><tt:Type>IPv4</tt:Type><tt:IPv4Address>0.0.0.0</tt:IPv4Address></tt:Address>"
           "<tt:Port>0</tt:Port><tt:TTL>0</tt:TTL><tt:AutoStart>false</tt:AutoStart></tt:Multicast>"
           "<tt:SessionTimeout>PT60S</tt:SessionTimeout></" +
           element + ">";
}

std::string profileXml(const OnvifCamera& camera, const OnvifStream& stream, const std::string& element) {
    return "<" + element + " token=\"" + stream.token + "\" fixed=\"true\">" + elementXml("tt:Name", stream.name) +
           sourceConfigurationXml(camera, "tt:VideoSourceConfiguration") +
           encoderConfigurationXml(stream, "tt:VideoEncoderConfiguration") +
           ptzConfigurationXml(camera, "tt:PTZConfiguration") + "</" + element + ">";
}

OnvifResult getProfiles(const OnvifCall& call) {
    std::string profiles;
    for (const OnvifStream& stream : call.camera.streams) {
        profiles += profileXml(call.camera, stream, "trt:Profiles");
    }
    return profiles;
}

OnvifResult getProfile(const OnvifCall& call) {
    if (auto fault = profileFault(call)) {
        return *fault;
    }
    const OnvifStream& stream = *call.camera.stream(call.operation.child("ProfileToken").text());
    return profileXml(call.camera, stream, "trt:Profile");
}

OnvifResult getVideoSources(const OnvifCall& call) {
    return std::string("<trt:VideoSources token=\"") + onvifVideoSource + "\">" +
           elementXml("tt:Framerate", rateOf(main(call.camera).rate)) +
           sizeXml("tt:Resolution", main(call.camera).size) + "</trt:VideoSources>";
}

OnvifResult listSourceConfigurations(const OnvifCall& call) {
    return sourceConfigurationXml(call.camera, "trt:Configurations");
}

OnvifResult getVideoSourceConfiguration(const OnvifCall& call) {
    if (call.operation.child("ConfigurationToken").text() != sourceConfiguration) {
        return invalidArgument("NoConfig", "There is no video source configuration of this token.");
    }
    return sourceConfigurationXml(call.camera, "trt:Configuration");
}

OnvifResult listEncoderConfigurations(const OnvifCall& call) {
    std::string configurations;
    for (const OnvifStream& stream : call.camera.streams) {
        configurations += encoderConfigurationXml(stream, "trt:Configurations");
    }
    return configurations;
}

const OnvifStream* encoderOf(const OnvifCall& call) {
    return call.camera.stream(call.operation.child("ConfigurationToken").text());
}

SoapFault noEncoder() {
    return invalidArgument("NoConfig", "There is no video encoder configuration of this token.");
}

OnvifResult getVideoEncoderConfiguration(const OnvifCall& call) {
    const OnvifStream* stream = encoderOf(call);
    if (stream == nullptr) {
        return noEncoder();
    }
    return encoderConfigurationXml(*stream, "trt:Configuration");
}

// Each stream is what it is: ranges of one value.
OnvifResult getVideoEncoderConfigurationOptions(const OnvifCall& call) {
    const XmlElement profile = call.operation.child("ProfileToken");
    const XmlElement configuration = call.operation.child("ConfigurationToken");
    const OnvifStream* stream = configuration ? encoderOf(call)
                                : profile     ? call.camera.stream(profile.text())
                                              : &main(call.camera);
    if (stream == nullptr) {
        return noEncoder();
    }
    const std::string rate = rateOf(stream->rate);
    const std::string common =
        rangeXml("tt:FrameRateRange", rate, rate) + rangeXml("tt:EncodingIntervalRange", "1", "1");
    const std::string codec =
        stream->codec == Codec::mjpeg
            ? "<tt:JPEG>" + sizeXml("tt:ResolutionsAvailable", stream->size) + common + "</tt:JPEG>"
            : "<tt:H264>" + sizeXml("tt:ResolutionsAvailable", stream->size) +
                  rangeXml("tt:GovLengthRange", rate, rate) + common +
                  "<tt:H264ProfilesSupported>Baseline</tt:H264ProfilesSupported></tt:H264>";
    return "<trt:Options>" + rangeXml("tt:QualityRange", "1", "1") + codec + "</trt:Options>";
}

OnvifResult getStreamUri(const OnvifCall& call) {
    if (auto fault = profileFault(call)) {
        return *fault;
    }
    const XmlElement setup = call.operation.child("StreamSetup");
    const std::string protocol = setup.child("Transport").child("Protocol").text();
    if (setup.child("Stream").text() == "RTP-Multicast" || protocol == "HTTP") {
        return invalidArgument("InvalidStreamSetup", "Streams come by unicast, over UDP or RTSP.");
    }
    const OnvifStream& stream = *call.camera.stream(call.operation.child("ProfileToken").text());
    const std::string uri = "rtsp://" + call.place.host + ":" + std::to_string(call.camera.rtspPort) + stream.path;
    return "<trt:MediaUri>" + elementXml("tt:Uri", uri) +
           "<tt:InvalidAfterConnect>false</tt:InvalidAfterConnect>"
           "<tt:InvalidAfterReboot>false</tt:InvalidAfterReboot><tt:Timeout>PT0S</tt:Timeout>"
           "</trt:MediaUri>";
}

OnvifResult getServiceCapabilities(const OnvifCall&) {
    return mediaCapabilitiesXml();
}

constexpr std::array operations{
    OnvifOperation{"GetServiceCapabilities", getServiceCapabilities, true},
    OnvifOperation{"GetProfiles", getProfiles},
    OnvifOperation{"GetProfile", getProfile},
    OnvifOperation{"GetVideoSources", getVideoSources},
    OnvifOperation{"GetVideoSourceConfigurations", listSourceConfigurations},
    OnvifOperation{"GetCompatibleVideoSourceConfigurations", listSourceConfigurations},
    OnvifOperation{"GetVideoSourceConfiguration", getVideoSourceConfiguration},
    OnvifOperation{"GetVideoEncoderConfigurations", listEncoderConfigurations},
    OnvifOperation{"GetCompatibleVideoEncoderConfigurations", listEncoderConfigurations},
    OnvifOperation{"GetVideoEncoderConfiguration", getVideoEncoderConfiguration},
    OnvifOperation{"GetVideoEncoderConfigurationOptions", getVideoEncoderConfigurationOptions},
    OnvifOperation{"GetStreamUri", getStreamUri},
};

} // namespace

std::string mediaCapabilitiesXml() {
    return R"(<trt:Capabilities SnapshotUri="false" Rotation="false" VideoSourceMode="false" OSD="false">)"
           R"(<trt:ProfileCapabilities MaximumNumberOfProfiles="2"/>)"
           R"(<trt:StreamingCapabilities RTPMulticast="false" RTP_TCP="false" RTP_RTSP_TCP="true"/></trt:Capabilities>)";
}

OnvifService mediaService() {
    return {"media", mediaSpace, "trt", operations.data(), operations.size()};
}

} // namespace qivo
