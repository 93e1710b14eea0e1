#include "ptz/HoldButton.h"

#include <QMouseEvent>

namespace qivo {

HoldButton::HoldButton(QWidget* parent) : QToolButton(parent) {}

void HoldButton::setState(int state) {
    if (m_state != state) {
        m_state = state;
        emit stateChanged(state);
    }
}

void HoldButton::mousePressEvent(QMouseEvent* event) {
    if (event->button() != Qt::LeftButton) {
        return;
    }
    m_isHeld = true;
    setDown(true);
    emit pressed();
}

/// The toolkit's own button would count as released as soon as the pointer leaves it.
void HoldButton::mouseMoveEvent(QMouseEvent* event) {
    event->accept();
}

void HoldButton::mouseReleaseEvent(QMouseEvent* event) {
    if (event->button() != Qt::LeftButton || !m_isHeld) {
        return;
    }
    letGo();
    if (hitButton(event->position().toPoint())) {
        setState(m_state == 0 ? 1 : 0);
    }
    emit released();
}

bool HoldButton::event(QEvent* event) {
    const bool isHidden = event->type() == QEvent::Hide;
    if (m_isHeld && (isHidden || event->type() == QEvent::WindowDeactivate)) {
        emit interrupted();
        if (isHidden) {
            letGo(); // the toolkit sends no more of this press
        }
    }
    return QToolButton::event(event);
}

void HoldButton::letGo() {
    m_isHeld = false;
    setDown(false);
}

} // namespace qivo
