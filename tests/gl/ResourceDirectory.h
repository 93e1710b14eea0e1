#pragma once

#include "platform/Resources.h"
#include "tests/platform/TemporaryDirectory.h"

namespace qivo {

/// An empty resource directory, for as long as it lives.
class ResourceDirectory : public TemporaryDirectory {
  public:
    ResourceDirectory() { setResourcePath(path()); }
    ~ResourceDirectory() { setResourcePath(""); }
};

} // namespace qivo
