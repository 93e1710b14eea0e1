#pragma once

#include <QSize>

class QWindow;

namespace qivo {

/// The size that the window system has given a window, in pixels. Empty if the window is not known to it, or if it does
/// not tell; then the window's own size times its scale is the best guess. Waits for the X server's answer.
///
/// Thread: main.
QSize drawableSize(const QWindow& window);

} // namespace qivo
