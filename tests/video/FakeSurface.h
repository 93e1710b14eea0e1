#pragma once

#include "platform/Surface.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace qivo {

/// Stands in for the shared memory: says what the test wants and records what is asked. Linked in place of the real
/// one.
class IOSurface {
  public:
    /// "a" and so on in what is recorded.
    explicit IOSurface(std::string given) : name(std::move(given)) {}

    std::string name;
    IOSurfacePlane plane{.width = 2, .height = 2, .bytesPerElement = 4, .bytesPerRow = 8};
    std::uint64_t planeIndex = 0; ///< of the only plane
    std::vector<std::uint8_t> pixels = std::vector<std::uint8_t>(16);
    bool hasAddress = true;
    IOReturn lockResult = kIOReturnSuccess;
    IOReturn unlockResult = kIOReturnSuccess;
    std::uint32_t seed = 0;
};

/// What was asked since the last time: "lock a 1", with the options in decimal.
std::vector<std::string> takeSurfaceCalls();

/// What surfaces are made of; empty if none was asked for. Every creation gives `nextSurface`, once.
struct FakeSurfaces {
    std::vector<std::vector<std::int64_t>> created; ///< values in the order of kIOSurface2DKeys
    std::shared_ptr<IOSurface> next;
};
FakeSurfaces& fakeSurfaces();

} // namespace qivo
