// The finding half on several networks: each is a pair of virtual wires whose far end lies in a namespace of its own.
#include <chrono>
#include <cstdlib>
#include <fcntl.h>
#include <functional>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <memory>
#include <sched.h>
#include <string>
#include <thread>
#include <unistd.h>

#include "FinderResponder.h"
#include "runtime/Directory.h"

namespace {

using namespace std::chrono_literals;
using namespace qivo::test;
using qivo::runtime::Directory;

using Clock = std::chrono::steady_clock;
constexpr auto kDeadline = 20s;

void run(const std::string& command) {
    if (std::system(command.c_str()) != 0) {
        throw std::runtime_error("failed: " + command);
    }
}

/// A machine on a network of its own with this one: `near` here has address PREFIX.1, the far end PREFIX.2.
class Neighbour {
  public:
    Neighbour(const std::string& near, const std::string& prefix)
        : m_near(near), m_prefix(prefix), m_address(prefix + ".2") {
        std::thread([this] {
            unshare(CLONE_NEWNET);
            m_namespace = open("/proc/thread-self/ns/net", O_RDONLY | O_CLOEXEC);
        }).join();
        run("ip link add " + near + " type veth peer name far");
        run("ip link set far netns /proc/" + std::to_string(getpid()) + "/fd/" + std::to_string(m_namespace));
        // Without the check for duplicates, the link-local addresses can be used at once.
        run("sysctl -qw net.ipv6.conf." + near + ".accept_dad=0");
        run("ip addr add " + prefix + ".1/24 dev " + near + " && ip link set " + near + " up");
        enter([this] {
            run("sysctl -qw net.ipv6.conf.far.accept_dad=0");
            run("ip addr add " + m_address + "/24 dev far && ip link set far up");
        });
    }
    Neighbour(const Neighbour&) = delete;
    Neighbour& operator=(const Neighbour&) = delete;
    ~Neighbour() {
        m_responders.clear();
        close(m_namespace);
        [[maybe_unused]] const int status = std::system(("ip link del " + m_near + " 2>/dev/null").c_str());
    }

    /// Waits until it has been asked, so that what it announces is heard.
    Responder& responder() { return responderAt(m_address); }
    Responder& responderOverIpv6() { return responderAt("::"); }

    /// A further machine on that network, with address PREFIX.HOST. Does not wait, since a network is asked more and
    /// more rarely.
    Responder& responderOfHost(int host) {
        const auto another = m_prefix + "." + std::to_string(host);
        enter([&] {
            run("ip addr add " + another + "/24 dev far");
            m_responders.push_back(std::make_unique<Responder>("far", another));
        });
        return *m_responders.back();
    }

    const std::string& address() const { return m_address; }

  private:
    Responder& responderAt(const std::string& address) {
        enter([&] { m_responders.push_back(std::make_unique<Responder>("far", address)); });
        auto& responder = *m_responders.back();
        const auto end = Clock::now() + kDeadline;
        while (responder.questions(kPtr) == 0) {
            if (Clock::now() > end) {
                throw std::runtime_error("nobody asks over " + m_near);
            }
            std::this_thread::sleep_for(5ms);
        }
        return responder;
    }

    void enter(const std::function<void()>& work) const {
        std::thread([&] {
            setns(m_namespace, CLONE_NEWNET);
            work();
        }).join();
    }

    std::string m_near;
    std::string m_prefix;
    std::string m_address;
    int m_namespace = -1;
    std::vector<std::unique_ptr<Responder>> m_responders;
};

class FinderInterfacesTest : public testing::Test {
  protected:
    bool seesUrl(const std::string& name, const std::string& url) {
        const auto end = Clock::now() + kDeadline;
        while (true) {
            const auto seen = m_directory->generation();
            const auto found = m_directory->findByName(name);
            if (found && (found->url == url || (url.empty() && !found->url.empty()))) {
                return true;
            }
            const auto left = std::chrono::ceil<std::chrono::milliseconds>(end - Clock::now());
            if (left <= 0ms || !m_directory->waitForChange(seen, left)) {
                ADD_FAILURE() << name << " is at " << (found ? found->url : "no address") << ", not at " << url;
                return false;
            }
        }
    }

    std::shared_ptr<Directory> m_directory = Directory::acquire();
};

TEST_F(FinderInterfacesTest, ASourceOnSeveralNetworksIsListedOnceAndMovesOnlyWhenItMust) {
    Neighbour first("near1", "10.77.1");
    Neighbour second("near2", "10.77.2");
    Responder loopback;
    auto& one = first.responder();
    auto& two = second.responder();
    loopback.answerWith(source("MULTI (a)", "multi", "127.0.0.1"));
    ASSERT_TRUE(seesUrl("MULTI (a)", "rtsp://127.0.0.1:8554/live"));
    one.answerWith(source("MULTI (a)", "multi", first.address()));
    one.announce(source("MULTI (a)", "multi", first.address()));
    ASSERT_TRUE(seesUrl("MULTI (a)", "rtsp://10.77.1.2:8554/live"));
    two.answerWith(source("MULTI (a)", "multi", second.address()));
    two.announce(source("MULTI (a)", "multi", second.address()));
    two.announce(source("MARK", "mark", second.address()));
    ASSERT_TRUE(seesUrl("MARK", "rtsp://10.77.2.2:8554/live"));
    EXPECT_TRUE(seesUrl("MULTI (a)", "rtsp://10.77.1.2:8554/live"));
    EXPECT_EQ(m_directory->announcements().size(), 2U);
    run("ip link set near1 down");
    EXPECT_TRUE(seesUrl("MULTI (a)", "rtsp://10.77.2.2:8554/live"));
    EXPECT_EQ(m_directory->announcements().size(), 2U);
}

TEST_F(FinderInterfacesTest, EveryMachineIsHeardBesideAProgramThatListensOnLoopbackAlone) {
    const Responder loopback; // shares the port with the finder
    Neighbour neighbour("near7", "10.77.7");
    neighbour.responder();
    // The system's choice of a wrong socket depends on the sender's address; it would have to miss all of these.
    for (int host = 10; host < 20; ++host) {
        const auto name = "HOST " + std::to_string(host);
        const auto address = "10.77.7." + std::to_string(host);
        neighbour.responderOfHost(host).announce(source(name, "host" + std::to_string(host), address));
        ASSERT_TRUE(seesUrl(name, "rtsp://" + address + ":8554/live"));
    }
}

TEST_F(FinderInterfacesTest, AnInterfaceThatComesLaterIsSearchedAndItsSourcesGoWithIt) {
    auto late = std::make_unique<Neighbour>("near3", "10.77.3");
    late->responder().answerWith(source("LATE (a)", "late", late->address()));
    ASSERT_TRUE(seesUrl("LATE (a)", "rtsp://10.77.3.2:8554/live"));
    const auto found = m_directory->findByName("LATE (a)");
    ASSERT_TRUE(found);
    EXPECT_FALSE(found->local);
    const auto seen = m_directory->generation();
    late.reset();
    ASSERT_TRUE(m_directory->waitForChange(seen, kDeadline));
    EXPECT_FALSE(m_directory->findByName("LATE (a)").has_value());
}

TEST_F(FinderInterfacesTest, ASourceIsFoundOverIpv6WithItsZone) {
    Neighbour neighbour("near4", "10.77.4");
    auto& responder = neighbour.responderOverIpv6();
    responder.answerWith(source("SIX (a)", "six", "fe80::1234"));
    ASSERT_TRUE(seesUrl("SIX (a)", "rtsp://[fe80::1234%25near4]:8554/live"));
    responder.announce({address("six", "2001:db8::9")});
    EXPECT_TRUE(seesUrl("SIX (a)", "rtsp://[2001:db8::9]:8554/live"));
}

TEST_F(FinderInterfacesTest, ASourceHeardOverBothFamiliesIsListedOnce) {
    Neighbour neighbour("near5", "10.77.5");
    const auto records = source("BOTH (a)", "both", "10.77.5.2");
    neighbour.responderOverIpv6().answerWith(records);
    neighbour.responder().answerWith(records);
    ASSERT_TRUE(seesUrl("BOTH (a)", "rtsp://10.77.5.2:8554/live"));
    EXPECT_EQ(m_directory->announcements().size(), 1U);
}

TEST_F(FinderInterfacesTest, ALoopbackAddressFromANeighbourIsRefused) {
    Neighbour neighbour("near6", "10.77.6");
    auto& responder = neighbour.responder();
    auto records = source("LURE (a)", "lure", "127.0.0.1");
    const auto honest = source("HONEST (a)", "honest", "10.77.6.2");
    records.insert(records.end(), honest.begin(), honest.end());
    responder.answerWith(records);
    ASSERT_TRUE(seesUrl("HONEST (a)", "rtsp://10.77.6.2:8554/live"));
    responder.announce(records);
    responder.announce(source("MARK", "mark", "10.77.6.2"));
    ASSERT_TRUE(seesUrl("MARK", "rtsp://10.77.6.2:8554/live"));
    EXPECT_FALSE(m_directory->findByName("LURE (a)").has_value());
}

TEST(FinderWithoutNetworkTest, SourcesAreFoundOnceTheFirstInterfaceComesAndAgainAfterItWentAway) {
    run("ip link set lo down");
    testing::internal::CaptureStderr();
    const auto directory = Directory::acquire();
    ASSERT_NE(directory, nullptr);
    EXPECT_FALSE(directory->waitForChange(0, 500ms));
    for (int round = 0; round < 2; ++round) {
        run("ip link set lo up && ip route replace 224.0.0.0/4 dev lo");
        Responder responder;
        responder.answerWith(source("FIRST (a)", "first", "127.0.0.1"));
        const auto seen = directory->generation();
        EXPECT_TRUE(directory->waitForChange(seen, kDeadline));
        ASSERT_TRUE(directory->findByName("FIRST (a)").has_value());
        run("ip link set lo down");
        EXPECT_TRUE(directory->waitForChange(seen + 1, kDeadline));
        EXPECT_FALSE(directory->findByName("FIRST (a)").has_value());
    }
    run("ip link set lo up && ip route replace 224.0.0.0/4 dev lo");
    EXPECT_EQ(testing::internal::GetCapturedStderr(), "");
}

} // namespace
