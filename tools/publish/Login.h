#pragma once

#include "tools/publish/HttpServer.h"

#include <chrono>
#include <cstdint>
#include <functional>
#include <map>
#include <optional>
#include <string>
#include <string_view>

namespace qivo {

inline constexpr std::size_t maximumLoginBytes = 64;

/** What clients are told that the login is for. */
inline constexpr const char* loginRealm = "qivo-publish";

/** Who may see and steer. */
struct Login {
    std::string user;
    std::string password;
};

/** Reads "USER:PASSWORD"; the password may hold colons. Each is 1 to maximumLoginBytes bytes of UTF-8 without control
 *  characters, the user without quotation mark and backslash. Null otherwise. */
[[nodiscard]] std::optional<Login> parseLogin(std::string_view text);

/** Whether two texts are equal, in a time that tells nothing of where they differ. */
[[nodiscard]] bool equalInConstantTime(std::string_view one, std::string_view other);

/** HTTP digest authentication (RFC 7616, MD5, qop "auth") for one login. A nonce is taken for five minutes, and each of
 *  its counts once, so that an answer that somebody overheard is worth nothing. Lives on one thread. */
class HttpLogin {
  public:
    using Clock = std::function<std::chrono::steady_clock::time_point()>;

    static constexpr std::chrono::minutes nonceLife{5};

    /** Nonces in use of which the counts are kept. When there are more, the oldest are no longer taken. */
    static constexpr std::size_t maximumNonces = 256;

    explicit HttpLogin(Login login, Clock clock = std::chrono::steady_clock::now);

    [[nodiscard]] const Login& login() const { return m_login; }

    enum class Verdict {
        accepted,
        stale, ///< the login is right, the nonce or its count is not
        refused
    };

    /** What the request's Authorization header says. An accepted answer is used up. */
    [[nodiscard]] Verdict check(const HttpRequest& request);

    /** 401 with a fresh nonce. */
    [[nodiscard]] HttpResponse challenge(Verdict verdict) const;

    /** A handler that only those reach who have logged in. It must not outlive this. */
    [[nodiscard]] HttpHandler protect(HttpHandler handler);

  private:
    struct Counts {
        std::uint32_t highest = 0;
        std::uint64_t seen = 0; // bit n: highest - n was there
    };
    [[nodiscard]] std::string nonceOf(std::int64_t issued) const;
    [[nodiscard]] std::optional<std::int64_t> issueOf(const std::string& nonce) const;
    [[nodiscard]] bool use(std::int64_t issued, std::uint32_t count);
    [[nodiscard]] std::int64_t now() const;

    Login m_login;
    Clock m_clock;
    std::string m_secret;
    std::map<std::int64_t, Counts> m_used; // by time of issue
    std::int64_t m_oldest = 0;             // issued before: no longer taken
};

} // namespace qivo
