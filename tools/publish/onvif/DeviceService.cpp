#include "tools/publish/Names.h"
#include "tools/publish/onvif/Scopes.h"
#include "tools/publish/onvif/Services.h"

#include <array>
#include <ctime>
#include <unistd.h>

namespace qivo {
namespace {

constexpr const char* manufacturer = "QIVO";
constexpr const char* model = "Virtual camera";
constexpr const char* versionXml = "<tt:Major>2</tt:Major><tt:Minor>60</tt:Minor>";

std::string number(int value) {
    return std::to_string(value);
}

OnvifResult getSystemDateAndTime(const OnvifCall&) {
    const std::time_t now = std::time(nullptr);
    std::tm utc{};
    gmtime_r(&now, &utc);
    return "<tds:SystemDateAndTime><tt:DateTimeType>NTP</tt:DateTimeType><tt:DaylightSavings>false</tt:DaylightSavings>"
           "<tt:TimeZone><tt:TZ>UTC0</tt:TZ></tt:TimeZone><tt:UTCDateTime><tt:Time>" +
           elementXml("tt:Hour", number(utc.tm_hour)) + elementXml("tt:Minute", number(utc.tm_min)) +
           elementXml("tt:Second", number(utc.tm_sec)) + "</tt:Time><tt:Date>" +
           elementXml("tt:Year", number(utc.tm_year + 1900)) + elementXml("tt:Month", number(utc.tm_mon + 1)) +
           elementXml("tt:Day", number(utc.tm_mday)) + "</tt:Date></tt:UTCDateTime></tds:SystemDateAndTime>";
}

OnvifResult getDeviceInformation(const OnvifCall& call) {
    return elementXml("tds:Manufacturer", manufacturer) + elementXml("tds:Model", model) +
           elementXml("tds:FirmwareVersion", QIVO_VERSION) + elementXml("tds:SerialNumber", call.camera.uuid()) +
           elementXml("tds:HardwareId", "virtual");
}

std::string capabilitiesOf(const OnvifService& service) {
    const std::string inner = service.space == deviceSpace  ? deviceCapabilitiesXml()
                              : service.space == mediaSpace ? mediaCapabilitiesXml()
                              : service.space == ptzSpace   ? ptzCapabilitiesXml()
                                                            : imagingCapabilitiesXml();
    return "<tds:Capabilities>" + inner + "</tds:Capabilities>";
}

OnvifResult getServices(const OnvifCall& call) {
    const std::string wanted = call.operation.child("IncludeCapability").text();
    const bool all = wanted == "true" || wanted == "1";
    std::string services;
    for (const OnvifService& service : onvifServices()) {
        services += "<tds:Service>" + elementXml("tds:Namespace", std::string(service.space)) +
                    elementXml("tds:XAddr", call.address(service.name)) + (all ? capabilitiesOf(service) : "") +
                    "<tds:Version>" + versionXml + "</tds:Version></tds:Service>";
    }
    return services;
}

OnvifResult getServiceCapabilities(const OnvifCall&) {
    return "<tds:Capabilities>" + deviceCapabilitiesXml() + "</tds:Capabilities>";
}

std::string deviceCapability(const OnvifCall& call) {
    const auto no = [](const char* name) { return elementXml(std::string("tt:") + name, "false"); };
    return "<tt:Device>" + elementXml("tt:XAddr", call.address("device_service")) + "<tt:Network>" + no("IPFilter") +
           no("ZeroConfiguration") + no("IPVersion6") + no("DynDNS") + "</tt:Network><tt:System>" +
           no("DiscoveryResolve") + elementXml("tt:DiscoveryBye", "true") + no("RemoteDiscovery") + no("SystemBackup") +
           no("SystemLogging") + no("FirmwareUpgrade") + "<tt:SupportedVersions>" + versionXml +
           "</tt:SupportedVersions></tt:System></tt:Device>";
}

std::string mediaCapability(const OnvifCall& call) {
    return "<tt:Media>" + elementXml("tt:XAddr", call.address("media")) +
           "<tt:StreamingCapabilities><tt:RTPMulticast>false</tt:RTPMulticast><tt:RTP_TCP>false</tt:RTP_TCP>"
           "<tt:RTP_RTSP_TCP>true</tt:RTP_RTSP_TCP></tt:StreamingCapabilities></tt:Media>";
}

OnvifResult getCapabilities(const OnvifCall& call) {
    std::string wanted = call.operation.child("Category").text();
    wanted = wanted.empty() ? "All" : wanted;
    const auto asked = [&](const char* category) { return wanted == "All" || wanted == category; };
    const auto plain = [&](const std::string& category, const char* service) {
        return "<tt:" + category + ">" + elementXml("tt:XAddr", call.address(service)) + "</tt:" + category + ">";
    };
    const std::string found = (asked("Device") ? deviceCapability(call) : "") +
                              (asked("Imaging") ? plain("Imaging", "imaging") : "") +
                              (asked("Media") ? mediaCapability(call) : "") + (asked("PTZ") ? plain("PTZ", "ptz") : "");
    if (found.empty()) {
        return SoapFault{"Receiver", {"ActionNotSupported", "NoSuchService"}, "There is no service of this category."};
    }
    return "<tds:Capabilities>" + found + "</tds:Capabilities>";
}

OnvifResult getScopes(const OnvifCall& call) {
    std::string scopes;
    for (const std::string& scope : scopesOf(call.camera)) {
        scopes += "<tds:Scopes><tt:ScopeDef>Fixed</tt:ScopeDef>" + elementXml("tt:ScopeItem", scope) + "</tds:Scopes>";
    }
    return scopes;
}

OnvifResult getHostname(const OnvifCall&) {
    std::array<char, 256> name{};
    gethostname(name.data(), name.size() - 1);
    return "<tds:HostnameInformation><tt:FromDHCP>false</tt:FromDHCP>" + elementXml("tt:Name", name.data()) +
           "</tds:HostnameInformation>";
}

OnvifResult getDiscoveryMode(const OnvifCall&) {
    return elementXml("tds:DiscoveryMode", "Discoverable");
}

OnvifResult getEndpointReference(const OnvifCall& call) {
    return elementXml("tds:GUID", "urn:uuid:" + call.camera.uuid());
}

OnvifResult getWsdlUrl(const OnvifCall&) {
    return elementXml("tds:WsdlUrl", "http://www.onvif.org/");
}

constexpr std::array operations{
    OnvifOperation{"GetSystemDateAndTime", getSystemDateAndTime, true},
    OnvifOperation{"GetServices", getServices, true},
    OnvifOperation{"GetServiceCapabilities", getServiceCapabilities, true},
    OnvifOperation{"GetCapabilities", getCapabilities, true},
    OnvifOperation{"GetHostname", getHostname, true},
    OnvifOperation{"GetEndpointReference", getEndpointReference, true},
    OnvifOperation{"GetWsdlUrl", getWsdlUrl, true},
    OnvifOperation{"GetDeviceInformation", getDeviceInformation},
    OnvifOperation{"GetScopes", getScopes},
    OnvifOperation{"GetDiscoveryMode", getDiscoveryMode},
};

} // namespace

std::string deviceCapabilitiesXml() {
    return R"(<tds:Capabilities><tds:Network NTP="0"/><tds:Security UsernameToken="true" HttpDigest="true"/>)"
           R"(<tds:System DiscoveryResolve="false" DiscoveryBye="true"/></tds:Capabilities>)";
}

OnvifService deviceService() {
    return {"device_service", deviceSpace, "tds", operations.data(), operations.size()};
}

} // namespace qivo
