#include "ptz/PTZSymbol.h"

#include "platform/SymbolIcon.h"

#include <QPainter>
#include <QPainterPath>

namespace qivo {
namespace {

const QColor kStoring(0xd0, 0x2c, 0x2c);
constexpr qreal kMiddle = kSymbolGrid / 2;

QPen penOf(const QColor& ink) {
    return {ink, 1.6, Qt::SolidLine, Qt::RoundCap, Qt::RoundJoin};
}

/// A triangle that points up, turned clockwise.
SymbolDrawing triangle(qreal degrees) {
    return [degrees](QPainter& painter, const QColor& ink, bool) {
        painter.translate(kMiddle, kMiddle);
        painter.rotate(degrees);
        painter.setPen(QPen(ink, 1.2, Qt::SolidLine, Qt::RoundCap, Qt::RoundJoin));
        painter.setBrush(ink);
        painter.drawPolygon(QPolygonF({{0, -4}, {4.8, 3.2}, {-4.8, 3.2}}));
    };
}

void drawLens(QPainter& painter, const QColor& ink) {
    painter.setPen(penOf(ink));
    painter.drawEllipse(QPointF(6.5, 6.5), 4.8, 4.8);
    painter.drawLine(QPointF(10.2, 10.2), QPointF(14.2, 14.2));
    painter.drawLine(QPointF(4.4, 6.5), QPointF(8.6, 6.5));
}

void drawZoomIn(QPainter& painter, const QColor& ink, bool /*on*/) {
    drawLens(painter, ink);
    painter.drawLine(QPointF(6.5, 4.4), QPointF(6.5, 8.6));
}

void drawZoomOut(QPainter& painter, const QColor& ink, bool /*on*/) {
    drawLens(painter, ink);
}

/// The corners of a viewfinder.
void drawAutofocus(QPainter& painter, const QColor& ink, bool /*on*/) {
    painter.setPen(penOf(ink));
    painter.translate(kMiddle, kMiddle);
    for (int corner = 0; corner < 4; ++corner) {
        painter.drawPolyline(QPolygonF({{-6, -2.5}, {-6, -6}, {-2.5, -6}}));
        painter.rotate(90);
    }
    painter.setBrush(ink);
    painter.drawEllipse(QPointF(0, 0), 1.2, 1.2);
}

/// An arrow into a tray.
void drawStore(QPainter& painter, const QColor& ink, bool on) {
    painter.setPen(penOf(on ? kStoring : ink));
    painter.drawPolyline(QPolygonF({{2, 9.5}, {2, 13.5}, {14, 13.5}, {14, 9.5}}));
    painter.drawLine(QPointF(8, 2), QPointF(8, 9.5));
    painter.drawPolyline(QPolygonF({{4.8, 6.6}, {8, 9.8}, {11.2, 6.6}}));
}

} // namespace

QIcon ptzIcon(PTZSymbol symbol) {
    switch (symbol) {
    case PTZSymbol::up:
        return symbolIcon(triangle(0));
    case PTZSymbol::right:
        return symbolIcon(triangle(90));
    case PTZSymbol::down:
        return symbolIcon(triangle(180));
    case PTZSymbol::left:
        return symbolIcon(triangle(270));
    case PTZSymbol::zoomIn:
        return symbolIcon(drawZoomIn);
    case PTZSymbol::zoomOut:
        return symbolIcon(drawZoomOut);
    case PTZSymbol::autofocus:
        return symbolIcon(drawAutofocus);
    case PTZSymbol::store:
        return symbolIcon(drawStore);
    }
    return {};
}

} // namespace qivo
