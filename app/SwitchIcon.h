#pragma once

#include <QIcon>

namespace qivo {

/// What the switches in the title bar look like. Each is drawn in the colours of the user's palette, for any size and
/// pixel ratio, and differs by shape, not only by colour, between off and on.
enum class SwitchSymbol { record, mute, lowBandwidth };

QIcon switchIcon(SwitchSymbol symbol);

} // namespace qivo
