#pragma once

#include "tools/publish/Planes.h"

#include <vector>

namespace qivo::test {

/// A picture's planes with some padding, which must stay untouched.
struct Canvas {
    static constexpr int padding = 16;
    PictureSize size;
    std::array<std::vector<std::uint8_t>, 3> samples;

    explicit Canvas(PictureSize of) : size(of) {
        for (int plane = 0; plane < 3; ++plane) {
            samples[plane].assign(stride(plane) * (plane == 0 ? size.height : size.height / 2), 1);
        }
    }
    [[nodiscard]] std::ptrdiff_t stride(int plane) const {
        return (plane == 0 ? size.width : size.width / 2) + padding;
    }
    PicturePlanes planes() {
        PicturePlanes all;
        for (int plane = 0; plane < 3; ++plane) {
            all.data[plane] = samples[plane].data();
            all.stride[plane] = stride(plane);
        }
        return all;
    }
    [[nodiscard]] std::array<std::uint8_t, 3> at(int x, int y) const {
        return {samples[0][y * stride(0) + x], samples[1][y / 2 * stride(1) + x / 2],
                samples[2][y / 2 * stride(2) + x / 2]};
    }
    [[nodiscard]] std::vector<std::uint8_t> luma(int top, int bottom) const {
        return {samples[0].begin() + top * stride(0), samples[0].begin() + bottom * stride(0)};
    }
};

} // namespace qivo::test
