#include "tools/publish/onvif/Scopes.h"

#include "tools/publish/Handles.h"
#include "tools/publish/Names.h"

namespace qivo {

std::vector<std::string> scopesOf(const OnvifCamera& camera) {
    const std::string start = "onvif://www.onvif.org/";
    const Text name(g_uri_escape_string(instanceName(camera.machine, camera.source).c_str(), nullptr, FALSE));
    return {start + "type/video_encoder", start + "type/ptz", start + "Profile/Streaming",
            start + "hardware/QIVO%20virtual%20camera", start + "name/" + name.get()};
}

} // namespace qivo
