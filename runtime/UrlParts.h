#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace qivo::runtime {

/// User and password, as they are typed.
struct Login {
    std::string user;
    std::string password;

    bool operator==(const Login&) const = default;
};

/// The parts of a URL of any scheme.
struct UrlParts {
    std::string scheme; ///< in lower case
    std::optional<Login> login;
    std::string host; ///< without the brackets of a numeric IPv6 address
    int port = 0;     ///< 0 where none is given
    std::string path; ///< with query, without fragment; "/" where there is none
};

/// Nothing if the text is not "scheme://host..." with a valid port, if any.
std::optional<UrlParts> urlParts(std::string_view url);

/// The address again, without its login.
std::string urlOf(const UrlParts& parts);

/// Whether both name the same host: numeric addresses by value, names without regard to case. Names are not resolved,
/// since whoever answers for a name can change the answer.
bool sameHost(std::string_view one, std::string_view other);

} // namespace qivo::runtime
