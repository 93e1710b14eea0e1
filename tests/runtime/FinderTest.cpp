#include "runtime/Finder.h"

#include <chrono>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <thread>

#include "FinderResponder.h"
#include "tests/audio/AllocationCount.h"

namespace {

using namespace std::chrono_literals;
using namespace qivo::test;
using qivo::runtime::Finder;
using testing::ElementsAre;
using testing::IsEmpty;

constexpr auto kDeadline = 20s;

std::vector<std::string> namesOf(Finder& finder) {
    std::uint32_t count = 99;
    const QIVOlib_source_t* sources = finder.sources(&count);
    std::vector<std::string> names;
    for (std::uint32_t i = 0; i < count; ++i) {
        names.emplace_back(sources[i].p_name);
    }
    return names;
}

class FinderTest : public testing::Test {
  protected:
    void SetUp() override {
        ASSERT_NE(m_first, nullptr);
        const auto end = std::chrono::steady_clock::now() + kDeadline;
        while (m_responder.questions(kPtr) == 0 && std::chrono::steady_clock::now() < end) {
            std::this_thread::sleep_for(1ms);
        }
    }

    Responder m_responder;
    std::unique_ptr<Finder> m_first = Finder::create(nullptr);
    std::unique_ptr<Finder> m_second = Finder::create(nullptr);
};

TEST_F(FinderTest, NothingFoundIsNoChange) {
    EXPECT_FALSE(m_first->wait(0ms));
    std::uint32_t count = 99;
    EXPECT_EQ(m_first->sources(&count), nullptr);
    EXPECT_EQ(count, 0U);
    EXPECT_EQ(m_first->sources(nullptr), nullptr);
}

TEST_F(FinderTest, EachFinderIsToldOnce) {
    m_responder.announce(source("ONE (a)", "host", "127.0.0.1"));
    EXPECT_TRUE(m_first->wait(kDeadline));
    EXPECT_FALSE(m_first->wait(0ms));
    EXPECT_TRUE(m_second->wait(0ms));
    EXPECT_FALSE(m_second->wait(0ms));
    EXPECT_THAT(namesOf(*m_first), ElementsAre("ONE (a)"));
    EXPECT_THAT(namesOf(*m_second), ElementsAre("ONE (a)"));
}

TEST_F(FinderTest, AFinderThatComesLaterIsTold) {
    m_responder.announce(source("ONE (a)", "host", "127.0.0.1"));
    ASSERT_TRUE(m_first->wait(kDeadline));
    EXPECT_TRUE(Finder::create(nullptr)->wait(0ms));
}

TEST_F(FinderTest, AnEmptyListAfterSourcesIsAChange) {
    const auto records = source("ONE (a)", "host", "127.0.0.1");
    m_responder.announce(records);
    ASSERT_TRUE(m_first->wait(kDeadline));
    ASSERT_THAT(namesOf(*m_first), ElementsAre("ONE (a)"));
    m_responder.announce(goodbye(records));
    EXPECT_TRUE(m_first->wait(kDeadline));
    EXPECT_THAT(namesOf(*m_first), IsEmpty());
}

TEST_F(FinderTest, ChangesBetweenTwoCallsAreOne) {
    m_responder.announce(source("ONE (a)", "host", "127.0.0.1"));
    ASSERT_TRUE(m_first->wait(kDeadline));
    m_responder.announce(source("ONE (b)", "host", "127.0.0.1"));
    ASSERT_TRUE(m_first->wait(kDeadline));
    EXPECT_TRUE(m_second->wait(0ms));
    EXPECT_FALSE(m_second->wait(0ms));
    EXPECT_THAT(namesOf(*m_second), ElementsAre("ONE (a)", "ONE (b)"));
}

TEST_F(FinderTest, AnotherControlPageIsNoChangeOfTheList) {
    m_responder.announce(source("ONE (a)", "host", "127.0.0.1"));
    ASSERT_TRUE(m_first->wait(kDeadline));
    m_responder.announce({text("ONE (a)", {"path=/live", "web=http://127.0.0.1/"})});
    EXPECT_FALSE(m_first->wait(1500ms));
}

TEST_F(FinderTest, WhatWasHandedOutBeforeItWasReportedIsReportedStill) {
    const auto records = source("ONE (a)", "host", "127.0.0.1");
    m_responder.announce(records);
    ASSERT_TRUE(m_first->wait(kDeadline));
    ASSERT_THAT(namesOf(*m_second), ElementsAre("ONE (a)"));
    m_responder.announce(goodbye(records));
    ASSERT_TRUE(m_first->wait(kDeadline));
    // The list is what it was when this finder last reported, yet its user holds another.
    EXPECT_TRUE(m_second->wait(0ms));
    EXPECT_FALSE(m_second->wait(0ms));
}

TEST_F(FinderTest, TheArrayStaysWhileTheNetworkChanges) {
    m_responder.announce(source("ONE (a)", "host", "127.0.0.1"));
    ASSERT_TRUE(m_first->wait(kDeadline));
    std::uint32_t count = 0;
    const QIVOlib_source_t* sources = m_first->sources(&count);
    m_responder.announce(source("ALPHA (b)", "host", "127.0.0.1"));
    ASSERT_TRUE(m_first->wait(kDeadline));
    ASSERT_EQ(count, 1U);
    EXPECT_STREQ(sources[0].p_name, "ONE (a)");
    EXPECT_STREQ(sources[0].p_url_address, "rtsp://127.0.0.1:8554/live");
}

TEST_F(FinderTest, SourcesOfThisMachineAreHiddenOnRequest) {
    const QIVOlib_find_create_t settings{false, nullptr, nullptr};
    const auto distant = Finder::create(&settings);
    m_responder.announce(source("NEAR (a)", "near", "127.0.0.1"));
    m_responder.announce(source("FAR (a)", "far", "192.0.2.7"));
    while (namesOf(*m_first).size() < 2) {
        ASSERT_TRUE(m_first->wait(kDeadline));
    }
    EXPECT_THAT(namesOf(*distant), ElementsAre("FAR (a)"));
}

TEST_F(FinderTest, GroupsAndExtraAddressesAreSaidToHaveNoEffect) {
    const QIVOlib_find_create_t settings{true, "editors", "192.0.2.1"};
    testing::internal::CaptureStderr();
    const auto finder = Finder::create(&settings);
    const std::string said = testing::internal::GetCapturedStderr();
    EXPECT_THAT(said, testing::HasSubstr("libqivo: sources are in no groups, so those of all groups are reported\n"));
    EXPECT_THAT(said,
                testing::HasSubstr("libqivo: extra addresses are not asked for sources, only the local network is\n"));
    m_responder.announce(source("ONE (a)", "host", "127.0.0.1"));
    EXPECT_TRUE(finder->wait(kDeadline));
}

TEST_F(FinderTest, AWaitDoesNotHoldUpTheOtherOperations) {
    std::thread waiter([&] { EXPECT_TRUE(m_first->wait(kDeadline)); });
    const auto start = std::chrono::steady_clock::now();
    namesOf(*m_first);
    EXPECT_LT(std::chrono::steady_clock::now() - start, kDeadline / 2);
    m_responder.announce(source("ONE (a)", "host", "127.0.0.1"));
    waiter.join();
}

TEST_F(FinderTest, AWaitEndsWithItsFinder) {
    std::thread waiter([&] { EXPECT_FALSE(m_first->wait(kDeadline)); });
    const auto start = std::chrono::steady_clock::now();
    m_first->end();
    waiter.join();
    EXPECT_LT(std::chrono::steady_clock::now() - start, kDeadline / 2);
}

TEST_F(FinderTest, AskingAgainWithoutNewsCopiesNothing) {
    m_responder.announce(source("ONE (a)", "host", "127.0.0.1"));
    ASSERT_TRUE(m_first->wait(kDeadline));
    ASSERT_THAT(namesOf(*m_first), ElementsAre("ONE (a)"));
    m_first->wait(0ms); // another control page or another address may have come since
    const AllocationCount allocations;
    for (int i = 0; i < 100; ++i) {
        EXPECT_FALSE(m_first->wait(0ms));
    }
    EXPECT_EQ(allocations.soFar(), 0U);
}

TEST_F(FinderTest, AWaitEndsAtItsTimeOut) {
    const auto start = std::chrono::steady_clock::now();
    EXPECT_FALSE(m_first->wait(120ms));
    EXPECT_GE(std::chrono::steady_clock::now() - start, 120ms);
}

TEST_F(FinderTest, TheLongestTimeOutIsTaken) {
    m_responder.announce(source("ONE (a)", "host", "127.0.0.1"));
    EXPECT_TRUE(m_first->wait(std::chrono::milliseconds(UINT32_MAX)));
}

} // namespace
