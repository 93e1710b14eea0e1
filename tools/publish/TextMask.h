#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace qivo {

/** Text as coverage: 0 where the background shows, 255 where the text does. */
struct TextMask {
    int width = 0;
    int height = 0;
    std::vector<std::uint8_t> coverage; ///< width * height, row by row
};

/** Draws a line of UTF-8 text, `height` pixels high with its line spacing; shrunk, then cut with an ellipsis, where it
 *  would be wider than `maximumWidth`. Any script that the machine has a font for; right-to-left text stands right. */
[[nodiscard]] TextMask renderText(const std::string& text, int maximumWidth, int height);

} // namespace qivo
