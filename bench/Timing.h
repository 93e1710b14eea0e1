#pragma once

#include <algorithm>
#include <chrono>
#include <functional>
#include <vector>

/// How long this takes.
inline double microseconds(const std::function<void()>& work) {
    using Clock = std::chrono::steady_clock;
    const auto begin = Clock::now();
    work();
    return std::chrono::duration<double, std::micro>(Clock::now() - begin).count();
}

inline double median(std::vector<double> values) {
    std::sort(values.begin(), values.end());
    return values[values.size() / 2];
}
