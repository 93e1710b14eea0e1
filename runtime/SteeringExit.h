#pragma once

#include <memory>

namespace qivo::runtime {

class Steering;

/// From now on the camera is also stopped when the process exits without having destroyed its receiver. Thread: any.
void steeringBegan(const std::shared_ptr<Steering>& steering);

} // namespace qivo::runtime
