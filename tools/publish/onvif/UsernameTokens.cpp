#include "tools/publish/onvif/UsernameTokens.h"

#include "tools/publish/Handles.h"

#include <array>
#include <glib.h>
#include <optional>
#include <vector>

namespace qivo {
namespace {

constexpr std::size_t maximumNonceCharacters = 256;
constexpr const char* digestType =
    "http://docs.oasis-open.org/wss/2004/01/oasis-200401-wss-username-token-profile-1.0#PasswordDigest";

struct FreeChecksum {
    void operator()(GChecksum* checksum) const { g_checksum_free(checksum); }
};
struct FreeDateTime {
    void operator()(GDateTime* time) const { g_date_time_unref(time); }
};
struct FreeBytes {
    void operator()(guchar* bytes) const { g_free(bytes); }
};
struct FreeZone {
    void operator()(GTimeZone* zone) const { g_time_zone_unref(zone); }
};

std::optional<std::string> decoded(const std::string& text) {
    if (text.empty() || text.size() > maximumNonceCharacters) {
        return std::nullopt;
    }
    gsize size = 0;
    const std::unique_ptr<guchar, FreeBytes> bytes(g_base64_decode(text.c_str(), &size));
    return bytes && size != 0 ? std::optional(std::string(reinterpret_cast<const char*>(bytes.get()), size))
                              : std::nullopt;
}

std::optional<UsernameTokens::Time> timeIn(const std::string& text) {
    const std::unique_ptr<GTimeZone, FreeZone> utc(g_time_zone_new_utc());
    const std::unique_ptr<GDateTime, FreeDateTime> time(g_date_time_new_from_iso8601(text.c_str(), utc.get()));
    if (!time) {
        return std::nullopt;
    }
    return UsernameTokens::Time(std::chrono::seconds(g_date_time_to_unix(time.get())));
}

} // namespace

std::string passwordDigest(const std::string& nonce, const std::string& created, const std::string& password) {
    const std::unique_ptr<GChecksum, FreeChecksum> checksum(g_checksum_new(G_CHECKSUM_SHA1));
    for (const std::string* part : {&nonce, &created, &password}) {
        g_checksum_update(checksum.get(), reinterpret_cast<const guchar*>(part->data()),
                          static_cast<gssize>(part->size()));
    }
    std::array<guint8, 20> digest{};
    gsize size = digest.size();
    g_checksum_get_digest(checksum.get(), digest.data(), &size);
    const Text text(g_base64_encode(digest.data(), size));
    return text.get();
}

UsernameTokens::UsernameTokens(Login login, Clock clock) : m_login(std::move(login)), m_clock(std::move(clock)) {}

bool UsernameTokens::accepts(XmlElement header, bool question) {
    const XmlElement token = header.child("Security").child("UsernameToken");
    const XmlElement password = token.child("Password");
    const std::string created = token.child("Created").text();
    const auto nonce = decoded(token.child("Nonce").text());
    const auto time = timeIn(created);
    if (!nonce || !time || password.attribute("Type").value_or("") != digestType) {
        return false;
    }
    const bool right = equalInConstantTime(token.child("Username").text(), m_login.user) &&
                       equalInConstantTime(password.text(), passwordDigest(*nonce, created, m_login.password));
    return right && mayBeUsed(created + '\n' + *nonce, *time, question);
}

bool UsernameTokens::mayBeUsed(const std::string& token, Time created, bool question) {
    const Time now = m_clock();
    if (created < now - tolerance || created > now + tolerance) {
        return false;
    }
    m_seen.erase(m_seen.begin(), m_seen.lower_bound({now - tolerance, {}}));
    const auto [first, fresh] = m_seen.emplace(std::pair(created, token), now);
    const bool allowed = fresh || (question && now >= first->second && now - first->second <= repetition);
    if (m_seen.size() > maximumTokens) {
        m_seen.erase(m_seen.begin());
    }
    return allowed;
}

} // namespace qivo
