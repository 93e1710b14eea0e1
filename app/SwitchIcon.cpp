#include "app/SwitchIcon.h"

#include <QGuiApplication>
#include <QIconEngine>
#include <QPainter>
#include <QPainterPath>
#include <QPalette>

#include <memory>

namespace qivo {
namespace {

/// The side of the square on which the symbols are drawn.
constexpr qreal kGrid = 16;

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

class SwitchIconEngine : public QIconEngine {
  public:
    explicit SwitchIconEngine(SwitchSymbol symbol) : m_symbol(symbol) {}

    void paint(QPainter* painter, const QRect& rect, QIcon::Mode mode, QIcon::State state) override {
        const auto group = mode == QIcon::Disabled ? QPalette::Disabled : QPalette::Active;
        const QColor ink = QGuiApplication::palette().color(group, QPalette::ButtonText);
        const qreal side = qMin(rect.width(), rect.height());
        painter->save();
        painter->setRenderHint(QPainter::Antialiasing);
        painter->translate(rect.center() + QPointF(0.5, 0.5) - QPointF(side / 2, side / 2));
        painter->scale(side / kGrid, side / kGrid);
        draw(*painter, ink, state == QIcon::On);
        painter->restore();
    }

    QPixmap pixmap(const QSize& size, QIcon::Mode mode, QIcon::State state) override {
        QPixmap pixmap(size);
        pixmap.fill(Qt::transparent);
        QPainter painter(&pixmap);
        paint(&painter, QRect(QPoint(0, 0), size), mode, state);
        return pixmap;
    }

    QIconEngine* clone() const override { return new SwitchIconEngine(*this); } // NOLINT: the caller owns it

  private:
    void draw(QPainter& painter, const QColor& ink, bool on) const {
        switch (m_symbol) {
        case SwitchSymbol::record:
            return drawRecord(painter, ink, on);
        case SwitchSymbol::mute:
            return drawSpeaker(painter, ink, on);
        case SwitchSymbol::lowBandwidth:
            return drawBars(painter, ink, on);
        }
    }

    SwitchSymbol m_symbol;
};

} // namespace

QIcon switchIcon(SwitchSymbol symbol) {
    return QIcon(std::make_unique<SwitchIconEngine>(symbol).release()); // the icon owns its engine
}

} // namespace qivo
