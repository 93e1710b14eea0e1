#include "platform/DrawableSize.h"

#include <QGuiApplication>
#include <QWindow>
#include <cstdlib>
#include <memory>
#include <xcb/xcb.h>

namespace qivo {

QSize drawableSize(const QWindow& window) {
    const auto* system = qGuiApp->nativeInterface<QNativeInterface::QX11Application>();
    if (system == nullptr || window.handle() == nullptr) {
        return {};
    }
    xcb_connection_t* connection = system->connection();
    const auto request = xcb_get_geometry(connection, static_cast<xcb_drawable_t>(window.winId()));
    const std::unique_ptr<xcb_get_geometry_reply_t, decltype(&std::free)> reply(
        xcb_get_geometry_reply(connection, request, nullptr), std::free);
    return reply ? QSize(reply->width, reply->height) : QSize();
}

} // namespace qivo
