// The plane copy and `update` of a 3840 x 2160 surface against one memcpy of its size, turn by turn in the same run.
//
//   bench-surface [ROUNDS]
#include "bench/Timing.h"
#include "video/IOSurface2D.h"
#include "video/s2dcpy.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <vector>

namespace {

constexpr std::uint64_t kWidth = 3840;
constexpr std::uint64_t kHeight = 2160;
constexpr double kTarget = 1.05;
constexpr int kDefaultRounds = 200;

void report(const char* what, const std::vector<double>& work, const std::vector<double>& copy) {
    const double ratio = medianRatio(work, copy);
    std::printf("%-12s %8.0f us, memcpy %8.0f us, ratio %.3f (target at most %.2f)%s\n", what, median(work),
                median(copy), ratio, kTarget, ratio <= kTarget ? "" : " MISSED");
}

/// A surface whose pages all exist.
qivo::IOSurface2D& written(qivo::IOSurface2D& surface) {
    surface.setWidth(kWidth);
    surface.setHeight(kHeight);
    if (!surface.acquire() || !surface.surface()) {
        std::fprintf(stderr, "bench-surface: no surface\n");
        std::exit(1);
    }
    std::memset(surface.map(), 1, surface.size());
    return surface;
}

} // namespace

int main(int argc, char** argv) {
    const int rounds = argc > 1 ? std::max(1, std::atoi(argv[1])) : kDefaultRounds;
    std::array<qivo::IOSurface2D, 4> surfaces;
    for (auto& surface : surfaces) {
        written(surface);
    }
    auto& [source, target, from, to] = surfaces;
    const std::size_t bytes = source.size();
    const std::vector<std::uint8_t> pixels(bytes, 7);
    // What is compared copies between memory of the same kinds.
    void* const toMemory = to.map();
    const void* const fromMemory = from.map();
    const auto copyOf = [&](const void* memory) {
        return [=] {
            std::memcpy(toMemory, memory, bytes);
            asm volatile("" : : "r"(toMemory) : "memory"); // the copy has a reader
        };
    };
    std::array<std::vector<double>, 4> times;
    for (int round = 0; round < rounds; ++round) {
        times[0].push_back(microseconds([&] { qivo::s2dcpy(source.surface(), target.surface(), nullptr); }));
        times[1].push_back(microseconds(copyOf(fromMemory)));
        times[2].push_back(microseconds([&] { target.update(pixels.data()); }));
        times[3].push_back(microseconds(copyOf(pixels.data())));
    }
    report("plane copy", times[0], times[1]);
    report("update", times[2], times[3]);
    return 0;
}
