#include "tools/record/MovieAtoms.h"

#include "tools/record/TrackAtoms.h"

#include <algorithm>
#include <array>

namespace qivo::record {
namespace {

constexpr std::size_t atomHeadBytes = 8;
constexpr std::uint32_t formatVersion = 0x200;
constexpr std::uint32_t nextTrackId = soundTrackId + 1;

constexpr std::uint32_t soundBlockFrames = 1024;

// Flags of a sample in a fragment.
constexpr std::uint32_t keySample = 0x02000000;       // depends on no other
constexpr std::uint32_t dependentSample = 0x01010000; // depends on others, cannot be started from
// Flags of a track in a fragment.
constexpr std::uint32_t placesFromFragment = 0x020000; // data offsets count from the fragment's start
// Flags of a run of samples: what stands for each, and that the data's offset is told.
constexpr std::uint32_t tellsOffset = 0x1;
constexpr std::uint32_t tellsDurations = 0x100;
constexpr std::uint32_t tellsSizes = 0x200;
constexpr std::uint32_t tellsFlags = 0x400;

void writeType(AtomWriter& out) {
    out.atom("ftyp", [&] {
        out.text("qt  ");
        out.u32(formatVersion);
        out.text("qt  ");
    });
}

std::int64_t movieEnd(const MovieInfo& info, const SampleTables& tables) {
    const std::int64_t soundEnd =
        info.sound ? movieTimeOfSound(*info.sound, tables.soundStart + tables.soundFrames) : 0;
    return std::max(tables.pictureEnd(), soundEnd);
}

void writeMovieHeader(AtomWriter& out, const MovieInfo& info, const SampleTables& tables) {
    constexpr std::array<std::uint32_t, 9> matrix = {0x10000, 0, 0, 0, 0x10000, 0, 0, 0, 0x40000000};
    out.fullAtom("mvhd", 1, 0, [&] {
        out.u64(info.created);
        out.u64(info.created);
        out.u32(movieTimescale);
        out.u64(static_cast<std::uint64_t>(movieEnd(info, tables)));
        out.fixed(1);   // rate
        out.u16(0x100); // volume
        out.zeros(10);
        for (const std::uint32_t value : matrix) {
            out.u32(value);
        }
        out.zeros(24);
        out.u32(nextTrackId);
    });
}

void writeExtension(AtomWriter& out, std::uint32_t track, std::uint32_t duration, std::uint32_t size) {
    out.fullAtom("trex", 0, 0, [&] {
        out.u32(track);
        out.u32(1); // the first and only sample description
        out.u32(duration);
        out.u32(size);
        out.u32(0);
    });
}

void writeExtensions(AtomWriter& out, const MovieInfo& info, const SampleTables& tables) {
    out.atom("mvex", [&] {
        out.fullAtom("mehd", 1, 0, [&] { out.u64(static_cast<std::uint64_t>(movieEnd(info, tables))); });
        if (info.picture) {
            writeExtension(out, pictureTrackId, 0, 0);
        }
        if (info.sound) {
            writeExtension(out, soundTrackId, 1, static_cast<std::uint32_t>(bytesPerSoundFrame(*info.sound)));
        }
    });
}

void writeMovie(AtomWriter& out, const MovieInfo& info, const SampleTables& tables, Samples samples) {
    out.atom("moov", [&] {
        writeMovieHeader(out, info, tables);
        writeTracks(out, info, tables, samples);
        if (samples == Samples::inFragments) {
            writeExtensions(out, info, tables);
        }
    });
}

void writeTrackStart(AtomWriter& out, std::uint32_t track, std::int64_t start) {
    out.fullAtom("tfhd", 0, placesFromFragment, [&] { out.u32(track); });
    out.fullAtom("tfdt", 1, 0, [&] { out.u64(static_cast<std::uint64_t>(start)); });
}

/** Returns where the offset of the data is to be written. */
std::size_t writePictureRun(AtomWriter& out, const std::vector<MoviePicture>& pictures) {
    std::size_t offsetPlace = 0;
    out.atom("traf", [&] {
        writeTrackStart(out, pictureTrackId, pictures.front().start);
        out.fullAtom("trun", 0, tellsOffset | tellsDurations | tellsSizes | tellsFlags, [&] {
            out.u32(static_cast<std::uint32_t>(pictures.size()));
            offsetPlace = out.size();
            out.u32(0);
            for (const MoviePicture& picture : pictures) {
                out.u32(picture.duration);
                out.u32(static_cast<std::uint32_t>(picture.bytes.size()));
                out.u32(picture.key ? keySample : dependentSample);
            }
        });
    });
    return offsetPlace;
}

/** Sound as samples of many frames each: readers handle every sample of a fragment by itself, and would choke on
 * frames. */
std::size_t writeSoundRun(AtomWriter& out, const SoundFormat& format, const Fragment& fragment) {
    const auto frameBytes = static_cast<std::uint32_t>(bytesPerSoundFrame(format));
    const auto frames = static_cast<std::uint32_t>(fragment.sound.size() / frameBytes);
    std::size_t offsetPlace = 0;
    out.atom("traf", [&] {
        writeTrackStart(out, soundTrackId, fragment.soundStart);
        out.fullAtom("trun", 0, tellsOffset | tellsDurations | tellsSizes, [&] {
            out.u32((frames + soundBlockFrames - 1) / soundBlockFrames);
            offsetPlace = out.size();
            out.u32(0);
            for (std::uint32_t done = 0; done < frames; done += soundBlockFrames) {
                const std::uint32_t block = std::min(soundBlockFrames, frames - done);
                out.u32(block);
                out.u32(block * frameBytes);
            }
        });
    });
    return offsetPlace;
}

std::size_t pictureBytes(const Fragment& fragment) {
    std::size_t bytes = 0;
    for (const MoviePicture& picture : fragment.pictures) {
        bytes += picture.bytes.size();
    }
    return bytes;
}

} // namespace

std::vector<std::uint8_t> headOf(const MovieInfo& info, const SampleTables& tables) {
    AtomWriter out;
    writeType(out);
    out.atom("free", [&] { out.zeros(dataHeaderBytes - atomHeadBytes); });
    writeMovie(out, info, tables, Samples::inFragments);
    out.atom("free", [&] { out.zeros(headBytes - out.size()); });
    return out.data();
}

std::vector<std::uint8_t> fragmentHead(const MovieInfo& info, const Fragment& fragment, std::uint32_t sequence) {
    AtomWriter out;
    std::size_t picturePlace = 0;
    std::size_t soundPlace = 0;
    out.atom("moof", [&] {
        out.fullAtom("mfhd", 0, 0, [&] { out.u32(sequence); });
        if (!fragment.pictures.empty()) {
            picturePlace = writePictureRun(out, fragment.pictures);
        }
        if (!fragment.sound.empty()) {
            soundPlace = writeSoundRun(out, *info.sound, fragment);
        }
    });
    const std::size_t pictures = pictureBytes(fragment);
    const std::size_t data = out.size() + atomHeadBytes;
    if (picturePlace != 0) {
        out.setU32(picturePlace, static_cast<std::uint32_t>(data));
    }
    if (soundPlace != 0) {
        out.setU32(soundPlace, static_cast<std::uint32_t>(data + pictures));
    }
    out.u32(static_cast<std::uint32_t>(atomHeadBytes + pictures + fragment.sound.size()));
    out.text("mdat");
    return out.data();
}

std::vector<std::uint8_t> indexOf(const MovieInfo& info, const SampleTables& tables) {
    AtomWriter out;
    writeMovie(out, info, tables, Samples::listed);
    return out.data();
}

std::vector<std::uint8_t> dataHeader(std::uint64_t end) {
    AtomWriter out;
    out.u32(1); // the length follows the type
    out.text("mdat");
    out.u64(end - dataHeaderOffset);
    return out.data();
}

} // namespace qivo::record
