#include "platform/TrackingArea.h"

#include <QMouseEvent>
#include <QResizeEvent>
#include <QWidget>

namespace qivo {

TrackingArea::TrackingArea(QWidget* view, const QRect& rect) : QObject(view), m_rect(rect) {
    view->setMouseTracking(true);
    view->installEventFilter(this);
}

bool TrackingArea::eventFilter(QObject* watched, QEvent* event) {
    switch (event->type()) {
    case QEvent::Enter:
    case QEvent::MouseMove:
    case QEvent::MouseButtonPress:
    case QEvent::MouseButtonRelease:
        setInside(m_rect.contains(static_cast<const QSinglePointEvent*>(event)->position().toPoint()));
        break;
    case QEvent::Leave:
        setInside(false);
        break;
    case QEvent::Resize:
        m_rect = QRect(QPoint(0, 0), static_cast<const QResizeEvent*>(event)->size());
        break;
    default:
        break;
    }
    return QObject::eventFilter(watched, event);
}

void TrackingArea::setInside(bool inside) {
    if (m_isInside == inside) {
        return;
    }
    m_isInside = inside;
    if (inside) {
        emit mouseEntered();
    } else {
        emit mouseExited();
    }
}

} // namespace qivo
