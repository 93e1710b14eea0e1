// Shows the same live source with several programs, one after another, and reads the clock in its picture back from the
// screen. Nothing is taken from the programs' own words: a picture counts when its time code is seen on the screen.
#include "bench/ProcessorTime.h"
#include "bench/Stalls.h"
#include "bench/Witness.h"
#include "tests/support/Process.h"
#include "tests/support/Screen.h"
#include "tools/publish/TimeCode.h"

#include <algorithm>
#include <array>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <functional>
#include <set>
#include <thread>
#include <unistd.h>

namespace {

using namespace std::chrono;
using qivo::test::eventually;
using qivo::test::Picture;
using qivo::test::Process;
using qivo::test::Screen;
using qivo::test::Window;

constexpr int kWidth = 1920;
constexpr int kHeight = 1080;
constexpr int kRate = 30;
constexpr auto kLookEvery = milliseconds(3);
constexpr auto kSettle = seconds(3); // after the first picture, before the measurement
constexpr int kStarts = 5;

struct Player {
    std::string name;
    bool drawsWithOpenGl = false;
    std::vector<std::string> command;
};

struct Result {
    std::string name;
    bool drawsWithOpenGl = false;
    bool shown = false;
    double firstPictureMs = 0; // this and the next: the median of several starts
    double firstPictureFromChoiceMs = 0;
    Share pictures;              // shown of those published
    Share picturesBetweenStalls; // the same, without those that came while the machine stood still
    std::size_t stalls = 0;
    double picturesPerSecond = 0;
    double latencyMs = 0;
    double latency95Ms = 0;
    double processorPercent = 0; // of one core, the program's own processes
    double serverPercent = 0;    // of one core, the X server meanwhile
};

std::int64_t nowMs() {
    return duration_cast<milliseconds>(system_clock::now().time_since_epoch()).count();
}

/// The largest window on the screen, or what it holds if that is the picture's own window.
std::optional<Window> pictureWindow(const Screen& screen) {
    std::optional<Window> best;
    for (const auto& title : screen.titles()) {
        auto window = screen.findWindow(title);
        if (!window) {
            continue;
        }
        const auto child = screen.largestChild(*window);
        if (child && child->width * child->height * 2 > window->width * window->height) {
            window = child;
        }
        if (!best || window->width * window->height > best->width * best->height) {
            best = window;
        }
    }
    return best;
}

/// The time code on the screen, looking only at its strip in the place where the picture belongs.
std::optional<std::int64_t> timeOnScreen(const Screen& screen, const Window& view) {
    Window strip = view;
    const int pictureHeight = std::min(view.height, view.width * kHeight / kWidth);
    const int pictureWidth = std::min(view.width, view.height * kWidth / kHeight);
    strip.x += (view.width - pictureWidth) / 2;
    strip.y += (view.height - pictureHeight) / 2 + pictureHeight - pictureHeight / qivo::timeCodeRowDivisor;
    strip.width = pictureWidth;
    strip.height = pictureHeight / qivo::timeCodeRowDivisor;
    // One row through the middle of the cells stands for all of them: looking is to cost as little as it can, as the
    // machine is busy with what is measured.
    strip.y += strip.height / 2;
    strip.height = 1;
    const Picture picture = screen.grab(strip);
    if (picture.empty()) {
        return std::nullopt;
    }
    return qivo::readTimeCode(picture.pixels.data(), picture.width, qivo::timeCodeRowDivisor, 0);
}

double percentile(std::vector<double> values, double fraction) {
    if (values.empty()) {
        return 0;
    }
    std::sort(values.begin(), values.end());
    return values[static_cast<std::size_t>(fraction * static_cast<double>(values.size() - 1))];
}

/// Chooses the only source through the viewer's menu; the moment of the choice, or nothing.
std::optional<steady_clock::time_point> chooseInMenu(Screen& screen) {
    if (!eventually([&] { return screen.findWindow("QIVO Viewer").has_value(); })) {
        return std::nullopt;
    }
    const Window window = *screen.findWindow("QIVO Viewer");
    const auto view = screen.largestChild(window);
    if (!view) {
        return std::nullopt;
    }
    screen.move(window, 0, 0);
    screen.resize(window, kWidth + window.width - view->width, kHeight + window.height - view->height);
    screen.activate(window);
    steady_clock::time_point chosen;
    const bool done = eventually([&] {
        screen.key("Alt+s");
        screen.key("Return"); // arrows would lead to the next menu while there is no source yet
        chosen = steady_clock::now();
        screen.key("Return");
        if (eventually([&] { return screen.findWindow("BENCH (Live)").has_value(); }, milliseconds(300))) {
            return true;
        }
        screen.key("Escape");
        screen.key("Escape");
        return false;
    });
    return done ? std::optional(chosen) : std::nullopt;
}

/// Looks at the screen for a while. Whether the witness could tell what was published meanwhile.
bool watch(const Screen& screen, const Window& view, pid_t pid, const std::string& url, seconds duration,
           Result& result) {
    const auto witness = Witness::start(url);
    if (witness == nullptr) {
        std::fputs("the witness received nothing\n", stderr);
        return false;
    }
    std::set<std::int64_t> pictures;
    std::vector<double> latencies;
    Stalls stalls;
    const pid_t server = screen.serverProcess();
    const double processorBefore = processorSeconds(pid);
    const double serverBefore = processorSeconds(server);
    const auto begin = steady_clock::now();
    while (steady_clock::now() - begin < duration) {
        const auto time = timeOnScreen(screen, view);
        if (time && pictures.insert(*time).second) {
            latencies.push_back(static_cast<double>(nowMs() - *time));
        }
        std::this_thread::sleep_for(kLookEvery);
    }
    const double elapsed = duration_cast<microseconds>(steady_clock::now() - begin).count() / 1e6;
    result.processorPercent = 100 * (processorSeconds(pid) - processorBefore) / elapsed;
    result.serverPercent = 100 * (processorSeconds(server) - serverBefore) / elapsed;
    result.picturesPerSecond = static_cast<double>(pictures.size()) / elapsed;
    result.latencyMs = percentile(latencies, 0.5);
    result.latency95Ms = percentile(latencies, 0.95);
    stalls.stop();
    const auto published = witness->end();
    result.pictures = shareOf(pictures, published);
    result.picturesBetweenStalls =
        shareOf(pictures, published, [&stalls](std::int64_t picture) { return !stalls.cover(picture); });
    result.stalls = stalls.count();
    if (result.pictures.published == 0) {
        std::fputs("nothing shown is known to the witness\n", stderr);
    }
    return result.pictures.published > 0;
}

/// A player that shows the source, and how long that took.
struct Start {
    std::unique_ptr<Process> process;
    double firstPictureMs = 0;
    double firstPictureFromChoiceMs = 0;
};

/// Starts a player and waits for its first picture. Nothing if it shows none.
std::optional<Start> begin(Screen& screen, const Player& player) {
    Start start;
    const auto started = steady_clock::now();
    start.process = Process::start(player.command);
    if (start.process == nullptr) {
        return std::nullopt;
    }
    auto chosen = started;
    if (player.command.front() == VIEWER) {
        const auto choice = chooseInMenu(screen);
        if (!choice) {
            std::fprintf(stderr, "%s: the source could not be chosen\n%s\n", player.name.c_str(),
                         start.process->errors().c_str());
            return std::nullopt;
        }
        chosen = *choice;
    }
    if (!eventually([&] {
            const auto view = pictureWindow(screen);
            return view && timeOnScreen(screen, *view).has_value();
        })) {
        std::fprintf(stderr, "%s: no picture was seen\n%s\n", player.name.c_str(), start.process->errors().c_str());
        return std::nullopt;
    }
    const auto first = steady_clock::now();
    start.firstPictureMs = duration_cast<microseconds>(first - started).count() / 1e3;
    start.firstPictureFromChoiceMs = duration_cast<microseconds>(first - chosen).count() / 1e3;
    return start;
}

void end(const Screen& screen, Process& process) {
    process.signal(SIGTERM);
    if (!process.wait(seconds(5))) {
        process.signal(SIGKILL);
    }
    eventually([&] { return screen.titles().empty(); }, seconds(5));
}

Result measure(Screen& screen, const Player& player, const std::string& url, seconds duration) {
    Result result;
    result.name = player.name;
    result.drawsWithOpenGl = player.drawsWithOpenGl;
    std::vector<double> firsts;
    std::vector<double> firstsFromChoice;
    for (int i = 0; i < kStarts; ++i) {
        const auto started = begin(screen, player);
        if (!started) {
            return result;
        }
        firsts.push_back(started->firstPictureMs);
        firstsFromChoice.push_back(started->firstPictureFromChoiceMs);
        if (i + 1 == kStarts) {
            std::this_thread::sleep_for(kSettle);
            const auto view = pictureWindow(screen);
            result.shown = view && watch(screen, *view, started->process->pid(), url, duration, result);
        }
        end(screen, *started->process);
    }
    result.firstPictureMs = percentile(firsts, 0.5);
    result.firstPictureFromChoiceMs = percentile(firstsFromChoice, 0.5);
    return result;
}

std::vector<Player> players(const std::string& url) {
    const std::vector<std::string> source = {"rtspsrc", "location=" + url, "latency=40", "!", "decodebin", "!"};
    const auto gst = [&](std::vector<std::string> sink) {
        std::vector<std::string> command = {"/usr/bin/gst-launch-1.0", "-q"};
        command.insert(command.end(), source.begin(), source.end());
        command.insert(command.end(), sink.begin(), sink.end());
        return command;
    };
    return {
        {"this viewer", true, {VIEWER}},
        {"gst-launch ximagesink", false, gst({"videoconvert", "!", "ximagesink"})},
        {"gst-launch glimagesink", true, gst({"glimagesink"})},
        {"mpv low-latency",
         true,
         {"/usr/bin/mpv", "--profile=low-latency", "--no-config", "--no-audio", "--no-border", "--vo=gpu",
          "--gpu-sw=yes", "--hwdec=no", "--geometry=1920x1080+0+0", "--really-quiet", url}},
        {"ffplay",
         false,
         {"/usr/bin/ffplay", "-loglevel", "error", "-an", "-fflags", "nobuffer", "-flags", "low_delay", "-framedrop",
          "-noborder", "-x", "1920", "-y", "1080", "-left", "0", "-top", "0", url}},
    };
}

void print(const std::vector<Result>& results) {
    std::printf("%-24s %-3s %12s %14s %9s %13s %13s %11s %10s %11s %9s\n", "", "GL", "shown of", "between", "shown/s",
                "first from", "first from", "latency", "latency", "processor", "X server");
    std::printf("%-24s %-3s %12s %14s %9s %13s %13s %11s %10s %11s %9s\n", "", "", "published", "stalls", "",
                "start, ms", "choice, ms", "median, ms", "95 %, ms", "% of a core", "%");
    for (const auto& result : results) {
        if (!result.shown) {
            std::printf("%-24s not measured\n", result.name.c_str());
            continue;
        }
        std::printf("%-24s %-3s %4zu of %4zu %6zu of %4zu %9.2f %13.0f %13.0f %11.0f %10.0f %11.1f %9.1f\n",
                    result.name.c_str(), result.drawsWithOpenGl ? "yes" : "no", result.pictures.shown,
                    result.pictures.published, result.picturesBetweenStalls.shown,
                    result.picturesBetweenStalls.published, result.picturesPerSecond, result.firstPictureMs,
                    result.firstPictureFromChoiceMs, result.latencyMs, result.latency95Ms, result.processorPercent,
                    result.serverPercent);
    }
}

/// This viewer's figure over the best of the others': below 1 is better, for pictures shown above 1.
void printRatios(const std::vector<Result>& results) {
    const Result& own = results.front();
    const auto best = [&](auto value, bool onlyOpenGl, bool highest) {
        double found = 0;
        for (std::size_t i = 1; i < results.size(); ++i) {
            if (results[i].shown && (!onlyOpenGl || results[i].drawsWithOpenGl)) {
                const double candidate = value(results[i]);
                found = found == 0 || (highest ? candidate > found : candidate < found) ? candidate : found;
            }
        }
        return found;
    };
    const auto shown = [](const Result& r) { return r.pictures.fraction(); };
    const auto between = [](const Result& r) { return r.picturesBetweenStalls.fraction(); };
    const auto first = [](const Result& r) { return r.firstPictureFromChoiceMs; };
    const auto firstFromStart = [](const Result& r) { return r.firstPictureMs; };
    const auto latency = [](const Result& r) { return r.latencyMs; };
    const auto processor = [](const Result& r) { return r.processorPercent + r.serverPercent; };
    const auto processorOfPicture = [&](const Result& r) { return processor(r) / r.picturesPerSecond; };
    std::printf("\nThis viewer against the best of the others:\n");
    std::printf("  pictures shown      %.3f of those published (the best other: %.3f)\n", shown(own),
                best(shown, false, true));
    std::printf("                      %.3f without those that came while the machine stood still, %zu times (%.3f)\n",
                between(own), own.stalls, best(between, false, true));
    std::printf("  first picture       %.2f times the best (from the choice; the others from their start)\n",
                first(own) / best(first, false, false));
    std::printf("                      %.2f times the best (all from the start of the program)\n",
                firstFromStart(own) / best(firstFromStart, false, false));
    std::printf("  latency, median     %.2f times the best\n", latency(own) / best(latency, false, false));
    std::printf("  processor + server  %.2f times the best that draws with OpenGL\n",
                processor(own) / best(processor, true, false));
    std::printf("                      %.2f times the best of these, for each picture shown\n",
                processorOfPicture(own) / best(processorOfPicture, true, false));
}

} // namespace

int main(int argc, char** argv) {
    std::setvbuf(stdout, nullptr, _IOLBF, 0); // a round takes minutes, also where a file takes the output
    const seconds duration(argc > 1 ? std::max(1, std::atoi(argv[1])) : 20);
    const int rounds = argc > 2 ? std::max(1, std::atoi(argv[2])) : 1;
    const auto screen = Screen::open();
    if (!screen) {
        std::fputs("bench-end-to-end: cannot open the display; run bench/end-to-end\n", stderr);
        return 1;
    }
    const auto publisher = Process::start({PUBLISH, "--loopback-only", "--machine", "BENCH", "--source", "Live",
                                           "--size", "1920x1080", "--rate", std::to_string(kRate), "--no-audio"});
    if (publisher == nullptr || !publisher->waitForOutput("BENCH (Live)")) {
        std::fputs("bench-end-to-end: the publisher serves nothing\n", stderr);
        return 1;
    }
    const std::string output = publisher->output();
    const std::string url = output.substr(0, output.find_first_of(" \t\n"));
    std::printf("%d x %d, %d pictures a second, %lld s each, from %s\n", kWidth, kHeight, kRate,
                static_cast<long long>(duration.count()), url.c_str());
    // Nobody is to pay for what happens once on a machine: programs read from the disk, shaders compiled into the
    // user's cache, the publisher's encoder loaded.
    for (const auto& player : players(url)) {
        const auto started = begin(*screen, player);
        if (started) {
            end(*screen, *started->process);
        }
    }
    for (int round = 0; round < rounds; ++round) {
        std::vector<Result> results;
        for (const auto& player : players(url)) {
            results.push_back(measure(*screen, player, url, duration));
        }
        std::printf("\n");
        print(results);
        printRatios(results);
    }
    return 0;
}
