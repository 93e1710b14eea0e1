#pragma once

#include "tools/publish/onvif/Onvif.h"

// What each service is made of.
namespace qivo {

inline constexpr const char* deviceSpace = "http://www.onvif.org/ver10/device/wsdl";
inline constexpr const char* mediaSpace = "http://www.onvif.org/ver10/media/wsdl";
inline constexpr const char* ptzSpace = "http://www.onvif.org/ver20/ptz/wsdl";
inline constexpr const char* imagingSpace = "http://www.onvif.org/ver20/imaging/wsdl";

[[nodiscard]] OnvifService deviceService();
[[nodiscard]] OnvifService mediaService();
[[nodiscard]] OnvifService ptzService();
[[nodiscard]] OnvifService imagingService();

/** What each service says that it can do: the "Capabilities" of its GetServiceCapabilities. */
[[nodiscard]] std::string deviceCapabilitiesXml();
[[nodiscard]] std::string mediaCapabilitiesXml();
[[nodiscard]] std::string ptzCapabilitiesXml();
[[nodiscard]] std::string imagingCapabilitiesXml();

} // namespace qivo
