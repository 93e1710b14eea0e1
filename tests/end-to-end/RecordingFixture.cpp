#include "tests/end-to-end/RecordingFixture.h"

#include "tests/record/MovieReader.h"
#include "tests/support/Tone.h"

#include <array>
#include <cctype>
#include <cmath>
#include <cstdlib>
#include <fstream>
#include <iterator>
#include <sstream>
#include <sys/mount.h>
#include <thread>

namespace qivo::test {
namespace {

constexpr const char* kPlace = "/usr/local/bin/Application.Mac.QIVO.Recording";
constexpr int kIntervalMs = 33;          // between two pictures
constexpr int kGapMs = 4 * kIntervalMs;  // which a busy machine may leave out one by one, unlike a piece of the movie
constexpr double kTimeTolerance = 0.06;  // s between a picture's time in the movie and the clock in the picture
constexpr double kSettling = 0.5;        // s at a movie's beginning, for which
constexpr double kUnsettled = 0.25;      // s are allowed instead
constexpr double kTracksTolerance = 0.2; // s between the ends of picture and sound
constexpr double kSoundJumpTolerance = 0.04; // s
constexpr double kTone = 440;                // Hz
constexpr double kToneTolerance = 1;         // Hz

/// The fields of a process's line in the table of processes, from its state on; none if there is no such process.
std::vector<std::string> fieldsOf(const std::string& process) {
    std::ifstream file("/proc/" + process + "/stat");
    const std::string line(std::istreambuf_iterator<char>(file), {});
    const std::size_t name = line.rfind(')');
    if (name == std::string::npos) {
        return {};
    }
    std::istringstream rest(line.substr(name + 1));
    return {std::istream_iterator<std::string>(rest), {}};
}

/// The clocks in the pictures go on without a hole, at the movie's times. These settle with the first pictures, so that
/// the middle one is what they are held against.
void expectClockWithoutGap(const DecodedMovie& movie) {
    const auto& middle = movie.pictures[movie.pictures.size() / 2];
    std::int64_t previous = movie.pictures.front().published.value_or(0) - kIntervalMs;
    for (const auto& picture : movie.pictures) {
        SCOPED_TRACE(picture.time);
        ASSERT_TRUE(picture.published && middle.published);
        const double clock = static_cast<double>(*picture.published - *middle.published) / 1000;
        const bool settled = picture.time >= kSettling;
        EXPECT_NEAR(clock, picture.time - middle.time, settled ? kTimeTolerance : kUnsettled);
        EXPECT_GT(*picture.published, previous);
        EXPECT_TRUE(!settled || *picture.published - previous < kGapMs) << *picture.published - previous << " ms";
        previous = *picture.published;
    }
}

void expectTone(const DecodedMovie& movie) {
    EXPECT_EQ(movie.rate, 48000);
    EXPECT_EQ(movie.channels, 2);
    // It may begin with silence, until the first packets come.
    ASSERT_GT(movie.sound.size(), static_cast<std::size_t>(movie.rate / 4));
    const std::vector<float> tone(movie.sound.end() - movie.rate / 4, movie.sound.end());
    EXPECT_NEAR(frequencyOf(tone, movie.rate), kTone, kToneTolerance);
    EXPECT_LT(movie.soundJump, kSoundJumpTolerance);
    EXPECT_NEAR(movie.soundEnd(), movie.pictures.back().time + kIntervalMs / 1000.0, kTracksTolerance);
}

} // namespace

void RecordingViewerTest::SetUp() {
    ViewerTest::SetUp();
    if (HasFatalFailure()) {
        return;
    }
    std::error_code failed;
    std::filesystem::remove(kPlace, failed);
    ASSERT_TRUE(std::filesystem::is_empty("/usr/local/bin")) << "run this test through tests/support/launch --files";
    std::filesystem::create_symlink(RECORDER, kPlace);
    m_folder = std::filesystem::path(std::getenv("HOME")) / "Movies";
    std::filesystem::remove_all(m_folder);
    std::filesystem::create_directory(m_folder);
}

void RecordingViewerTest::TearDown() {
    ViewerTest::TearDown();
    m_viewer.reset();
    umount2(m_folder.c_str(), MNT_DETACH); // if a test has mounted something there
}

std::unique_ptr<Process> RecordingViewerTest::publishAndShow(const std::string& machine,
                                                             const std::vector<std::string>& sources,
                                                             const std::vector<std::string>& options) {
    std::vector<std::string> all{"--size", "640x360"};
    all.insert(all.end(), options.begin(), options.end());
    auto publisher = publish(machine, sources, all);
    startViewer();
    choose(0, 0, machine + " (" + sources.front() + ")");
    EXPECT_TRUE(picturesArrive());
    return publisher;
}

void RecordingViewerTest::startRecording() {
    const std::size_t before = recorded().size();
    clickRecordSwitch();
    EXPECT_TRUE(recordSwitchShowsOn());
    std::error_code missing;
    EXPECT_TRUE(eventually([&] {
        return recorded().size() == before + 1 && std::filesystem::file_size(movie(), missing) > 0 && !missing;
    })) << m_viewer->errors();
}

void RecordingViewerTest::recordFor(std::chrono::milliseconds length) const {
    const std::int64_t end = now() + length.count();
    EXPECT_TRUE(picturesArrive(end)) << "what is recorded is shown all the while";
}

std::vector<std::string> RecordingViewerTest::recorded() const {
    std::vector<std::string> names;
    for (const auto& entry : std::filesystem::directory_iterator(m_folder)) {
        names.push_back(entry.path().filename());
    }
    return names;
}

std::optional<pid_t> RecordingViewerTest::recorder() const {
    const std::string parent = std::to_string(m_viewer->pid());
    for (const auto& entry : std::filesystem::directory_iterator("/proc")) {
        const std::string process = entry.path().filename();
        const auto fields = std::isdigit(process.front()) != 0 ? fieldsOf(process) : std::vector<std::string>();
        std::error_code gone;
        if (fields.size() > 1 && fields[1] == parent &&
            std::filesystem::equivalent(entry.path() / "exe", RECORDER, gone)) {
            return std::atoi(process.c_str());
        }
    }
    return std::nullopt;
}

bool RecordingViewerTest::hasEnded(pid_t process) {
    const auto fields = fieldsOf(std::to_string(process));
    return fields.empty() || fields[0] == "Z";
}

bool isFinished(const std::filesystem::path& movie) {
    std::ifstream file(movie, std::ios::binary);
    bool hasIndex = false;
    std::array<unsigned char, 16> head{};
    for (std::uint64_t at = 0;
         file.seekg(static_cast<std::streamoff>(at)) && file.read(reinterpret_cast<char*>(head.data()), 8);) {
        const std::string kind(reinterpret_cast<const char*>(head.data()) + 4, 4);
        const auto number = [&head](std::size_t from, std::size_t bytes) {
            std::uint64_t value = 0;
            for (std::size_t i = from; i < from + bytes; ++i) {
                value = value << 8 | head.at(i);
            }
            return value;
        };
        std::uint64_t size = number(0, 4);
        if (size == 1 && file.read(reinterpret_cast<char*>(head.data()) + 8, 8)) {
            size = number(8, 8);
        }
        if (kind == "moof" || size < 8) {
            return false;
        }
        hasIndex = hasIndex || kind == "moov";
        at += size;
    }
    return hasIndex;
}

void expectWholeRecording(const std::filesystem::path& movie, double seconds, bool hasSound) {
    SCOPED_TRACE(movie);
    const DecodedMovie decoded = decodeMovie(movie);
    ASSERT_TRUE(decoded.readable) << decoded.error;
    EXPECT_EQ(decoded.width, 640);
    EXPECT_EQ(decoded.height, 360);
    ASSERT_FALSE(decoded.pictures.empty());
    EXPECT_GE(decoded.pictures.back().time, seconds);
    expectClockWithoutGap(decoded);
    if (hasSound) {
        expectTone(decoded);
    } else {
        EXPECT_TRUE(decoded.sound.empty());
    }
}

} // namespace qivo::test
