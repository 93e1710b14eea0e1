// The recorder as a process, with a source that is made by a script.
#include "tests/record/RecorderProcess.h"
#include "tests/support/Screen.h"

#include <cmath>
#include <csignal>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <thread>
#include <unistd.h>

namespace qivo::test {
namespace {

namespace fs = std::filesystem;
using std::chrono::milliseconds;
using std::chrono::seconds;
using testing::HasSubstr;

constexpr auto kLastingEnd = milliseconds(1000); // an interrupted recorder may take
constexpr double kTogether = 0.040;              // seconds between picture and sound
constexpr const char* kBoth = "picture=320x180@30 sound=48000x2";

std::int64_t wallMs() {
    return std::chrono::duration_cast<milliseconds>(std::chrono::system_clock::now().time_since_epoch()).count();
}

std::vector<std::string> namesIn(const std::string& folder) {
    std::vector<std::string> names;
    for (const auto& entry : fs::directory_iterator(folder)) {
        names.push_back(entry.path().filename().string());
    }
    return names;
}

/// Each flash has its tone. A movie that begins within one shows neither's beginning.
void expectTogether(const DecodedMovie& movie, std::size_t least) {
    const auto seen = flashes(movie);
    const auto heard = tones(movie);
    EXPECT_GE(seen.size(), least);
    for (const double flash : seen) {
        double nearest = 1e9;
        for (const double tone : heard) {
            nearest = std::min(nearest, std::abs(tone - flash));
        }
        EXPECT_LE(nearest, kTogether) << "the flash at " << flash << " s";
    }
}

/// Pictures, thirty a second, and sound of a movie that was broken off.
void expectTogetherAtTheEnd(const DecodedMovie& movie) {
    ASSERT_FALSE(movie.pictures.empty());
    EXPECT_NEAR(movie.soundEnd(), movie.pictures.back().time + 1.0 / 30, kTogether);
}

/// The clock in the pictures runs as the movie's own does.
void expectClock(const DecodedMovie& movie, double tolerance = 0.020) {
    ASSERT_GE(movie.pictures.size(), 2U);
    const auto& first = movie.pictures[movie.pictures.size() / 2];
    for (const auto& picture : movie.pictures) {
        ASSERT_TRUE(picture.published && first.published) << picture.time;
        EXPECT_NEAR(picture.time - first.time, static_cast<double>(*picture.published - *first.published) * 1e-3,
                    tolerance);
    }
}

double longestStep(const DecodedMovie& movie) {
    double longest = 0;
    for (std::size_t i = 1; i < movie.pictures.size(); ++i) {
        longest = std::max(longest, movie.pictures[i].time - movie.pictures[i - 1].time);
    }
    return longest;
}

/// All that was published between the first and the last picture is there.
void expectEveryPicture(const DecodedMovie& movie, int rate) {
    ASSERT_FALSE(movie.pictures.empty());
    ASSERT_TRUE(movie.pictures.back().published && movie.pictures.front().published);
    const auto span = *movie.pictures.back().published - *movie.pictures.front().published;
    EXPECT_EQ(movie.pictures.size(),
              static_cast<std::size_t>(std::lround(static_cast<double>(span) * rate * 1e-3)) + 1);
}

TEST(Recorder, TheClockRunsThroughTheMovieWithPictureAndSoundTogether) {
    RecorderProcess recorder(std::string(kBoth) + " jitter=15");
    ASSERT_TRUE(recorder.waitForLength(milliseconds(2300))) << recorder.process().errors();
    EXPECT_EQ(recorder.interrupt(), 0) << recorder.process().errors();
    EXPECT_LT(recorder.ending(), kLastingEnd);
    EXPECT_THAT(recorder.process().errors(),
                testing::MatchesRegex("Application.Mac.QIVO.Recording: encoding with [^\n]+\n"));
    const DecodedMovie movie = recorder.movie();
    ASSERT_TRUE(movie.readable) << movie.error;
    EXPECT_EQ(movie.width, 320);
    EXPECT_EQ(movie.height, 180);
    EXPECT_EQ(movie.rate, 48000);
    EXPECT_EQ(movie.channels, 2);
    ASSERT_NO_FATAL_FAILURE(expectClock(movie));
    expectEveryPicture(movie, 30);
    expectTogether(movie, 2);
    EXPECT_LT(movie.soundJump, 0.001);
    EXPECT_NEAR(movie.pictures.front().time, 0, 0.001);
    EXPECT_LT(movie.soundStart, 0.25);
    EXPECT_NEAR(movie.soundEnd(), movie.pictures.back().time, 0.25);
    EXPECT_THAT(recorder.lastProgress(),
                HasSubstr("pictures " + std::to_string(movie.pictures.size()) + " dropped 0 bytes " +
                          std::to_string(fs::file_size(recorder.moviePath()))));
    EXPECT_EQ(namesIn(recorder.folder().path("movies")).size(), 1U);
}

TEST(Recorder, PicturesThatAreSlowToComeAreTogetherWithTheirSoundOnceTheSendersClockIsKnown) {
    RecorderProcess recorder(std::string(kBoth) + " late=120 clock=500");
    ASSERT_TRUE(recorder.waitForLength(milliseconds(2300))) << recorder.process().errors();
    EXPECT_EQ(recorder.interrupt(), 0);
    const DecodedMovie movie = recorder.movie();
    ASSERT_TRUE(movie.readable) << movie.error;
    expectClock(movie);
    expectTogether(movie, 2);
    EXPECT_LT(movie.soundJump, 0.001);
}

TEST(Recorder, ASourceThatComesBackGoesOnInTheSameFile) {
    RecorderProcess recorder(std::string(kBoth) + " gone=700-1600");
    ASSERT_TRUE(recorder.waitForLength(milliseconds(2500))) << recorder.process().errors();
    EXPECT_EQ(recorder.interrupt(), 0);
    const DecodedMovie movie = recorder.movie();
    ASSERT_TRUE(movie.readable) << movie.error;
    expectClock(movie, kTogether);
    EXPECT_NEAR(longestStep(movie), 0.9, 0.1) << "the gap";
    expectTogether(movie, 1);
    EXPECT_LT(movie.soundJump, 0.001) << "silence in the gap";
    EXPECT_EQ(namesIn(recorder.folder().path("movies")).size(), 1U);
    EXPECT_EQ(recorder.process().output().find("waiting for the disk"), std::string::npos);
}

TEST(Recorder, AnotherSizeStandsBetweenBarsInTheMoviesSize) {
    RecorderProcess recorder("picture=320x180@30 resize=700:180x180");
    ASSERT_TRUE(recorder.waitForLength(milliseconds(1400))) << recorder.process().errors();
    EXPECT_EQ(recorder.interrupt(), 0);
    const DecodedMovie movie = recorder.movie();
    ASSERT_TRUE(movie.readable) << movie.error;
    EXPECT_EQ(movie.width, 320);
    EXPECT_EQ(movie.height, 180);
    EXPECT_LT(longestStep(movie), 0.1);
    ASSERT_FALSE(movie.pictures.empty());
    EXPECT_GT(movie.pictures.front().corner, 40);
    EXPECT_LT(movie.pictures.back().corner, 25) << "a black bar";
    EXPECT_GT(movie.pictures.back().middle, 40);
}

TEST(Recorder, SoundThatChangesItsRateStaysInPlace) {
    RecorderProcess recorder("picture=320x180@30 sound=48000x1 rate=600:44100");
    ASSERT_TRUE(recorder.waitForLength(milliseconds(1500))) << recorder.process().errors();
    EXPECT_EQ(recorder.interrupt(), 0);
    const DecodedMovie movie = recorder.movie();
    ASSERT_TRUE(movie.readable) << movie.error;
    EXPECT_EQ(movie.rate, 48000);
    EXPECT_EQ(movie.channels, 1);
    EXPECT_LT(movie.soundJump, 0.001);
    expectTogether(movie, 1);
}

TEST(Recorder, SoundAloneIsAMovieToo) {
    RecorderProcess recorder("sound=44100x6");
    ASSERT_TRUE(recorder.waitForLength(milliseconds(1200))) << recorder.process().errors();
    EXPECT_THAT(recorder.lastProgress(), HasSubstr("pictures 0 dropped 0 bytes "));
    EXPECT_THAT(recorder.lastProgress(), HasSubstr(" waiting for a picture"));
    EXPECT_EQ(recorder.interrupt(), 0);
    const DecodedMovie movie = recorder.movie();
    ASSERT_TRUE(movie.readable) << movie.error;
    EXPECT_TRUE(movie.pictures.empty());
    EXPECT_EQ(movie.rate, 44100);
    EXPECT_EQ(movie.channels, 6);
    EXPECT_GE(movie.soundEnd(), 1.2);
}

TEST(Recorder, PicturesAloneAreAMovieToo) {
    RecorderProcess recorder("picture=320x180@15");
    ASSERT_TRUE(recorder.waitForLength(milliseconds(1000))) << recorder.process().errors();
    EXPECT_EQ(recorder.interrupt(), 0);
    const DecodedMovie movie = recorder.movie();
    ASSERT_TRUE(movie.readable) << movie.error;
    EXPECT_EQ(movie.rate, 0);
    expectClock(movie);
    expectEveryPicture(movie, 15);
}

TEST(Recorder, ASourceThatSendsNothingLeavesNoMovieAndSaysSo) {
    RecorderProcess recorder("");
    std::ofstream(recorder.moviePath()) << "an earlier movie";
    EXPECT_TRUE(
        recorder.process().waitForOutput("time 00:00:00.000 pictures 0 dropped 0 bytes 0 waiting for the source\n"));
    EXPECT_EQ(recorder.interrupt(), 1);
    EXPECT_LT(recorder.ending(), kLastingEnd);
    EXPECT_EQ(recorder.process().errors(),
              "Application.Mac.QIVO.Recording: nothing came from \"STUDIO (Cam 1)\": there is no movie\n");
    EXPECT_EQ(namesIn(recorder.folder().path("movies")).size(), 1U) << "and the earlier one stays where it is";
    EXPECT_EQ(fs::file_size(recorder.moviePath()), 16U);
}

TEST(Recorder, AnExistingMovieIsKeptBesideTheNewOne) {
    const std::string name = "it's 100% \"new\" (😀 1)";
    RecorderProcess recorder("picture=320x180@30", name,
                             "printf earlier >\"$folder/"
                             "it's 100% \\\"new\\\" (😀 1).mov\"; exec \"$@\"");
    ASSERT_TRUE(recorder.waitForLength(milliseconds(500))) << recorder.process().errors();
    EXPECT_EQ(recorder.interrupt(), 0);
    EXPECT_TRUE(recorder.movie().readable);
    const auto names = namesIn(recorder.folder().path("movies"));
    ASSERT_EQ(names.size(), 2U);
    const std::string kept = names[0] == name + ".mov" ? names[1] : names[0];
    EXPECT_THAT(kept, testing::MatchesRegex("it's 100% \"new\" .* 1. ....-..-.. ..\\...\\...\\.mov"));
    EXPECT_EQ(fs::file_size(recorder.folder().path("movies/" + kept)), 7U);
}

TEST(Recorder, KilledOutrightTheMoviePlaysUpToASecondBefore) {
    RecorderProcess recorder(kBoth);
    ASSERT_TRUE(recorder.waitForLength(milliseconds(1900))) << recorder.process().errors();
    const std::int64_t killed = wallMs();
    recorder.process().signal(SIGKILL);
    recorder.process().wait(seconds(10));
    const DecodedMovie movie = recorder.movie();
    ASSERT_TRUE(movie.readable) << movie.error;
    ASSERT_FALSE(movie.pictures.empty());
    ASSERT_TRUE(movie.pictures.back().published);
    EXPECT_LE(killed - *movie.pictures.back().published, 1000);
    expectTogetherAtTheEnd(movie);
    expectClock(movie);
    expectTogether(movie, 1);
}

TEST(Recorder, ProgressComesOftenEnoughToBeStopped) {
    RecorderProcess recorder(kBoth);
    ASSERT_TRUE(recorder.process().waitForOutput("time "));
    auto longest = milliseconds(0);
    const auto end = std::chrono::steady_clock::now() + milliseconds(1500);
    for (std::size_t seen = 0; std::chrono::steady_clock::now() < end;) {
        const auto from = std::chrono::steady_clock::now();
        ASSERT_TRUE(eventually([&] { return recorder.process().output().size() > seen; }));
        seen = recorder.process().output().size();
        longest = std::max(longest, std::chrono::duration_cast<milliseconds>(std::chrono::steady_clock::now() - from));
    }
    EXPECT_LE(longest, milliseconds(250));
    EXPECT_EQ(recorder.interrupt(), 0);
}

TEST(Recorder, TerminationFinishesTheMovie) {
    RecorderProcess recorder(kBoth);
    ASSERT_TRUE(recorder.waitForLength(milliseconds(600))) << recorder.process().errors();
    recorder.process().signal(SIGTERM);
    EXPECT_EQ(recorder.process().wait(kLastingEnd), 0);
    EXPECT_TRUE(recorder.movie().readable);
}

TEST(Recorder, TheEndOfWhoeverStartedItFinishesTheMovie) {
    RecorderProcess recorder(kBoth);
    ASSERT_TRUE(recorder.waitForLength(milliseconds(600))) << recorder.process().errors();
    recorder.closeInput();
    EXPECT_EQ(recorder.process().wait(kLastingEnd), 0) << "its input has closed";
    EXPECT_TRUE(recorder.movie().readable);
}

TEST(Recorder, WithoutAReaderOfItsProgressItFinishesTheMovie) {
    // `head` takes one line and goes; the shell stays and tells the recorder's exit code.
    RecorderProcess recorder(kBoth, "A", "{ \"$@\"; echo \"ended $?\" >&2; } | head -n 12");
    EXPECT_TRUE(eventually([&] { return recorder.complaints() == "ended 0\n"; })) << recorder.process().errors();
    EXPECT_TRUE(recorder.movie().readable);
}

TEST(Recorder, ProgressThatNobodyReadsHoldsNothingUp) {
    // A pipe that is full from the beginning.
    RecorderProcess recorder(kBoth, "A",
                             "mkfifo \"$folder/../output\"; exec 3<>\"$folder/../output\"; "
                             "timeout 1 cat /dev/zero >&3; exec \"$@\" >&3");
    const std::string movie = recorder.moviePath();
    ASSERT_TRUE(eventually([&] { return fs::exists(movie) && fs::file_size(movie) > 200'000; }));
    EXPECT_EQ(recorder.interrupt(), 0);
    EXPECT_LT(recorder.ending(), kLastingEnd);
    EXPECT_TRUE(recorder.movie().readable);
}

TEST(Recorder, WrongArgumentsPrintTheUsageAndEndWithTwo) {
    RecorderProcess recorder("", "A", "exec \"$@\" -more");
    EXPECT_EQ(recorder.process().wait(seconds(10)), 2);
    EXPECT_THAT(recorder.process().errors(), HasSubstr("usage: Application.Mac.QIVO.Recording -i SOURCE -o FILE.mov "));
    EXPECT_EQ(recorder.process().output(), "");
}

TEST(Recorder, ANameThatClimbsOutOfTheFolderIsRefused) {
    RecorderProcess recorder(kBoth, "../A");
    EXPECT_EQ(recorder.process().wait(seconds(10)), 1);
    EXPECT_THAT(recorder.process().errors(), HasSubstr("\"..\" would lead out of the folder\n"));
    EXPECT_FALSE(fs::exists(recorder.moviePath()));
}

TEST(Recorder, AMissingFolderIsOneLineAndAFailure) {
    RecorderProcess recorder(kBoth, "A", "rmdir \"$folder\"; exec \"$@\"");
    EXPECT_EQ(recorder.process().wait(seconds(10)), 1);
    EXPECT_EQ(recorder.process().errors(), "Application.Mac.QIVO.Recording: cannot record into the folder \"" +
                                               recorder.folder().path("movies") + "\": No such file or directory\n");
}

TEST(Recorder, AFolderThatCannotBeWrittenIsOneLineAndAFailure) {
    RecorderProcess recorder(
        kBoth, "A", "exec unshare --mount sh -c 'mount -t tmpfs -o ro none \"$0\" && exec \"$@\"' \"$folder\" \"$@\"");
    EXPECT_EQ(recorder.process().wait(seconds(10)), 1);
    EXPECT_EQ(recorder.process().errors(), "Application.Mac.QIVO.Recording: cannot record into the folder \"" +
                                               recorder.folder().path("movies") + "\": Read-only file system\n");
}

/// On a disk of its own of that size; what was recorded is copied off it.
std::string onDisk(const std::string& size) {
    return "mkdir \"$folder/../copy\"; exec unshare --mount sh -c 'mount -t tmpfs -o size=" + size +
           " none \"$0\" && { \"$@\"; code=$?; cp \"$0/A.mov\" \"$0/../copy/\"; exit $code; }' \"$folder\" \"$@\"";
}

TEST(Recorder, ADiskThatFillsUpIsOneLineAndAFailureAndTheMoviePlays) {
    RecorderProcess recorder("picture=320x180@30 sound=48000x2 noise", "A", onDisk("1500k"));
    EXPECT_EQ(recorder.process().wait(seconds(20)), 1);
    EXPECT_EQ(recorder.complaints(), "Application.Mac.QIVO.Recording: the movie \"" + recorder.moviePath() +
                                         "\" ends here: No space left on device\n");
    const DecodedMovie movie = decodeMovie(recorder.folder().path("copy/A.mov"));
    ASSERT_TRUE(movie.readable) << movie.error;
    EXPECT_GE(movie.pictures.size(), 5U);
    EXPECT_GE(movie.sound.size(), 5000U);
    expectTogetherAtTheEnd(movie);
    EXPECT_LT(longestStep(movie), 0.1);
}

TEST(Recorder, ADiskThatIsFullFromTheBeginningIsOneLineAndAFailureAndTheEarlierMovieStays) {
    RecorderProcess recorder(kBoth, "A",
                             "mkdir \"$folder/../copy\"; exec unshare --mount sh -c 'mount -t tmpfs -o size=8k none "
                             "\"$0\" && { printf earlier "
                             ">\"$0/A.mov\"; head -c 8k /dev/zero >\"$0/other\" 2>/dev/null; \"$@\"; code=$?; "
                             "cp \"$0\"/* \"$0/../copy/\"; exit $code; }' \"$folder\" \"$@\"");
    EXPECT_EQ(recorder.process().wait(seconds(10)), 1);
    EXPECT_EQ(recorder.complaints(), "Application.Mac.QIVO.Recording: cannot record to \"" + recorder.moviePath() +
                                         "\": No space left on device\n");
    const std::string copy = recorder.folder().path("copy");
    EXPECT_THAT(namesIn(copy), testing::UnorderedElementsAre("A.mov", "other"));
    EXPECT_EQ(fs::file_size(copy + "/A.mov"), 7U) << "the earlier one, under its own name";
}

TEST(Recorder, AFolderThatIsDeletedMeanwhileIsOneLineAndAFailure) {
    RecorderProcess recorder(kBoth);
    ASSERT_TRUE(recorder.waitForLength(milliseconds(600))) << recorder.process().errors();
    fs::remove_all(recorder.folder().path("movies"));
    EXPECT_EQ(recorder.process().wait(seconds(10)), 1);
    EXPECT_EQ(recorder.complaints(), "Application.Mac.QIVO.Recording: the movie \"" + recorder.moviePath() +
                                         "\" ends here: it has been deleted\n");
}

TEST(Recorder, ProgressComesFromTheBeginning) {
    // GStreamer looks through all its plug-ins first, which takes it a while.
    RecorderProcess recorder(kBoth, "A", "GST_REGISTRY=\"$folder/../registry\" exec \"$@\"");
    ASSERT_TRUE(recorder.waitForLength(milliseconds(600))) << recorder.process().errors();
    EXPECT_EQ(recorder.interrupt(), 0);
    const std::string waiting = "time 00:00:00.000 pictures 0 dropped 0 bytes 0 waiting for the source\n";
    EXPECT_THAT(recorder.process().output(), testing::StartsWith(waiting + waiting));
}

TEST(Recorder, WhileItPreparesItCanBeEnded) {
    RecorderProcess recorder(kBoth, "A", "GST_REGISTRY=\"$folder/../registry\" exec \"$@\"");
    ASSERT_TRUE(recorder.process().waitForOutput("waiting for the source\n"));
    EXPECT_EQ(recorder.interrupt(), 1);
    EXPECT_LT(recorder.ending(), kLastingEnd);
    EXPECT_THAT(recorder.process().errors(), HasSubstr("there is no movie\n"));
    EXPECT_THAT(namesIn(recorder.folder().path("movies")), testing::IsEmpty());
}

} // namespace
} // namespace qivo::test
