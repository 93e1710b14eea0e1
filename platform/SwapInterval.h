#pragma once

class QOpenGLContext;

namespace qivo {

/// Sets how many vertical retraces a swap of the current drawable waits for. The context must be current in the calling
/// thread. Where the window system offers no way, nothing happens.
void applySwapInterval(QOpenGLContext& context, int interval);

} // namespace qivo
