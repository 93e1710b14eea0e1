#include "tools/publish/Login.h"

#include <algorithm>
#include <charconv>
#include <sys/random.h>

namespace qivo {
namespace {

constexpr std::size_t secretBytes = 32;

using Parameters = std::unique_ptr<GHashTable, void (*)(GHashTable*)>;

std::string parameter(const Parameters& parameters, const char* name) {
    const auto* value = static_cast<const char*>(g_hash_table_lookup(parameters.get(), name));
    return value != nullptr ? value : "";
}

std::string md5(const std::string& text) {
    return Text(g_compute_checksum_for_string(G_CHECKSUM_MD5, text.data(), static_cast<gssize>(text.size()))).get();
}

bool mayBePart(std::string_view text) {
    return !text.empty() && text.size() <= maximumLoginBytes &&
           g_utf8_validate(text.data(), static_cast<gssize>(text.size()), nullptr) != FALSE &&
           std::none_of(text.begin(), text.end(), [](unsigned char byte) { return byte < ' ' || byte == 0x7F; });
}

// Of a request target, in whichever form it was written.
std::string withoutHost(const std::string& uri) {
    const std::size_t scheme = uri.find("://");
    if (scheme == std::string::npos) {
        return uri;
    }
    const std::size_t path = uri.find('/', scheme + 3);
    return path == std::string::npos ? "/" : uri.substr(path);
}

std::optional<std::uint64_t> hexNumber(const std::string& text) {
    std::uint64_t value = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), value, 16);
    return !text.empty() && error == std::errc{} && end == text.data() + text.size() ? std::optional(value)
                                                                                     : std::nullopt;
}

} // namespace

std::optional<Login> parseLogin(std::string_view text) {
    const std::size_t colon = text.find(':');
    if (colon == std::string_view::npos || !mayBePart(text.substr(0, colon)) || !mayBePart(text.substr(colon + 1)) ||
        text.substr(0, colon).find_first_of("\"\\") != std::string_view::npos) {
        return std::nullopt;
    }
    return Login{std::string(text.substr(0, colon)), std::string(text.substr(colon + 1))};
}

bool equalInConstantTime(std::string_view one, std::string_view other) {
    unsigned differences = one.size() == other.size() ? 0 : 1;
    for (std::size_t i = 0; i < one.size() && !other.empty(); ++i) {
        differences |= static_cast<unsigned char>(one[i]) ^ static_cast<unsigned char>(other[i % other.size()]);
    }
    return differences == 0;
}

HttpLogin::HttpLogin(Login login, Clock clock)
    : m_login(std::move(login)), m_clock(std::move(clock)), m_secret(secretBytes, '\0') {
    // At most 256 bytes are given whole and without fail once the system has any.
    while (getrandom(m_secret.data(), m_secret.size(), 0) != static_cast<ssize_t>(m_secret.size())) {
    }
}

std::int64_t HttpLogin::now() const {
    return std::chrono::duration_cast<std::chrono::microseconds>(m_clock().time_since_epoch()).count();
}

// The time of issue, signed, so that nothing is kept for those who only ask.
std::string HttpLogin::nonceOf(std::int64_t issued) const {
    const std::string time = std::to_string(issued);
    const Text signature(g_compute_hmac_for_string(G_CHECKSUM_SHA256, reinterpret_cast<const guchar*>(m_secret.data()),
                                                   m_secret.size(), time.data(), static_cast<gssize>(time.size())));
    return time + "-" + std::string(signature.get()).substr(0, 32);
}

std::optional<std::int64_t> HttpLogin::issueOf(const std::string& nonce) const {
    std::int64_t issued = 0;
    const auto [end, error] = std::from_chars(nonce.data(), nonce.data() + nonce.size(), issued);
    if (error != std::errc{} || !equalInConstantTime(nonce, nonceOf(issued))) {
        return std::nullopt;
    }
    return issued;
}

// A browser asks for several things at once, so counts may overtake each other a little.
bool HttpLogin::use(std::int64_t issued, std::uint32_t count) {
    constexpr std::uint32_t window = 64;
    const auto life = std::chrono::duration_cast<std::chrono::microseconds>(nonceLife).count();
    m_oldest = std::max(m_oldest, now() - life);
    m_used.erase(m_used.begin(), m_used.lower_bound(m_oldest));
    if (issued < m_oldest || count == 0) {
        return false;
    }
    Counts& counts = m_used[issued];
    if (count > counts.highest) {
        const std::uint32_t ahead = count - counts.highest;
        counts.seen = (ahead < window ? counts.seen << ahead : 0) | 1U;
        counts.highest = count;
    } else {
        const std::uint32_t behind = counts.highest - count;
        if (behind >= window || (counts.seen >> behind & 1U) != 0) {
            return false;
        }
        counts.seen |= std::uint64_t{1} << behind;
    }
    if (m_used.size() > maximumNonces) {
        m_oldest = m_used.begin()->first + 1;
        m_used.erase(m_used.begin());
    }
    return true;
}

HttpLogin::Verdict HttpLogin::check(const HttpRequest& request) {
    const std::string header = request.header("Authorization");
    constexpr std::string_view scheme = "Digest ";
    if (header.size() < scheme.size() || g_ascii_strncasecmp(header.data(), scheme.data(), scheme.size()) != 0) {
        return Verdict::refused;
    }
    const Parameters said(soup_header_parse_param_list(header.c_str() + scheme.size()), soup_header_free_param_list);
    const std::string target = request.path + (request.query.empty() ? "" : "?" + request.query);
    const std::string uri = parameter(said, "uri");
    const std::string nonce = parameter(said, "nonce");
    const std::string count = parameter(said, "nc");
    const std::string expected =
        md5(md5(m_login.user + ":" + loginRealm + ":" + m_login.password) + ":" + nonce + ":" + count + ":" +
            parameter(said, "cnonce") + ":auth:" + md5(request.sentMethod + ":" + uri));
    const bool rightResponse = equalInConstantTime(parameter(said, "response"), expected);
    const bool rightUser = equalInConstantTime(parameter(said, "username"), m_login.user);
    const bool right = rightResponse && rightUser && parameter(said, "qop") == "auth" && withoutHost(uri) == target;
    if (!right) {
        return Verdict::refused;
    }
    const auto issued = issueOf(nonce);
    const auto number = hexNumber(count);
    const bool fresh = issued && number && *number <= UINT32_MAX && use(*issued, static_cast<std::uint32_t>(*number));
    return fresh ? Verdict::accepted : Verdict::stale;
}

HttpResponse HttpLogin::challenge(Verdict verdict) const {
    const std::string value = std::string("Digest realm=\"") + loginRealm +
                              "\", qop=\"auth\", algorithm=MD5, nonce=\"" + nonceOf(now()) + "\"" +
                              (verdict == Verdict::stale ? ", stale=true" : "");
    return {401, "text/plain; charset=utf-8", "A login is needed.\n", {{"WWW-Authenticate", value}}};
}

HttpHandler HttpLogin::protect(HttpHandler handler) {
    return [this, handler = std::move(handler)](const HttpRequest& request, HttpReply reply) {
        const Verdict verdict = check(request);
        if (verdict == Verdict::accepted) {
            handler(request, std::move(reply));
        } else {
            reply.send(challenge(verdict));
        }
    };
}

} // namespace qivo
