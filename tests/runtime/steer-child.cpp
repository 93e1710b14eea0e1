// steer-child URL END [PRESET]: begins to turn the camera behind the source, or sends it to a preset, says so and ends
// as it is told:
//   hold      not by itself
//   receiver  destroys the receiver and lives on
//   library   destroys the library and lives on
//   exit      leaves the process without a word to the library

#include "sdk/qivo.h"

#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <thread>

namespace {

using namespace std::chrono_literals;

void say(const char* text) {
    std::printf("%s\n", text);
    std::fflush(stdout);
}

/// Does what an application does: captures, and asks after each status change.
bool waitForCamera(QIVOlib_recv_instance_t receiver) {
    const auto deadline = std::chrono::steady_clock::now() + 20s;
    while (std::chrono::steady_clock::now() < deadline) {
        const int32_t type = QIVOlib_recv_capture_v2(receiver, nullptr, nullptr, nullptr, 100);
        if (type == QIVOlib_frame_type_status_change && QIVOlib_recv_ptz_is_supported(receiver)) {
            return true;
        }
    }
    return false;
}

} // namespace

int main(int argc, char** argv) {
    if (argc < 3 || argc > 4 || !QIVOlib_initialize()) {
        return 2;
    }
    const std::string end = argv[2];
    QIVOlib_recv_create_v3_t settings{};
    settings.source.p_url_address = argv[1];
    settings.color_format = QIVOlib_recv_color_format_rgba;
    settings.bandwidth = QIVOlib_recv_bandwidth_highest;
    QIVOlib_recv_instance_t const receiver = QIVOlib_recv_create_v3(&settings);
    const bool obeys =
        waitForCamera(receiver) && (argc == 4 ? QIVOlib_recv_ptz_recall_preset(receiver, std::atoi(argv[3]), 0.25F)
                                              : QIVOlib_recv_ptz_pan_tilt_speed(receiver, 0.1F, 0));
    if (!obeys) {
        say("no camera");
        return 1;
    }
    if (end == "hold") {
        // Whoever ends it by this signal means no fault that a sanitizer would have to report.
        std::signal(SIGSEGV, SIG_DFL);
    }
    say("turning");
    std::this_thread::sleep_for(500ms);
    say("ending");
    if (end == "exit") {
        std::exit(0);
    }
    if (end == "receiver") {
        QIVOlib_recv_destroy(receiver);
    } else if (end == "library") {
        QIVOlib_destroy();
    }
    std::this_thread::sleep_for(20s);
    return 0;
}
