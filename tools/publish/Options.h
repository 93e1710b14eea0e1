#pragma once

#include "tools/publish/Login.h"

#include <optional>
#include <string>
#include <variant>
#include <vector>

namespace qivo {

inline constexpr int minimumPictureWidth = 128;
inline constexpr int minimumPictureHeight = 72;
inline constexpr int maximumPictureSize = 4096;
inline constexpr int maximumRate = 240;
inline constexpr int maximumRateDenominator = 1001;
inline constexpr int preferredPort = 8554;
inline constexpr int preferredHttpPort = 8080;
inline constexpr std::size_t maximumSources = 256;

/** A TXT record's string holds 255 bytes, of which "web=" takes four. */
inline constexpr std::size_t maximumWebAddressBytes = 251;

/** The widest and highest picture that RTP can carry as JPEG. */
inline constexpr int maximumJpegSize = 2040;

struct PictureSize {
    int width = 1280;
    int height = 720;

    friend bool operator==(const PictureSize&, const PictureSize&) = default;
};

/** Pictures a second, as a fraction in lowest terms. */
struct PictureRate {
    int numerator = 30;
    int denominator = 1;

    friend bool operator==(const PictureRate&, const PictureRate&) = default;
};

inline constexpr int minimumAudioRate = 8000;
inline constexpr int maximumAudioRate = 192000;
inline constexpr int maximumAudioChannels = 8;

enum class Codec { h264, h265, mjpeg };

enum class SoundCodec { l16, l24, aac, opus, pcmu };

/** One source: what is to be shown and how. */
struct SourceOptions {
    std::string name = "Test Picture";
    std::string input; ///< a file, a capture device or an rtsp address; empty for the test picture
    bool ptz = false;  ///< a camera to steer in place of the test picture
    std::string web;   ///< address of the control page; empty: the camera's own, or none
    PictureSize size;
    PictureRate rate;
    PictureSize lowSize; ///< of the low-bandwidth stream
    PictureRate lowRate;
    Codec codec = Codec::h264;
    bool audio = true;
    int audioRate = 48000; ///< samples a second
    int audioChannels = 2;
    SoundCodec audioCodec = SoundCodec::l16;
};

/** What the command line asks for. */
struct Options {
    std::string machine;
    int port = -1;     ///< 0 for any free one, -1 for preferredPort or, where that is busy, any free one
    int httpPort = -1; ///< for steering; the same with preferredHttpPort
    bool loopbackOnly = false;
    std::optional<Login> login = {};    ///< needed for streams and steering
    std::vector<SourceOptions> sources; ///< at least one
};

/** --help and --version: print this on standard output and end with success. */
struct PrintAndExit {
    std::string text;
};

/** The command line cannot be followed: one line that says what is wrong and what to do. */
struct UsageError {
    std::string text;
};

using ParsedOptions = std::variant<Options, PrintAndExit, UsageError>;

/** Reads the arguments that follow the program's name. Looks at nothing but them; `hostName` is the machine's name
 * where
 *  --machine is not given. */
[[nodiscard]] ParsedOptions parseOptions(const std::vector<std::string>& arguments, const std::string& hostName);

/** A quarter of each side, even, and not below the smallest picture. */
[[nodiscard]] PictureSize lowSizeFor(PictureSize size);

/** The rate divided by a whole number so that at most 15 pictures a second are left, at least halved; rates of 5 and
 *  less stay. */
[[nodiscard]] PictureRate lowRateFor(PictureRate rate);

} // namespace qivo
