#include "tools/record/Fragmenter.h"

#include <algorithm>
#include <utility>

namespace qivo::record {
namespace {

constexpr std::int64_t nanosecondsPerSecond = std::nano::den;
constexpr Nanoseconds lateness = std::chrono::milliseconds(100);
constexpr std::uint32_t longestUsual = movieTimescale / 5; // a gap is nothing usual

std::int64_t unitsIn(Nanoseconds time) {
    return time.count() / nanosecondsPerSecond * movieTimescale +
           time.count() % nanosecondsPerSecond * movieTimescale / nanosecondsPerSecond;
}

} // namespace

void Fragmenter::reach(Nanoseconds time) {
    m_length = std::max(m_length, time);
}

/// The first frames of a connection often come late, which only the later ones show: what is held and belongs together
/// is placed by its end.
void Fragmenter::straightenSound() {
    for (std::size_t i = m_held.size(); i-- > 1;) {
        SoundPiece& piece = m_held[i - 1].piece;
        const auto frames = static_cast<std::int64_t>(piece.bytes.size() / bytesPerSoundFrame(m_format));
        const Nanoseconds time = m_held[i].piece.time - Nanoseconds(frames * nanosecondsPerSecond / m_format.rate);
        if (std::chrono::abs(time - piece.time) < lateness) {
            piece.time = time;
        }
    }
}

void Fragmenter::placeSoundAddedBefore(Nanoseconds time) {
    straightenSound();
    while (!m_held.empty() && m_held.front().added < time) {
        placeSound(m_held.front().piece);
        m_held.pop_front();
    }
}

void Fragmenter::addPicture(CodedPicture picture, Nanoseconds now) {
    m_origin = m_origin.value_or(picture.time);
    const Nanoseconds time = picture.time - *m_origin;
    MoviePicture placed{std::move(picture.bytes), unitsIn(time), m_usualDuration, picture.key};
    if (m_pictures.empty()) {
        placed.start = std::max(placed.start, m_pictureEnd);
    } else {
        MoviePicture& last = m_pictures.back().picture;
        placed.start = std::max(placed.start, last.start + 1);
        last.duration = pictureDuration(placed.start - last.start);
        m_usualDuration = std::min(last.duration, longestUsual);
        placed.duration = m_usualDuration;
    }
    reach(time);
    m_pictures.push_back({std::move(placed), now});
    m_since = m_since.value_or(now);
}

void Fragmenter::addSound(SoundPiece piece, const SoundFormat& format, Nanoseconds now) {
    m_format = format;
    if (!m_placer) {
        m_placer.emplace(format.rate);
    }
    m_since = m_since.value_or(now);
    m_held.push_back({std::move(piece), now});
}

void Fragmenter::placeSound(const SoundPiece& piece) {
    const std::size_t frameBytes = bytesPerSoundFrame(m_format);
    const auto frames = static_cast<std::int64_t>(piece.bytes.size() / frameBytes);
    const SoundPlacer::Placed placed = m_placer->place(piece.time - *m_origin, frames);
    if (!m_placer->begun()) {
        return;
    }
    if (m_sound.empty()) {
        m_soundStart = m_placer->next() - placed.silence - (placed.repeatFirst ? 1 : 0) - (frames - placed.skip);
    }
    m_sound.resize(m_sound.size() + static_cast<std::size_t>(placed.silence) * frameBytes);
    const auto first = piece.bytes.begin();
    if (placed.repeatFirst) {
        m_sound.insert(m_sound.end(), first, first + static_cast<std::ptrdiff_t>(frameBytes));
    }
    m_sound.insert(m_sound.end(),
                   first + static_cast<std::ptrdiff_t>(placed.skip * static_cast<std::int64_t>(frameBytes)),
                   piece.bytes.end());
    reach(Nanoseconds(m_placer->next() * nanosecondsPerSecond / m_format.rate));
}

std::optional<SoundFormat> Fragmenter::soundFormat() const {
    return m_placer && m_placer->begun() ? std::optional(m_format) : std::nullopt;
}

/// Sound that has stopped goes on as silence while pictures come.
void Fragmenter::fillSound() {
    if (!m_placer || m_pictures.empty()) {
        return;
    }
    const Nanoseconds reached(m_pictures.back().picture.start * nanosecondsPerSecond / movieTimescale);
    const Nanoseconds heard(m_placer->next() * nanosecondsPerSecond / m_format.rate);
    if (!m_placer->begun() || reached - heard < soundLate) {
        return;
    }
    if (m_sound.empty()) {
        m_soundStart = m_placer->next();
    }
    const std::int64_t frames = m_placer->fillTo(reached - soundAwaited);
    m_sound.resize(m_sound.size() + static_cast<std::size_t>(frames) * bytesPerSoundFrame(m_format));
}

std::optional<Nanoseconds> Fragmenter::due() const {
    if (!m_since) {
        return std::nullopt;
    }
    return *m_since + (m_origin ? fragmentLength : pictureAwaited);
}

Fragment Fragmenter::take(Nanoseconds now) {
    const auto when = due();
    if (!when || now < *when) {
        return {};
    }
    if (!m_origin) {
        straightenSound();
        m_origin = m_held.front().piece.time;
    }
    placeSoundAddedBefore(now - soundHeld);
    fillSound();
    Fragment fragment = cut(picturesThatCanGo(now));
    m_since = m_pictures.empty() && m_held.empty() && m_sound.empty() ? std::nullopt : std::optional(now);
    return fragment;
}

/// How many of the pictures that are held. Without the sound that belongs to them they would outlast it where the movie
/// is broken off.
std::size_t Fragmenter::picturesThatCanGo(Nanoseconds now) {
    if (m_pictures.empty()) {
        return 0;
    }
    // How long the last picture lasts is known when the next one comes, unless that takes too long.
    if (HeldPicture& last = m_pictures.back(); now - last.added >= fragmentLength) {
        // Less than usual, so that the next one begins where it belongs also if it is only late in coming here.
        last.picture.duration = std::max<std::uint32_t>(m_usualDuration / 2, 1);
        return m_pictures.size();
    }
    std::size_t count = m_pictures.size() - 1;
    if (m_placer && m_placer->begun()) {
        const std::int64_t heard = m_placer->next() * movieTimescale / m_format.rate;
        while (count > 0 && m_pictures[count].picture.start > heard &&
               now - m_pictures[count - 1].added < pictureHeld) {
            --count;
        }
    }
    return count;
}

Fragment Fragmenter::takeAll() {
    if (!m_origin && !m_held.empty()) {
        straightenSound();
        m_origin = m_held.front().piece.time;
    }
    placeSoundAddedBefore(Nanoseconds::max());
    m_since.reset();
    return cut(m_pictures.size());
}

Fragment Fragmenter::cut(std::size_t pictures) {
    Fragment fragment;
    const auto end = m_pictures.begin() + static_cast<std::ptrdiff_t>(pictures);
    for (auto held = m_pictures.begin(); held != end; ++held) {
        fragment.pictures.push_back(std::move(held->picture));
    }
    m_pictures.erase(m_pictures.begin(), end);
    if (!fragment.pictures.empty()) {
        m_pictureEnd = fragment.pictures.back().start + fragment.pictures.back().duration;
    }
    fragment.soundStart = m_soundStart;
    fragment.sound = cutSound();
    return fragment;
}

/// What is heard with a picture that is still held waits for it.
std::vector<std::uint8_t> Fragmenter::cutSound() {
    if (m_pictures.empty() || m_sound.empty()) {
        return std::exchange(m_sound, {});
    }
    const auto frameBytes = static_cast<std::int64_t>(bytesPerSoundFrame(m_format));
    const std::int64_t end = m_pictures.front().picture.start * m_format.rate / movieTimescale;
    const std::int64_t frames =
        std::clamp<std::int64_t>(end - m_soundStart, 0, static_cast<std::int64_t>(m_sound.size()) / frameBytes);
    const auto split = m_sound.begin() + static_cast<std::ptrdiff_t>(frames * frameBytes);
    std::vector<std::uint8_t> sound(m_sound.begin(), split);
    m_sound.erase(m_sound.begin(), split);
    m_soundStart += frames;
    return sound;
}

} // namespace qivo::record
