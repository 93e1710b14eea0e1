#include "tools/record/Fragmenter.h"

#include <algorithm>
#include <iterator>
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
        MoviePicture& last = m_pictures.back();
        placed.start = std::max(placed.start, last.start + 1);
        last.duration = pictureDuration(placed.start - last.start);
        m_usualDuration = std::min(last.duration, longestUsual);
        placed.duration = m_usualDuration;
    }
    reach(time);
    m_pictures.push_back(std::move(placed));
    m_lastAdded = now;
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
    const Nanoseconds reached(m_pictures.back().start * nanosecondsPerSecond / movieTimescale);
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
    // How long the last picture lasts is known when the next one comes, unless that takes too long.
    std::size_t pictures = m_pictures.empty() ? 0 : m_pictures.size() - 1;
    if (!m_pictures.empty() && now - m_lastAdded >= fragmentLength) {
        // Less than usual, so that the next one begins where it belongs also if it is only late in coming here.
        m_pictures.back().duration = std::max<std::uint32_t>(m_usualDuration / 2, 1);
        pictures = m_pictures.size();
    }
    Fragment fragment = cut(pictures);
    m_since = m_pictures.empty() && m_held.empty() ? std::nullopt : std::optional(now);
    return fragment;
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
    fragment.pictures.assign(std::make_move_iterator(m_pictures.begin()), std::make_move_iterator(end));
    m_pictures.erase(m_pictures.begin(), end);
    if (!fragment.pictures.empty()) {
        m_pictureEnd = fragment.pictures.back().start + fragment.pictures.back().duration;
    }
    fragment.soundStart = m_soundStart;
    fragment.sound = std::exchange(m_sound, {});
    return fragment;
}

} // namespace qivo::record
