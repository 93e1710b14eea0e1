#include <algorithm>
#include <arpa/inet.h>
#include <array>
#include <atomic>
#include <chrono>
#include <cstdio>
#include <functional>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <memory>
#include <netinet/in.h>
#include <sys/socket.h>
#include <thread>
#include <unistd.h>

#include "FinderResponder.h"
#include "runtime/Directory.h"
#include "runtime/SourceTable.h"

namespace {

using namespace std::chrono_literals;
using namespace qivo::test;
using qivo::runtime::Announcement;
using qivo::runtime::Directory;
using testing::ElementsAre;
using testing::IsEmpty;

using Clock = std::chrono::steady_clock;

/// Far beyond what any change may take, also where other programs leave it little of the processor; only a failure
/// waits as long.
constexpr auto kDeadline = 60s;
/// Between two looks at what does not wake anybody up.
constexpr auto kLook = 1ms;
/// More than are kept.
constexpr int kFlood = static_cast<int>(qivo::runtime::kMaxSources) + 500;

std::vector<std::string> namesIn(const Directory& directory) {
    std::vector<std::string> names;
    for (const auto& announcement : directory.announcements()) {
        names.push_back(announcement.name);
    }
    return names;
}

/// Waits for the condition through the directory's own changes.
bool eventually(const Directory& directory, const std::function<bool()>& condition,
                std::chrono::milliseconds limit = kDeadline) {
    const auto end = Clock::now() + limit;
    while (true) {
        const auto seen = directory.generation();
        if (condition()) {
            return true;
        }
        const auto left = std::chrono::ceil<std::chrono::milliseconds>(end - Clock::now());
        if (left <= 0ms || !directory.waitForChange(seen, left)) {
            return condition();
        }
    }
}

class DirectoryTest : public testing::Test {
  protected:
    /// What is announced before the directory listens would be lost, so its first question is waited for.
    void SetUp() override {
        const auto end = Clock::now() + kDeadline;
        while (m_responder.questions(kPtr) == 0 && Clock::now() < end) {
            std::this_thread::sleep_for(kLook);
        }
        ASSERT_GT(m_responder.questions(kPtr), 0);
    }

    bool finds(const std::string& name) {
        return eventually(*m_directory, [&] { return m_directory->findByName(name).has_value(); });
    }
    bool loses(const std::string& name, std::chrono::milliseconds limit = kDeadline) {
        return eventually(
            *m_directory, [&] { return !m_directory->findByName(name).has_value(); }, limit);
    }
    bool seesUrl(const std::string& name, const std::string& url) {
        return eventually(*m_directory, [&] {
            const auto found = m_directory->findByName(name);
            return found && found->url == url;
        });
    }
    /// Waits until everything sent before has been worked off: a source that is sent after it comes and goes. Sent
    /// again while it is not seen, because a flood before it may have filled the socket's buffer.
    void settle() {
        const std::string name = "settled " + std::to_string(++m_settled);
        const auto end = Clock::now() + kDeadline;
        const auto seen = [&] { return m_directory->findByName(name).has_value(); };
        do {
            m_responder.announce(source(name, "settled", "127.0.0.1"));
        } while (!eventually(*m_directory, seen, 200ms) && Clock::now() < end);
        ASSERT_TRUE(seen());
        m_responder.announce(goodbye({pointer(name)}));
        ASSERT_TRUE(loses(name));
    }

    Responder m_responder;
    std::shared_ptr<Directory> m_directory = Directory::acquire();
    int m_settled = 0;
};

TEST_F(DirectoryTest, ASourceIsFoundByWhatItAnswers) {
    m_responder.answerWith(
        source("STUDIO (Cam 1)", "studio", "127.0.0.1", 8554,
               {"path=live/1", "low=/low", "web=http://127.0.0.1/", "onvif=http://127.0.0.1/onvif"}));
    ASSERT_TRUE(finds("STUDIO (Cam 1)"));
    const Announcement expected{"STUDIO (Cam 1)",    "rtsp://127.0.0.1:8554/live/1", "rtsp://127.0.0.1:8554/low",
                                "http://127.0.0.1/", "http://127.0.0.1/onvif",       true};
    EXPECT_EQ(m_directory->findByName("STUDIO (Cam 1)"), expected);
    EXPECT_EQ(m_directory->findByUrl("rtsp://127.0.0.1:8554/low"), expected);
    EXPECT_EQ(m_directory->findByUrl(""), std::nullopt);
}

TEST_F(DirectoryTest, TwoHundredSourcesAreFoundWithinThreeSeconds) {
    std::vector<DnsRecord> records;
    for (int i = 0; i < 200; ++i) {
        const auto one = source("MACHINE (Source " + std::to_string(i) + ")", "machine" + std::to_string(i % 20),
                                "127.0.0.1", static_cast<std::uint16_t>(9000 + i));
        records.insert(records.end(), one.begin(), one.end());
    }
    m_responder.answerWith(records);
    // The directory of the fixture may have asked already; a new one starts its own clock.
    m_directory.reset();
    const auto start = Clock::now();
    m_directory = Directory::acquire();
    EXPECT_TRUE(eventually(*m_directory, [&] { return m_directory->announcements().size() == 200; }));
    EXPECT_LT(Clock::now() - start, 3s);
    const auto names = namesIn(*m_directory);
    EXPECT_TRUE(std::is_sorted(names.begin(), names.end()));
}

TEST_F(DirectoryTest, AGoodbyeIsSeenWithinTwoSeconds) {
    const auto records = source("LEAVING", "host", "127.0.0.1");
    m_responder.announce(records);
    ASSERT_TRUE(finds("LEAVING"));
    m_responder.announce(goodbye(records));
    EXPECT_TRUE(loses("LEAVING", 2s));
}

TEST_F(DirectoryTest, ASourceWhoseHostDiedGoesWithItsRecordsAndReturnsWithThem) {
    // Short-lived records that nobody refreshes; the pointer lives on, as it does for more than an hour in earnest.
    const auto records = source("MORTAL", "mortal", "127.0.0.1", 8554, {"path=/live"}, 3);
    m_responder.announce(records);
    ASSERT_TRUE(finds("MORTAL"));
    ASSERT_TRUE(loses("MORTAL"));
    m_responder.announce(source("MORTAL", "mortal", "127.0.0.9", 9999, {"path=/other"}));
    EXPECT_TRUE(seesUrl("MORTAL", "rtsp://127.0.0.9:9999/other"));
}

TEST_F(DirectoryTest, ARefreshedRecordLivesOnUnnoticed) {
    const auto records = source("REFRESHED", "host", "127.0.0.1", 8554, {"path=/live"}, 2);
    m_responder.answerWith(records);
    ASSERT_TRUE(finds("REFRESHED"));
    const auto seen = m_directory->generation();
    const int asked = m_responder.questions(kSrv);
    // Beyond two lifetimes, in which the stack asks and is answered again.
    EXPECT_FALSE(m_directory->waitForChange(seen, 4500ms));
    EXPECT_GE(m_responder.questions(kSrv), asked + 2);
}

TEST_F(DirectoryTest, AChangedPortAddressOrTextIsSeen) {
    m_responder.announce(source("CHANGING", "host", "127.0.0.1"));
    ASSERT_TRUE(seesUrl("CHANGING", "rtsp://127.0.0.1:8554/live"));
    m_responder.announce({server("CHANGING", "host", 9554)});
    EXPECT_TRUE(seesUrl("CHANGING", "rtsp://127.0.0.1:9554/live"));
    m_responder.announce({address("host", "127.0.0.2")});
    EXPECT_TRUE(seesUrl("CHANGING", "rtsp://127.0.0.2:9554/live"));
    m_responder.announce({text("CHANGING", {"path=/new", "web=https://127.0.0.2/"})});
    EXPECT_TRUE(seesUrl("CHANGING", "rtsp://127.0.0.2:9554/new"));
    const auto changed = m_directory->findByName("CHANGING");
    ASSERT_TRUE(changed);
    EXPECT_EQ(changed->web, "https://127.0.0.2/");
}

TEST_F(DirectoryTest, ASourceThatStartsAgainAtOnceIsSeen) {
    const auto records = source("RESTARTED", "host", "127.0.0.1");
    for (int i = 0; i < 3; ++i) {
        m_responder.announce(records);
        ASSERT_TRUE(finds("RESTARTED"));
        m_responder.announce(goodbye(records));
        ASSERT_TRUE(loses("RESTARTED"));
    }
}

TEST_F(DirectoryTest, TheSameAnnouncedTwiceIsNoChange) {
    const auto records = source("SAME", "host", "127.0.0.1");
    m_responder.announce(records);
    ASSERT_TRUE(finds("SAME"));
    const auto seen = m_directory->generation();
    m_responder.announce(records);
    EXPECT_FALSE(m_directory->waitForChange(seen, 1500ms));
}

TEST_F(DirectoryTest, NamesThatDifferInCaseAloneAreOne) {
    m_responder.announce(source("Case", "host", "127.0.0.1"));
    ASSERT_TRUE(finds("Case"));
    m_responder.announce(source("CASE", "host", "127.0.0.1"));
    settle();
    EXPECT_THAT(namesIn(*m_directory), ElementsAre("Case"));
}

TEST_F(DirectoryTest, ASubscriptionIsToldAndEnds) {
    std::atomic<int> calls = 0;
    auto subscription = m_directory->subscribe([&] { ++calls; });
    m_responder.announce(source("HEARD", "host", "127.0.0.1"));
    ASSERT_TRUE(finds("HEARD"));
    // A later subscriber's call comes after the first one's.
    auto moved = std::move(subscription);
    settle();
    EXPECT_GE(calls, 2);
    moved.reset();
    const int before = calls;
    settle();
    EXPECT_EQ(calls, before);
}

TEST_F(DirectoryTest, TheLastReferenceMayGoInsideACallback) {
    std::atomic<bool> dropped = false;
    std::shared_ptr<Directory> last;
    auto subscription = m_directory->subscribe([&] {
        last.reset();
        dropped = true;
    });
    const Directory* raw = m_directory.get();
    last = m_directory;
    m_responder.announce(source("DROP", "host", "127.0.0.1"));
    m_directory.reset();
    EXPECT_NE(raw, nullptr);
    const auto end = Clock::now() + kDeadline;
    while (!dropped && Clock::now() < end) {
        std::this_thread::sleep_for(kLook);
    }
    EXPECT_TRUE(dropped);
}

TEST_F(DirectoryTest, ReferencesShareOneDirectory) {
    EXPECT_EQ(Directory::acquire(), m_directory);
}

TEST_F(DirectoryTest, StartingAndEndingManyTimesLeavesNothing) {
    m_responder.answerWith(source("LOOP", "host", "127.0.0.1"));
    for (int i = 0; i < 20; ++i) {
        m_directory.reset();
        m_directory = Directory::acquire();
        ASSERT_NE(m_directory, nullptr);
        if (i % 5 == 0) {
            ASSERT_TRUE(finds("LOOP"));
        }
    }
}

TEST_F(DirectoryTest, SeveralProcessesShareThePort) {
    const std::unique_ptr<FILE, int (*)(FILE*)> other(popen(FINDER_WATCH " --once", "r"), pclose);
    m_responder.answerWith(source("SHARED", "host", "127.0.0.1"));
    m_responder.announce(source("SHARED", "host", "127.0.0.1"));
    ASSERT_TRUE(finds("SHARED"));
    std::array<char, 256> line{};
    ASSERT_NE(fgets(line.data(), line.size(), other.get()), nullptr);
    EXPECT_STREQ(line.data(), "SHARED | rtsp://127.0.0.1:8554/live |  |  |  | local\n");
}

TEST(DirectoryStartTest, SharingThePortIsNotWarnedOf) {
    testing::internal::CaptureStderr();
    {
        Responder responder; // before the directory, whose stack then meets a port in use
        responder.answerWith(source("SHARED", "host", "127.0.0.1"));
        const auto directory = Directory::acquire();
        EXPECT_TRUE(eventually(*directory, [&] { return directory->findByName("SHARED").has_value(); }));
    }
    EXPECT_EQ(testing::internal::GetCapturedStderr(), "");
}

TEST(DirectoryStartTest, APortThatAnotherHoldsAloneIsTriedAgain) {
    const int holder = socket(AF_INET6, SOCK_DGRAM | SOCK_CLOEXEC, 0);
    sockaddr_in6 address{};
    address.sin6_family = AF_INET6;
    address.sin6_port = htons(5353);
    ASSERT_EQ(bind(holder, reinterpret_cast<const sockaddr*>(&address), sizeof address), 0); // both families
    const auto directory = Directory::acquire();
    ASSERT_NE(directory, nullptr);
    EXPECT_FALSE(directory->waitForChange(0, 500ms));
    close(holder);
    Responder responder;
    responder.answerWith(source("AFTERWARDS", "host", "127.0.0.1"));
    EXPECT_TRUE(eventually(*directory, [&] { return directory->findByName("AFTERWARDS").has_value(); }));
}

// --- Hostile input -----------------------------------------------------------------------------------------------

struct Hostile {
    friend void PrintTo(const Hostile& hostile, std::ostream* stream) { *stream << hostile.name; }

    std::string name;
    std::vector<DnsRecord> records;
    std::vector<std::string> expected; // names listed once it was worked off, besides the honest one
};

std::vector<DnsRecord> with(std::vector<DnsRecord> records, const std::vector<DnsRecord>& more) {
    records.insert(records.end(), more.begin(), more.end());
    return records;
}

std::vector<Hostile> hostileCases() {
    const std::string control = "BELL\a";
    const std::string zero("ZE\0RO", 5);
    const std::string notUtf8 = "\xff\xfe latin";
    const std::string overlong = "\xc0\xaf";
    const std::string longest(63, 'n');
    std::vector<std::string> manyStrings(40, std::string(200, 'x'));
    auto foreign = source("FOREIGN", "host", "127.0.0.1");
    foreign[0].data = wireName({"FOREIGN", "_http", "_tcp", "local"});
    auto deep = source("DEEP", "host", "127.0.0.1");
    deep[0].data = wireName({"a", "b", "DEEP", "_rtsp", "_tcp", "local"});
    auto rootTarget = source("ROOT", "host", "127.0.0.1");
    rootTarget[1].data = wireNumber(0) + wireNumber(0) + wireNumber(554) + std::string(1, '\0');
    auto badHost = source("BADHOST", "host", "127.0.0.1");
    badHost[1] = server("BADHOST", "ho\nst", 554);
    auto shortAddress = source("SHORT", "short", "127.0.0.1");
    shortAddress[3].data = "\x7f";
    auto emptyServer = source("EMPTY", "host", "127.0.0.1");
    emptyServer[1].data = "";
    return {
        {"NameWithControlCharacter", source(control, "host", "127.0.0.1"), {}},
        {"NameWithZeroByte", source(zero, "host", "127.0.0.1"), {}},
        {"NameNotUtf8", source(notUtf8, "host", "127.0.0.1"), {}},
        {"NameOverlongUtf8", source(overlong, "host", "127.0.0.1"), {}},
        {"NameOfGreatestLength", source(longest, "host", "127.0.0.1"), {longest}},
        {"NameEmpty", source("", "host", "127.0.0.1"), {}},
        {"NameOfOtherService", foreign, {}},
        {"NameWithTooManyLabels", deep, {}},
        {"PortZero", source("PORTLESS", "host", "127.0.0.1", 0), {}},
        {"TargetIsRoot", rootTarget, {}},
        {"TargetWithControlCharacter", badHost, {}},
        {"ServerDataEmpty", emptyServer, {}},
        {"HostWithoutAddress", {pointer("HOSTLESS"), server("HOSTLESS", "nohost", 554), text("HOSTLESS", {})}, {}},
        {"AddressTruncated", shortAddress, {}},
        {"AddressUnspecified", source("BADIP", "badip", "0.0.0.0"), {}},
        {"AddressMulticast", source("BADIP", "badip", "224.0.0.1"), {}},
        {"AddressBroadcast", source("BADIP", "badip", "255.255.255.255"), {}},
        {"AddressDirectedBroadcast", source("BADIP", "badip", "127.255.255.255"), {}},
        {"AddressUnspecifiedV6", source("BADIP", "badip", "::"), {}},
        {"AddressMulticastV6", source("BADIP", "badip", "ff02::1"), {}},
        {"AddressMappedV6", source("BADIP", "badip", "::ffff:127.0.0.1"), {}},
        {"TextOversized", source("FAT", "host", "127.0.0.1", 554, manyStrings), {}},
        {"TextPathTooLong", source("LONGPATH", "host", "127.0.0.1", 554, {"path=/" + std::string(240, '\x01')}), {}},
        {"ServiceIsAnAlias",
         with(source("ALIAS", "host", "127.0.0.1"), {{serviceType(), kCname, 120, wireName(serviceType()), true}}),
         {"ALIAS"}},
        {"AliasesInALoop",
         {pointer("LOOPED"),
          {serviceName("LOOPED"), kCname, 120, wireName(serviceName("LOOPED2")), true},
          {serviceName("LOOPED2"), kCname, 120, wireName(serviceName("LOOPED")), true}},
         {}},
        {"HostPointsAtService", {pointer("SELF"), server("SELF", "SELF", 554), text("SELF", {})}, {}},
        {"ForEver", source("ETERNAL", "host", "127.0.0.1", 554, {}, 0xffffffff), {"ETERNAL"}},
    };
}

class HostileTest : public DirectoryTest, public testing::WithParamInterface<Hostile> {};

TEST_P(HostileTest, IsSurvivedAndHidesNobodyElse) {
    m_responder.announce(source("HONEST", "honest", "127.0.0.1"));
    ASSERT_TRUE(finds("HONEST"));
    // Each record by itself, then all in one packet, and again a second later, when the first ones are in the cache.
    for (int round = 0; round < 2; ++round) {
        for (const auto& record : GetParam().records) {
            m_responder.send(wireResponse({record}));
        }
        m_responder.send(wireResponse(GetParam().records));
        settle();
    }
    auto expected = GetParam().expected;
    expected.emplace_back("HONEST");
    EXPECT_THAT(namesIn(*m_directory), testing::UnorderedElementsAreArray(expected));
}

INSTANTIATE_TEST_SUITE_P(Records, HostileTest, testing::ValuesIn(hostileCases()),
                         [](const auto& instance) { return instance.param.name; });

TEST_F(DirectoryTest, AnAliasOfWhatIsLookedUpIsSurvivedTwoSecondsApart) {
    m_responder.announce(source("HONEST", "honest", "127.0.0.1"));
    ASSERT_TRUE(finds("HONEST"));
    for (int round = 0; round < 2; ++round) {
        for (const auto& owner : {serviceType(), serviceName("HONEST"), std::vector<std::string>{"honest", "local"}}) {
            m_responder.send(wireResponse({{owner, kCname, 120, wireName({"elsewhere", "local"}), true}}));
            m_responder.send(
                wireResponse({{owner, kCname, 120, wireName({std::string("else\0where", 10), "local"}), true}}));
        }
        settle(); // takes more than a second
        settle();
    }
    EXPECT_THAT(namesIn(*m_directory), ElementsAre("HONEST"));
}

TEST_F(DirectoryTest, MutilatedPacketsAreSurvived) {
    m_responder.announce(source("HONEST", "honest", "127.0.0.1"));
    ASSERT_TRUE(finds("HONEST"));
    const std::string whole = wireResponse(source("MUTANT", "mutant", "127.0.0.1"));
    std::uint32_t random = 12345;
    const auto next = [&random] { return (random = random * 1664525 + 1013904223) >> 8U; };
    for (std::size_t length = 0; length < whole.size(); ++length) {
        m_responder.send(whole.substr(0, length));
    }
    for (int i = 0; i < 3000; ++i) {
        std::string packet = whole;
        for (auto changes = 1 + next() % 8; changes > 0; --changes) {
            packet[next() % packet.size()] = static_cast<char>(next());
        }
        m_responder.send(packet);
        if (i % 200 == 0) {
            std::this_thread::yield();
        }
    }
    m_responder.send(std::string(20000, '\xc0'));
    settle();
    EXPECT_TRUE(m_directory->findByName("HONEST").has_value());
}

TEST_F(DirectoryTest, ThousandsOfServicesHideNobodyElse) {
    m_responder.announce(source("HONEST", "honest", "127.0.0.1"));
    ASSERT_TRUE(finds("HONEST"));
    for (int i = 0; i < kFlood; ++i) {
        const auto name = "FLOOD " + std::to_string(i);
        m_responder.announce(source(name, "host" + std::to_string(i), "127.0.0.1"));
        if (i % 50 == 0) {
            std::this_thread::sleep_for(5ms); // so that the socket's buffer does not swallow the flood
        }
    }
    // Said again while it is not heard, because the flood may have filled the socket's buffer.
    const auto end = Clock::now() + kDeadline;
    do {
        m_responder.announce(goodbye(source("HONEST", "honest", "127.0.0.1")));
    } while (!loses("HONEST", 2s) && Clock::now() < end);
    EXPECT_FALSE(m_directory->findByName("HONEST").has_value());
    EXPECT_LE(m_directory->announcements().size(), qivo::runtime::kMaxSources);
    EXPECT_GT(m_directory->announcements().size(), 200U);
}

TEST_F(DirectoryTest, NamesThatPointAtThemselvesAreSurvived) {
    std::string packet =
        wireNumber(0) + wireNumber(0x8400) + wireNumber(0) + wireNumber(1) + wireNumber(0) + wireNumber(0);
    packet +=
        "\xc0\x0c" + wireNumber(kPtr) + wireNumber(1) + wireNumber(0) + wireNumber(120) + wireNumber(2) + "\xc0\x0c";
    m_responder.send(packet);
    settle();
    EXPECT_THAT(namesIn(*m_directory), IsEmpty());
}

} // namespace
