#pragma once

#include "tools/publish/Login.h"
#include "tools/publish/onvif/Xml.h"

#include <chrono>
#include <functional>
#include <map>
#include <string>
#include <utility>

namespace qivo {

/** Judges the WS-Security UsernameToken of requests by one login. Only digests count: a password in the clear is
 * refused like a wrong one. A token, known by its nonce and time stamp, is good once; for questions, which change
 * nothing, a moment longer, since there are clients that ask several things with the same.
 *
 *  Thread: one. */
class UsernameTokens {
  public:
    using Time = std::chrono::system_clock::time_point;
    using Clock = std::function<Time()>;

    /** How far a client's clock may be off. */
    static constexpr std::chrono::seconds tolerance{300};

    /** How long after its first use a token is good for further questions. */
    static constexpr std::chrono::seconds repetition{1};

    /** The oldest tokens are forgotten beyond so many. Only who knows the password adds any. */
    static constexpr std::size_t maximumTokens = 65536;

    explicit UsernameTokens(Login login, Clock clock = std::chrono::system_clock::now);

    /** True if the header of a request, which may be nothing, holds a good token. `question`: it changes nothing. */
    [[nodiscard]] bool accepts(XmlElement header, bool question);

  private:
    [[nodiscard]] bool mayBeUsed(const std::string& token, Time created, bool question);

    Login m_login;
    Clock m_clock;
    std::map<std::pair<Time, std::string>, Time> m_seen; // tokens by time stamp; when they first came
};

/** What a client puts into a token: Base64 of the SHA-1 of nonce, time stamp and password. */
[[nodiscard]] std::string passwordDigest(const std::string& nonce, const std::string& created,
                                         const std::string& password);

} // namespace qivo
