#pragma once

namespace qivo {

/// Which mouse buttons are down at this moment, whatever event is being handled: bit 0 the left one, bit 1 the right
/// one, bit 2 the middle one.
///
/// Thread: main.
unsigned pressedMouseButtons();

} // namespace qivo
