#include "platform/KeyState.h"

#include <QGuiApplication>

#include <cstdlib>
#include <memory>
#include <xcb/xproto.h>

namespace qivo {

bool keyIsDown(std::uint32_t scanCode) {
    constexpr std::uint32_t kKeyCodes = 256;
    auto* x11 = qGuiApp->nativeInterface<QNativeInterface::QX11Application>();
    // Without a screen the interface may be there, but not the connection.
    xcb_connection_t* connection = x11 != nullptr ? x11->connection() : nullptr;
    if (connection == nullptr || scanCode >= kKeyCodes) {
        return false;
    }
    const std::unique_ptr<xcb_query_keymap_reply_t, void (*)(void*)> reply(
        xcb_query_keymap_reply(connection, xcb_query_keymap(connection), nullptr), std::free);
    return reply != nullptr && (reply->keys[scanCode / 8] >> (scanCode % 8) & 1) != 0; // NOLINT: a record of C
}

} // namespace qivo
