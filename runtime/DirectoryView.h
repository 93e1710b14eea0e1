#pragma once

#include "runtime/SourceView.h"

namespace qivo::runtime {

/// The shared directory as receivers see it; null if this machine has no network at all. May take a moment.
std::shared_ptr<SourceView> directoryView();

} // namespace qivo::runtime
