#pragma once

#include "runtime/UrlParts.h"

#include <chrono>
#include <string>
#include <string_view>

namespace qivo::runtime {

/// The proof of a password that WS-Security's UsernameToken carries: Base64(SHA-1(nonce + created + password)), with
/// the nonce as bytes.
std::string passwordDigest(std::string_view nonce, std::string_view created, std::string_view password);

/// A time as the token gives it, e.g. "2010-09-16T07:50:45Z".
std::string timeText(std::chrono::system_clock::time_point time);

/// The SOAP header with a UsernameToken for the login, made at `created` by the clock of the one who will read it.
/// `nonce` are bytes that are never used twice.
std::string securityHeader(const Login& login, std::string_view nonce, std::chrono::system_clock::time_point created);

/// Sixteen random bytes.
std::string newNonce();

} // namespace qivo::runtime
