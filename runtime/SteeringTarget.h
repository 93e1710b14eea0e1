#pragma once

#include "runtime/Target.h"
#include "runtime/UrlParts.h"

#include <optional>
#include <string>
#include <vector>

namespace qivo::runtime {

/// Where the device service of a source that does not announce one is looked for, on the source's host.
inline constexpr const char* kUsualDeviceService = "/onvif/device_service";

/// Whom to ask for a source's steering, and who may be asked on the way.
struct SteeringTarget {
    std::string device;               ///< address of the device service, without login
    bool announced = false;           ///< the announcement names it; otherwise it is the usual one of the source's host
    std::vector<std::string> hosts;   ///< the only hosts that are ever asked
    std::vector<std::string> streams; ///< the URLs of the source, without logins
    std::optional<Login> login;
    std::string loginHost; ///< the only host that may see the login in any form

    bool operator==(const SteeringTarget&) const = default;

    bool admits(const std::string& url) const;
};

/// The target for a request, by the announcement of the source where there is one. `guess` allows the usual address of
/// a source that announces none. Nothing if there is nobody to ask.
std::optional<SteeringTarget> steeringTarget(const Request& request, const std::optional<Announcement>& announcement,
                                             bool guess);

} // namespace qivo::runtime
