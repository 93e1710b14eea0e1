#include "platform/PointerState.h"

#include <QGuiApplication>

namespace qivo {

unsigned pressedMouseButtons() {
    static_assert(Qt::LeftButton == 1 && Qt::RightButton == 2 && Qt::MiddleButton == 4);
    constexpr unsigned kKnown = 7;
    return static_cast<unsigned>(QGuiApplication::mouseButtons().toInt()) & kKnown;
}

} // namespace qivo
