#pragma once

namespace qivo {

/// The spline from x1 (t = 0) to x2 (t = 1). Its grouping is part of what the resampler promises.
inline float spline(float x0, float x1, float x2, float x3, float t) {
    const float a = ((x1 - x2) * 3.0F - x0 + x3) * 0.5F;
    const float b = (x2 + x2 + x0) - (x1 * 5.0F + x3) * 0.5F;
    const float c = (x2 - x0) * 0.5F;
    return ((a * t + b) * t + c) * t + x1;
}

} // namespace qivo
