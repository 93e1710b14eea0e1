// Prints the sources of the network whenever they change, until its standard input ends. For development and for tests
// that need a second process.
#include <chrono>
#include <cstdio>
#include <cstring>
#include <poll.h>
#include <unistd.h>

#include "runtime/Directory.h"

namespace {

void print(const std::vector<qivo::runtime::Announcement>& sources) {
    for (const auto& source : sources) {
        std::printf("%s | %s | %s | %s | %s | %s\n", source.name.c_str(), source.url.c_str(), source.lowUrl.c_str(),
                    source.web.c_str(), source.onvif.c_str(), source.local ? "local" : "");
    }
    std::puts("--");
    std::fflush(stdout);
}

bool inputEnded() {
    pollfd input{STDIN_FILENO, POLLIN, 0};
    return poll(&input, 1, 0) != 0;
}

} // namespace

// With the argument --once it ends after the first change, or after 20 seconds without any.
int main(int count, char** arguments) {
    const bool once = count > 1 && std::strcmp(arguments[1], "--once") == 0;
    const auto directory = qivo::runtime::Directory::acquire();
    if (!directory) {
        std::fputs("finder-watch: this machine has no network\n", stderr);
        return 1;
    }
    if (once) {
        directory->waitForChange(0, std::chrono::seconds(20));
        print(directory->announcements());
        return 0;
    }
    std::uint64_t seen = 0;
    while (!inputEnded()) {
        if (directory->waitForChange(seen, std::chrono::milliseconds(50))) {
            seen = directory->generation();
            print(directory->announcements());
        }
    }
    return 0;
}
