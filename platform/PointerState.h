#pragma once

namespace qivo {

/// Which mouse buttons are down at this moment, whatever event is being handled: bit 0 the left one, bit 1 the right
/// one, bit 2 the middle one. Where the window system does not tell, the buttons are those of the event.
///
/// Thread: main.
unsigned pressedMouseButtons();

} // namespace qivo
