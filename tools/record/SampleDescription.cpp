#include "tools/record/SampleDescription.h"

namespace qivo::record {
namespace {

constexpr int tallestStandardDefinition = 576;
constexpr std::uint32_t pixelsPerInch = 72;
constexpr std::uint16_t trueColour = 24;
constexpr std::uint16_t noColourTable = 0xFFFF;
constexpr std::size_t compressorNameBytes = 32;

constexpr std::uint16_t colourBt709 = 1;
constexpr std::uint16_t primariesSmpteC = 6;
constexpr std::uint16_t matrixBt601 = 6;

constexpr int highestClassicRate = 65535; ///< what 16 bits hold
constexpr std::uint16_t classicSampleBits = 16;
constexpr std::uint32_t classicSampleBytes = 2;
constexpr std::uint32_t oneFrame = 1;

// Sound descriptions of version 2 have a fixed beginning for readers that do not know them.
constexpr std::uint32_t soundStructBytes = 72;
constexpr std::uint32_t signedPackedBigEndian = 0x2 | 0x4 | 0x8;

constexpr std::uint32_t layoutMono = 100U << 16 | 1;
constexpr std::uint32_t layoutStereo = 101U << 16 | 2;
constexpr std::uint32_t layoutInOrder = 147U << 16;

void writeEntryHead(AtomWriter& out) {
    out.zeros(6);
    out.u16(1); // the first and only data reference
}

void writeColours(AtomWriter& out, const PictureFormat& format) {
    const bool high = isHighDefinition(format.height);
    out.atom("colr", [&] {
        out.text("nclc");
        out.u16(high ? colourBt709 : primariesSmpteC);
        out.u16(colourBt709);
        out.u16(high ? colourBt709 : matrixBt601);
    });
}

std::uint32_t layoutOf(int channels) {
    if (channels <= 2) {
        return channels == 1 ? layoutMono : layoutStereo;
    }
    return layoutInOrder | static_cast<std::uint32_t>(channels);
}

void writeLayout(AtomWriter& out, const SoundFormat& format) {
    out.fullAtom("chan", 0, 0, [&] {
        out.u32(layoutOf(format.channels));
        out.zeros(8);
    });
}

/** The description of version 1, which every reader knows. */
void describeClassicSound(AtomWriter& out, const SoundFormat& format) {
    out.atom("in24", [&] {
        writeEntryHead(out);
        out.u16(1); // version
        out.u16(0);
        out.u32(0);
        out.u16(static_cast<std::uint16_t>(format.channels));
        out.u16(classicSampleBits); // as it is for every format that says more below
        out.u32(0);
        out.fixed(static_cast<std::uint32_t>(format.rate));
        out.u32(oneFrame);
        out.u32(bytesPerSoundSample);
        out.u32(static_cast<std::uint32_t>(bytesPerSoundFrame(format)));
        out.u32(classicSampleBytes);
        writeLayout(out, format);
    });
}

/** The description of version 2, which has room for high rates. */
void describeFastSound(AtomWriter& out, const SoundFormat& format) {
    out.atom("lpcm", [&] {
        writeEntryHead(out);
        out.u16(2); // version
        out.u16(0);
        out.u32(0);
        out.u16(3);
        out.u16(16);
        out.u16(0xFFFE);
        out.u16(0);
        out.u32(0x10000);
        out.u32(soundStructBytes);
        out.f64(format.rate);
        out.u32(static_cast<std::uint32_t>(format.channels));
        out.u32(0x7F000000);
        out.u32(bytesPerSoundSample * 8);
        out.u32(signedPackedBigEndian);
        out.u32(static_cast<std::uint32_t>(bytesPerSoundFrame(format)));
        out.u32(oneFrame);
        writeLayout(out, format);
    });
}

} // namespace

bool isHighDefinition(int height) {
    return height > tallestStandardDefinition;
}

void describePictures(AtomWriter& out, const PictureFormat& format) {
    out.atom("avc1", [&] {
        writeEntryHead(out);
        out.zeros(16);
        out.u16(static_cast<std::uint16_t>(format.width));
        out.u16(static_cast<std::uint16_t>(format.height));
        out.fixed(pixelsPerInch);
        out.fixed(pixelsPerInch);
        out.u32(0);
        out.u16(1); // pictures in a sample
        out.zeros(compressorNameBytes);
        out.u16(trueColour);
        out.u16(noColourTable);
        out.atom("avcC", [&] { out.bytes(format.decoderSetup); });
        writeColours(out, format);
        out.atom("pasp", [&] {
            out.u32(static_cast<std::uint32_t>(format.pixelAspectN));
            out.u32(static_cast<std::uint32_t>(format.pixelAspectD));
        });
    });
}

void describeSound(AtomWriter& out, const SoundFormat& format) {
    if (format.rate <= highestClassicRate) {
        describeClassicSound(out, format);
    } else {
        describeFastSound(out, format);
    }
}

} // namespace qivo::record
