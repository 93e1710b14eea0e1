#pragma once

#include "tools/publish/HttpServer.h"

#include <string>

namespace qivo {

/** Whether the request names this machine by an address, as "localhost" or by its own name, `machineName`, alone or in
 *  ".local". A name of another's, which may have been made to lead here after its page was loaded, does not count. */
[[nodiscard]] bool namesThisMachine(const HttpRequest& request, const std::string& machineName);

/** Whether nothing speaks against the request's coming from a page of this server or from no page at all. */
[[nodiscard]] bool mayLook(const HttpRequest& request);

/** Whether the request proves to come from a page of this server and carries JSON. */
[[nodiscard]] bool mayCommand(const HttpRequest& request);

} // namespace qivo
