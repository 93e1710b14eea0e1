#include "runtime/Mailbox.h"

#include <gtest/gtest.h>

#include <atomic>
#include <thread>
#include <vector>

namespace qivo::runtime {
namespace {

using namespace std::chrono_literals;

/// Pictures in memory.
std::atomic<int> g_pictures = 0;
std::atomic<int> g_mostPictures = 0;

class FakePicture final : public Picture {
  public:
    explicit FakePicture(int number) : m_number(number) {
        const int now = ++g_pictures;
        int most = g_mostPictures;
        while (most < now && !g_mostPictures.compare_exchange_weak(most, now)) {
        }
    }
    ~FakePicture() override { --g_pictures; }
    QIVOlib_video_frame_v2_t record() const override {
        QIVOlib_video_frame_v2_t record{};
        record.xres = m_number;
        record.p_data = const_cast<std::uint8_t*>(&m_pixel); // NOLINT(cppcoreguidelines-pro-type-const-cast)
        return record;
    }

  private:
    const int m_number;
    const std::uint8_t m_pixel = 0;
};

/// By a clock that stands still unless a test sets it.
class MailboxTest : public testing::Test {
  protected:
    MailboxTest() { g_mostPictures = 0; }
    ~MailboxTest() override {
        m_mailbox.drain();
        EXPECT_EQ(g_pictures, 0) << "pictures are left in memory";
    }

    void make(int number, Mailbox::Clock::duration patience = 1h) {
        m_mailbox.makeRoom(patience);
        m_mailbox.offer(std::make_unique<FakePicture>(number));
    }
    int32_t capture(std::chrono::milliseconds timeout = 0ms) {
        return m_mailbox.capture(&m_record, nullptr, Mailbox::Clock::now() + timeout);
    }
    /// Captures a picture and gives it back at once: its number, 0 if there was none.
    int taken() {
        if (capture() != QIVOlib_frame_type_video) {
            return 0;
        }
        m_mailbox.giveBack(m_record.p_data);
        return m_record.xres;
    }
    void pass(Mailbox::Clock::duration time) { m_time = m_time.load() + time; }
    /// Until the mailbox asks for the time again, which it does with its lock held: whatever then takes the lock comes
    /// after what it asked for.
    void awaitQuestion(int asked) const {
        while (m_asked == asked) {
            std::this_thread::yield();
        }
    }
    /// The caller keeps up and as many pictures wait as there can be: numbers from 1.
    void fill() {
        ASSERT_EQ(capture(), QIVOlib_frame_type_none);
        for (std::size_t i = 1; i <= Mailbox::kPictures; ++i) {
            make(static_cast<int>(i));
        }
        ASSERT_EQ(m_mailbox.waiting().video_frames, static_cast<int>(Mailbox::kPictures));
    }
    /// A maker who waits for room.
    std::thread makerOf(int number, Mailbox::Clock::duration patience = 1h) {
        const int asked = m_asked;
        std::thread maker([this, number, patience] { make(number, patience); });
        awaitQuestion(asked);
        return maker;
    }

    std::atomic<Mailbox::Clock::time_point> m_time = Mailbox::Clock::now();
    std::atomic<int> m_asked = 0;
    Mailbox m_mailbox{[this] {
        const auto now = m_time.load();
        ++m_asked;
        return now;
    }};
    QIVOlib_video_frame_v2_t m_record{};
};

TEST_F(MailboxTest, EmptyOneAnswersNone) {
    EXPECT_EQ(capture(), QIVOlib_frame_type_none);
    EXPECT_EQ(m_mailbox.waiting().video_frames, 0);
}

TEST_F(MailboxTest, NewestPictureWins) {
    make(1);
    make(2);
    make(3);
    EXPECT_EQ(m_mailbox.waiting().video_frames, 1);
    EXPECT_EQ(taken(), 3);
    EXPECT_EQ(taken(), 0);
}

TEST_F(MailboxTest, WhoKeepsUpIsGivenAllThatCameTogether) {
    fill();
    for (int i = 1; i <= static_cast<int>(Mailbox::kPictures); ++i) {
        pass(CallerPace::kLooksOften);
        EXPECT_EQ(taken(), i);
    }
    EXPECT_EQ(taken(), 0);
    EXPECT_LE(g_mostPictures, static_cast<int>(Mailbox::kPictures));
}

TEST_F(MailboxTest, WhoWaitedForAPictureKeepsUp) {
    const int asked = m_asked;
    std::thread maker([this, asked] {
        awaitQuestion(asked);
        pass(CallerPace::kCatchesUp + 20ms);
        make(1);
    });
    ASSERT_EQ(capture(10s), QIVOlib_frame_type_video);
    maker.join();
    make(2);
    make(3);
    EXPECT_EQ(m_mailbox.waiting().video_frames, 2);
    pass(CallerPace::kLooksOften);
    EXPECT_EQ(taken(), 2) << "the time that it waited counts as its own";
}

TEST_F(MailboxTest, CaptureEndsNoPicture) {
    fill();
    pass(CallerPace::kLooksOften + 1ms);
    ASSERT_EQ(capture(), QIVOlib_frame_type_video);
    EXPECT_EQ(m_record.xres, static_cast<int>(Mailbox::kPictures));
    EXPECT_EQ(g_pictures, static_cast<int>(Mailbox::kPictures)) << "it took the time to end those it was too late for";
    m_mailbox.makeRoom(0ms);
    EXPECT_EQ(g_pictures, 1);
    m_mailbox.abandon();
}

TEST_F(MailboxTest, WhoComesLateIsGivenTheNewest) {
    ASSERT_EQ(capture(), QIVOlib_frame_type_none);
    make(1);
    make(2);
    make(3);
    pass(CallerPace::kLooksOften + 1ms);
    EXPECT_EQ(taken(), 3);
    EXPECT_EQ(taken(), 0);
}

TEST_F(MailboxTest, WhoNeverFindsNoneIsGivenTheNewest) {
    ASSERT_EQ(capture(), QIVOlib_frame_type_none);
    make(1);
    int number = 1;
    for (auto passed = 20ms; passed <= CallerPace::kCatchesUp; passed += 20ms) {
        pass(20ms);
        make(++number);
        ASSERT_EQ(taken(), number - 1);
    }
    pass(20ms);
    make(++number);
    EXPECT_EQ(taken(), number) << "the delay stays";
    EXPECT_EQ(taken(), 0) << "one was kept that is too late";
}

TEST_F(MailboxTest, MakerWaitsForWhoKeepsUp) {
    fill();
    std::thread maker = makerOf(5);
    EXPECT_EQ(taken(), 1);
    maker.join();
    for (int i = 2; i <= 5; ++i) {
        EXPECT_EQ(taken(), i);
    }
    EXPECT_LE(g_mostPictures, static_cast<int>(Mailbox::kPictures));
}

TEST_F(MailboxTest, MakerWaitsUntilTheCallerIsLate) {
    fill();
    std::thread maker = makerOf(5);
    pass(CallerPace::kLooksOften);
    maker.join();
    EXPECT_EQ(taken(), 2) << "the oldest was not replaced";
    pass(CallerPace::kLooksOften + 1ms);
    EXPECT_EQ(taken(), 5);
    EXPECT_LE(g_mostPictures, static_cast<int>(Mailbox::kPictures));
}

TEST_F(MailboxTest, MakerWaitsNoLongerThanItCan) {
    fill();
    std::thread maker = makerOf(5, 20ms);
    pass(20ms);
    maker.join();
    make(6, 0ms);
    for (int i = 3; i <= 6; ++i) {
        EXPECT_EQ(taken(), i);
    }
    EXPECT_LE(g_mostPictures, static_cast<int>(Mailbox::kPictures));
}

TEST_F(MailboxTest, MakerDoesNotWaitForWhoCanTakeNoMore) {
    for (std::size_t i = 0; i < Mailbox::kPicturesOut; ++i) {
        ASSERT_EQ(capture(), QIVOlib_frame_type_none);
        make(1);
        ASSERT_EQ(capture(), QIVOlib_frame_type_video);
    }
    make(2);
    const int asked = m_asked;
    make(3);
    EXPECT_EQ(m_asked, asked) << "it waits for a caller who has to give one back first";
    EXPECT_EQ(m_mailbox.waiting().video_frames, 1);
}

TEST_F(MailboxTest, MakerWaitsForWhoIsAboutToTakeAPicture) {
    const int asked = m_asked;
    int first = 0;
    std::thread caller([this, &first] {
        EXPECT_EQ(capture(10s), QIVOlib_frame_type_video);
        first = m_record.xres;
        m_mailbox.giveBack(m_record.p_data);
    });
    awaitQuestion(asked);
    pass(CallerPace::kLooksOften + 1ms);
    for (int i = 1; i <= 5; ++i) { // the caller may or may not have the processor meanwhile
        make(i);
    }
    caller.join();
    EXPECT_EQ(first, 1);
    for (int i = 2; i <= 5; ++i) {
        EXPECT_EQ(taken(), i);
    }
    EXPECT_LE(g_mostPictures, static_cast<int>(Mailbox::kPictures));
}

TEST_F(MailboxTest, LookOfWhoIsTooSlowEndsTheMakersWait) {
    fill();
    int number = static_cast<int>(Mailbox::kPictures);
    for (auto passed = 0ms; passed < CallerPace::kCatchesUp; passed += 100ms) {
        pass(100ms);
        ASSERT_NE(taken(), 0);
        make(++number);
    }
    std::thread maker = makerOf(++number);
    pass(1ms);
    EXPECT_EQ(taken(), number - 1);
    maker.join();
    EXPECT_EQ(taken(), number);
    EXPECT_EQ(taken(), 0);
    EXPECT_LE(g_mostPictures, static_cast<int>(Mailbox::kPictures));
}

TEST_F(MailboxTest, EndOfAConnectionEndsTheMakersWait) {
    fill();
    std::thread maker = makerOf(5);
    m_mailbox.dropWaiting();
    maker.join();
    EXPECT_EQ(taken(), 5);
}

TEST_F(MailboxTest, CloseEndsTheMakersWait) {
    fill();
    std::thread maker = makerOf(5);
    m_mailbox.close();
    maker.join();
    EXPECT_EQ(taken(), 0);
    EXPECT_LE(g_mostPictures, static_cast<int>(Mailbox::kPictures));
}

TEST_F(MailboxTest, PicturesOfAConnectionThatEndedAreDropped) {
    fill();
    m_mailbox.dropWaiting();
    EXPECT_EQ(g_pictures, 0);
    fill();
    pass(CallerPace::kLooksOften + 1ms);
    ASSERT_EQ(taken(), 4); // the others are late
    m_mailbox.dropWaiting();
    EXPECT_EQ(g_pictures, 0);
    EXPECT_EQ(capture(), QIVOlib_frame_type_none);
}

TEST_F(MailboxTest, StatusChangeComesFirstAndSeveralAreOne) {
    make(1);
    m_mailbox.raiseStatus();
    m_mailbox.raiseStatus();
    EXPECT_EQ(capture(), QIVOlib_frame_type_status_change);
    EXPECT_EQ(capture(), QIVOlib_frame_type_video);
}

TEST_F(MailboxTest, CallerWithoutVideoGetsStatusOnly) {
    make(1);
    EXPECT_EQ(m_mailbox.capture(nullptr, nullptr, Mailbox::Clock::now()), QIVOlib_frame_type_none);
    m_mailbox.raiseStatus();
    EXPECT_EQ(m_mailbox.capture(nullptr, nullptr, Mailbox::Clock::now()), QIVOlib_frame_type_status_change);
    EXPECT_EQ(m_mailbox.waiting().video_frames, 1);
}

TEST_F(MailboxTest, PicturesOutAreBounded) {
    std::vector<QIVOlib_video_frame_v2_t> out;
    for (std::size_t i = 0; i < Mailbox::kPicturesOut; ++i) {
        make(static_cast<int>(i));
        ASSERT_EQ(capture(), QIVOlib_frame_type_video);
        out.push_back(m_record);
    }
    make(8);
    make(9);
    EXPECT_EQ(capture(), QIVOlib_frame_type_none) << "beyond the bound";
    m_mailbox.giveBack(out.front().p_data);
    ASSERT_EQ(capture(), QIVOlib_frame_type_video);
    EXPECT_EQ(m_record.xres, 9) << "the newest, once there is room";
    EXPECT_LE(g_mostPictures, static_cast<int>(Mailbox::kPictures));
}

TEST_F(MailboxTest, PictureBeingMadeTakesThePlaceOfTheOneThatWaits) {
    for (std::size_t i = 0; i < Mailbox::kPicturesOut; ++i) {
        make(static_cast<int>(i));
        ASSERT_EQ(capture(), QIVOlib_frame_type_video);
    }
    make(8);
    m_mailbox.makeRoom(0ms);
    EXPECT_EQ(m_mailbox.waiting().video_frames, 0);
    m_mailbox.abandon();
    EXPECT_EQ(m_mailbox.waiting().video_frames, 0);
}

TEST_F(MailboxTest, UnknownPictureIsNotTakenBack) {
    make(1);
    ASSERT_EQ(capture(), QIVOlib_frame_type_video);
    int stray = 0;
    m_mailbox.giveBack(&stray);
    m_mailbox.giveBack(nullptr);
    EXPECT_EQ(g_pictures, 1);
    m_mailbox.giveBack(m_record.p_data);
    EXPECT_EQ(g_pictures, 0);
    m_mailbox.giveBack(m_record.p_data);
}

TEST_F(MailboxTest, CloseEndsAWait) {
    std::thread closer([this] { m_mailbox.close(); });
    EXPECT_EQ(capture(10s), QIVOlib_frame_type_none);
    closer.join();
    make(1);
    EXPECT_EQ(capture(), QIVOlib_frame_type_none);
    EXPECT_EQ(g_pictures, 0) << "a closed mailbox keeps nothing";
}

TEST_F(MailboxTest, WaitEndsWithAPicture) {
    std::thread maker([this] { make(1); });
    EXPECT_EQ(capture(10s), QIVOlib_frame_type_video);
    maker.join();
}

TEST_F(MailboxTest, ManyThreadsStayWithinTheBound) {
    constexpr int kRounds = 5000;
    std::atomic<bool> ended = false;
    std::thread maker([&] {
        for (int i = 0; i < kRounds; ++i) {
            make(i);
            m_mailbox.raiseStatus();
        }
        ended = true;
    });
    std::vector<std::thread> takers;
    for (int i = 0; i < 2; ++i) {
        takers.emplace_back([&] {
            QIVOlib_video_frame_v2_t record{};
            while (!ended) {
                if (m_mailbox.capture(&record, nullptr, Mailbox::Clock::now() + 1ms) == QIVOlib_frame_type_video) {
                    m_mailbox.giveBack(record.p_data);
                }
            }
        });
    }
    maker.join();
    for (std::thread& taker : takers) {
        taker.join();
    }
    EXPECT_LE(g_mostPictures, static_cast<int>(Mailbox::kPictures));
}

} // namespace
} // namespace qivo::runtime
