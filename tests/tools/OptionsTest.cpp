#include "tools/publish/Options.h"

#include <gtest/gtest.h>

namespace qivo {
namespace {

using Arguments = std::vector<std::string>;

Options accepted(const Arguments& arguments) {
    const ParsedOptions parsed = parseOptions(arguments, "host");
    const auto* options = std::get_if<Options>(&parsed);
    EXPECT_NE(options, nullptr) << (std::holds_alternative<UsageError>(parsed) ? std::get<UsageError>(parsed).text
                                                                               : "");
    Options nothing;
    nothing.sources.resize(1);
    return options != nullptr ? *options : nothing;
}

std::string refused(const Arguments& arguments) {
    const ParsedOptions parsed = parseOptions(arguments, "host");
    const auto* error = std::get_if<UsageError>(&parsed);
    EXPECT_NE(error, nullptr);
    return error != nullptr ? error->text : "";
}

TEST(Options, nothingGivenMeansOneTestPictureOfThisHost) {
    const Options options = accepted({});
    EXPECT_EQ(options.machine, "host");
    EXPECT_EQ(options.port, -1);
    EXPECT_FALSE(options.loopbackOnly);
    ASSERT_EQ(options.sources.size(), 1U);
    EXPECT_EQ(options.sources[0].name, "Test Picture");
    EXPECT_EQ(options.sources[0].size, (PictureSize{1280, 720}));
    EXPECT_EQ(options.sources[0].rate, (PictureRate{30, 1}));
    EXPECT_EQ(options.sources[0].lowSize, (PictureSize{320, 180}));
    EXPECT_EQ(options.sources[0].lowRate, (PictureRate{15, 1}));
    EXPECT_EQ(options.sources[0].codec, Codec::h264);
}

TEST(Options, soundIsAStereoToneUnlessSaidOtherwise) {
    const Options options = accepted({"--source", "A", "--source", "B", "--audio-rate", "44100", "--audio-channels",
                                      "1", "--audio-codec", "aac", "--source", "C", "--no-audio"});
    ASSERT_EQ(options.sources.size(), 3U);
    EXPECT_TRUE(options.sources[0].audio);
    EXPECT_EQ(options.sources[0].audioRate, 48000);
    EXPECT_EQ(options.sources[0].audioChannels, 2);
    EXPECT_EQ(options.sources[0].audioCodec, SoundCodec::l16);
    EXPECT_EQ(options.sources[1].audioRate, 44100);
    EXPECT_EQ(options.sources[1].audioChannels, 1);
    EXPECT_EQ(options.sources[1].audioCodec, SoundCodec::aac);
    EXPECT_FALSE(options.sources[2].audio);
    EXPECT_EQ(options.sources[2].audioRate, 48000);
}

TEST(Options, camerasToSteerAreSourcesOfTheirOwn) {
    const Options options = accepted({"--http-port", "0", "--source", "A", "--source", "B", "--ptz"});
    EXPECT_FALSE(options.sources[0].ptz);
    EXPECT_TRUE(options.sources[1].ptz);
    EXPECT_EQ(options.httpPort, 0);
    EXPECT_TRUE(accepted({"--ptz", "--source", "A"}).sources[0].ptz) << "the default of all";
    EXPECT_EQ(accepted({"--ptz"}).httpPort, -1);
}

TEST(Options, whatACameraToSteerCannotShowIsRefused) {
    EXPECT_EQ(refused({"--source", "A", "--ptz", "--input", "x.mp4"}),
              "source \"A\": --ptz and --input both say what is shown; leave out one");
    EXPECT_EQ(refused({"--source", "A", "--ptz", "--codec", "h265"}),
              "source \"A\": ONVIF names no H.265; steer a camera with --codec h264 or mjpeg");
    EXPECT_EQ(refused({"--http-port", "65536"}),
              "--http-port \"65536\": not a port; write a number from 0 (any free one) to 65535");
}

TEST(Options, soundOptionsBeforeTheFirstSourceAreTheDefaultOfAll) {
    const Options options = accepted({"--no-audio", "--audio-rate=8000", "--source", "A", "--source", "B"});
    EXPECT_FALSE(options.sources[0].audio);
    EXPECT_FALSE(options.sources[1].audio);
    EXPECT_EQ(options.sources[1].audioRate, 8000);
}

TEST(Options, audioRatesAtTheLimitsAreTakenAndBeyondRefused) {
    EXPECT_EQ(accepted({"--audio-rate", "8000"}).sources[0].audioRate, minimumAudioRate);
    EXPECT_EQ(accepted({"--audio-rate", "192000"}).sources[0].audioRate, maximumAudioRate);
    for (const char* rate : {"7999", "192001", "0", "2147483647"}) {
        EXPECT_EQ(refused({"--audio-rate", rate}),
                  "--audio-rate \"" + std::string(rate) + "\": rates go from 8000 to 192000 samples a second");
    }
    for (const char* rate : {"", "x", "48k", "-48000", "48000.5", "99999999999"}) {
        EXPECT_EQ(refused({"--audio-rate", rate}),
                  "--audio-rate \"" + std::string(rate) + "\": not a rate; write samples a second, for example 48000");
    }
}

TEST(Options, audioChannelsAtTheLimitsAreTakenAndBeyondRefused) {
    EXPECT_EQ(accepted({"--audio-channels", "1"}).sources[0].audioChannels, 1);
    EXPECT_EQ(accepted({"--audio-channels", "8"}).sources[0].audioChannels, maximumAudioChannels);
    for (const char* channels : {"0", "9", "", "two", "-1"}) {
        EXPECT_EQ(refused({"--audio-channels", channels}),
                  "--audio-channels \"" + std::string(channels) +
                      "\": not a number of channels; write a number from 1 to 8");
    }
}

TEST(Options, audioCodecThatIsNotKnownOrCannotCarryTheSoundIsRefused) {
    EXPECT_EQ(refused({"--audio-codec", "mp3"}), "--audio-codec \"mp3\": not known; use l16, l24, aac, opus or pcmu");
    EXPECT_EQ(refused({"--audio-codec", "opus", "--audio-rate", "44100"}),
              "source \"Test Picture\": --audio-codec opus carries 8000, 12000, 16000, 24000 or 48000 Hz; choose "
              "another --audio-rate or --audio-codec");
    EXPECT_EQ(refused({"--audio-codec", "aac", "--audio-channels", "3"}),
              "source \"Test Picture\": --audio-codec aac carries at most 2 channels; choose fewer --audio-channels or "
              "another --audio-codec");
    EXPECT_EQ(refused({"--audio-codec", "pcmu", "--audio-rate", "8000"}),
              "source \"Test Picture\": --audio-codec pcmu carries at most 1 channel; choose fewer --audio-channels or "
              "another --audio-codec");
    EXPECT_FALSE(accepted({"--audio-codec", "pcmu", "--no-audio"}).sources[0].audio) << "what is not sent may not fit";
}

TEST(Options, optionsBelongToTheSourceBeforeThemAndAreDefaultsBeforeTheFirst) {
    const Options options = accepted({"--rate", "25", "--source", "A", "--size", "640x360", "--source", "B", "--web",
                                      "http://b/", "--input=x.mp4", "--machine", "M"});
    ASSERT_EQ(options.sources.size(), 2U);
    EXPECT_EQ(options.machine, "M");
    EXPECT_EQ(options.sources[0].name, "A");
    EXPECT_EQ(options.sources[0].size, (PictureSize{640, 360}));
    EXPECT_EQ(options.sources[0].rate, (PictureRate{25, 1}));
    EXPECT_EQ(options.sources[0].web, "");
    EXPECT_EQ(options.sources[1].size, (PictureSize{1280, 720}));
    EXPECT_EQ(options.sources[1].rate, (PictureRate{25, 1}));
    EXPECT_EQ(options.sources[1].web, "http://b/");
    EXPECT_EQ(options.sources[1].input, "x.mp4");
}

TEST(Options, lowStreamCanBeChosen) {
    const Options options = accepted({"--low-size", "400x300", "--low-rate", "10"});
    EXPECT_EQ(options.sources[0].lowSize, (PictureSize{400, 300}));
    EXPECT_EQ(options.sources[0].lowRate, (PictureRate{10, 1}));
}

TEST(Options, sizesAtTheLimitsAreTakenAndBeyondRefused) {
    EXPECT_EQ(accepted({"--size", "128x72"}).sources[0].lowSize, (PictureSize{128, 72}));
    EXPECT_EQ(accepted({"--size", "4096x4096"}).sources[0].size.width, maximumPictureSize);
    for (const char* size : {"126x72", "128x70", "4098x720", "1280x4098"}) {
        EXPECT_EQ(refused({"--size", size}), "--size \"" + std::string(size) + "\": sizes go from 128x72 to 4096x4096");
    }
}

TEST(Options, textThatIsNoSizeIsRefused) {
    for (const char* size :
         {"", "x", "1280", "1280x", "1280x720x2", "-1280x720", "1280 x720", "99999999999x720", "1e3x720"}) {
        EXPECT_EQ(refused({"--size", size}),
                  "--size \"" + std::string(size) + "\": not a size; write WIDTHxHEIGHT, for example 1280x720");
    }
}

TEST(Options, oddSizesAreRefusedAndTheNextEvenOneNamed) {
    EXPECT_EQ(refused({"--size", "641x361"}), "--size \"641x361\": encoders need even numbers; use 640x360");
}

TEST(Options, ratesMayBeFractions) {
    EXPECT_EQ(accepted({"--rate", "30000/1001"}).sources[0].rate, (PictureRate{30000, 1001}));
    EXPECT_EQ(accepted({"--rate", "50/2"}).sources[0].rate, (PictureRate{25, 1}));
    EXPECT_EQ(accepted({"--rate", "240"}).sources[0].rate, (PictureRate{240, 1}));
}

TEST(Options, badRatesAreRefused) {
    for (const char* rate : {"", "fast", "30/0", "30/", "/2", "29.97", "-1"}) {
        EXPECT_EQ(refused({"--rate", rate}),
                  "--rate \"" + std::string(rate) +
                      "\": not a rate; write pictures a second, for example 30 or 30000/1001");
    }
    for (const char* rate : {"0", "1/2", "241", "481/2", "30/1002"}) {
        EXPECT_EQ(refused({"--rate", rate}),
                  "--rate \"" + std::string(rate) +
                      "\": rates go from 1 to 240 pictures a second, in parts of at most 1001");
    }
}

TEST(Options, portsAreNumbersUpTo65535) {
    EXPECT_EQ(accepted({"--port", "0"}).port, 0);
    EXPECT_EQ(accepted({"--port=65535"}).port, 65535);
    for (const char* port : {"65536", "-1", "rtsp", ""}) {
        EXPECT_EQ(refused({"--port", port}),
                  "--port \"" + std::string(port) + "\": not a port; write a number from 0 (any free one) to 65535");
    }
}

TEST(Options, theHttpPortFollowsTheSameRule) {
    EXPECT_EQ(accepted({}).httpPort, -1);
    EXPECT_EQ(accepted({"--http-port", "0"}).httpPort, 0);
    EXPECT_EQ(refused({"--http-port", "http"}),
              "--http-port \"http\": not a port; write a number from 0 (any free one) to 65535");
}

TEST(Options, aLoginIsAUserAndAPassword) {
    EXPECT_FALSE(accepted({}).login);
    EXPECT_EQ(accepted({"--login", "ada:secret:1"}).login->user, "ada");
    EXPECT_EQ(accepted({"--login=ada:secret:1"}).login->password, "secret:1");
}

TEST(Options, aBadLoginIsRefusedWithoutSayingIt) {
    for (const char* login : {"", "hush", "hush:", ":hush", "a\"b:hush", "a:hush\n"}) {
        EXPECT_EQ(refused({"--login", login}),
                  "--login: not a login; write USER:PASSWORD, each of 1 to 64 bytes without "
                  "control characters, the user without \" and \\");
    }
}

TEST(Options, webAddressesAreHttpOrHttps) {
    EXPECT_EQ(accepted({"--web", "HTTPS://cam.local:8080/a?b"}).sources[0].web, "HTTPS://cam.local:8080/a?b");
    for (const char* web : {"ftp://x/", "javascript:alert(1)", "x", "", "file:///etc/passwd"}) {
        EXPECT_EQ(refused({"--web", web}),
                  "--web \"" + std::string(web) + "\": not a web address; it must begin with http:// or https://");
    }
    EXPECT_EQ(refused({"--web", "http:///x"}), "--web \"http:///x\": the address has no host");
    EXPECT_EQ(refused({"--web", "http://a b"}),
              "--web: the address holds blanks, control or non-ASCII characters; percent-encode them");
    // What viewers would drop without a word.
    for (const char* web : {"http://a:0/", "http://a:65536/", "http://a:x/", "http://[]/", "http://[::1/", "http://@/",
                            "http://a\\b/", "http://a/%zz", "http://a/\"", "http://a/{b}"}) {
        EXPECT_EQ(refused({"--web", web}), "--web \"" + std::string(web) +
                                               "\": not a web address that viewers take; check its host, its port and "
                                               "its characters");
    }
    for (const char* web : {"http://[fe80::1]:80/", "http://user@camera/", "http://a/%20", "https://a?b#c"}) {
        EXPECT_EQ(accepted({"--web", web}).sources[0].web, web);
    }
}

TEST(Options, webAddressFitsItsRecord) {
    const std::string longest = "http://h/" + std::string(maximumWebAddressBytes - 9, 'x');
    EXPECT_EQ(accepted({"--web", longest}).sources[0].web, longest);
    EXPECT_EQ(refused({"--web", longest + "x"}),
              "--web: the address is too long to be announced: 252 bytes, at most 251");
}

TEST(Options, sourceNamesMustDiffer) {
    EXPECT_EQ(refused({"--source", "A", "--source", "A"}),
              "--source \"A\" is given twice; names must differ in more than capital letters");
    EXPECT_EQ(refused({"--source", "Cam 1", "--source", "CAM 1"}),
              "--source \"CAM 1\" is given twice; names must differ in more than capital letters");
    EXPECT_EQ(accepted({"--source", "Cam 1", "--source", "Cam 2"}).sources.size(), 2U);
}

TEST(Options, sourcesAreBounded) {
    Arguments arguments;
    for (std::size_t i = 0; i < maximumSources; ++i) {
        arguments.insert(arguments.end(), {"--source", std::to_string(i)});
    }
    EXPECT_EQ(accepted(arguments).sources.size(), maximumSources);
    arguments.insert(arguments.end(), {"--source", "more"});
    EXPECT_EQ(refused(arguments), "more than 256 sources; start another qivo-publish for the rest");
}

TEST(Options, namesAreChecked) {
    EXPECT_NE(refused({"--machine", "A (B"}).find("viewers take"), std::string::npos);
    EXPECT_NE(refused({"--machine", "M", "--source", std::string(63, 'x')}).find("too long"), std::string::npos);
}

TEST(Options, inputsThatCannotBeAreRefused) {
    EXPECT_EQ(refused({"--input", "http://x/y.mp4"}), "--input \"http://x/y.mp4\": only rtsp:// addresses are relayed");
    EXPECT_EQ(refused({"--input", ""}), "--input: nothing is named; give a file, /dev/videoN or an rtsp:// address");
    EXPECT_EQ(accepted({"--input", "dir/odd://name"}).sources[0].input, "dir/odd://name");
}

TEST(Options, unknownOptionsAndMissingValuesAreRefused) {
    EXPECT_EQ(refused({"--frobnicate"}), "unknown option \"--frobnicate\"; --help lists what there is");
    EXPECT_EQ(refused({"file.mp4"}), "unknown option \"file.mp4\"; --help lists what there is");
    EXPECT_EQ(refused({"--loopback-only=yes"}), "unknown option \"--loopback-only=yes\"; --help lists what there is");
    EXPECT_EQ(refused({"--source"}), "--source needs a value; --help says which");
    EXPECT_EQ(refused({"--codec", "vp8"}), "--codec \"vp8\": not known; use h264, h265 or mjpeg");
}

TEST(Options, jpegPicturesStayWithinWhatRtpCarries) {
    EXPECT_EQ(accepted({"--codec", "mjpeg", "--size", "2040x1080"}).sources[0].codec, Codec::mjpeg);
    EXPECT_NE(refused({"--codec", "mjpeg", "--size", "2048x1080"}).find("at most 2040x2040"), std::string::npos);
}

TEST(Options, helpNamesEveryOption) {
    const ParsedOptions parsed = parseOptions({"--help", "--nonsense"}, "host");
    ASSERT_TRUE(std::holds_alternative<PrintAndExit>(parsed));
    const std::string& text = std::get<PrintAndExit>(parsed).text;
    for (const char* option :
         {"--machine", "--source", "--input", "--size", "--rate", "--codec", "--low-size", "--low-rate", "--web",
          "--loopback-only", "--port", "--http-port", "--login", "--help", "--version"}) {
        EXPECT_NE(text.find(std::string("  ") + option + " "), std::string::npos) << option;
    }
}

TEST(Options, versionIsPrinted) {
    const ParsedOptions parsed = parseOptions({"--version"}, "host");
    ASSERT_TRUE(std::holds_alternative<PrintAndExit>(parsed));
    EXPECT_EQ(std::get<PrintAndExit>(parsed).text.rfind("qivo-publish ", 0), 0U);
}

TEST(Options, lowRateIsAtLeastHalvedAndAtMostFifteen) {
    EXPECT_EQ(lowRateFor({60, 1}), (PictureRate{15, 1}));
    EXPECT_EQ(lowRateFor({25, 1}), (PictureRate{25, 2}));
    EXPECT_EQ(lowRateFor({30000, 1001}), (PictureRate{15000, 1001}));
    EXPECT_EQ(lowRateFor({5, 1}), (PictureRate{5, 1}));
    EXPECT_EQ(lowRateFor({240, 1}), (PictureRate{15, 1}));
}

TEST(Options, lowSizeIsEven) {
    EXPECT_EQ(lowSizeFor({1920, 1080}), (PictureSize{480, 270}));
    EXPECT_EQ(lowSizeFor({1004, 604}), (PictureSize{250, 150}));
}

} // namespace
} // namespace qivo
