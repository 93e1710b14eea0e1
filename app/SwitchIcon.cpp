#include "app/SwitchIcon.h"

#include "platform/SymbolIcon.h"

#include <QPainter>
#include <QPainterPath>

namespace qivo {
namespace {

const QColor kRecording(0xd0, 0x2c, 0x2c);

void drawRecord(QPainter& painter, const QColor& ink, bool on) {
    painter.setPen(QPen(on ? kRecording : ink, 1.5));
    painter.drawEllipse(QPointF(8, 8), 6.2, 6.2);
    painter.setPen(Qt::NoPen);
    painter.setBrush(kRecording);
    painter.drawEllipse(QPointF(8, 8), on ? 4.4 : 3.0, on ? 4.4 : 3.0);
}

void drawSpeaker(QPainter& painter, const QColor& ink, bool muted) {
    QPainterPath speaker;
    speaker.addPolygon(QPolygonF({{1.5, 6}, {4, 6}, {8, 2.5}, {8, 13.5}, {4, 10}, {1.5, 10}}));
    speaker.closeSubpath();
    painter.fillPath(speaker, ink);
    painter.setPen(QPen(ink, 1.5, Qt::SolidLine, Qt::RoundCap));
    if (muted) {
        painter.drawLine(QPointF(10.5, 5.5), QPointF(15, 10.5));
        painter.drawLine(QPointF(15, 5.5), QPointF(10.5, 10.5));
    } else {
        painter.drawArc(QRectF(6.5, 5, 6, 6), -45 * 16, 90 * 16);
        painter.drawArc(QRectF(5, 2.5, 10, 11), -50 * 16, 100 * 16);
    }
}

void drawBars(QPainter& painter, const QColor& ink, bool low) {
    QColor faint = ink;
    faint.setAlphaF(0.3F);
    for (int bar = 0; bar < 4; ++bar) {
        const qreal height = 3.0 + 3.3 * bar;
        painter.fillRect(QRectF(1.5 + 3.5 * bar, 14 - height, 2.5, height), low && bar > 0 ? faint : ink);
    }
}

} // namespace

QIcon switchIcon(SwitchSymbol symbol) {
    switch (symbol) {
    case SwitchSymbol::record:
        return symbolIcon(drawRecord);
    case SwitchSymbol::mute:
        return symbolIcon(drawSpeaker);
    case SwitchSymbol::lowBandwidth:
        return symbolIcon(drawBars);
    }
    return {};
}

} // namespace qivo
