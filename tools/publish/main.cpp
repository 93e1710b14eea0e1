#include "tools/publish/Announcer.h"
#include "tools/publish/Options.h"
#include "tools/publish/Publisher.h"

#include <array>
#include <csignal>
#include <cstdio>
#include <glib-unix.h>
#include <unistd.h>

namespace {

constexpr int usageExitCode = 2;

std::string hostName() {
    std::array<char, 256> name{};
    gethostname(name.data(), name.size() - 1);
    const std::string whole = name.data();
    return whole.substr(0, whole.find('.'));
}

gboolean quit(gpointer loop) {
    g_main_loop_quit(static_cast<GMainLoop*>(loop));
    return G_SOURCE_CONTINUE;
}

// While GStreamer loads its plugins and inputs are examined, which takes seconds, nothing has begun that would have to
// be ended.
void endAtOnce(int) {
    _exit(0);
}

int fail(const std::string& text, int code) {
    std::fprintf(stderr, "qivo-publish: %s\n", text.c_str());
    return code;
}

int publish(const qivo::Options& options) {
    qivo::Publisher publisher(options);
    if (const std::string problem = publisher.examine(); !problem.empty()) {
        return fail(problem, 1);
    }
    GMainLoop* loop = g_main_loop_new(nullptr, FALSE);
    g_unix_signal_add(SIGINT, quit, loop);
    g_unix_signal_add(SIGTERM, quit, loop);
    const std::string problem = publisher.start();
    if (problem.empty()) {
        g_main_loop_run(loop);
    }
    publisher.stop();
    g_main_loop_unref(loop);
    return problem.empty() ? 0 : fail(problem, 1);
}

} // namespace

int main(int argc, char** argv) {
    std::signal(SIGPIPE, SIG_IGN);
    const std::vector<std::string> arguments(argv + 1, argv + argc);
    const qivo::ParsedOptions parsed = qivo::parseOptions(arguments, hostName());
    if (const auto* error = std::get_if<qivo::UsageError>(&parsed)) {
        return fail(error->text, usageExitCode);
    }
    if (const auto* answer = std::get_if<qivo::PrintAndExit>(&parsed)) {
        std::fputs(answer->text.c_str(), stdout);
        return 0;
    }
    std::signal(SIGINT, endAtOnce);
    std::signal(SIGTERM, endAtOnce);
    gst_init(nullptr, nullptr);
    return publish(std::get<qivo::Options>(parsed));
}
