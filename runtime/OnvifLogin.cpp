#include "runtime/OnvifLogin.h"

#include "runtime/GstHandles.h"
#include "runtime/SoapMessage.h"

#include <array>
#include <ctime>
#include <random>

namespace qivo::runtime {
namespace {

constexpr std::size_t kNonceBytes = 16;
constexpr const char* kSecurity = "http://docs.oasis-open.org/wss/2004/01/oasis-200401-wss-wssecurity-secext-1.0.xsd";
constexpr const char* kUtility = "http://docs.oasis-open.org/wss/2004/01/oasis-200401-wss-wssecurity-utility-1.0.xsd";
constexpr const char* kProfile = "http://docs.oasis-open.org/wss/2004/01/oasis-200401-wss-username-token-profile-1.0";
constexpr const char* kMessage = "http://docs.oasis-open.org/wss/2004/01/oasis-200401-wss-soap-message-security-1.0";

struct ChecksumRelease {
    void operator()(GChecksum* checksum) const { g_checksum_free(checksum); }
};

std::string sha1(const std::string& bytes) {
    const std::unique_ptr<GChecksum, ChecksumRelease> checksum(g_checksum_new(G_CHECKSUM_SHA1));
    g_checksum_update(checksum.get(), reinterpret_cast<const guchar*>(bytes.data()), static_cast<gssize>(bytes.size()));
    std::array<guchar, 20> digest{};
    gsize length = digest.size();
    g_checksum_get_digest(checksum.get(), digest.data(), &length);
    return {reinterpret_cast<const char*>(digest.data()), length};
}

std::string base64(std::string_view bytes) {
    const GstOwned<gchar> text(g_base64_encode(reinterpret_cast<const guchar*>(bytes.data()), bytes.size()));
    return text.get();
}

} // namespace

std::string passwordDigest(std::string_view nonce, std::string_view created, std::string_view password) {
    return base64(sha1(std::string(nonce).append(created).append(password)));
}

std::string timeText(std::chrono::system_clock::time_point time) {
    const std::time_t seconds = std::chrono::system_clock::to_time_t(time);
    std::tm parts{};
    gmtime_r(&seconds, &parts);
    std::array<char, 32> text{};
    return {text.data(), std::strftime(text.data(), text.size(), "%Y-%m-%dT%H:%M:%SZ", &parts)};
}

std::string securityHeader(const Login& login, std::string_view nonce, std::chrono::system_clock::time_point created) {
    const std::string time = timeText(created);
    // Without mustUnderstand: a device that knows only the login of HTTP would have to refuse the message.
    return std::string("<wsse:Security xmlns:wsse=\"") + kSecurity + "\" xmlns:wsu=\"" + kUtility +
           "\"><wsse:UsernameToken><wsse:Username>" + xmlText(login.user) + "</wsse:Username><wsse:Password Type=\"" +
           kProfile + "#PasswordDigest\">" + passwordDigest(nonce, time, login.password) +
           "</wsse:Password><wsse:Nonce EncodingType=\"" + kMessage + "#Base64Binary\">" + base64(nonce) +
           "</wsse:Nonce><wsu:Created>" + time + "</wsu:Created></wsse:UsernameToken></wsse:Security>";
}

std::string newNonce() {
    std::random_device random;
    std::string nonce;
    while (nonce.size() < kNonceBytes) {
        nonce += static_cast<char>(random());
    }
    return nonce;
}

} // namespace qivo::runtime
