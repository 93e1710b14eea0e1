// Types, looks and takes pictures of a screen from a script:
//   screen-tool wait-window TITLE SECONDS | key CHORD ... | click X Y | picture FILE.png [TITLE] | titles
#include "tests/support/Screen.h"

#include <QImage>
#include <cstdio>
#include <cstdlib>
#include <optional>
#include <string>
#include <vector>

namespace {

using qivo::test::Screen;

int usage() {
    std::fputs("usage: screen-tool wait-window TITLE SECONDS | key CHORD ... | click X Y | picture FILE.png [TITLE] | "
               "titles\n",
               stderr);
    return 2;
}

int waitWindow(const Screen& screen, const std::string& title, int seconds) {
    const auto there = [&] { return screen.findWindow(title).has_value(); };
    if (qivo::test::eventually(there, std::chrono::seconds(seconds))) {
        return 0;
    }
    std::fprintf(stderr, "screen-tool: no window with the title '%s' within %d s\n", title.c_str(), seconds);
    return 1;
}

int keys(Screen& screen, const std::vector<std::string>& chords) {
    for (const auto& chord : chords) {
        if (!screen.key(chord)) {
            std::fprintf(stderr, "screen-tool: there is no key '%s'\n", chord.c_str());
            return 1;
        }
    }
    return 0;
}

/// Of the window with that title as the screen shows it, or of the whole screen.
int picture(const Screen& screen, const std::string& path, const std::optional<std::string>& title) {
    const auto window = title ? screen.findWindow(*title) : std::nullopt;
    if (title && !window) {
        std::fprintf(stderr, "screen-tool: there is no window with the title '%s'\n", title->c_str());
        return 1;
    }
    const qivo::test::Picture shot = window ? screen.grab(*window) : screen.grabAll();
    const QImage image(shot.pixels.data(), shot.width, shot.height, QImage::Format_RGBA8888);
    if (shot.empty() || !image.save(QString::fromStdString(path), "PNG")) {
        std::fprintf(stderr, "screen-tool: cannot write '%s'\n", path.c_str());
        return 1;
    }
    return 0;
}

} // namespace

int main(int argc, char** argv) {
    const std::vector<std::string> arguments(argv + 1, argv + argc);
    if (arguments.empty()) {
        return usage();
    }
    const auto screen = Screen::open();
    if (!screen) {
        std::fputs("screen-tool: cannot open the display\n", stderr);
        return 1;
    }
    const std::string& command = arguments[0];
    if (command == "wait-window" && arguments.size() == 3) {
        return waitWindow(*screen, arguments[1], std::atoi(arguments[2].c_str()));
    }
    if (command == "key" && arguments.size() > 1) {
        return keys(*screen, {arguments.begin() + 1, arguments.end()});
    }
    if (command == "click" && arguments.size() == 3) {
        screen->click(std::atoi(arguments[1].c_str()), std::atoi(arguments[2].c_str()));
        return 0;
    }
    if (command == "picture" && (arguments.size() == 2 || arguments.size() == 3)) {
        return picture(*screen, arguments[1], arguments.size() == 3 ? std::optional(arguments[2]) : std::nullopt);
    }
    if (command == "titles" && arguments.size() == 1) {
        for (const auto& title : screen->titles()) {
            std::puts(title.c_str());
        }
        return 0;
    }
    return usage();
}
