#include "tests/record/RecorderProcess.h"

#include "tests/support/Screen.h"

#include <csignal>
#include <cstdio>
#include <fcntl.h>
#include <filesystem>
#include <sys/stat.h>
#include <thread>
#include <unistd.h>
#include <utility>

namespace qivo::test {
namespace {

constexpr auto kLimit = std::chrono::seconds(20);
constexpr int kStillRunning = 1000;
constexpr auto kLaunchersPass = std::chrono::milliseconds(5);

} // namespace

RecorderProcess::RecorderProcess(const std::string& script, std::string name, const std::string& around,
                                 const std::string& library)
    : m_name(std::move(name)) {
    std::filesystem::create_directory(m_folder.path("movies"));
    const std::string pipe = m_folder.path("input");
    mkfifo(pipe.c_str(), 0600);
    m_input = open(pipe.c_str(), O_RDWR | O_CLOEXEC);
    const std::string folder = m_folder.path("movies");
    m_process =
        Process::start({"/bin/sh", "-c", "exec <\"$0\"; folder=$1; shift; " + around, pipe, folder, RECORDER, "-i",
                        m_name, "-o", folder + "/" + m_name + ".mov", "-orvane", "-nothumbnail"},
                       // The shell would hand on the last of two settings, which is the inherited one.
                       {"QIVO_STAND_IN=" + script, "LD_LIBRARY_PATH=" + library, "ASAN_OPTIONS=detect_leaks=0"});
}

RecorderProcess::~RecorderProcess() {
    closeInput();
}

void RecorderProcess::closeInput() {
    if (m_input >= 0) {
        close(std::exchange(m_input, -1));
    }
}

std::string RecorderProcess::complaints() const {
    std::string errors = m_process->errors();
    const std::size_t begin = errors.find("Application.Mac.QIVO.Recording: encoding with ");
    if (begin != std::string::npos) {
        errors.erase(begin, errors.find('\n', begin) + 1 - begin);
    }
    return errors;
}

std::string RecorderProcess::lastProgress() const {
    const std::string output = m_process->output();
    const std::size_t end = output.rfind('\n');
    if (end == std::string::npos || end == 0) {
        return {};
    }
    const std::size_t begin = output.rfind('\n', end - 1);
    return output.substr(begin == std::string::npos ? 0 : begin + 1,
                         end - (begin == std::string::npos ? 0 : begin + 1));
}

std::chrono::milliseconds RecorderProcess::length() const {
    int hours = 0;
    int minutes = 0;
    int seconds = 0;
    int milliseconds = 0;
    std::sscanf(lastProgress().c_str(), "time %d:%d:%d.%d", &hours, &minutes, &seconds, &milliseconds);
    return std::chrono::milliseconds(((hours * 60 + minutes) * 60 + seconds) * 1000 + milliseconds);
}

bool RecorderProcess::waitForLength(std::chrono::milliseconds length) {
    return eventually([&] { return this->length() >= length || !m_process->running(); }, kLimit) &&
           this->length() >= length;
}

int RecorderProcess::interrupt() {
    const auto began = std::chrono::steady_clock::now();
    while (m_process->running() && std::chrono::steady_clock::now() - began < kLimit) {
        m_process->signal(SIGINT);
        std::this_thread::sleep_for(kLaunchersPass);
    }
    m_ending = std::chrono::duration_cast<std::chrono::milliseconds>(std::chrono::steady_clock::now() - began);
    return m_process->wait(kLimit).value_or(kStillRunning);
}

} // namespace qivo::test
