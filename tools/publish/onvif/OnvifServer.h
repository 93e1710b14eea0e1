#pragma once

#include "tools/publish/HttpServer.h"
#include "tools/publish/onvif/Onvif.h"
#include "tools/publish/onvif/WsDiscovery.h"

#include <memory>
#include <string>
#include <vector>

namespace qivo {

/** Serves the ONVIF services of cameras under their paths and lets them be found. Lives on the thread of the default
 * main context, no longer than the HTTP server. */
class OnvifServer {
  public:
    /** Adds the services to `http`. */
    OnvifServer(HttpServer& http, std::vector<OnvifCamera> cameras);
    OnvifServer(const OnvifServer&) = delete;
    OnvifServer& operator=(const OnvifServer&) = delete;

    /** Lets the cameras be found, once the HTTP server listens. Empty, or one line that says why they are not; they can
     *  be steered all the same. */
    [[nodiscard]] std::string announce(bool loopbackOnly);

  private:
    HttpServer& m_http;
    std::vector<std::shared_ptr<OnvifDevice>> m_devices;
    std::unique_ptr<WsDiscovery> m_discovery;
};

} // namespace qivo
