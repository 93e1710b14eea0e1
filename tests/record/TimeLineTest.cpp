// Where pictures and sound go in time: the source's clock, the sound's place, the fragments.
#include "tools/record/CommonClock.h"
#include "tools/record/Fragmenter.h"
#include "tools/record/Progress.h"

#include <cmath>
#include <gtest/gtest.h>

namespace qivo::record {
namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;

double ms(Nanoseconds time) {
    return static_cast<double>(time.count()) * 1e-6;
}

TEST(SourceClock, KeepsTheSourcesSpacingWhateverTheDelays) {
    SourceClock clock;
    // The first frame comes with the least delay of all; others up to 80 ms later.
    const Nanoseconds first = clock.place(seconds(777), seconds(5));
    EXPECT_EQ(first, seconds(5));
    Nanoseconds last = first;
    for (int i = 1; i < 300; ++i) {
        const Nanoseconds late = milliseconds(i * 37 % 80);
        const Nanoseconds place =
            clock.place(seconds(777) + i * milliseconds(40), seconds(5) + i * milliseconds(40) + late);
        EXPECT_NEAR(ms(place - last), 40, 0.02) << i;
        EXPECT_NEAR(ms(place - first), 40.0 * i, 2.5) << i;
        last = place;
    }
}

TEST(SourceClock, AFirstFrameThatWasLateIsMadeUpForAtOnce) {
    SourceClock clock;
    static_cast<void>(clock.place(seconds(1), seconds(5) + milliseconds(90)));
    const Nanoseconds second = clock.place(seconds(1) + milliseconds(40), seconds(5) + milliseconds(40));
    EXPECT_EQ(second, seconds(5) + milliseconds(91)) << "never before the one before";
    Nanoseconds place{};
    for (int i = 2; i < 6; ++i) {
        place = clock.place(seconds(1) + i * milliseconds(40), seconds(5) + i * milliseconds(40));
    }
    EXPECT_NEAR(ms(place - seconds(5)), 200, 0.1);
}

TEST(SourceClock, FollowsAClockThatIsFastOrSlow) {
    for (const double rate : {1.00005, 0.99995}) {
        SourceClock clock;
        Nanoseconds place{};
        Nanoseconds arrival{};
        for (int i = 0; i < 25 * 1800; ++i) {
            arrival = i * milliseconds(40);
            place = clock.place(Nanoseconds(std::llround(i * 40e6 * rate)), arrival + milliseconds(i % 7));
        }
        EXPECT_NEAR(ms(place - arrival), 0, 8) << rate;
    }
}

TEST(SourceClock, StampsThatBeginAnewGoOnByTheirArrival) {
    SourceClock clock;
    static_cast<void>(clock.place(seconds(100), seconds(5)));
    EXPECT_EQ(clock.place(seconds(2), seconds(20)), seconds(20));
    EXPECT_EQ(clock.place(seconds(2) + milliseconds(40), seconds(20) + milliseconds(40)),
              seconds(20) + milliseconds(40));
    EXPECT_EQ(clock.place(seconds(900), seconds(21)), seconds(21));
}

TEST(SourceClock, WithoutStampsArrivalCounts) {
    SourceClock clock;
    EXPECT_EQ(clock.place({}, seconds(5)), seconds(5));
    EXPECT_EQ(clock.place({}, seconds(5) + milliseconds(33)), seconds(5) + milliseconds(33));
    EXPECT_EQ(clock.place({}, seconds(5) + milliseconds(33)), seconds(5) + milliseconds(34))
        << "each later than the one before";
}

TEST(SourceClock, AStreamOfTheSameClockGoesByTheOthersDistance) {
    SourceClock pictures;
    SourceClock sound;
    for (int i = 0; i < 100; ++i) {
        const Nanoseconds now = seconds(5) + i * milliseconds(40);
        const Nanoseconds picture = pictures.place(seconds(777) + i * milliseconds(40), now + milliseconds(90));
        const Nanoseconds heard =
            sound.place(seconds(777) + i * milliseconds(40), now + milliseconds(i % 5), pictures.offset());
        if (i > 0) {
            EXPECT_EQ(heard, picture) << i;
        }
    }
    // Alone again it goes on from there.
    const Nanoseconds next = seconds(5) + milliseconds(4000);
    EXPECT_NEAR(ms(sound.place(seconds(781), next) - next), 90, 0.1);
}

TEST(SourceClock, ADistanceThatCannotBeRightIsNotGoneBy) {
    SourceClock clock;
    static_cast<void>(clock.place(seconds(777), seconds(5)));
    const Nanoseconds wrong = seconds(5) - seconds(777) + SourceClock::jump + milliseconds(1);
    EXPECT_EQ(clock.place(seconds(778), seconds(6), wrong), seconds(6));
    EXPECT_EQ(clock.place(seconds(779), seconds(7), wrong - milliseconds(1)), seconds(7) + SourceClock::jump);
}

TEST(CommonClock, IsForgottenSomeTimeAfterTheLastPicture) {
    CommonClock clock;
    EXPECT_EQ(clock.offset(seconds(5)), std::nullopt);
    clock.tell(-seconds(3), seconds(5));
    EXPECT_EQ(clock.offset(seconds(5)), -seconds(3));
    EXPECT_EQ(clock.offset(seconds(5) + CommonClock::lasting - milliseconds(1)), -seconds(3));
    EXPECT_EQ(clock.offset(seconds(5) + CommonClock::lasting), std::nullopt);
}

TEST(SoundPlacer, BeginsWhereTheFirstPieceBelongs) {
    SoundPlacer placer(48000);
    EXPECT_FALSE(placer.begun());
    const auto placed = placer.place(milliseconds(250), 480);
    EXPECT_EQ(placed.silence, 0);
    EXPECT_EQ(placed.skip, 0);
    EXPECT_EQ(placer.next(), 12000 + 480);
}

TEST(SoundPlacer, WhatBelongsBeforeTheMovieIsLeftOut) {
    SoundPlacer placer(48000);
    EXPECT_EQ(placer.place(-milliseconds(20), 480).skip, 480);
    EXPECT_FALSE(placer.begun());
    EXPECT_EQ(placer.place(-milliseconds(4), 480).skip, 192);
    EXPECT_TRUE(placer.begun());
    EXPECT_EQ(placer.next(), 288);
}

TEST(SoundPlacer, AGapBecomesSilenceAndAnOverlapIsLeftOut) {
    SoundPlacer placer(48000);
    static_cast<void>(placer.place({}, 480));
    EXPECT_EQ(placer.place(milliseconds(1010), 480).silence, 48000);
    EXPECT_EQ(placer.next(), 48960);
    EXPECT_EQ(placer.place(milliseconds(980), 480).skip, 480) << "all of it";
    EXPECT_EQ(placer.place(milliseconds(990), 2400).skip, 1440);
    EXPECT_EQ(placer.next(), 49920);
}

TEST(SoundPlacer, JitterChangesNothing) {
    SoundPlacer placer(48000);
    static_cast<void>(placer.place({}, 480));
    for (int i = 1; i < 100; ++i) {
        const auto placed = placer.place(i * milliseconds(10) + std::chrono::microseconds(i % 5 * 450 - 900), 480);
        EXPECT_EQ(placed.silence + placed.skip + (placed.repeatFirst ? 1 : 0), 0) << i;
    }
    EXPECT_EQ(placer.next(), 48000);
}

TEST(SoundPlacer, ClocksThatDifferCostSingleSamples) {
    for (const int actual : {48010, 47990}) {
        SoundPlacer placer(48000);
        std::int64_t most = 0;
        for (std::int64_t i = 0; i < 60000; ++i) {
            const auto placed = placer.place(Nanoseconds(i * 480 * std::nano::den / actual), 480);
            most = std::max(most, placed.silence + placed.skip + (placed.repeatFirst ? 1 : 0));
        }
        EXPECT_EQ(most, 1) << actual;
        EXPECT_NEAR(static_cast<double>(placer.next()), 60000.0 * 480 * 48000 / actual, 48 * 5.5)
            << "within 5.5 ms after 10 minutes";
    }
}

TEST(SoundPlacer, FillsUpWithSilenceOnlyOnceThereWasSound) {
    SoundPlacer placer(8000);
    EXPECT_EQ(placer.fillTo(seconds(3)), 0);
    static_cast<void>(placer.place(seconds(1), 80));
    EXPECT_EQ(placer.fillTo(seconds(3)), 15920);
    EXPECT_EQ(placer.fillTo(seconds(2)), 0);
    EXPECT_EQ(placer.next(), 24000);
}

class FragmenterTest : public testing::Test {
  protected:
    static constexpr SoundFormat kFormat{8000, 1};

    void picture(Nanoseconds time, std::optional<Nanoseconds> now = std::nullopt) {
        m_fragmenter.addPicture({{1, 2, 3}, time, m_pictures++ == 0}, now.value_or(time));
    }
    /// 10 ms of sound.
    void sound(Nanoseconds time) { m_fragmenter.addSound({std::vector<std::uint8_t>(80 * 3, 7), time}, kFormat, time); }

    Fragmenter m_fragmenter;
    int m_pictures = 0;
};

TEST_F(FragmenterTest, NothingIsDueWithoutPicturesAndSound) {
    EXPECT_EQ(m_fragmenter.due(), std::nullopt);
    const Fragment fragment = m_fragmenter.take(seconds(10));
    EXPECT_TRUE(fragment.pictures.empty() && fragment.sound.empty());
    EXPECT_TRUE(m_fragmenter.takeAll().pictures.empty());
}

TEST_F(FragmenterTest, PicturesLastUntilTheNextAndTheLastWaitsForIt) {
    for (int i = 0; i < 11; ++i) {
        picture(seconds(50) + i * milliseconds(40));
    }
    const Fragment fragment = m_fragmenter.take(seconds(50) + milliseconds(400));
    ASSERT_EQ(fragment.pictures.size(), 10U);
    for (std::size_t i = 0; i < 10; ++i) {
        EXPECT_EQ(fragment.pictures[i].start, static_cast<std::int64_t>(i) * 3600);
        EXPECT_EQ(fragment.pictures[i].duration, 3600U);
    }
    EXPECT_TRUE(fragment.pictures[0].key);
    EXPECT_FALSE(fragment.pictures[1].key);
    const Fragment rest = m_fragmenter.takeAll();
    ASSERT_EQ(rest.pictures.size(), 1U);
    EXPECT_EQ(rest.pictures[0].start, 36000);
}

TEST_F(FragmenterTest, AFragmentIsDueSoonEnoughToLoseLessThanASecond) {
    picture(seconds(50));
    ASSERT_TRUE(m_fragmenter.due());
    EXPECT_LE(*m_fragmenter.due() - seconds(50), milliseconds(500));
    EXPECT_TRUE(m_fragmenter.take(*m_fragmenter.due() - milliseconds(1)).pictures.empty());
    EXPECT_EQ(m_fragmenter.take(*m_fragmenter.due()).pictures.size(), 1U) << "though nobody knows how long it lasts";
    EXPECT_EQ(m_fragmenter.due(), std::nullopt);
}

TEST_F(FragmenterTest, SlowPicturesKeepTheirTimes) {
    picture(seconds(50));
    const Fragment first = m_fragmenter.take(seconds(50) + milliseconds(450));
    picture(seconds(52));
    const Fragment second = m_fragmenter.take(seconds(52) + milliseconds(450));
    ASSERT_EQ(first.pictures.size() + second.pictures.size(), 2U);
    EXPECT_EQ(second.pictures[0].start, 2 * 90000);
    EXPECT_LE(first.pictures[0].start + first.pictures[0].duration, second.pictures[0].start);
}

TEST_F(FragmenterTest, PicturesThatAreLateInComingKeepTheirTimes) {
    for (int i = 0; i < 4; ++i) {
        picture(seconds(50) + i * milliseconds(40));
    }
    const Fragment first = m_fragmenter.take(seconds(50) + milliseconds(600));
    ASSERT_EQ(first.pictures.size(), 4U) << "nobody knows whether another one will come";
    for (int i = 4; i < 20; ++i) {
        picture(seconds(50) + i * milliseconds(40), seconds(50) + milliseconds(700 + i));
    }
    const Fragment second = m_fragmenter.takeAll();
    ASSERT_EQ(second.pictures.size(), 16U);
    for (std::size_t i = 0; i < 16; ++i) {
        EXPECT_EQ(second.pictures[i].start, static_cast<std::int64_t>(i + 4) * 3600);
        EXPECT_EQ(second.pictures[i].duration, 3600U);
    }
}

TEST_F(FragmenterTest, AGapIsNotTakenForTheUsual) {
    picture(seconds(50));
    picture(seconds(80));
    const Fragment fragment = m_fragmenter.take(seconds(81));
    ASSERT_EQ(fragment.pictures.size(), 2U);
    EXPECT_LE(fragment.pictures[1].duration, 18000U);
    picture(seconds(80) + milliseconds(200), seconds(82));
    EXPECT_EQ(m_fragmenter.takeAll().pictures.at(0).start, 30 * 90000 + 18000);
}

TEST_F(FragmenterTest, APictureThatStandsForHoursHasALongDurationAndTheNextItsTime) {
    picture(seconds(50));
    picture(seconds(50) + std::chrono::hours(14));
    const Fragment fragment = m_fragmenter.takeAll();
    ASSERT_EQ(fragment.pictures.size(), 2U);
    EXPECT_EQ(fragment.pictures[0].duration, 0x7FFFFFFFU);
    EXPECT_EQ(fragment.pictures[1].start, 14LL * 3600 * 90000);
}

TEST_F(FragmenterTest, TheMovieBeginsWithTheFirstPictureAndSoundBeforeItIsCut) {
    for (int i = 0; i < 20; ++i) {
        sound(seconds(50) + i * milliseconds(10));
    }
    EXPECT_TRUE(m_fragmenter.take(seconds(50) + milliseconds(499)).sound.empty()) << "waits for the picture";
    picture(seconds(50) + milliseconds(105), seconds(50) + milliseconds(200));
    const Fragment fragment = m_fragmenter.takeAll();
    ASSERT_EQ(fragment.pictures.size(), 1U);
    EXPECT_EQ(fragment.pictures[0].start, 0);
    EXPECT_EQ(fragment.soundStart, 0);
    EXPECT_EQ(fragment.sound.size(), 95U * 8 * 3);
}

TEST_F(FragmenterTest, SoundThatCameLateAtFirstIsPlacedByWhatCameInTime) {
    for (int i = 0; i < 20; ++i) {
        sound(seconds(50) + i * milliseconds(10) + milliseconds(i < 5 ? 30 - i : 0));
    }
    picture(seconds(50) + milliseconds(40), seconds(50) + milliseconds(200));
    const Fragment fragment = m_fragmenter.takeAll();
    EXPECT_EQ(fragment.soundStart, 0);
    EXPECT_EQ(fragment.sound.size(), 160U * 8 * 3) << "neither silence nor single samples";
}

TEST_F(FragmenterTest, WithoutAPictureTheMovieBeginsWithTheSound) {
    for (int i = 0; i < 50; ++i) {
        sound(seconds(50) + i * milliseconds(10));
    }
    const Fragment fragment = m_fragmenter.take(seconds(50) + milliseconds(500));
    EXPECT_EQ(fragment.soundStart, 0);
    EXPECT_EQ(fragment.sound.size(), 30U * 80 * 3) << "the rest waits for better knowledge of its place";
    EXPECT_EQ(m_fragmenter.length(), milliseconds(300));
    picture(seconds(53));
    const Fragment later = m_fragmenter.takeAll();
    ASSERT_EQ(later.pictures.size(), 1U);
    EXPECT_EQ(later.pictures[0].start, 3 * 90000) << "a picture that comes late is late";
}

TEST_F(FragmenterTest, SoundThatComesLateBeginsLate) {
    picture(seconds(50));
    sound(seconds(51));
    const Fragment fragment = m_fragmenter.takeAll();
    EXPECT_EQ(fragment.soundStart, 8000);
    EXPECT_EQ(fragment.sound.size(), 80U * 3);
}

TEST_F(FragmenterTest, AGapIsInTheTimeLineOfBoth) {
    picture(seconds(50));
    sound(seconds(50));
    picture(seconds(80));
    sound(seconds(80));
    const Fragment fragment = m_fragmenter.takeAll();
    ASSERT_EQ(fragment.pictures.size(), 2U);
    EXPECT_EQ(fragment.pictures[1].start, 30 * 90000);
    EXPECT_EQ(fragment.sound.size(), (30U * 8000 + 80) * 3);
    EXPECT_EQ(fragment.sound[79 * 3], 7);
    EXPECT_EQ(fragment.sound[80 * 3], 0) << "silence";
    EXPECT_EQ(fragment.sound.back(), 7);
    EXPECT_EQ(m_fragmenter.length(), seconds(30) + milliseconds(10));
}

TEST_F(FragmenterTest, SoundThatHasStoppedGoesOnAsSilence) {
    sound(seconds(50));
    for (int i = 0; i <= 100; ++i) {
        picture(seconds(50) + i * milliseconds(40));
    }
    const Fragment fragment = m_fragmenter.take(seconds(54));
    EXPECT_EQ(fragment.sound.size(), 3U * 8000 * 3) << "up to a second before the last picture";
    sound(seconds(54));
    const Fragment next = m_fragmenter.takeAll();
    EXPECT_EQ(next.soundStart, 3 * 8000);
    EXPECT_EQ(next.sound.size(), (8000U + 80) * 3);
}

/// A recording as it goes on, by this machine's clock.
class OngoingTest : public FragmenterTest {
  protected:
    /// Ten milliseconds; pictures come so much later than they belong.
    void goOn(bool withSound, milliseconds picturesLate) {
        m_now += milliseconds(10);
        if (withSound) {
            sound(m_now);
        }
        if ((m_now - picturesLate).count() % Nanoseconds(milliseconds(40)).count() == 0) {
            picture(m_now - picturesLate, m_now);
        }
        const Fragment fragment = m_fragmenter.take(m_now);
        m_cut = !fragment.pictures.empty() || !fragment.sound.empty();
        if (!fragment.pictures.empty()) {
            const MoviePicture& last = fragment.pictures.back();
            m_pictureEnd = Nanoseconds((last.start + last.duration) * std::nano::den / movieTimescale);
        }
        if (!fragment.sound.empty()) {
            const std::int64_t frames = fragment.soundStart + static_cast<std::int64_t>(fragment.sound.size()) / 3;
            m_soundEnd = Nanoseconds(frames * std::nano::den / kFormat.rate);
        }
    }

    Nanoseconds m_now = seconds(50);
    Nanoseconds m_pictureEnd{}; ///< of what has been cut, as the next one
    Nanoseconds m_soundEnd{};
    bool m_cut = false; ///< just now
};

TEST_F(OngoingTest, PicturesAndSoundEndTogetherWhereverItIsBrokenOff) {
    for (const milliseconds late : {milliseconds(0), milliseconds(60), milliseconds(350)}) {
        m_fragmenter = {};
        m_pictures = 0;
        int cuts = 0;
        for (int i = 0; i < 500; ++i) {
            goOn(true, late);
            if (m_cut && i > 100) {
                ++cuts;
                EXPECT_NEAR(ms(m_pictureEnd), ms(m_soundEnd), 1) << i << ", pictures late by " << late.count() << " ms";
            }
        }
        EXPECT_GE(cuts, 8);
    }
}

TEST_F(OngoingTest, NothingIsHeldForWhatDoesNotComeAnyMore) {
    for (int i = 0; i < 200; ++i) {
        goOn(true, milliseconds(0));
    }
    for (int i = 0; i < 300; ++i) {
        goOn(false, milliseconds(0));
        EXPECT_GE(ms(m_pictureEnd), ms(m_now - seconds(50)) - 800) << "pictures without sound";
    }
    for (int i = 0; i < 300; ++i) {
        goOn(true, std::chrono::hours(1) + milliseconds(1));
        EXPECT_TRUE(i < 100 || ms(m_soundEnd) >= ms(m_now - seconds(50)) - 800) << "sound without pictures";
    }
}

TEST(ProgressLine, SaysTimePicturesDroppedBytesAndWhyItWaits) {
    Progress progress;
    progress.length = std::chrono::hours(26) + std::chrono::minutes(3) + seconds(4) + milliseconds(56);
    progress.pictures = 12345;
    progress.dropped = 6;
    progress.bytes = 789'000'000'000;
    EXPECT_EQ(progressLine(progress), "time 26:03:04.056 pictures 12345 dropped 6 bytes 789000000000");
    progress.waiting = "the source";
    EXPECT_EQ(progressLine(progress),
              "time 26:03:04.056 pictures 12345 dropped 6 bytes 789000000000 waiting for the source");
    progress.soundLost = milliseconds(1250);
    EXPECT_EQ(progressLine(progress), "time 26:03:04.056 pictures 12345 dropped 6 bytes 789000000000 sound lost "
                                      "00:00:01.250 waiting for the source");
}

} // namespace
} // namespace qivo::record
