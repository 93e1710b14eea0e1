#pragma once

#include <QColor>
#include <QIcon>

#include <functional>

class QPainter;

namespace qivo {

/// The side of the square on which a symbol is drawn; the icon scales it to its size.
constexpr qreal kSymbolGrid = 16;

/// Draws a symbol on that square in the colour of the user's button texts.
using SymbolDrawing = std::function<void(QPainter& painter, const QColor& ink, bool on)>;

/// An icon in the colours of the user's palette, for any size and pixel ratio.
///
/// Thread: main.
QIcon symbolIcon(SymbolDrawing drawing);

} // namespace qivo
