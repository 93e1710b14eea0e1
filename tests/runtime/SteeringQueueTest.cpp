// The order in which a camera is asked, with time and answers from the test.

#include "runtime/PtzCommands.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <string>
#include <vector>

namespace qivo::test {
namespace {

using namespace std::chrono_literals;
using runtime::PtzCommands;
using runtime::PtzRequest;
using Kind = PtzRequest::Kind;

class SteeringQueue : public testing::Test {
  protected:
    /// Everything that is to be asked now.
    std::vector<PtzRequest> asked() {
        std::vector<PtzRequest> requests;
        while (auto request = m_commands.next(m_now)) {
            requests.push_back(*request);
        }
        return requests;
    }

    std::vector<Kind> kinds() {
        std::vector<Kind> kinds;
        m_last = asked();
        for (const PtzRequest& request : m_last) {
            kinds.push_back(request.kind);
        }
        return kinds;
    }

    void answer(bool accepted = true) {
        for (const PtzRequest& request : m_last) {
            m_commands.done(request.id, accepted, m_now);
        }
    }

    /// Begins to pan and has it answered.
    void panning() {
        EXPECT_TRUE(m_commands.move(0.5F, 0));
        EXPECT_EQ(kinds(), std::vector{Kind::move});
        answer();
    }

    PtzCommands m_commands;
    PtzCommands::Clock::time_point m_now{1000s};
    std::vector<PtzRequest> m_last;
    const std::vector<Kind> kStop{Kind::stop, Kind::halt};
};

TEST_F(SteeringQueue, AsksOneAfterTheOther) {
    EXPECT_TRUE(m_commands.store(3));
    EXPECT_TRUE(m_commands.recall(4, 0.25F));
    EXPECT_EQ(kinds(), std::vector{Kind::store});
    EXPECT_EQ(m_last[0].preset, 3);
    EXPECT_EQ(asked().size(), 0U) << "the first has not been answered";
    answer(false);
    EXPECT_EQ(kinds(), std::vector{Kind::recall});
    EXPECT_EQ(m_last[0].preset, 4);
    EXPECT_EQ(m_last[0].value, 0.25F);
}

TEST_F(SteeringQueue, ANewerSpeedReplacesOneThatWaits) {
    EXPECT_TRUE(m_commands.store(1));
    asked();
    m_last = {};
    EXPECT_TRUE(m_commands.move(0.1F, 0));
    EXPECT_TRUE(m_commands.zoom(0.2F));
    EXPECT_TRUE(m_commands.move(0.3F, 0.4F));
    m_commands.done(1, true, m_now);
    ASSERT_EQ(kinds(), std::vector{Kind::move});
    EXPECT_EQ(m_last[0].speed.pan, 0.3F);
    EXPECT_EQ(m_last[0].speed.tilt, 0.4F);
    EXPECT_EQ(m_last[0].speed.zoom, 0.2F);
    answer();
    EXPECT_EQ(asked().size(), 0U);
}

TEST_F(SteeringQueue, ASpeedDoesNotOvertakeAPreset) {
    EXPECT_TRUE(m_commands.autoFocus());
    asked();
    EXPECT_TRUE(m_commands.move(0.1F, 0));
    EXPECT_TRUE(m_commands.store(1));
    EXPECT_TRUE(m_commands.move(0.2F, 0));
    m_commands.done(1, true, m_now);
    ASSERT_EQ(kinds(), std::vector{Kind::move});
    EXPECT_EQ(m_last[0].speed.pan, 0.1F);
    answer();
    EXPECT_EQ(kinds(), std::vector{Kind::store});
    answer();
    ASSERT_EQ(kinds(), std::vector{Kind::move});
    EXPECT_EQ(m_last[0].speed.pan, 0.2F);
}

TEST_F(SteeringQueue, AMoveIsRenewedWhileItHolds) {
    panning();
    EXPECT_EQ(m_commands.nextLook(), m_now + PtzCommands::kRenewal);
    m_now += PtzCommands::kRenewal - 1ms;
    EXPECT_EQ(asked().size(), 0U);
    m_now += 1ms;
    ASSERT_EQ(kinds(), std::vector{Kind::move});
    EXPECT_EQ(m_last[0].speed.pan, 0.5F);
    EXPECT_EQ(m_last[0].axes, runtime::kPanTiltAxes);
    EXPECT_LE(2 * PtzCommands::kRenewal, PtzCommands::kRunOut) << "one that is lost must not be felt";
}

TEST_F(SteeringQueue, AStopIsAskedBothWaysAndEndsTheRenewal) {
    panning();
    EXPECT_TRUE(m_commands.move(0, 0));
    ASSERT_EQ(kinds(), kStop);
    EXPECT_EQ(m_last[0].axes, runtime::kPanTiltAxes);
    EXPECT_EQ(m_last[1].speed.pan, 0);
    EXPECT_TRUE(m_commands.busy(m_now));
    answer();
    EXPECT_FALSE(m_commands.busy(m_now));
    m_now += 1h;
    EXPECT_EQ(asked().size(), 0U);
}

TEST_F(SteeringQueue, AStopOvertakesWhatWaitsAndDropsOlderMovement) {
    EXPECT_TRUE(m_commands.store(1));
    asked();
    EXPECT_TRUE(m_commands.move(0.1F, 0));
    EXPECT_TRUE(m_commands.recall(2, 1));
    EXPECT_TRUE(m_commands.autoFocus());
    EXPECT_TRUE(m_commands.move(0, 0));
    ASSERT_EQ(kinds(), kStop) << "the camera has not answered, and must be stopped all the same";
    answer();
    m_commands.done(1, true, m_now);
    EXPECT_EQ(kinds(), std::vector{Kind::autoFocus});
    answer();
    EXPECT_EQ(asked().size(), 0U);
}

TEST_F(SteeringQueue, AStopOfOneAxisLeavesTheOther) {
    panning();
    EXPECT_TRUE(m_commands.zoom(0.3F));
    ASSERT_EQ(kinds(), std::vector{Kind::move});
    EXPECT_EQ(m_last[0].axes, runtime::kPanTiltAxes | runtime::kZoomAxis);
    EXPECT_EQ(m_last[0].speed.pan, 0.5F) << "some cameras stop what a move leaves out";
    answer();
    EXPECT_TRUE(m_commands.zoom(0));
    ASSERT_EQ(kinds(), kStop);
    EXPECT_EQ(m_last[0].axes, runtime::kZoomAxis);
    EXPECT_EQ(m_last[1].moving, runtime::kPanTiltAxes);
    EXPECT_EQ(m_last[1].speed.pan, 0.5F);
    EXPECT_EQ(m_last[1].speed.zoom, 0);
    answer();
    m_now += PtzCommands::kRenewal;
    ASSERT_EQ(kinds(), std::vector{Kind::move});
    EXPECT_EQ(m_last[0].axes, runtime::kPanTiltAxes);
}

TEST_F(SteeringQueue, NothingMovesBeforeTheStopHasBeenAnswered) {
    panning();
    EXPECT_TRUE(m_commands.move(0, 0));
    EXPECT_TRUE(m_commands.move(-0.5F, 0));
    ASSERT_EQ(kinds(), kStop);
    const auto stop = m_last;
    m_commands.done(stop[0].id, true, m_now);
    EXPECT_EQ(asked().size(), 0U);
    m_commands.done(stop[1].id, true, m_now);
    ASSERT_EQ(kinds(), std::vector{Kind::move});
    EXPECT_EQ(m_last[0].speed.pan, -0.5F);
}

TEST_F(SteeringQueue, AMoveThatWasOvertakenIsStoppedOnceMore) {
    EXPECT_TRUE(m_commands.move(0.5F, 0));
    const auto move = asked();
    EXPECT_TRUE(m_commands.move(0, 0));
    ASSERT_EQ(kinds(), kStop);
    answer();
    EXPECT_EQ(m_commands.nextLook(), m_now + PtzCommands::kStopPause) << "the move may take effect at any time";
    m_now += PtzCommands::kStopPause;
    ASSERT_EQ(kinds(), kStop);
    const auto second = m_last;
    m_commands.done(move[0].id, true, m_now);
    EXPECT_EQ(asked().size(), 0U) << "a stop is under way";
    m_commands.done(second[0].id, true, m_now);
    m_commands.done(second[1].id, true, m_now);
    ASSERT_EQ(kinds(), kStop) << "the one under way may have been taken before the move";
    answer();
    m_now += 1h;
    EXPECT_EQ(asked().size(), 0U);
    EXPECT_FALSE(m_commands.busy(m_now));
}

TEST_F(SteeringQueue, AStopThatNothingAcceptsIsAskedAgainButNotForEver) {
    panning();
    EXPECT_TRUE(m_commands.move(0, 0));
    for (int i = 0; i < PtzCommands::kStopTries; ++i) {
        ASSERT_EQ(kinds(), kStop) << i;
        answer(false);
        EXPECT_EQ(asked().size(), 0U);
        m_now += PtzCommands::kStopPause;
    }
    EXPECT_EQ(asked().size(), 0U);
}

TEST_F(SteeringQueue, OneAcceptedHalfOfAStopIsEnough) {
    panning();
    EXPECT_TRUE(m_commands.move(0, 0));
    ASSERT_EQ(kinds(), kStop);
    m_commands.done(m_last[0].id, false, m_now);
    m_commands.done(m_last[1].id, true, m_now);
    m_now += 1h;
    EXPECT_EQ(asked().size(), 0U);
}

TEST_F(SteeringQueue, ANewerMoveEndsTheRepetitionOfAStop) {
    panning();
    EXPECT_TRUE(m_commands.move(0, 0));
    ASSERT_EQ(kinds(), kStop);
    answer(false);
    EXPECT_TRUE(m_commands.move(0.1F, 0));
    EXPECT_EQ(kinds(), std::vector{Kind::move});
    m_now += PtzCommands::kStopPause;
    EXPECT_EQ(asked().size(), 0U);
}

TEST_F(SteeringQueue, AStopWithoutAMoveIsAskedAllTheSame) {
    EXPECT_TRUE(m_commands.zoom(0));
    EXPECT_EQ(kinds(), kStop);
    EXPECT_EQ(m_last[0].axes, runtime::kZoomAxis);
}

TEST_F(SteeringQueue, AStopIsNeverRefused) {
    EXPECT_TRUE(m_commands.store(0));
    asked();
    for (std::size_t i = 0; i < PtzCommands::kMostWaiting; ++i) {
        EXPECT_TRUE(m_commands.store(1));
    }
    EXPECT_FALSE(m_commands.store(1));
    EXPECT_FALSE(m_commands.move(0.1F, 0));
    EXPECT_TRUE(m_commands.move(0, 0));
    EXPECT_EQ(kinds(), kStop);
}

TEST_F(SteeringQueue, TheFocusIsTakenFromTheAutomaticOnce) {
    EXPECT_TRUE(m_commands.focus(0.25F));
    EXPECT_TRUE(m_commands.focus(0.5F));
    EXPECT_EQ(kinds(), std::vector{Kind::manualFocus});
    answer();
    ASSERT_EQ(kinds(), std::vector{Kind::focus});
    EXPECT_EQ(m_last[0].value, 0.5F);
    answer();
    EXPECT_TRUE(m_commands.focus(1));
    EXPECT_EQ(kinds(), std::vector{Kind::focus});
    answer();
    EXPECT_TRUE(m_commands.autoFocus());
    EXPECT_EQ(kinds(), std::vector{Kind::autoFocus});
    answer();
    EXPECT_TRUE(m_commands.focus(1));
    EXPECT_EQ(kinds(), std::vector{Kind::manualFocus});
}

TEST_F(SteeringQueue, SpeedsAreCutAndWhatIsNoNumberIsRefused) {
    const float none = std::numeric_limits<float>::quiet_NaN();
    const float infinite = std::numeric_limits<float>::infinity();
    EXPECT_FALSE(m_commands.move(none, 0));
    EXPECT_FALSE(m_commands.move(0, none));
    EXPECT_FALSE(m_commands.zoom(none));
    EXPECT_FALSE(m_commands.focus(none));
    EXPECT_FALSE(m_commands.recall(1, none));
    EXPECT_EQ(asked().size(), 0U);
    EXPECT_TRUE(m_commands.move(-7, infinite));
    EXPECT_TRUE(m_commands.zoom(1.5F));
    ASSERT_EQ(kinds(), std::vector{Kind::move});
    EXPECT_EQ(m_last[0].speed.pan, -1);
    EXPECT_EQ(m_last[0].speed.tilt, 1);
    EXPECT_EQ(m_last[0].speed.zoom, 1);
    answer();
    EXPECT_TRUE(m_commands.focus(-3));
    kinds();
    answer();
    ASSERT_EQ(kinds(), std::vector{Kind::focus});
    EXPECT_EQ(m_last[0].value, 0);
}

TEST_F(SteeringQueue, PresetsOutOfRangeAreRefused) {
    EXPECT_FALSE(m_commands.store(-1));
    EXPECT_FALSE(m_commands.store(PtzCommands::kLastPreset + 1));
    EXPECT_FALSE(m_commands.recall(-1, 1));
    EXPECT_FALSE(m_commands.recall(PtzCommands::kLastPreset + 1, 1));
    EXPECT_TRUE(m_commands.store(0));
    EXPECT_TRUE(m_commands.recall(PtzCommands::kLastPreset, 1));
}

TEST_F(SteeringQueue, ARecallThatWasStoppedIsNoLongerWanted) {
    EXPECT_TRUE(m_commands.recall(1, 1));
    ASSERT_EQ(kinds(), std::vector{Kind::recall});
    const auto recall = m_last;
    EXPECT_TRUE(m_commands.stillWanted(recall[0].id));
    EXPECT_TRUE(m_commands.move(0, 0));
    ASSERT_EQ(kinds(), kStop);
    EXPECT_FALSE(m_commands.stillWanted(recall[0].id));
    answer();
    m_commands.done(recall[0].id, false, m_now);
    EXPECT_EQ(kinds(), kStop) << "the camera may have taken it all the same";
    answer();
    m_now += 1h;
    EXPECT_EQ(asked().size(), 0U);
}

/// As a panel does whose pointer passes a button.
TEST_F(SteeringQueue, AStopOfTheZoomAloneLeavesARecallThatWaits) {
    EXPECT_TRUE(m_commands.store(1));
    asked();
    EXPECT_TRUE(m_commands.recall(2, 1));
    EXPECT_TRUE(m_commands.zoom(0));
    ASSERT_EQ(kinds(), kStop);
    answer();
    m_commands.done(1, true, m_now);
    ASSERT_EQ(kinds(), std::vector{Kind::recall});
    EXPECT_EQ(m_last[0].preset, 2);
    answer();
    EXPECT_EQ(asked().size(), 0U) << "and not twice";
}

TEST_F(SteeringQueue, AStopOfTheZoomAloneIsFollowedByTheRecallThatItBroke) {
    EXPECT_TRUE(m_commands.recall(2, 0.25F));
    ASSERT_EQ(kinds(), std::vector{Kind::recall});
    const auto recall = m_last;
    EXPECT_TRUE(m_commands.zoom(0));
    ASSERT_EQ(kinds(), kStop) << "at once";
    answer();
    m_commands.done(recall[0].id, true, m_now);
    ASSERT_EQ(kinds(), kStop) << "the camera may have taken the first before the recall";
    answer();
    ASSERT_EQ(kinds(), std::vector{Kind::recall});
    EXPECT_EQ(m_last[0].preset, 2);
    EXPECT_EQ(m_last[0].value, 0.25F);
    answer();
    EXPECT_TRUE(m_commands.zoom(0));
    ASSERT_EQ(kinds(), kStop);
    answer(false);
    EXPECT_EQ(asked().size(), 0U) << "the stop comes first";
    m_now += PtzCommands::kStopPause;
    ASSERT_EQ(kinds(), kStop);
    answer();
    EXPECT_EQ(kinds(), std::vector{Kind::recall});
    answer();
    EXPECT_EQ(asked().size(), 0U);
}

TEST_F(SteeringQueue, ARecallIsNotAskedAgainAfterASpeedOrAnotherStopOrMuchLater) {
    const auto recalled = [this] {
        EXPECT_TRUE(m_commands.recall(2, 1));
        EXPECT_EQ(kinds(), std::vector{Kind::recall});
        answer();
    };
    const auto stopped = [this] {
        EXPECT_EQ(kinds(), kStop);
        answer();
    };
    recalled();
    EXPECT_TRUE(m_commands.zoom(0.1F));
    EXPECT_EQ(kinds(), std::vector{Kind::move});
    answer();
    EXPECT_TRUE(m_commands.zoom(0));
    stopped();
    EXPECT_EQ(asked().size(), 0U) << "somebody zooms";

    recalled();
    EXPECT_TRUE(m_commands.zoom(0));
    EXPECT_TRUE(m_commands.move(0, 0));
    stopped();
    EXPECT_EQ(asked().size(), 0U) << "both are to stand";

    recalled();
    m_now += PtzCommands::kRecallTime;
    EXPECT_TRUE(m_commands.zoom(0));
    stopped();
    EXPECT_EQ(asked().size(), 0U) << "it has long arrived";
}

TEST_F(SteeringQueue, ARecallThatIsRefusedIsNotAskedAgain) {
    EXPECT_TRUE(m_commands.recall(2, 1));
    ASSERT_EQ(kinds(), std::vector{Kind::recall});
    answer(false);
    EXPECT_TRUE(m_commands.zoom(0));
    ASSERT_EQ(kinds(), kStop);
    answer();
    EXPECT_EQ(asked().size(), 0U) << "there is no such preset";
}

TEST_F(SteeringQueue, ARefusalDoesAwayWithNoNewerRecall) {
    EXPECT_TRUE(m_commands.recall(2, 1));
    ASSERT_EQ(kinds(), std::vector{Kind::recall});
    EXPECT_TRUE(m_commands.recall(3, 1));
    answer(false);
    ASSERT_EQ(kinds(), std::vector{Kind::recall});
    answer();
    EXPECT_TRUE(m_commands.zoom(0));
    ASSERT_EQ(kinds(), kStop);
    answer();
    ASSERT_EQ(kinds(), std::vector{Kind::recall});
    EXPECT_EQ(m_last[0].preset, 3);
}

/// Some cameras answer a move only when it has been done, and stop by themselves meanwhile.
TEST_F(SteeringQueue, AMoveThatHoldsIsRenewedBesideOneThatIsNotAnswered) {
    EXPECT_TRUE(m_commands.move(0.5F, 0));
    ASSERT_EQ(kinds(), std::vector{Kind::move});
    const auto first = m_last;
    EXPECT_EQ(m_commands.nextLook(), m_now + PtzCommands::kLateRenewal);
    m_now += PtzCommands::kLateRenewal - 1ms;
    EXPECT_EQ(asked().size(), 0U);
    m_now += 1ms;
    ASSERT_EQ(kinds(), std::vector{Kind::move});
    const auto second = m_last;
    EXPECT_EQ(second[0].speed.pan, 0.5F);
    EXPECT_LT(PtzCommands::kLateRenewal, PtzCommands::kRunOut);
    m_now += 1s;
    EXPECT_EQ(asked().size(), 0U) << "no more than two, since a stop may have to wait for them";
    EXPECT_TRUE(m_commands.move(-0.5F, 0));
    m_commands.done(first[0].id, true, m_now);
    EXPECT_EQ(asked().size(), 0U) << "the other may be taken after a newer one";
    m_commands.done(second[0].id, true, m_now);
    ASSERT_EQ(kinds(), std::vector{Kind::move});
    EXPECT_EQ(m_last[0].speed.pan, -0.5F);
}

TEST_F(SteeringQueue, AStopIsRepeatedUntilBothMovesThatItOvertookAreAnswered) {
    EXPECT_TRUE(m_commands.move(0.5F, 0));
    const auto first = asked();
    m_now += PtzCommands::kLateRenewal;
    const auto second = asked();
    ASSERT_EQ(second.size(), 1U);
    EXPECT_TRUE(m_commands.move(0, 0));
    ASSERT_EQ(kinds(), kStop);
    answer();
    for (const PtzRequest& move : {first[0], second[0]}) {
        m_commands.done(move.id, true, m_now);
        ASSERT_EQ(kinds(), kStop);
        answer();
    }
    m_now += 1h;
    EXPECT_EQ(asked().size(), 0U);
    EXPECT_FALSE(m_commands.busy(m_now));
}

TEST_F(SteeringQueue, TheEndStopsWhatMoves) {
    panning();
    EXPECT_TRUE(m_commands.store(1));
    m_commands.end(m_now);
    EXPECT_FALSE(m_commands.finished(m_now));
    EXPECT_FALSE(m_commands.move(1, 0));
    EXPECT_FALSE(m_commands.zoom(0));
    EXPECT_FALSE(m_commands.store(1));
    ASSERT_EQ(kinds(), kStop);
    EXPECT_FALSE(m_commands.finished(m_now));
    answer();
    EXPECT_TRUE(m_commands.finished(m_now));
}

TEST_F(SteeringQueue, TheEndStopsAMoveThatHasNotBeenAnswered) {
    EXPECT_TRUE(m_commands.zoom(1));
    const auto move = asked();
    m_commands.end(m_now);
    ASSERT_EQ(kinds(), kStop);
    answer();
    EXPECT_FALSE(m_commands.finished(m_now));
    m_commands.done(move[0].id, true, m_now);
    ASSERT_EQ(kinds(), kStop);
    answer();
    EXPECT_TRUE(m_commands.finished(m_now));
}

TEST_F(SteeringQueue, TheEndComesInTimeWhateverTheCameraDoes) {
    panning();
    m_commands.end(m_now);
    EXPECT_EQ(kinds(), kStop);
    m_now += PtzCommands::kEndLimit;
    EXPECT_TRUE(m_commands.finished(m_now));
}

TEST_F(SteeringQueue, TheEndStopsARecall) {
    EXPECT_TRUE(m_commands.recall(1, 1));
    EXPECT_EQ(kinds(), std::vector{Kind::recall});
    answer();
    EXPECT_TRUE(m_commands.zoom(0.1F));
    EXPECT_EQ(kinds(), std::vector{Kind::move});
    answer();
    EXPECT_TRUE(m_commands.zoom(0));
    EXPECT_EQ(kinds(), kStop);
    answer();
    m_commands.end(m_now);
    ASSERT_EQ(kinds(), kStop);
    EXPECT_EQ(m_last[0].axes, runtime::kPanTiltAxes) << "the zoom stands";
    answer();
    EXPECT_TRUE(m_commands.finished(m_now));
}

/// Somebody else may move it by then.
TEST_F(SteeringQueue, TheEndLeavesACameraAloneThatHasLongArrived) {
    EXPECT_TRUE(m_commands.recall(1, 1));
    EXPECT_EQ(kinds(), std::vector{Kind::recall});
    answer();
    m_now += PtzCommands::kRecallTime - 1ms;
    EXPECT_TRUE(m_commands.busy(m_now));
    m_now += 1ms;
    EXPECT_FALSE(m_commands.busy(m_now));
    m_commands.end(m_now);
    EXPECT_EQ(asked().size(), 0U);
    EXPECT_TRUE(m_commands.finished(m_now));
}

TEST_F(SteeringQueue, TheEndStopsARecallThatHasNotBeenAnswered) {
    EXPECT_TRUE(m_commands.recall(1, 1));
    const auto recall = asked();
    m_commands.end(m_now);
    EXPECT_FALSE(m_commands.stillWanted(recall[0].id));
    ASSERT_EQ(kinds(), kStop);
    EXPECT_EQ(m_last[0].axes, runtime::kPanTiltAxes | runtime::kZoomAxis);
    answer();
    m_commands.done(recall[0].id, true, m_now);
    ASSERT_EQ(kinds(), kStop);
    answer();
    EXPECT_TRUE(m_commands.finished(m_now));
}

TEST_F(SteeringQueue, TheEndLeavesACameraThatStandsAlone) {
    EXPECT_TRUE(m_commands.store(1));
    kinds();
    answer();
    EXPECT_TRUE(m_commands.recall(1, 1));
    kinds();
    answer();
    EXPECT_TRUE(m_commands.move(0, 0));
    EXPECT_EQ(kinds(), kStop);
    answer();
    EXPECT_TRUE(m_commands.zoom(0));
    EXPECT_EQ(kinds(), kStop);
    answer();
    m_commands.end(m_now);
    EXPECT_EQ(asked().size(), 0U);
    EXPECT_TRUE(m_commands.finished(m_now));
}

} // namespace
} // namespace qivo::test
