#pragma once

#include "tools/publish/onvif/Xml.h"

#include <chrono>
#include <functional>
#include <set>
#include <string>
#include <utility>

namespace qivo {

/** Judges the WS-Security UsernameToken of requests by one login. Only digests count: a password in the clear is
 * refused like a wrong one. A nonce is good once with its time stamp, which the digest binds to it.
 *
 *  Thread: one. */
class UsernameTokens {
  public:
    using Time = std::chrono::system_clock::time_point;
    using Clock = std::function<Time()>;

    /** How far a client's clock may be off. */
    static constexpr std::chrono::seconds tolerance{300};

    /** The oldest nonces are forgotten beyond so many. Only who knows the password adds any. */
    static constexpr std::size_t maximumNonces = 65536;

    UsernameTokens(std::string user, std::string password, Clock clock = std::chrono::system_clock::now);

    /** True if the header of a request, which may be nothing, holds a good token that was not seen before. */
    [[nodiscard]] bool accepts(XmlElement header);

  private:
    [[nodiscard]] bool remember(const std::string& nonce, Time created);

    std::string m_user;
    std::string m_password;
    Clock m_clock;
    std::set<std::pair<Time, std::string>> m_seen; // time stamps, each with its nonce
};

/** What a client puts into a token: Base64 of the SHA-1 of nonce, time stamp and password. */
[[nodiscard]] std::string passwordDigest(const std::string& nonce, const std::string& created,
                                         const std::string& password);

} // namespace qivo
