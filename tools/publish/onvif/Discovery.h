#pragma once

#include "tools/publish/onvif/Onvif.h"

#include <cstdint>
#include <string>
#include <vector>

namespace qivo {

/** What WS-Discovery says of cameras. Every message has an identity of its own. Thread: one. */
class DiscoveryMessages {
  public:
    DiscoveryMessages();

    /** The answers to a datagram, one for each camera that it looks for; none to anything but a probe. `place` is where
     *  the sender reaches the services. */
    [[nodiscard]] std::vector<std::string>
    answers(const std::string& datagram, const std::vector<const OnvifCamera*>& cameras, const OnvifPlace& place);

    /** What a camera says to all when it comes and when it goes. */
    [[nodiscard]] std::string hello(const OnvifCamera& camera, const OnvifPlace& place);
    [[nodiscard]] std::string bye(const OnvifCamera& camera);

  private:
    [[nodiscard]] std::string header(const std::string& action, const std::string& to,
                                     const std::string& relatesTo = {});

    std::int64_t m_instance;
    std::uint64_t m_number = 0;
};

} // namespace qivo
