#include "tests/tools/Digest.h"

#include <glib.h>

namespace qivo::test {
namespace {

std::string md5(const std::string& text) {
    gchar* sum = g_compute_checksum_for_string(G_CHECKSUM_MD5, text.data(), static_cast<gssize>(text.size()));
    const std::string copy = sum;
    g_free(sum);
    return copy;
}

} // namespace

std::string DigestAnswer::header() const {
    const std::string who = md5(user + ":" + realm + ":" + password);
    const std::string what = md5(method + ":" + uri);
    const std::string start =
        "Digest username=\"" + user + "\", realm=\"" + realm + "\", nonce=\"" + nonce + "\", uri=\"" + uri + "\", ";
    if (count.empty()) {
        return start + "response=\"" + md5(who + ":" + nonce + ":" + what) + "\"";
    }
    return start + "qop=auth, nc=" + count + ", cnonce=\"c1\", response=\"" +
           md5(who + ":" + nonce + ":" + count + ":c1:auth:" + what) + "\"";
}

std::string nonceIn(const std::string& challenge) {
    const std::size_t begin = challenge.find("nonce=\"");
    return begin == std::string::npos ? "" : challenge.substr(begin + 7, challenge.find('"', begin + 7) - begin - 7);
}

} // namespace qivo::test
