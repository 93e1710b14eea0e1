#pragma once

#include <QIcon>

namespace qivo {

/// What the panel's buttons look like.
enum class PTZSymbol { left, right, up, down, zoomIn, zoomOut, autofocus, store };

QIcon ptzIcon(PTZSymbol symbol);

} // namespace qivo
