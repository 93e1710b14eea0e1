#pragma once

#include "tools/publish/Camera.h"
#include "tools/publish/Options.h"
#include "tools/publish/onvif/Soap.h"
#include "tools/publish/onvif/UsernameTokens.h"

#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <variant>
#include <vector>

namespace qivo {

/** A stream of a camera, as a media profile. */
struct OnvifStream {
    std::string token; ///< of the profile and of its encoder
    std::string name;
    std::string path; ///< under the RTSP server, begins with "/"
    PictureSize size;
    PictureRate rate;
    Codec codec = Codec::h264;
    int kilobits = 0; ///< a second, about
};

/** A camera, as ONVIF sees a device. */
struct OnvifCamera {
    std::string machine;
    std::string source;
    std::string path; ///< of its services, begins and ends with "/"
    std::shared_ptr<Camera> camera;
    std::vector<OnvifStream> streams; ///< at least one
    int rtspPort = 0;

    /** A UUID that this name on this host has in every run. */
    [[nodiscard]] std::string uuid() const;

    /** Null for a token that is no stream's. */
    [[nodiscard]] const OnvifStream* stream(const std::string& token) const;
};

/** Where a client reached this machine. */
struct OnvifPlace {
    std::string host; ///< as it stands in an address
    int port = 0;     ///< of the services
};

/** The place that a client means by its "Host" header, or, where that is missing or no host, the address and port at
 * which it came in. */
[[nodiscard]] OnvifPlace placeOf(const std::string& hostHeader, const std::string& localAddress, int localPort);

/** One call of an operation. */
struct OnvifCall {
    const OnvifCamera& camera;
    const OnvifPlace& place;
    XmlElement operation;

    /** The address of a service by its name in the path. */
    [[nodiscard]] std::string address(std::string_view service) const;
};

/** What stands in the response's element, or why there is no response. */
using OnvifResult = std::variant<std::string, SoapFault>;

struct OnvifOperation {
    std::string_view name;
    OnvifResult (*run)(const OnvifCall& call);
    bool open = false; ///< answered without a login
};

/** A service and what it can do. */
struct OnvifService {
    std::string_view name; ///< in the path
    std::string_view space;
    std::string_view prefix; ///< in Soap.h's envelopes
    const OnvifOperation* first;
    std::size_t count;
};

/** The four services; the device service is the first. */
[[nodiscard]] const std::vector<OnvifService>& onvifServices();

/** The tokens of what a camera has one of. */
inline constexpr const char* onvifVideoSource = "video";
inline constexpr const char* onvifNode = "head";
inline constexpr const char* onvifPtzConfiguration = "ptz";

/** The PTZ configuration, as its service and the media profiles give it, in an element of that name. */
[[nodiscard]] std::string ptzConfigurationXml(const OnvifCamera& camera, const std::string& element);

/** The fault for a profile token that is no stream's; empty if it is one. */
[[nodiscard]] std::optional<SoapFault> profileFault(const OnvifCall& call);

/** "<NAME>TEXT</NAME>", the text escaped. */
[[nodiscard]] std::string elementXml(const std::string& name, const std::string& text);

/** "<NAME><tt:Min>…</tt:Min><tt:Max>…</tt:Max></NAME>". */
[[nodiscard]] std::string rangeXml(const std::string& name, const std::string& minimum, const std::string& maximum);

/** An answer over HTTP. */
struct OnvifAnswer {
    int status = 200;
    std::string body;
    bool challenge = false; ///< a login was needed and not given
};

/** A camera's ONVIF services: Device, Media, PTZ and Imaging. Thread: one. */
class OnvifDevice {
  public:
    /** `tokens`, which may be null, asks every operation but the open ones for a login. */
    OnvifDevice(OnvifCamera camera, std::shared_ptr<UsernameTokens> tokens);

    /** Answers a request to any of the services. `authenticated`: the transport has seen a good login. */
    [[nodiscard]] OnvifAnswer answer(const std::string& request, const OnvifPlace& place, bool authenticated) const;

    [[nodiscard]] const OnvifCamera& camera() const { return m_camera; }

  private:
    OnvifCamera m_camera;
    std::shared_ptr<UsernameTokens> m_tokens;
};

} // namespace qivo
