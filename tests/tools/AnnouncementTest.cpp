#include "tests/tools/Browser.h"
#include "tests/tools/Publisher.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <csignal>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

namespace qivo::test {
namespace {

using namespace std::chrono_literals;

TEST(Announcement, sourcesAreAnnouncedWithPathsAndWebAddress) {
    PublishProcess publisher(
        {"--machine", "STUDIO", "--source", "Cam 1", "--source", "Cam 2", "--web", "http://cam.local/"}, 4);
    const Browser browser;
    ASSERT_TRUE(browser.waitFor("STUDIO (Cam 1)"));
    ASSERT_TRUE(browser.waitFor("STUDIO (Cam 2)"));
    auto found = browser.found();
    const Found& one = found["STUDIO (Cam 1)"];
    const Found& two = found["STUDIO (Cam 2)"];
    EXPECT_EQ("rtsp://" + one.address + ":" + std::to_string(one.port) + one.text.at("path"), publisher.address(0));
    EXPECT_EQ("rtsp://" + one.address + ":" + std::to_string(one.port) + one.text.at("low"), publisher.address(1));
    EXPECT_EQ(one.text.count("web"), 0U);
    EXPECT_EQ("rtsp://" + two.address + ":" + std::to_string(two.port) + two.text.at("path"), publisher.address(2));
    EXPECT_EQ(two.text.at("web"), "http://cam.local/");
}

TEST(Announcement, longestAndForeignNamesArriveAsTheyStand) {
    const std::string foreign = "K\xC3\xBC"
                                "che \xE3\x82\xAB. \\ (a)";
    const std::string longest(54, 'x');
    const PublishProcess publisher({"--machine", "STUDIO", "--source", foreign, "--source", longest}, 4);
    const Browser browser;
    EXPECT_TRUE(browser.waitFor("STUDIO (" + foreign + ")"));
    EXPECT_TRUE(browser.waitFor("STUDIO (" + longest + ")"));
}

TEST(Announcement, interruptSaysGoodbyeAndEndsWithSuccessWithinASecond) {
    for (const int signal : {SIGINT, SIGTERM}) {
        PublishProcess publisher({"--machine", "STUDIO", "--source", "Cam 1"});
        const Browser browser;
        ASSERT_TRUE(browser.waitFor("STUDIO (Cam 1)"));
        publisher.process().signal(signal);
        EXPECT_EQ(publisher.process().wait(1s), 0);
        // Without a goodbye the announcement would be believed for more than an hour.
        EXPECT_TRUE(browser.waitForGone("STUDIO (Cam 1)", 2s));
    }
}

TEST(Announcement, oneOfTwoPublishersLeavesWithoutHarmToTheOther) {
    PublishProcess one({"--machine", "STUDIO", "--source", "Cam 1"});
    const PublishProcess two({"--machine", "STUDIO", "--source", "Cam 2"});
    {
        const Browser browser;
        ASSERT_TRUE(browser.waitFor("STUDIO (Cam 1)"));
        ASSERT_TRUE(browser.waitFor("STUDIO (Cam 2)"));
        one.process().signal(SIGTERM);
        EXPECT_EQ(one.process().wait(1s), 0);
        ASSERT_TRUE(browser.waitForGone("STUDIO (Cam 1)", 2s));
        EXPECT_EQ(browser.found().count("STUDIO (Cam 2)"), 1U);
    }
    const Browser later;
    EXPECT_TRUE(later.waitFor("STUDIO (Cam 2)"));
}

TEST(Announcement, addressThatComesLaterIsAnnounced) {
    const auto publisher =
        Process::start({PUBLISH, "--machine", "STUDIO", "--source", "Cam 1", "--port", "0"}, {withoutLeakCheck});
    Browser browser;
    ASSERT_TRUE(browser.waitFor("STUDIO (Cam 1)"));
    const auto added = Process::start({"/bin/sh", "-c", "ip address add 127.0.0.77/8 dev lo"});
    ASSERT_EQ(added->wait(5s), 0) << added->errors();
    EXPECT_TRUE(browser.waitForAddress("STUDIO (Cam 1)", "127.0.0.77"));
}

TEST(Announcement, addressesOfACameraFollowTheMachines) {
    const auto publisher = Process::start(
        {PUBLISH, "--machine", "STUDIO", "--source", "Cam 1", "--ptz", "--port", "0", "--http-port", "0"},
        {withoutLeakCheck});
    const auto text = [](const char* key) {
        const Browser browser;
        return browser.waitFor("STUDIO (Cam 1)") ? browser.found()["STUDIO (Cam 1)"].text[key] : "";
    };
    EXPECT_THAT(text("web"), testing::StartsWith("http://127.0.0.1:"));
    EXPECT_THAT(text("onvif"), testing::StartsWith("http://127.0.0.1:"));
    const auto plugged =
        Process::start({"/bin/sh", "-c",
                        "ip link add cable type veth peer name wall && ip link set wall up && ip link set cable up && "
                        "ip address add 192.0.2.7/24 dev cable"});
    ASSERT_EQ(plugged->wait(5s), 0) << plugged->errors();
    const auto deadline = std::chrono::steady_clock::now() + 15s;
    std::string web = text("web");
    while (web.rfind("http://192.0.2.7:", 0) != 0 && std::chrono::steady_clock::now() < deadline) {
        web = text("web");
    }
    const auto unplugged = Process::start({"/bin/sh", "-c", "ip link delete cable"});
    EXPECT_EQ(unplugged->wait(5s), 0) << unplugged->errors();
    EXPECT_THAT(web, testing::MatchesRegex("http://192\\.0\\.2\\.7:[0-9]+/source-1/"));
}

TEST(Announcement, portThatAnotherHoldsAloneIsTriedAgain) {
    const int alone = socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0);
    sockaddr_in place{};
    place.sin_family = AF_INET;
    place.sin_port = htons(5353);
    ASSERT_EQ(bind(alone, reinterpret_cast<const sockaddr*>(&place), sizeof place), 0);
    PublishProcess publisher({"--machine", "STUDIO", "--source", "Cam 1"});
    // Through a few tries: the reason is said once.
    EXPECT_FALSE(publisher.process().wait(2s));
    EXPECT_THAT(publisher.process().errors(),
                testing::MatchesRegex("qivo-publish: cannot announce on the network: [^\n]*; it is tried again, the "
                                      "addresses above are served all the same\n"));
    close(alone);
    const Browser browser;
    EXPECT_TRUE(browser.waitFor("STUDIO (Cam 1)"));
}

TEST(Announcement, nameThatAnotherUsesGetsANumberAndIsReported) {
    Browser other;
    other.announce("STUDIO (Cam 1)", 4);
    ASSERT_TRUE(other.waitFor("STUDIO (Cam 1)"));
    PublishProcess publisher({"--machine", "STUDIO", "--source", "Cam 1"});
    EXPECT_TRUE(other.waitFor("STUDIO (Cam 1 #2)"));
    EXPECT_EQ(other.found()["STUDIO (Cam 1)"].port, 4);
    EXPECT_THAT(publisher.process().errors(),
                testing::HasSubstr(
                    "\"STUDIO (Cam 1)\" is taken by another on the network; announced as \"STUDIO (Cam 1 #2)\""));
}

} // namespace
} // namespace qivo::test
