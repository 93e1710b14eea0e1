#include "ptz/MotionKeys.h"

#include "platform/KeyState.h"

#include <QKeyEvent>
#include <QWidget>
#include <QWindow>

#include <algorithm>
#include <utility>

namespace qivo {
namespace {

/// Shift is how many keyboards type a plus. With any other modifier a key is a shortcut's.
bool isPlain(const QKeyEvent& event) {
    return (event.modifiers() & ~(Qt::ShiftModifier | Qt::KeypadModifier)) == Qt::NoModifier;
}

} // namespace

MotionKeys::MotionKeys(QWidget* window) {
    window->installEventFilter(this);
}

bool MotionKeys::eventFilter(QObject* watched, QEvent* event) {
    const bool isNative = watched->isWindowType();
    if (!isNative && event->type() == QEvent::WinIdChange) {
        watchKeys(*static_cast<QWidget*>(watched));
    }
    if (isNative && event->type() == QEvent::KeyPress) {
        return handlePress(*static_cast<QKeyEvent*>(event));
    }
    if (isNative && event->type() == QEvent::KeyRelease) {
        return handleRelease(*static_cast<QKeyEvent*>(event));
    }
    if (!isNative && (event->type() == QEvent::WindowDeactivate || event->type() == QEvent::Hide)) {
        letAllGo();
    }
    return QObject::eventFilter(watched, event);
}

/// The window of the window system has the keys before any control. It is not made here for that: asked for it, the
/// toolkit would make one of each control of the parent's window too, and cover the picture with them.
void MotionKeys::watchKeys(const QWidget& window) {
    if (QWindow* native = window.windowHandle()) {
        native->installEventFilter(this);
    }
}

MotionKeys::Motion MotionKeys::motionOf(const QKeyEvent& event) {
    switch (event.key()) {
    case Qt::Key_Left:
        return {1, 0, 0};
    case Qt::Key_Right:
        return {-1, 0, 0};
    case Qt::Key_Up:
        return {0, 1, 0};
    case Qt::Key_Down:
        return {0, -1, 0};
    case Qt::Key_Plus:
    case Qt::Key_Equal: // plus without Shift
        return {0, 0, 1};
    case Qt::Key_Minus:
    case Qt::Key_Underscore: // minus with Shift
        return {0, 0, -1};
    default:
        return {};
    }
}

bool MotionKeys::handlePress(const QKeyEvent& event) {
    const Motion motion = motionOf(event);
    const bool isMotion = motion.pan != 0 || motion.tilt != 0 || motion.zoom != 0;
    const bool isPreset = event.key() >= Qt::Key_1 && event.key() <= Qt::Key_9;
    if (!isPlain(event) || (!isMotion && !isPreset)) {
        return false;
    }
    if (event.isAutoRepeat() || (isMotion && find(event) != m_held.end())) {
        return true;
    }
    if (isPreset) {
        emit preset(event.key() - Qt::Key_0);
    } else {
        m_held.push_back({event.key(), event.nativeScanCode(), motion});
        announce(motion);
    }
    return true;
}

bool MotionKeys::handleRelease(const QKeyEvent& event) {
    const auto held = find(event);
    if (held == m_held.end()) {
        return false;
    }
    if (!event.isAutoRepeat() && !keyIsDown(event.nativeScanCode())) {
        const Motion motion = held->motion;
        m_held.erase(held);
        announce(motion);
    }
    return true;
}

/// A key may give another sign when it goes up than when it went down, if Shift has been let go in between.
std::vector<MotionKeys::HeldKey>::iterator MotionKeys::find(const QKeyEvent& event) {
    return std::find_if(m_held.begin(), m_held.end(), [&](const HeldKey& held) {
        return event.nativeScanCode() != 0 ? held.scanCode == event.nativeScanCode() : held.key == event.key();
    });
}

void MotionKeys::letAllGo() {
    Motion changed;
    for (const HeldKey& held : std::exchange(m_held, {})) {
        changed.pan |= held.motion.pan;
        changed.tilt |= held.motion.tilt;
        changed.zoom |= held.motion.zoom;
    }
    announce(changed);
}

void MotionKeys::tellAgain() {
    Motion held;
    for (const HeldKey& key : m_held) {
        held.pan |= key.motion.pan;
        held.tilt |= key.motion.tilt;
        held.zoom |= key.motion.zoom;
    }
    announce(held);
}

/// Tells the sums of those kinds of motion that a key has changed.
void MotionKeys::announce(const Motion& changed) {
    Motion sum;
    for (const HeldKey& held : m_held) {
        sum.pan += held.motion.pan;
        sum.tilt += held.motion.tilt;
        sum.zoom += held.motion.zoom;
    }
    if (changed.pan != 0 || changed.tilt != 0) {
        emit panTilt(std::clamp(sum.pan, -1, 1), std::clamp(sum.tilt, -1, 1));
    }
    if (changed.zoom != 0) {
        emit zoom(std::clamp(sum.zoom, -1, 1));
    }
}

} // namespace qivo
