#pragma once

#include "tools/publish/Colour.h"
#include "tools/publish/Options.h"
#include "tools/publish/TextMask.h"

#include <array>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

namespace qivo {

/** The three planes of an I420 picture: luma, then Cb and Cr of half its width and height. */
struct PicturePlanes {
    std::array<std::uint8_t*, 3> data{};
    std::array<std::ptrdiff_t, 3> stride{};
};

/** What a test picture says and in which colours. */
struct TestPictureLook {
    std::string name;    ///< written large
    std::string note;    ///< written over a dark area in place of the colour bars; empty: the bars
    std::size_t hue = 0; ///< number of the source; neighbours get clearly different bands
    ColourSpace space = bt709;
};

/** The test picture: 75 % colour bars, a bar that runs through a dark band, the source's name on a band of the source's
 *  hue, a running clock and, at the bottom, the time code of TimeCode.h.
 *
 *  What never changes is drawn once; draw() copies it and touches only what moves. Not thread-safe. */
class TestPicture {
  public:
    /** Rows in eighteenths of the height at which the areas begin. */
    static constexpr int runnerTop = 9;
    static constexpr int nameTop = 11;
    static constexpr int clockTop = 14;
    static constexpr int areaDivisor = 18;

    /** The runner crosses the picture once in this time. */
    static constexpr std::chrono::milliseconds crossing{4000};

    TestPicture(PictureSize size, const TestPictureLook& look);

    /** Fills the planes, which have the size given at construction, with the picture of that moment. */
    void draw(const PicturePlanes& planes, std::chrono::system_clock::time_point time);

    /** First row of an area, even. */
    [[nodiscard]] int areaTop(int eighteenths) const;

  private:
    void fill(int left, int top, int right, int bottom, const Colour& colour);
    void drawBars();
    void drawNote(const std::string& note);
    void drawName(const TestPictureLook& look);
    void prepareClock();
    void drawText(const TextMask& mask, int left, int top);
    void drawRunner(const PicturePlanes& planes, std::chrono::milliseconds time) const;
    void drawClock(const PicturePlanes& planes, std::chrono::milliseconds time) const;

    PictureSize m_size;
    ColourSpace m_space;
    std::array<std::vector<std::uint8_t>, 3> m_still; // what never changes, without padding
    std::array<TextMask, 12> m_glyphs;                // digits, colon, point
    int m_glyphWidth = 0;
    std::uint8_t m_dark = 0; // luma behind the runner and the clock
};

/** A time of day as the clock shows it: hh:mm:ss.mmm, local time. */
[[nodiscard]] std::string clockText(std::chrono::milliseconds sinceEpoch);

} // namespace qivo
