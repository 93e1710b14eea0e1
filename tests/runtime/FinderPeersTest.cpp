// The finding half beside the system's own multicast DNS daemon, which runs on a message bus and an interface of the
// test's own.
#include <algorithm>
#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <memory>
#include <stdexcept>
#include <string>

#include "FinderResponder.h"
#include "runtime/Directory.h"
#include "tests/support/Process.h"

namespace {

using namespace std::chrono_literals;
using namespace qivo::test;
using qivo::runtime::Announcement;
using qivo::runtime::Directory;

constexpr auto kDeadline = 20s;

/// Everyone on the bus may do everything.
constexpr const char* kBusPolicy = R"(<busconfig>
  <type>session</type>
  <listen>unix:path=%DIRECTORY%/bus</listen>
  <auth>EXTERNAL</auth>
  <policy context="default">
    <allow user="*"/>
    <allow own="*"/>
    <allow send_destination="*" eavesdrop="true"/>
    <allow eavesdrop="true"/>
  </policy>
</busconfig>
)";
constexpr const char* kDaemonSettings = "[server]\nhost-name=studio\nuse-ipv6=no\nallow-interfaces=wire\n";

void run(const std::string& command) {
    if (std::system(command.c_str()) != 0) {
        throw std::runtime_error("failed: " + command);
    }
}

class FinderPeersTest : public testing::Test {
  protected:
    FinderPeersTest() {
        std::string name = std::filesystem::temp_directory_path() / "finder-peers-XXXXXX";
        if (mkdtemp(name.data()) == nullptr) {
            throw std::runtime_error("no folder for the daemon's settings");
        }
        m_folder = name;
    }
    ~FinderPeersTest() override {
        m_daemon.reset();
        m_bus.reset();
        [[maybe_unused]] const int status = std::system("ip link del wire 2>/dev/null");
        std::filesystem::remove_all(m_folder);
    }

    void SetUp() override {
        run("ip link add wire type veth peer name end && ip addr add 10.78.0.1/24 dev wire");
        run("ip link set wire up && ip link set end up");
        std::string policy = kBusPolicy;
        policy.replace(policy.find("%DIRECTORY%"), std::string("%DIRECTORY%").size(), m_folder.string());
        std::ofstream(m_folder / "bus.conf") << policy;
        std::ofstream(m_folder / "daemon.conf") << kDaemonSettings;
        m_bus = Process::start({"/usr/bin/dbus-daemon", "--nofork", "--print-address",
                                "--config-file=" + (m_folder / "bus.conf").string()});
        ASSERT_TRUE(m_bus && m_bus->waitForOutput("unix:path=", kDeadline)) << m_bus->errors();
        // Its run-time folder is built into it, so it sees one of its own, whatever runs on this machine.
        m_daemon = startOnBus("/usr/bin/unshare",
                              {"--mount", "--", "/bin/sh", "-c",
                               "mount -t tmpfs run /run && exec /usr/sbin/avahi-daemon --no-drop-root --no-chroot "
                               "--no-rlimits -f " +
                                   (m_folder / "daemon.conf").string() + " 2>&1"});
        ASSERT_TRUE(m_daemon && m_daemon->waitForOutput("Server startup complete", kDeadline)) << m_daemon->output();
    }

    std::unique_ptr<Process> startOnBus(const std::string& program, std::vector<std::string> arguments) const {
        arguments.insert(arguments.begin(), program);
        return Process::start(arguments, {"DBUS_SYSTEM_BUS_ADDRESS=unix:path=" + (m_folder / "bus").string()});
    }
    std::unique_ptr<Process> publishCamera() const {
        return startOnBus("/usr/bin/avahi-publish-service",
                          {"STUDIO (Cam 9)", "_rtsp._tcp", "8554", "path=/x", "web=http://10.0.0.1/"});
    }

    static bool eventually(const Directory& directory, const std::function<bool()>& condition) {
        const auto end = std::chrono::steady_clock::now() + kDeadline;
        while (!condition()) {
            const auto seen = directory.generation();
            const auto left = std::chrono::ceil<std::chrono::milliseconds>(end - std::chrono::steady_clock::now());
            if (!condition() && !directory.waitForChange(seen, left)) {
                return condition();
            }
        }
        return true;
    }

    std::filesystem::path m_folder;
    std::unique_ptr<Process> m_bus;
    std::unique_ptr<Process> m_daemon;
};

const Announcement kCamera{"STUDIO (Cam 9)", "rtsp://10.78.0.1:8554/x", "", "http://10.0.0.1/", "", true};

TEST_F(FinderPeersTest, WhatTheDaemonPublishesIsFoundWhoeverComesFirst) {
    const auto early = publishCamera();
    auto directory = Directory::acquire();
    const auto isFound = [&] { return directory->findByName(kCamera.name) == kCamera; };
    EXPECT_TRUE(eventually(*directory, isFound)) << directory->announcements().size() << m_daemon->output();
    early->signal(SIGTERM);
    ASSERT_TRUE(eventually(*directory, [&] { return directory->announcements().empty(); }));
    const auto late = publishCamera();
    EXPECT_TRUE(eventually(*directory, isFound)) << directory->announcements().size() << m_daemon->output();
}

TEST_F(FinderPeersTest, APublisherThatIsKilledIsGoneWithinTwoSeconds) {
    const auto directory = Directory::acquire();
    const auto publisher = publishCamera();
    ASSERT_TRUE(eventually(*directory, [&] { return directory->findByName(kCamera.name) == kCamera; }));
    const auto killed = std::chrono::steady_clock::now();
    publisher->signal(SIGKILL);
    EXPECT_TRUE(eventually(*directory, [&] { return directory->announcements().empty(); }));
    EXPECT_LT(std::chrono::steady_clock::now() - killed, 2s);
}

TEST_F(FinderPeersTest, TheDaemonGoesOnHearingWhatTheFinderHears) {
    const auto directory = Directory::acquire();
    Responder camera("wire", "10.78.0.1");
    camera.answerWith(source("OTHER (Cam 1)", "other", "10.78.0.1"));
    ASSERT_TRUE(eventually(*directory, [&] { return directory->findByName("OTHER (Cam 1)").has_value(); }));
    const auto browse = startOnBus("/usr/bin/avahi-browse", {"--parsable", "--resolve", "_rtsp._tcp"});
    EXPECT_TRUE(browse->waitForOutput(";other.local;10.78.0.1;8554;\"path=/live\"", kDeadline))
        << browse->output() << browse->errors();
}

} // namespace
