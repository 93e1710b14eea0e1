#include "tools/record/TrackAtoms.h"

#include "tools/record/SampleDescription.h"

#include <array>

// The atoms are those of Apple's "QuickTime File Format"; fragments are those of ISO/IEC 14496-12, which QuickTime
// movies share.
namespace qivo::record {
namespace {

constexpr std::array<std::uint32_t, 9> unityMatrix = {0x10000, 0, 0, 0, 0x10000, 0, 0, 0, 0x40000000};
constexpr std::uint32_t trackEnabledInMovie = 0x3;
constexpr std::uint32_t dataInThisFile = 1;
constexpr std::uint16_t fullVolume = 0x100;
constexpr std::uint16_t englishLanguage = 0;
constexpr std::uint32_t normalRate = 0x10000;
constexpr std::uint16_t ditherCopy = 0x40;
constexpr std::uint16_t halfColour = 0x8000;

/** A track as its atoms see it. Times are in the track's own units unless they say otherwise. */
struct Track {
    std::uint32_t id = 0;
    std::string_view kind; ///< "vide" or "soun"
    std::uint32_t timescale = 0;
    std::int64_t duration = 0;
    std::int64_t movieStart = 0;    ///< in units of movieTimescale
    std::int64_t movieDuration = 0; ///< in units of movieTimescale, from the start on
    std::uint32_t width = 0;        ///< on the screen, in pixels
    std::uint32_t height = 0;
};

void writeTrackHeader(AtomWriter& out, const Track& track, std::uint64_t created) {
    out.fullAtom("tkhd", 1, trackEnabledInMovie, [&] {
        out.u64(created);
        out.u64(created);
        out.u32(track.id);
        out.u32(0);
        out.u64(static_cast<std::uint64_t>(track.movieStart + track.movieDuration));
        out.zeros(8);
        out.u32(0); // layer and alternate group
        out.u16(track.kind == "soun" ? fullVolume : 0);
        out.u16(0);
        for (const std::uint32_t value : unityMatrix) {
            out.u32(value);
        }
        out.fixed(track.width);
        out.fixed(track.height);
    });
}

/** A track that begins later than the movie says so by an empty edit. */
void writeEdits(AtomWriter& out, const Track& track) {
    out.atom("edts", [&] {
        out.fullAtom("elst", 1, 0, [&] {
            out.u32(track.movieStart > 0 ? 2 : 1);
            if (track.movieStart > 0) {
                out.u64(static_cast<std::uint64_t>(track.movieStart));
                out.u64(~std::uint64_t{0});
                out.u32(normalRate);
            }
            out.u64(static_cast<std::uint64_t>(track.movieDuration));
            out.u64(0);
            out.u32(normalRate);
        });
    });
}

void writeHandler(AtomWriter& out, std::string_view type, std::string_view subtype, std::string_view name) {
    out.fullAtom("hdlr", 0, 0, [&] {
        out.text(type);
        out.text(subtype);
        out.zeros(12);
        out.u8(static_cast<std::uint8_t>(name.size()));
        out.text(name);
    });
}

void writeMediaHeader(AtomWriter& out, const Track& track, std::uint64_t created) {
    out.fullAtom("mdhd", 1, 0, [&] {
        out.u64(created);
        out.u64(created);
        out.u32(track.timescale);
        out.u64(static_cast<std::uint64_t>(track.duration));
        out.u16(englishLanguage);
        out.u16(0);
    });
}

void writeKindHeader(AtomWriter& out, const Track& track) {
    if (track.kind == "soun") {
        out.fullAtom("smhd", 0, 0, [&] { out.zeros(4); });
        return;
    }
    out.fullAtom("vmhd", 0, 1, [&] {
        out.u16(ditherCopy);
        for (int colour = 0; colour < 3; ++colour) {
            out.u16(halfColour);
        }
    });
}

void writeDataPlace(AtomWriter& out) {
    writeHandler(out, "dhlr", "alis", "Data");
    out.atom("dinf", [&] {
        out.fullAtom("dref", 0, 0, [&] {
            out.u32(1);
            out.fullAtom("alis", 0, dataInThisFile, [] {});
        });
    });
}

template <typename Describe, typename List>
void writeTrack(AtomWriter& out, const Track& track, std::uint64_t created, bool edits, Describe describe, List list) {
    out.atom("trak", [&] {
        writeTrackHeader(out, track, created);
        if (edits) {
            writeEdits(out, track);
        }
        out.atom("mdia", [&] {
            writeMediaHeader(out, track, created);
            writeHandler(out, "mhlr", track.kind, track.kind == "soun" ? "Sound" : "Picture");
            out.atom("minf", [&] {
                writeKindHeader(out, track);
                writeDataPlace(out);
                out.atom("stbl", [&] {
                    out.fullAtom("stsd", 0, 0, [&] {
                        out.u32(1);
                        describe();
                    });
                    list();
                });
            });
        });
    });
}

/** Pairs of how often and how long, as few as there can be. */
void writeDurations(AtomWriter& out, const std::vector<SampleTables::Picture>& pictures) {
    out.fullAtom("stts", 0, 0, [&] {
        const std::size_t countPlace = out.size();
        out.u32(0);
        std::uint32_t runs = 0;
        for (std::size_t i = 0; i < pictures.size();) {
            std::size_t end = i;
            while (end < pictures.size() && pictures[end].duration == pictures[i].duration) {
                ++end;
            }
            out.u32(static_cast<std::uint32_t>(end - i));
            out.u32(pictures[i].duration);
            ++runs;
            i = end;
        }
        out.setU32(countPlace, runs);
    });
}

void writeKeys(AtomWriter& out, const std::vector<SampleTables::Picture>& pictures) {
    out.fullAtom("stss", 0, 0, [&] {
        const std::size_t countPlace = out.size();
        out.u32(0);
        std::uint32_t keys = 0;
        for (std::size_t i = 0; i < pictures.size(); ++i) {
            if (pictures[i].key) {
                out.u32(static_cast<std::uint32_t>(i + 1));
                ++keys;
            }
        }
        out.setU32(countPlace, keys);
    });
}

void writeChunks(AtomWriter& out, const std::vector<SampleTables::Chunk>& chunks) {
    out.fullAtom("stsc", 0, 0, [&] {
        const std::size_t countPlace = out.size();
        out.u32(0);
        std::uint32_t runs = 0;
        for (std::size_t i = 0; i < chunks.size(); ++i) {
            if (i == 0 || chunks[i].count != chunks[i - 1].count) {
                out.u32(static_cast<std::uint32_t>(i + 1));
                out.u32(chunks[i].count);
                out.u32(1);
                ++runs;
            }
        }
        out.setU32(countPlace, runs);
    });
    out.fullAtom("co64", 0, 0, [&] {
        out.u32(static_cast<std::uint32_t>(chunks.size()));
        for (const auto& chunk : chunks) {
            out.u64(chunk.offset);
        }
    });
}

void listPictures(AtomWriter& out, const SampleTables& tables) {
    writeDurations(out, tables.pictures);
    writeKeys(out, tables.pictures);
    out.fullAtom("stsz", 0, 0, [&] {
        out.u32(0);
        out.u32(static_cast<std::uint32_t>(tables.pictures.size()));
        for (const auto& picture : tables.pictures) {
            out.u32(picture.size);
        }
    });
    writeChunks(out, tables.pictureChunks);
}

void listSound(AtomWriter& out, const SoundFormat& format, const SampleTables& tables) {
    out.fullAtom("stts", 0, 0, [&] {
        out.u32(1);
        out.u32(static_cast<std::uint32_t>(tables.soundFrames));
        out.u32(1);
    });
    out.fullAtom("stsz", 0, 0, [&] {
        out.u32(static_cast<std::uint32_t>(bytesPerSoundFrame(format)));
        out.u32(static_cast<std::uint32_t>(tables.soundFrames));
    });
    writeChunks(out, tables.soundChunks);
}

/** The tables of a movie whose samples are in fragments. */
void listNothing(AtomWriter& out) {
    for (const std::string_view type : {"stts", "stsc", "stco"}) {
        out.fullAtom(type, 0, 0, [&] { out.u32(0); });
    }
    out.fullAtom("stsz", 0, 0, [&] { out.zeros(8); });
}

Track pictureTrack(const PictureFormat& format, const SampleTables& tables) {
    Track track{pictureTrackId, "vide", movieTimescale};
    track.movieStart = tables.pictureStart();
    track.movieDuration = tables.pictureEnd() - tables.pictureStart();
    track.duration = track.movieDuration;
    track.width =
        static_cast<std::uint32_t>(static_cast<std::int64_t>(format.width) * format.pixelAspectN / format.pixelAspectD);
    track.height = static_cast<std::uint32_t>(format.height);
    return track;
}

Track soundTrack(const SoundFormat& format, const SampleTables& tables) {
    Track track{soundTrackId, "soun", static_cast<std::uint32_t>(format.rate)};
    track.duration = tables.soundFrames;
    track.movieStart = movieTimeOfSound(format, tables.soundStart);
    track.movieDuration = movieTimeOfSound(format, tables.soundFrames);
    return track;
}

} // namespace

std::int64_t movieTimeOfSound(const SoundFormat& format, std::int64_t frames) {
    return frames / format.rate * movieTimescale + frames % format.rate * movieTimescale / format.rate;
}

void writeTracks(AtomWriter& out, const MovieInfo& info, const SampleTables& tables, Samples samples) {
    const bool listed = samples == Samples::listed;
    if (info.picture) {
        writeTrack(
            out, pictureTrack(*info.picture, tables), info.created, listed,
            [&] { describePictures(out, *info.picture); },
            [&] { listed ? listPictures(out, tables) : listNothing(out); });
    }
    if (info.sound) {
        writeTrack(
            out, soundTrack(*info.sound, tables), info.created, listed, [&] { describeSound(out, *info.sound); },
            [&] { listed ? listSound(out, *info.sound, tables) : listNothing(out); });
    }
}

} // namespace qivo::record
