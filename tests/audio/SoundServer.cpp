#include "tests/audio/SoundServer.h"

#include "tests/support/Screen.h"

#include <csignal>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <sstream>

namespace qivo::test {

using namespace std::chrono_literals;

SoundServer::SoundServer() {
    std::string folder = (std::filesystem::temp_directory_path() / "sound-XXXXXX").string();
    m_folder = mkdtemp(folder.data());
    m_environment = {"HOME=" + m_folder,
                     "XDG_RUNTIME_DIR=" + m_folder,
                     "XDG_CONFIG_HOME=" + m_folder,
                     "PULSE_RUNTIME_PATH=" + m_folder,
                     "PULSE_SERVER=unix:" + m_folder + "/socket",
                     "DBUS_SESSION_BUS_ADDRESS=disabled:",
                     "DBUS_SYSTEM_BUS_ADDRESS=disabled:"};
    for (const std::string& entry : m_environment) {
        const auto equals = entry.find('=');
        setenv(entry.substr(0, equals).c_str(), entry.substr(equals + 1).c_str(), 1);
    }
}

SoundServer::~SoundServer() {
    kill();
    std::error_code ignored;
    std::filesystem::remove_all(m_folder, ignored);
}

bool SoundServer::start(const std::vector<std::string>& sinks) {
    std::vector<std::string> command = {"/usr/bin/pulseaudio",
                                        "-n",
                                        "--daemonize=no",
                                        "--exit-idle-time=60",
                                        "--use-pid-file=no",
                                        "--disable-shm=yes",
                                        "--realtime=no",
                                        "-L",
                                        "module-native-protocol-unix auth-anonymous=1 socket=" + m_folder + "/socket"};
    std::vector<std::string> all = sinks;
    all.emplace_back("nowhere");
    for (const std::string& sink : all) {
        command.insert(command.end(),
                       {"-L", "module-null-sink sink_name=" + sink + " format=float32le rate=48000 channels=2"});
    }
    std::filesystem::remove(m_folder + "/socket");
    m_process = Process::start(command, m_environment);
    if (!m_process || !eventually([this] { return control({"info"}).find("Default Sink") != std::string::npos; })) {
        return false;
    }
    // Recordings follow the default source, which follows the default sink unless it was chosen.
    control({"set-default-source", "nowhere.monitor"});
    return true;
}

void SoundServer::kill() {
    if (m_process) {
        m_process->signal(SIGKILL);
        m_process->wait(10s);
        m_process.reset();
    }
}

void SoundServer::setHalted(bool halted) {
    m_process->signal(halted ? SIGSTOP : SIGCONT);
}

std::string SoundServer::control(const std::vector<std::string>& arguments) const {
    std::vector<std::string> command = {"/usr/bin/pactl"};
    command.insert(command.end(), arguments.begin(), arguments.end());
    const auto process = Process::start(command, m_environment);
    if (!process || process->wait(10s) != 0) {
        return "";
    }
    eventually([&process] { return !process->output().empty(); }, 200ms); // read by another thread
    return process->output();
}

std::string SoundServer::moduleOf(const std::string& sink) const {
    std::istringstream modules(control({"list", "short", "modules"}));
    for (std::string line; std::getline(modules, line);) {
        if (line.find("sink_name=" + sink + " ") != std::string::npos) {
            return line.substr(0, line.find('\t'));
        }
    }
    return "";
}

SoundServer::Recording::Recording(const SoundServer& server, const std::string& sink)
    : m_process(Process::start({"/usr/bin/parec", "--raw", "--device=" + sink + ".monitor", "--format=float32le",
                                "--rate=48000", "--channels=2", "--latency-msec=20"},
                               server.m_environment)) {}

std::vector<float> SoundServer::Recording::samples() const {
    const std::string bytes = m_process->output();
    std::vector<float> floats(bytes.size() / sizeof(float) / 2 * 2);
    if (!floats.empty()) {
        std::memcpy(floats.data(), bytes.data(), floats.size() * sizeof(float));
    }
    return floats;
}

} // namespace qivo::test
