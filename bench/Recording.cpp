// Publishes, shows and records one live source at a time, and reads the clock in every picture of the movie.
#include "bench/ProcessorTime.h"
#include "bench/Witness.h"
#include "tests/platform/TemporaryDirectory.h"
#include "tests/record/MovieReader.h"
#include "tests/support/Process.h"
#include "tests/support/Screen.h"
#include "tools/record/MovieAtoms.h"

#include <algorithm>
#include <chrono>
#include <cmath>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <iterator>
#include <sched.h>
#include <set>
#include <thread>
#include <unistd.h>

namespace {

using namespace std::chrono;
using qivo::test::eventually;
using qivo::test::Process;
using qivo::test::Screen;

constexpr int kRate = 30;
constexpr const char* kSource = "BENCH (Live)";

/// This program and all that it starts on so many processors.
void useProcessors(int count) {
    cpu_set_t all;
    cpu_set_t some;
    CPU_ZERO(&all);
    CPU_ZERO(&some);
    sched_getaffinity(0, sizeof(all), &all);
    for (int i = 0; i < CPU_SETSIZE && count > 0; ++i) {
        if (CPU_ISSET(i, &all)) {
            CPU_SET(i, &some);
            --count;
        }
    }
    sched_setaffinity(0, sizeof(some), &some);
}

/// Chooses the only source through the viewer's menu.
bool show(Screen& screen) {
    if (!eventually([&] { return screen.findWindow("QIVO Viewer").has_value(); })) {
        return false;
    }
    screen.activate(*screen.findWindow("QIVO Viewer"));
    return eventually([&] {
        for (const char* key : {"Escape", "Escape", "Alt+s", "Return", "Return"}) {
            screen.key(key);
        }
        return eventually([&] { return screen.findWindow(kSource).has_value(); }, milliseconds(700));
    });
}

/// A word behind another one in the last line of progress.
std::string told(const std::string& output, const std::string& what) {
    const std::size_t place = output.rfind(what + " ");
    return place == std::string::npos
               ? "?"
               : output.substr(place + what.size() + 1,
                               output.find_first_of(" \n", place + what.size() + 1) - place - what.size() - 1);
}

/// Whether all pictures that were published meanwhile are in the movie.
bool judge(const qivo::test::DecodedMovie& movie, const std::set<std::int64_t>& published, const std::string& dropped) {
    std::size_t unreadable = 0;
    std::size_t misplaced = 0; // twice, or behind a later one
    std::set<std::int64_t> recorded;
    for (const auto& picture : movie.pictures) {
        if (!picture.published) {
            ++unreadable;
        } else if (!recorded.empty() && *picture.published <= *recorded.rbegin()) {
            ++misplaced;
        } else {
            recorded.insert(*picture.published);
        }
    }
    std::int64_t longest = 0;
    for (auto i = recorded.begin(); i != recorded.end() && std::next(i) != recorded.end(); ++i) {
        longest = std::max(longest, *std::next(i) - *i);
    }
    const long due = recorded.empty()
                         ? 0
                         : std::lround(static_cast<double>(*recorded.rbegin() - *recorded.begin()) * kRate * 1e-3) + 1;
    const Share share = shareOf(recorded, published);
    std::printf("pictures published while recording   %zu, due %ld\n", share.published, due);
    std::printf("pictures recorded                    %zu, with a clock that cannot be read %zu, misplaced %zu\n",
                movie.pictures.size(), unreadable, misplaced);
    std::printf("missing                              %zu, longest step %lld ms\n", share.published - share.shown,
                static_cast<long long>(longest));
    std::printf("dropped, as the recorder tells       %s\n", dropped.c_str());
    return movie.readable && share.published > 0 && share.shown == share.published && unreadable == 0 && misplaced == 0;
}

/// The end of a recording of a day: the index of its pictures and sound, against a copy of as many bytes.
void measureIndex() {
    constexpr std::uint32_t pictures = 24 * 60 * 60 * kRate;
    constexpr std::uint32_t inChunk = 12;
    qivo::record::MovieInfo info;
    info.picture.emplace();
    info.picture->width = 1920;
    info.picture->height = 1080;
    info.sound = {48000, 2};
    qivo::record::SampleTables tables;
    for (std::uint32_t i = 0; i < pictures; ++i) {
        tables.pictures.push_back({i * 3000LL, 3000 + i % 2, 50000, i % 60 == 0}); // no two alike
        if (i % inChunk == 0) {
            tables.pictureChunks.push_back({i * 50000ULL, inChunk});
            tables.soundChunks.push_back({i * 50000ULL, 19200 + i % 5});
            tables.soundFrames += 19200;
        }
    }
    const auto began = steady_clock::now();
    const auto index = qivo::record::indexOf(info, tables);
    const auto made = steady_clock::now();
    const std::vector<std::uint8_t> copy(index);
    const auto copied = steady_clock::now();
    const double ms = duration<double, std::milli>(made - began).count();
    std::printf("index of a day                       %zu MB in %.0f ms, %.0f times a copy of it\n", copy.size() >> 20U,
                ms, ms / duration<double, std::milli>(copied - made).count());
}

} // namespace

int main(int argc, char** argv) {
    const int length = argc > 1 ? std::max(1, std::atoi(argv[1])) : 30;
    const int processors = argc > 2 ? std::atoi(argv[2]) : 2;
    measureIndex();
    if (processors > 0) {
        useProcessors(processors);
    }
    const auto screen = Screen::open();
    const auto publisher = Process::start({PUBLISH, "--loopback-only", "--machine", "BENCH", "--source", "Live",
                                           "--size", "1920x1080", "--rate", std::to_string(kRate)});
    if (!screen || !publisher || !publisher->waitForOutput(kSource)) {
        std::fputs("bench-recording: there is no display or no source; run bench/recording\n", stderr);
        return 1;
    }
    const auto viewer = Process::start({VIEWER});
    if (!viewer || !show(*screen)) {
        std::fputs("bench-recording: the source could not be chosen\n", stderr);
        return 1;
    }
    std::this_thread::sleep_for(seconds(3));
    const std::string address = publisher->output().substr(0, publisher->output().find_first_of(" \t\n"));
    const auto witness = Witness::start(address);
    if (!witness) {
        std::fputs("bench-recording: nothing comes from the source\n", stderr);
        return 1;
    }
    const qivo::TemporaryDirectory folder;
    const auto recorder =
        Process::start({RECORDER, "-i", kSource, "-o", folder.path("movie.mov"), "-orvane", "-nothumbnail"});
    if (!recorder || !recorder->waitForOutput("pictures 1")) {
        std::fputs("bench-recording: nothing is recorded\n", stderr);
        return 1;
    }
    const double viewerBefore = processorSeconds(viewer->pid());
    const double before = processorSeconds(recorder->pid());
    const auto began = steady_clock::now();
    std::this_thread::sleep_for(seconds(length));
    const double elapsed = duration<double>(steady_clock::now() - began).count();
    const double used = 100 * (processorSeconds(recorder->pid()) - before) / elapsed;
    const double viewerUsed = 100 * (processorSeconds(viewer->pid()) - viewerBefore) / elapsed;
    const auto ending = steady_clock::now();
    recorder->signal(SIGINT);
    const auto code = recorder->wait(seconds(30));
    const double endingMs = duration<double, std::milli>(steady_clock::now() - ending).count();
    const auto published = witness->end();
    viewer->signal(SIGTERM);
    publisher->signal(SIGTERM);
    std::printf("%s", recorder->errors().c_str());
    const bool whole =
        judge(qivo::test::decodeMovie(folder.path("movie.mov")), published, told(recorder->output(), "dropped"));
    std::printf("processor time                       recorder %.0f %%, viewer %.0f %% of one\n", used, viewerUsed);
    std::printf("ended within                         %.0f ms\n", endingMs);
    return whole && code == 0 ? 0 : 1;
}
