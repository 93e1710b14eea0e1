#include "tests/tools/Publisher.h"
#include "tools/publish/Handles.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <arpa/inet.h>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

namespace qivo::test {
namespace {

using namespace std::chrono_literals;
using testing::MatchesRegex;

struct Outcome {
    int code = -1;
    std::string output;
    std::string errors;
};

/// `around` is a program with arguments of its own that runs the publisher.
Outcome outcome(std::vector<std::string> arguments, std::vector<std::string> environment = {},
                const std::vector<std::string>& around = {}) {
    environment.emplace_back(withoutLeakCheck);
    arguments.insert(arguments.begin(), PUBLISH);
    arguments.insert(arguments.begin(), around.begin(), around.end());
    const auto process = Process::start(arguments, environment);
    const auto code = process->wait(20s);
    return {code.value_or(-1), process->output(), process->errors()};
}

void expectRefused(const std::vector<std::string>& arguments, int code, const std::string& text,
                   const std::vector<std::string>& around = {}) {
    const Outcome result = outcome(arguments, {}, around);
    EXPECT_EQ(result.code, code);
    EXPECT_EQ(result.errors, "qivo-publish: " + text + "\n");
    EXPECT_EQ(result.output, "");
}

// A folder that goes with the test.
class Folder {
  public:
    Folder() {
        std::string name = (std::filesystem::temp_directory_path() / "publish-XXXXXX").string();
        m_path = mkdtemp(name.data());
    }
    ~Folder() { std::filesystem::remove_all(m_path); }
    [[nodiscard]] std::string file(const std::string& name) const { return m_path / name; }

  private:
    std::filesystem::path m_path;
};

TEST(Errors, usageErrorsEndWithTwo) {
    expectRefused({"--frobnicate"}, 2, "unknown option \"--frobnicate\"; --help lists what there is");
    expectRefused({"--size", "641x360"}, 2, "--size \"641x360\": encoders need even numbers; use 640x360");
    expectRefused(
        {"--machine", "A (B"}, 2,
        "--machine \"A (B\": viewers take what stands before the first \" (\" of a name as the machine; leave "
        "\" (\" out");
    expectRefused({"--machine", "STUDIO", "--source", std::string(55, 'x')}, 2,
                  "\"STUDIO (" + std::string(55, 'x') +
                      ")\" is too long to be announced: 64 bytes, at most 63; shorten --machine or --source");
}

TEST(Errors, helpAndVersionEndWithSuccess) {
    const Outcome help = outcome({"--help"});
    EXPECT_EQ(help.code, 0);
    EXPECT_EQ(help.output.rfind("Usage: qivo-publish", 0), 0U);
    const Outcome version = outcome({"--version"});
    EXPECT_EQ(version.code, 0);
    EXPECT_THAT(version.output, MatchesRegex("qivo-publish [0-9]+\\.[0-9]+\\.[0-9]+\n"));
}

TEST(Errors, missingFileIsNamed) {
    expectRefused({"--input", "/no/such/film.mp4"}, 1,
                  "--input \"/no/such/film.mp4\": No such file or directory; check the path");
}

TEST(Errors, folderAndNoiseAreNoMediaFiles) {
    const Folder folder;
    expectRefused({"--input", folder.file("")}, 1,
                  "--input \"" + folder.file("") +
                      "\": not a file; give a media file, /dev/videoN or an rtsp:// address");
    const std::string noise = folder.file("noise.mp4");
    std::ofstream(noise) << "this is no film";
    const Outcome result = outcome({"--input", noise});
    EXPECT_EQ(result.code, 1);
    EXPECT_THAT(result.errors, testing::StartsWith("qivo-publish: --input \"" + noise + "\": "));
    EXPECT_EQ(std::count(result.errors.begin(), result.errors.end(), '\n'), 1);
}

TEST(Errors, unreadableFileIsNamed) {
    const Folder folder;
    const std::string film = folder.file("film.mp4");
    std::ofstream(film) << "x";
    std::filesystem::permissions(film, std::filesystem::perms::none);
    // Root reads every file, for which it needs no more than this one capability.
    const std::vector<std::string> withoutOverride{"/usr/bin/setpriv", "--bounding-set=-dac_override,-dac_read_search"};
    expectRefused({"--input", film}, 1, "--input \"" + film + "\": Permission denied; make the file readable",
                  geteuid() == 0 ? withoutOverride : std::vector<std::string>());
}

TEST(Errors, fileWithoutVideoIsRefused) {
    gst_init(nullptr, nullptr);
    const Folder folder;
    const std::string sound = folder.file("sound.wav");
    GstElement* parsed = gst_parse_launch("audiotestsrc num-buffers=20 ! wavenc ! filesink name=out", nullptr);
    const Object<GstElement> pipeline(GST_ELEMENT(gst_object_ref_sink(parsed)));
    const Object<GstElement> out(gst_bin_get_by_name(GST_BIN(parsed), "out"));
    g_object_set(out.get(), "location", sound.c_str(), nullptr);
    gst_element_set_state(parsed, GST_STATE_PLAYING);
    const Object<GstBus> bus(gst_element_get_bus(parsed));
    const Message end(gst_bus_timed_pop_filtered(bus.get(), 10 * GST_SECOND, GST_MESSAGE_EOS));
    ASSERT_TRUE(end);
    gst_element_set_state(parsed, GST_STATE_NULL);
    expectRefused({"--input", sound}, 1, "--input \"" + sound + "\": holds no video; give a file with pictures in it");
}

TEST(Errors, missingCaptureDeviceIsNamed) {
    expectRefused({"--input", "/dev/video123"}, 1,
                  "--input \"/dev/video123\": No such file or directory; check that the capture device is plugged in");
}

TEST(Errors, busyPortIsNamedAndNothingHalfStarted) {
    const int listener = socket(AF_INET, SOCK_STREAM, 0);
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_addr.s_addr = htonl(INADDR_ANY);
    socklen_t length = sizeof address;
    ASSERT_EQ(bind(listener, reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
    ASSERT_EQ(listen(listener, 1), 0);
    ASSERT_EQ(getsockname(listener, reinterpret_cast<sockaddr*>(&address), &length), 0);
    const std::string port = std::to_string(ntohs(address.sin_port));
    const Outcome result = outcome({"--port", port});
    close(listener);
    EXPECT_EQ(result.code, 1);
    EXPECT_EQ(result.output, "");
    EXPECT_THAT(result.errors, MatchesRegex("qivo-publish: cannot serve at port " + port +
                                            ": .*; choose another with --port, or --port 0 for any free one\n"));
}

TEST(Errors, missingElementIsNamedWithItsPackage) {
    const Folder folder;
    const Outcome result = outcome(
        {}, {"GST_PLUGIN_SYSTEM_PATH_1_0=" + folder.file("none"), "GST_REGISTRY_1_0=" + folder.file("registry")});
    EXPECT_EQ(result.code, 1);
    EXPECT_EQ(result.errors, "qivo-publish: the GStreamer element appsrc is missing; install the Debian package "
                             "gstreamer1.0-plugins-base\n");
}

} // namespace
} // namespace qivo::test
