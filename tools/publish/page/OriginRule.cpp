#include "tools/publish/page/OriginRule.h"

#include <algorithm>
#include <cctype>

namespace qivo {
namespace {

std::string lower(std::string text) {
    std::transform(text.begin(), text.end(), text.begin(), [](unsigned char byte) { return std::tolower(byte); });
    return text;
}

bool isPort(const std::string& text) {
    return !text.empty() && text.size() <= 5 &&
           std::all_of(text.begin(), text.end(), [](unsigned char byte) { return std::isdigit(byte) != 0; });
}

// "host" or "host:port"; an IPv6 address stands in brackets. Empty where it is neither.
std::string hostPart(const std::string& header) {
    const std::size_t bracket = header.rfind(']');
    const std::size_t colon = header.find(':', bracket == std::string::npos ? 0 : bracket);
    if (colon != std::string::npos && !isPort(header.substr(colon + 1))) {
        return {};
    }
    const std::string host = header.substr(0, colon);
    const bool bracketed = host.size() > 2 && host.front() == '[' && host.back() == ']';
    return bracketed ? host.substr(1, host.size() - 2) : host;
}

} // namespace

bool namesThisMachine(const HttpRequest& request, const std::string& machineName) {
    const std::string host = lower(hostPart(request.header("Host")));
    const std::string own = lower(machineName);
    return !host.empty() && (g_hostname_is_ip_address(host.c_str()) != FALSE || host == "localhost" ||
                             (!own.empty() && (host == own || host == own + ".local")));
}

bool mayLook(const HttpRequest& request) {
    const std::string site = request.header("Sec-Fetch-Site");
    return site.empty() || site == "same-origin" || site == "none";
}

bool mayCommand(const HttpRequest& request) {
    const std::string site = request.header("Sec-Fetch-Site");
    const std::string type = lower(request.header("Content-Type"));
    return lower(request.header("Origin")) == "http://" + lower(request.header("Host")) &&
           (site.empty() || site == "same-origin") &&
           (type == "application/json" || type.rfind("application/json;", 0) == 0);
}

} // namespace qivo
