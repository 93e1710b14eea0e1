#pragma once

#include "tools/publish/Handles.h"
#include "tools/publish/onvif/UsernameTokens.h"

#include <string>

namespace qivo::test {

/// A WS-Security header, right unless a test changes it.
struct Token {
    std::string user = "admin";
    std::string password = "secret";
    std::string nonce = "0123456789abcdef";
    std::string created;
    std::string type = "#PasswordDigest";
    std::string given; // in place of the digest

    [[nodiscard]] std::string xml() const {
        const Text encoded(g_base64_encode(reinterpret_cast<const guchar*>(nonce.data()), nonce.size()));
        const std::string digest = given.empty() ? passwordDigest(nonce, created, password) : given;
        return "<w:Security xmlns:w=\"http://docs.oasis-open.org/wss/2004/01/"
               "oasis-200401-wss-wssecurity-secext-1.0.xsd\"><w:UsernameToken><w:Username>" +
               user +
               "</w:Username><w:Password Type=\"http://docs.oasis-open.org/wss/2004/01/"
               "oasis-200401-wss-username-token-profile-1.0" +
               type + "\">" + digest + "</w:Password><w:Nonce>" + encoded.get() + "</w:Nonce><w:Created>" + created +
               "</w:Created></w:UsernameToken></w:Security>";
    }
};

} // namespace qivo::test
