#pragma once

#include "tools/publish/onvif/Onvif.h"

#include <string>
#include <vector>

namespace qivo {

/** What a camera says of itself when it is looked for: addresses in ONVIF's scheme, names percent-encoded. */
[[nodiscard]] std::vector<std::string> scopesOf(const OnvifCamera& camera);

} // namespace qivo
