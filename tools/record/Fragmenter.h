#pragma once

#include "tools/record/MovieFormat.h"
#include "tools/record/SoundPlacer.h"
#include "tools/record/SourceClock.h"

#include <deque>
#include <optional>
#include <vector>

namespace qivo::record {

/** A coded picture, by this machine's time. */
struct CodedPicture {
    std::vector<std::uint8_t> bytes;
    Nanoseconds time{};
    bool key = false;
};

/** A piece of sound in the movie's format, by this machine's time. */
struct SoundPiece {
    std::vector<std::uint8_t> bytes;
    Nanoseconds time{};
};

/** Puts pictures and sound on the movie's time line and cuts it into fragments.
 *
 *  The movie begins with the first picture, and without one soon enough with the first sound. A picture lasts until the
 *  next one. While both come, pictures and sound of a fragment end together, so that they do so wherever the movie is
 *  broken off. Time is given by the caller. */
class Fragmenter {
  public:
    /** How much is collected before it is written. What is not written is lost to a power cut, so well below a second.
     */
    static constexpr Nanoseconds fragmentLength = std::chrono::milliseconds(400);
    /** How long sound waits for the first picture. */
    static constexpr Nanoseconds pictureAwaited = std::chrono::milliseconds(500);
    /** How long sound waits for better knowledge of where it belongs. */
    static constexpr Nanoseconds soundHeld = std::chrono::milliseconds(200);
    /** How long pictures wait for the sound that belongs to them. */
    static constexpr Nanoseconds pictureHeld = std::chrono::milliseconds(300);
    /** Sound that is behind the pictures by so much is filled up with silence, and how far. */
    static constexpr Nanoseconds soundLate = std::chrono::milliseconds(1500);
    static constexpr Nanoseconds soundAwaited = std::chrono::milliseconds(1000);

    void addPicture(CodedPicture picture, Nanoseconds now);
    /** The format must be the same each time. */
    void addSound(SoundPiece piece, const SoundFormat& format, Nanoseconds now);

    /** The next fragment; empty if none is due. */
    [[nodiscard]] Fragment take(Nanoseconds now);
    /** All that is left. */
    [[nodiscard]] Fragment takeAll();

    /** When `take` has something to do by the passing of time alone. */
    [[nodiscard]] std::optional<Nanoseconds> due() const;
    /** Of the sound; empty before there is any on the time line. */
    [[nodiscard]] std::optional<SoundFormat> soundFormat() const;
    /** Length of the movie so far. */
    [[nodiscard]] Nanoseconds length() const { return m_length; }

  private:
    struct HeldPicture {
        MoviePicture picture;
        Nanoseconds added{};
    };
    struct HeldSound {
        SoundPiece piece;
        Nanoseconds added{};
    };

    void straightenSound();
    void placeSoundAddedBefore(Nanoseconds time);
    void placeSound(const SoundPiece& piece);
    void fillSound();
    [[nodiscard]] std::size_t picturesThatCanGo(Nanoseconds now);
    [[nodiscard]] Fragment cut(std::size_t pictures);
    [[nodiscard]] std::vector<std::uint8_t> cutSound();
    void reach(Nanoseconds time);

    std::optional<Nanoseconds> m_origin;
    std::deque<HeldSound> m_held; ///< sound that has not been placed
    SoundFormat m_format;
    std::optional<SoundPlacer> m_placer;
    std::vector<HeldPicture> m_pictures;
    std::vector<std::uint8_t> m_sound; ///< that has been placed
    std::int64_t m_soundStart = 0;
    std::optional<Nanoseconds> m_since; ///< when the oldest of what waits was added
    std::int64_t m_pictureEnd = 0;      ///< of what has been cut
    std::uint32_t m_usualDuration = movieTimescale / 30;
    Nanoseconds m_length{};
};

} // namespace qivo::record
