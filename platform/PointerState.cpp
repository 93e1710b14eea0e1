#include "platform/PointerState.h"

#include <QGuiApplication>

#include <cstdlib>
#include <memory>
#include <optional>
#include <xcb/xproto.h>

namespace qivo {
namespace {

/// What an X server says; nothing where there is none.
std::optional<unsigned> buttonsOfServer() {
    auto* x11 = qGuiApp->nativeInterface<QNativeInterface::QX11Application>();
    // Without a screen the interface may be there, but not the connection.
    xcb_connection_t* connection = x11 != nullptr ? x11->connection() : nullptr;
    if (connection == nullptr) {
        return std::nullopt;
    }
    const xcb_window_t root = xcb_setup_roots_iterator(xcb_get_setup(connection)).data->root;
    const std::unique_ptr<xcb_query_pointer_reply_t, void (*)(void*)> reply(
        xcb_query_pointer_reply(connection, xcb_query_pointer(connection, root), nullptr), std::free);
    if (reply == nullptr) {
        return std::nullopt;
    }
    const auto bit = [mask = reply->mask](unsigned button, unsigned value) {
        return (mask & button) != 0 ? value : 0U;
    };
    return bit(XCB_KEY_BUT_MASK_BUTTON_1, 1) | bit(XCB_KEY_BUT_MASK_BUTTON_3, 2) | bit(XCB_KEY_BUT_MASK_BUTTON_2, 4);
}

/// What the toolkit knows by the event that it is delivering.
unsigned buttonsOfToolkit() {
    static_assert(Qt::LeftButton == 1 && Qt::RightButton == 2 && Qt::MiddleButton == 4);
    constexpr unsigned kKnown = 7;
    return static_cast<unsigned>(QGuiApplication::mouseButtons().toInt()) & kKnown;
}

} // namespace

unsigned pressedMouseButtons() {
    const auto buttons = buttonsOfServer();
    return buttons ? *buttons : buttonsOfToolkit();
}

} // namespace qivo
