#pragma once

#include "tools/publish/Planes.h"

#include <array>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

namespace qivo {

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
    [[nodiscard]] PicturePlanes still();
    void drawBars();
    void drawNote(const std::string& note);
    void drawName(const TestPictureLook& look);
    void drawRunner(const PicturePlanes& planes, std::chrono::milliseconds time) const;
    void drawClock(const PicturePlanes& planes, std::chrono::milliseconds time) const;

    PictureSize m_size;
    ColourSpace m_space;
    std::array<std::vector<std::uint8_t>, 3> m_still; // what never changes, without padding
    ClockFace m_clock;
    std::uint8_t m_dark; // luma behind the runner and the clock
};

} // namespace qivo
