#include "runtime/SourceTable.h"

#include <gtest/gtest.h>

namespace {

using namespace qivo::runtime;

constexpr int kLoopback = 1;
constexpr int kWired = 2;
constexpr int kWireless = 3;

IpAddress ip(const std::string& text) {
    return IpAddress::parse(text).value();
}

LocalNetwork network() {
    LocalNetwork network;
    network.interfaces = {{kLoopback, "lo", true}, {kWired, "eth0", false}, {kWireless, "wlan0", false}};
    network.addresses = {{kLoopback, ip("127.0.0.1"), 8},
                         {kWired, ip("192.168.1.2"), 24},
                         {kWired, ip("fe80::2"), 64},
                         {kWireless, ip("10.0.0.2"), 8}};
    return network;
}

class SourceTableTest : public testing::Test {
  protected:
    void announce(int interface, const std::string& address) {
        m_table.addService(interface, "CAM");
        m_table.addServer(interface, "cam", {"host.local", 554, 0});
        m_table.addText(interface, "cam", {"/live", "", "", ""});
        m_table.addAddress(interface, "host.local", ip(address));
    }
    std::string url() {
        const auto list = m_table.announcements(network());
        return list.size() == 1 ? list.front().url : std::to_string(list.size()) + " sources";
    }

    SourceTable m_table;
};

TEST_F(SourceTableTest, RoutableIpv4IsPreferredWhateverTheOrder) {
    announce(kLoopback, "::1");
    EXPECT_EQ(url(), "rtsp://[::1]:554/live");
    announce(kLoopback, "127.0.0.1");
    EXPECT_EQ(url(), "rtsp://127.0.0.1:554/live");
    announce(kWired, "fe80::9");
    EXPECT_EQ(url(), "rtsp://[fe80::9%25eth0]:554/live");
    announce(kWired, "2001:db8::9");
    EXPECT_EQ(url(), "rtsp://[2001:db8::9]:554/live");
    announce(kWired, "169.254.1.9");
    EXPECT_EQ(url(), "rtsp://169.254.1.9:554/live");
    announce(kWired, "172.17.0.1");
    EXPECT_EQ(url(), "rtsp://172.17.0.1:554/live");
    announce(kWired, "192.168.1.9"); // in the wire's own network
    EXPECT_EQ(url(), "rtsp://192.168.1.9:554/live");
}

TEST_F(SourceTableTest, ASecondWayAsGoodChangesNothing) {
    announce(kWireless, "10.0.0.9");
    ASSERT_EQ(url(), "rtsp://10.0.0.9:554/live");
    announce(kWired, "192.168.1.9");
    EXPECT_EQ(url(), "rtsp://10.0.0.9:554/live");
    m_table.removeAddress(kWireless, "host.local", ip("10.0.0.9"));
    EXPECT_EQ(url(), "rtsp://192.168.1.9:554/live");
    m_table.addAddress(kWireless, "host.local", ip("10.0.0.9"));
    EXPECT_EQ(url(), "rtsp://192.168.1.9:554/live");
}

TEST_F(SourceTableTest, TheNewestAddressOfAnInterfaceCounts) {
    announce(kWired, "192.168.1.9");
    ASSERT_EQ(url(), "rtsp://192.168.1.9:554/live");
    m_table.addAddress(kWired, "host.local", ip("192.168.1.7"));
    EXPECT_EQ(url(), "rtsp://192.168.1.7:554/live");
    m_table.addAddress(kWired, "host.local", ip("192.168.1.9")); // the first one over IPv6, too
    EXPECT_EQ(url(), "rtsp://192.168.1.7:554/live");
}

TEST_F(SourceTableTest, WhatIsHeardOverBothFamiliesGoesWithTheLast) {
    announce(kWired, "192.168.1.9");
    announce(kWired, "192.168.1.9");
    m_table.removeService(kWired, "CAM");
    EXPECT_EQ(url(), "rtsp://192.168.1.9:554/live");
    m_table.removeService(kWired, "CAM");
    EXPECT_EQ(url(), "0 sources");
}

TEST_F(SourceTableTest, AnInterfaceNeedsAllRecordsItself) {
    m_table.addService(kWired, "CAM");
    m_table.addServer(kWired, "cam", {"host.local", 554, 0});
    m_table.addAddress(kWired, "host.local", ip("192.168.1.9"));
    m_table.addText(kWireless, "cam", {"/live", "", "", ""});
    EXPECT_EQ(url(), "0 sources");
    m_table.addText(kWired, "cam", {"/live", "", "", ""});
    EXPECT_EQ(url(), "rtsp://192.168.1.9:554/live");
}

TEST_F(SourceTableTest, LoopbackAddressesFromElsewhereAreRefused) {
    announce(kWired, "127.0.0.1");
    announce(kWired, "::1");
    EXPECT_EQ(url(), "0 sources");
}

TEST_F(SourceTableTest, AddressesThatNobodyCanHaveAreRefused) {
    for (const char* bad : {"0.0.0.0", "0.1.2.3", "224.0.0.251", "240.0.0.1", "255.255.255.255", "192.168.1.255",
                            "::", "ff02::1", "::ffff:192.168.1.9", "::192.168.1.9"}) {
        announce(kWired, bad);
        EXPECT_EQ(url(), "0 sources") << bad;
    }
}

TEST_F(SourceTableTest, AnUnknownInterfaceIsNotUsed) {
    announce(77, "192.168.1.9");
    EXPECT_EQ(url(), "0 sources");
}

TEST_F(SourceTableTest, ServersOfLowestPriorityCount) {
    announce(kWired, "192.168.1.9");
    m_table.addServer(kWired, "cam", {"host.local", 1554, 1});
    EXPECT_EQ(url(), "rtsp://192.168.1.9:554/live");
}

TEST_F(SourceTableTest, LocalSourcesAreKnownByTheirAddress) {
    announce(kWired, "192.168.1.2");
    EXPECT_TRUE(m_table.announcements(network()).front().local);
    m_table.addAddress(kWired, "host.local", ip("192.168.1.3"));
    EXPECT_FALSE(m_table.announcements(network()).front().local);
}

TEST_F(SourceTableTest, SourcesHaveABound) {
    for (std::size_t i = 0; i < kMaxSources; ++i) {
        ASSERT_TRUE(m_table.addService(kWired, "CAM " + std::to_string(i)));
    }
    EXPECT_FALSE(m_table.addService(kWired, "ONE MORE"));
    EXPECT_TRUE(m_table.addService(kWireless, "CAM 0"));
    m_table.removeService(kWired, "CAM 1");
    EXPECT_TRUE(m_table.addService(kWired, "ONE MORE"));
}

TEST_F(SourceTableTest, RecordsOfASourceHaveABound) {
    announce(kWired, "192.168.1.9");
    for (std::size_t i = 0; i < 2 * kMaxRecords; ++i) {
        m_table.addServer(kWired, "cam", {"host" + std::to_string(i), 554, 0});
    }
    EXPECT_EQ(m_table.hostsOf("cam").size(), kMaxRecords);
}

TEST_F(SourceTableTest, OneMachinesSourcesStandTogether) {
    for (const char* name : {"STUDIO 2 (a)", "STUDIO (b)", "ATTIC (z)", "STUDIO (a)"}) {
        m_table.addService(kWired, name);
        m_table.addServer(kWired, foldCase(name), {"host.local", 554, 0});
        m_table.addText(kWired, foldCase(name), {"/", "", "", ""});
    }
    m_table.addAddress(kWired, "host.local", ip("192.168.1.9"));
    std::string order;
    for (const auto& source : m_table.announcements(network())) {
        order += source.name + "|";
    }
    EXPECT_EQ(order, "ATTIC (z)|STUDIO (a)|STUDIO (b)|STUDIO 2 (a)|");
}

} // namespace
