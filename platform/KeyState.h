#pragma once

#include <cstdint>

namespace qivo {

/// Whether a key is physically down at this moment, by its native scan code. Where the window system does not tell, no
/// key is.
///
/// An X server repeats a held key as releases and presses, of which the toolkit takes a release for a real one when the
/// press after it comes late.
///
/// Thread: main.
bool keyIsDown(std::uint32_t scanCode);

} // namespace qivo
