#include "tools/publish/Options.h"

#include "tools/publish/Names.h"
#include "tools/publish/Sound.h"

#include "sdk/WebAddress.h"

#include <algorithm>
#include <charconv>
#include <numeric>
#include <optional>
#include <set>
#include <string_view>

namespace qivo {
namespace {

const char* const helpText =
    R"help(Usage: qivo-publish [--machine NAME] [--source NAME [OPTION ...]] ...

Makes live sources: announces each as "MACHINE (SOURCE)" on the local network and serves it over RTSP, in full and
in a low-bandwidth version, until it is interrupted. Each address served is printed on a line of its own.

For the whole process:
  --machine NAME      the machine's name (default: the host's name)
  --loopback-only     serve and announce on this machine only
  --port N            serve at this port, 0 for any free one (default: 8554, or any free one if that is busy)
  --http-port N       steer cameras at this port, 0 for any free one (default: 8080, or any free one if that is busy)
  --login USER:PASSWORD
                      require this login for the streams and the steering (the announcements stay public)
  --help              print this text
  --version           print the version

For a source. Given after a --source they belong to it; given before the first they are the default of all:
  --source NAME       begin a source of this name (default: one source, "Test Picture")
  --input WHAT        instead of the test picture: a media file, played in a loop; a capture device (/dev/videoN);
                      or an rtsp:// address, reconnected for as long as it takes
  --ptz               instead of the test picture: a camera to steer, over ONVIF and from a web page of its own
  --size WxH          size of the picture (default: 1280x720); both numbers even
  --rate N[/D]        pictures a second (default: 30), for instance 25 or 30000/1001
  --codec NAME        h264, h265 or mjpeg (default: h264)
  --low-size WxH      size of the low-bandwidth picture (default: a quarter of each side)
  --low-rate N[/D]    its pictures a second (default: half, at most 15)
  --audio-rate N      samples a second of the sound (default: 48000)
  --audio-channels N  its channels, 1 to 8 (default: 2)
  --audio-codec NAME  l16, l24, aac, opus or pcmu (default: l16)
  --no-audio          no sound; otherwise a tone of the source's own, or the sound of its input if that has any
  --web ADDRESS       http or https address of the source's control page

Example:
  qivo-publish --machine STUDIO --source "Cam 1" --source "Cam 2" --input talk.mp4 --size 1920x1080
)help";

using Problem = std::string; // empty: none

std::optional<int> wholeNumber(std::string_view text) {
    int value = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), value);
    if (text.empty() || error != std::errc{} || end != text.data() + text.size() || text.front() == '-') {
        return std::nullopt;
    }
    return value;
}

Problem parseSize(const std::string& option, const std::string& text, PictureSize& size) {
    const std::string start = option + " \"" + text + "\": ";
    const std::size_t by = text.find('x');
    const auto width = wholeNumber(std::string_view(text).substr(0, by));
    const auto height = by == std::string::npos ? std::nullopt : wholeNumber(std::string_view(text).substr(by + 1));
    if (!width || !height) {
        return start + "not a size; write WIDTHxHEIGHT, for example 1280x720";
    }
    if (*width < minimumPictureWidth || *height < minimumPictureHeight || *width > maximumPictureSize ||
        *height > maximumPictureSize) {
        return start + "sizes go from " + std::to_string(minimumPictureWidth) + "x" +
               std::to_string(minimumPictureHeight) + " to " + std::to_string(maximumPictureSize) + "x" +
               std::to_string(maximumPictureSize);
    }
    if (*width % 2 != 0 || *height % 2 != 0) {
        return start + "encoders need even numbers; use " + std::to_string(*width / 2 * 2) + "x" +
               std::to_string(*height / 2 * 2);
    }
    size = {*width, *height};
    return {};
}

Problem parseRate(const std::string& option, const std::string& text, PictureRate& rate) {
    const std::string start = option + " \"" + text + "\": ";
    const std::size_t by = text.find('/');
    const auto numerator = wholeNumber(std::string_view(text).substr(0, by));
    const auto denominator = by == std::string::npos ? 1 : wholeNumber(std::string_view(text).substr(by + 1));
    if (!numerator || !denominator || *denominator == 0) {
        return start + "not a rate; write pictures a second, for example 30 or 30000/1001";
    }
    if (*denominator > maximumRateDenominator || *numerator < *denominator || *numerator / *denominator > maximumRate ||
        (*numerator / *denominator == maximumRate && *numerator % *denominator != 0)) {
        return start + "rates go from 1 to " + std::to_string(maximumRate) +
               " pictures a second, in parts of at most " + std::to_string(maximumRateDenominator);
    }
    const int divisor = std::gcd(*numerator, *denominator);
    rate = {*numerator / divisor, *denominator / divisor};
    return {};
}

Problem parsePort(const std::string& option, const std::string& text, int& port) {
    const auto value = wholeNumber(text);
    if (!value || *value > 65535) {
        return option + " \"" + text + "\": not a port; write a number from 0 (any free one) to 65535";
    }
    port = *value;
    return {};
}

// Never with what was given: part of it is a password.
const char* const loginProblem = "--login: not a login; write USER:PASSWORD, each of 1 to 64 bytes without control "
                                 "characters, the user without \" and \\";

Problem parseCodec(const std::string& text, Codec& codec) {
    if (text == "h264") {
        codec = Codec::h264;
    } else if (text == "h265") {
        codec = Codec::h265;
    } else if (text == "mjpeg") {
        codec = Codec::mjpeg;
    } else {
        return "--codec \"" + text + "\": not known; use h264, h265 or mjpeg";
    }
    return {};
}

Problem parseAudioRate(const std::string& text, int& rate) {
    const auto value = wholeNumber(text);
    if (!value) {
        return "--audio-rate \"" + text + "\": not a rate; write samples a second, for example 48000";
    }
    if (*value < minimumAudioRate || *value > maximumAudioRate) {
        return "--audio-rate \"" + text + "\": rates go from " + std::to_string(minimumAudioRate) + " to " +
               std::to_string(maximumAudioRate) + " samples a second";
    }
    rate = *value;
    return {};
}

Problem parseAudioChannels(const std::string& text, int& channels) {
    const auto value = wholeNumber(text);
    if (!value || *value < 1 || *value > maximumAudioChannels) {
        return "--audio-channels \"" + text + "\": not a number of channels; write a number from 1 to " +
               std::to_string(maximumAudioChannels);
    }
    channels = *value;
    return {};
}

Problem parseAudioCodec(const std::string& text, SoundCodec& codec) {
    if (text == "l16") {
        codec = SoundCodec::l16;
    } else if (text == "l24") {
        codec = SoundCodec::l24;
    } else if (text == "aac") {
        codec = SoundCodec::aac;
    } else if (text == "opus") {
        codec = SoundCodec::opus;
    } else if (text == "pcmu") {
        codec = SoundCodec::pcmu;
    } else {
        return "--audio-codec \"" + text + "\": not known; use l16, l24, aac, opus or pcmu";
    }
    return {};
}

// As names on the network are compared.
std::string inLowerCase(std::string text) {
    std::transform(text.begin(), text.end(), text.begin(),
                   [](char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c; });
    return text;
}

bool startsWithAnyCase(std::string_view text, std::string_view start) {
    return text.size() >= start.size() && std::equal(start.begin(), start.end(), text.begin(), [](char a, char b) {
               return a == (b >= 'A' && b <= 'Z' ? b - 'A' + 'a' : b);
           });
}

Problem checkWebAddress(const std::string& text) {
    const std::string start = "--web \"" + text + "\": ";
    const std::size_t scheme = startsWithAnyCase(text, "http://") ? 7 : startsWithAnyCase(text, "https://") ? 8 : 0;
    if (scheme == 0) {
        return start + "not a web address; it must begin with http:// or https://";
    }
    if (text.size() > maximumWebAddressBytes) {
        return "--web: the address is too long to be announced: " + std::to_string(text.size()) + " bytes, at most " +
               std::to_string(maximumWebAddressBytes);
    }
    const bool printable =
        std::all_of(text.begin(), text.end(), [](unsigned char byte) { return byte > ' ' && byte < 0x7F; });
    if (!printable) {
        return "--web: the address holds blanks, control or non-ASCII characters; percent-encode them";
    }
    if (text.size() == scheme || std::string_view("/:?#").find(text[scheme]) != std::string_view::npos) {
        return start + "the address has no host";
    }
    if (!isWebAddress(text)) {
        return start + "not a web address that viewers take; check its host, its port and its characters";
    }
    return {};
}

Problem checkInput(const std::string& text) {
    if (text.empty()) {
        return "--input: nothing is named; give a file, /dev/videoN or an rtsp:// address";
    }
    const std::size_t scheme = text.find("://");
    if (scheme != std::string::npos && text.find('/') > scheme && !startsWithAnyCase(text, "rtsp://") &&
        !startsWithAnyCase(text, "rtsps://")) {
        return "--input \"" + text + "\": only rtsp:// addresses are relayed";
    }
    return {};
}

// A source as it is collected: the low stream follows from the full one where nothing is said of it.
struct Draft {
    SourceOptions source;
    bool lowSizeGiven = false;
    bool lowRateGiven = false;
};

SourceOptions finish(Draft draft) {
    if (!draft.lowSizeGiven) {
        draft.source.lowSize = lowSizeFor(draft.source.size);
    }
    if (!draft.lowRateGiven) {
        draft.source.lowRate = lowRateFor(draft.source.rate);
    }
    return std::move(draft.source);
}

Problem sourceProblem(const std::string& machine, const SourceOptions& source) {
    if (Problem problem = sourceNameProblem(machine, source.name); !problem.empty()) {
        return problem;
    }
    if (source.ptz && !source.input.empty()) {
        return "source \"" + source.name + "\": --ptz and --input both say what is shown; leave out one";
    }
    if (source.ptz && source.codec == Codec::h265) {
        return "source \"" + source.name + "\": ONVIF names no H.265; steer a camera with --codec h264 or mjpeg";
    }
    const int largest = std::max({source.size.width, source.size.height, source.lowSize.width, source.lowSize.height});
    if (source.codec == Codec::mjpeg && largest > maximumJpegSize) {
        return "source \"" + source.name + "\": --codec mjpeg carries at most " + std::to_string(maximumJpegSize) +
               "x" + std::to_string(maximumJpegSize) + "; choose a smaller --size or another --codec";
    }
    if (source.audio) {
        const Problem problem = soundCodecProblem(source.audioCodec, source.audioRate, source.audioChannels);
        return problem.empty() ? Problem() : "source \"" + source.name + "\": " + problem;
    }
    return {};
}

// The reading of one command line.
class Reader {
  public:
    explicit Reader(const std::string& hostName) { m_options.machine = hostName; }

    ParsedOptions read(const std::vector<std::string>& arguments);

  private:
    Problem readValue(const std::string& option, const std::string& value);
    Problem beginSource(const std::string& name);
    Problem complete();
    Draft& current() { return m_drafts.empty() ? m_defaults : m_drafts.back(); }

    Options m_options;
    Draft m_defaults;
    std::vector<Draft> m_drafts;
};

bool takesValue(const std::string& option) {
    static const std::set<std::string> options{"--machine",    "--source",         "--input",      "--size",
                                               "--rate",       "--codec",          "--web",        "--low-size",
                                               "--low-rate",   "--port",           "--http-port",  "--login",
                                               "--audio-rate", "--audio-channels", "--audio-codec"};
    return options.count(option) != 0;
}

ParsedOptions Reader::read(const std::vector<std::string>& arguments) {
    for (std::size_t i = 0; i < arguments.size(); ++i) {
        const std::string& argument = arguments[i];
        const std::size_t equals = argument.find('=');
        const std::string option = argument.substr(0, equals);
        if (argument == "--help") {
            return PrintAndExit{helpText};
        }
        if (argument == "--version") {
            return PrintAndExit{"qivo-publish " QIVO_VERSION "\n"};
        }
        Problem problem;
        if (argument == "--loopback-only") {
            m_options.loopbackOnly = true;
        } else if (argument == "--no-audio") {
            current().source.audio = false;
        } else if (argument == "--ptz") {
            current().source.ptz = true;
        } else if (!takesValue(option)) {
            problem = "unknown option \"" + argument + "\"; --help lists what there is";
        } else if (equals != std::string::npos) {
            problem = readValue(option, argument.substr(equals + 1));
        } else if (i + 1 == arguments.size()) {
            problem = option + " needs a value; --help says which";
        } else {
            problem = readValue(option, arguments[++i]);
        }
        if (!problem.empty()) {
            return UsageError{problem};
        }
    }
    if (Problem problem = complete(); !problem.empty()) {
        return UsageError{problem};
    }
    return std::move(m_options);
}

Problem Reader::readValue(const std::string& option, const std::string& value) {
    SourceOptions& source = current().source;
    if (option == "--machine") {
        m_options.machine = value;
    } else if (option == "--port") {
        return parsePort(option, value, m_options.port);
    } else if (option == "--http-port") {
        return parsePort(option, value, m_options.httpPort);
    } else if (option == "--login") {
        m_options.login = parseLogin(value);
        return m_options.login ? Problem() : Problem(loginProblem);
    } else if (option == "--source") {
        return beginSource(value);
    } else if (option == "--input") {
        source.input = value;
        return checkInput(value);
    } else if (option == "--web") {
        source.web = value;
        return checkWebAddress(value);
    } else if (option == "--codec") {
        return parseCodec(value, source.codec);
    } else if (option == "--audio-rate") {
        return parseAudioRate(value, source.audioRate);
    } else if (option == "--audio-channels") {
        return parseAudioChannels(value, source.audioChannels);
    } else if (option == "--audio-codec") {
        return parseAudioCodec(value, source.audioCodec);
    } else if (option == "--size") {
        return parseSize(option, value, source.size);
    } else if (option == "--rate") {
        return parseRate(option, value, source.rate);
    } else if (option == "--low-size") {
        current().lowSizeGiven = true;
        return parseSize(option, value, source.lowSize);
    } else {
        current().lowRateGiven = true;
        return parseRate(option, value, source.lowRate);
    }
    return {};
}

Problem Reader::beginSource(const std::string& name) {
    if (m_drafts.size() == maximumSources) {
        return "more than " + std::to_string(maximumSources) + " sources; start another qivo-publish for the rest";
    }
    m_drafts.push_back(m_defaults);
    m_drafts.back().source.name = name;
    return {};
}

Problem Reader::complete() {
    if (Problem problem = machineNameProblem(m_options.machine); !problem.empty()) {
        return problem;
    }
    if (m_drafts.empty()) {
        m_drafts.push_back(m_defaults);
    }
    std::set<std::string> names;
    for (Draft& draft : m_drafts) {
        m_options.sources.push_back(finish(std::move(draft)));
        const SourceOptions& source = m_options.sources.back();
        if (Problem problem = sourceProblem(m_options.machine, source); !problem.empty()) {
            return problem;
        }
        if (!names.insert(inLowerCase(source.name)).second) {
            return "--source \"" + source.name + "\" is given twice; names must differ in more than capital letters";
        }
    }
    return {};
}

} // namespace

ParsedOptions parseOptions(const std::vector<std::string>& arguments, const std::string& hostName) {
    return Reader(hostName).read(arguments);
}

PictureSize lowSizeFor(PictureSize size) {
    return {std::max(minimumPictureWidth, size.width / 4 & ~1), std::max(minimumPictureHeight, size.height / 4 & ~1)};
}

PictureRate lowRateFor(PictureRate rate) {
    constexpr int fewEnough = 5;
    constexpr int wanted = 15;
    if (rate.numerator <= fewEnough * rate.denominator) {
        return rate;
    }
    int divisor = 2;
    while (rate.numerator > wanted * rate.denominator * divisor) {
        ++divisor;
    }
    const int common = std::gcd(rate.numerator, rate.denominator * divisor);
    return {rate.numerator / common, rate.denominator * divisor / common};
}

} // namespace qivo
