#pragma once

#include <algorithm>
#include <chrono>
#include <functional>
#include <iterator>
#include <utility>
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

/// The median of each turn's ratio by itself: a machine that slows down for a while slows both of them.
inline double medianRatio(const std::vector<double>& work, const std::vector<double>& copy) {
    std::vector<double> ratios;
    std::transform(work.begin(), work.end(), copy.begin(), std::back_inserter(ratios), std::divides<>());
    return median(std::move(ratios));
}
