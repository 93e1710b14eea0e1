#include "platform/SymbolIcon.h"

#include <QGuiApplication>
#include <QIconEngine>
#include <QPainter>
#include <QPalette>

#include <memory>
#include <utility>

namespace qivo {
namespace {

class SymbolIconEngine : public QIconEngine {
  public:
    explicit SymbolIconEngine(SymbolDrawing drawing) : m_drawing(std::move(drawing)) {}

    void paint(QPainter* painter, const QRect& rect, QIcon::Mode mode, QIcon::State state) override {
        const auto group = mode == QIcon::Disabled ? QPalette::Disabled : QPalette::Active;
        const QColor ink = QGuiApplication::palette().color(group, QPalette::ButtonText);
        const qreal side = qMin(rect.width(), rect.height());
        painter->save();
        painter->setRenderHint(QPainter::Antialiasing);
        painter->translate(rect.center() + QPointF(0.5, 0.5) - QPointF(side / 2, side / 2));
        painter->scale(side / kSymbolGrid, side / kSymbolGrid);
        m_drawing(*painter, ink, state == QIcon::On);
        painter->restore();
    }

    QPixmap pixmap(const QSize& size, QIcon::Mode mode, QIcon::State state) override {
        QPixmap pixmap(size);
        pixmap.fill(Qt::transparent);
        QPainter painter(&pixmap);
        paint(&painter, QRect(QPoint(0, 0), size), mode, state);
        return pixmap;
    }

    QIconEngine* clone() const override { return new SymbolIconEngine(*this); } // NOLINT: the caller owns it

  private:
    SymbolDrawing m_drawing;
};

} // namespace

QIcon symbolIcon(SymbolDrawing drawing) {
    // The icon owns its engine.
    return QIcon(std::make_unique<SymbolIconEngine>(std::move(drawing)).release());
}

} // namespace qivo
