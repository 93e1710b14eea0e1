#pragma once

#include <chrono>
#include <cstdint>
#include <deque>
#include <optional>
#include <vector>

namespace qivo::runtime {

/// Speeds from -1 to 1 in the directions of libqivo: left, up and in are positive.
struct PtzSpeed {
    float pan = 0;
    float tilt = 0;
    float zoom = 0;
};

/// Axes that start and stop together; a set of them is a sum.
inline constexpr unsigned kPanTiltAxes = 1;
inline constexpr unsigned kZoomAxis = 2;

/// What the camera is to be asked.
struct PtzRequest {
    enum class Kind {
        move,
        stop,        ///< the first half of a stop
        halt,        ///< the second: a move with no speed
        autoFocus,   ///< the camera takes the focus
        manualFocus, ///< the camera leaves the focus to us
        focus,
        store,
        recall,
    };

    Kind kind = Kind::move;
    unsigned axes = 0;   ///< move: that move; stop and halt: that stop
    PtzSpeed speed{};    ///< move: speeds of `axes`; halt: of the other axes in motion
    unsigned moving = 0; ///< halt: the other axes in motion
    float value = 0;     ///< focus: from 0 (far) to 1 (near); recall: the speed
    int preset = 0;      ///< store and recall
    std::uint64_t id = 0;
};

/// The order in which a camera is asked, without the asking: time comes from the caller, and so do the answers.
///
/// One command is asked after the other, each when the one before it has been answered. A newer speed or focus takes
/// the place of one that has not been asked yet. A move that holds is asked again and again, since each runs out; once
/// beside one that has not been answered, where that would run out before.
/// A stop waits for nothing and does away with what was to move before it. It is asked in both ways there are; again
/// where neither was accepted; and once more when a move that it overtook on the way has been answered, because the
/// camera may have taken them in the other order. Nothing moves before a stop has been answered or given up.
/// A stop of the zoom alone does not do away with a recall that no speed followed: it comes from a pointer that passes
/// a button, and would leave the camera with the zoom of another place. The recall is asked once more after it, unless
/// the camera has refused it.
///
/// Thread: one at a time.
class PtzCommands {
  public:
    using Clock = std::chrono::steady_clock;

    /// How long a camera moves on by itself after a move. ONVIF's smallest unit that every camera knows.
    static constexpr std::chrono::seconds kRunOut{1};
    /// When a move that holds is asked again.
    static constexpr std::chrono::milliseconds kRenewal{400};
    /// The same where the camera has not answered yet. Later, because a camera that does one thing after the other has
    /// to do this one, too, before it comes to a stop.
    static constexpr std::chrono::milliseconds kLateRenewal{700};
    /// Moves that are asked at a time.
    static constexpr std::size_t kMostMoves = 2;
    /// How long after it was asked a recall may have to be asked again; by then cameras have arrived.
    static constexpr std::chrono::seconds kRecallTime{20};
    /// The pause before a stop is asked again.
    static constexpr std::chrono::milliseconds kStopPause{200};
    /// How often a stop is asked that nothing accepts.
    static constexpr int kStopTries = 5;
    /// Commands that wait; more are refused. A stop is never refused.
    static constexpr std::size_t kMostWaiting = 32;
    /// Presets are numbered from 0 to this.
    static constexpr int kLastPreset = 255;
    /// How long after the end a camera is still asked to stop.
    static constexpr std::chrono::milliseconds kEndLimit{1500};

    // Each answers whether the command will be asked. Speeds beyond -1 to 1 are cut, numbers that are none are refused.
    bool move(float pan, float tilt);
    bool zoom(float speed);
    bool autoFocus();
    bool focus(float value);
    bool store(int preset);
    bool recall(int preset, float speed);

    /// Nothing is accepted any more; what moves is stopped, and what may still be on its way to a preset.
    void end(Clock::time_point now);

    /// What to ask now; to be called until there is nothing.
    std::optional<PtzRequest> next(Clock::time_point now);
    /// A request has been answered or given up. A recall that is not accepted is not asked again after a stop, so that
    /// one whose answer is lost, which the camera may be doing, counts as accepted.
    void done(std::uint64_t id, bool accepted, Clock::time_point now);
    /// Whether a recall that is being asked still counts: nobody has stopped the camera since.
    bool stillWanted(std::uint64_t id) const;
    /// When time alone will give `next` something.
    Clock::time_point nextLook() const;
    /// Whether all is done after the end.
    bool finished(Clock::time_point now) const;
    /// Whether the camera moves or is on its way to a preset, or may still be, or commands have not been answered.
    bool busy(Clock::time_point now) const;

  private:
    /// A stop under way.
    struct Pair {
        unsigned axes = 0;
        std::uint64_t stop = 0;
        std::uint64_t halt = 0;
        int open = 2;
        bool accepted = false;
    };

    bool speeds(unsigned axes, const PtzSpeed& speed);
    bool enqueue(const PtzRequest& request);
    void stop(unsigned axes);
    void forgetRecall();
    std::optional<PtzRequest> nextStop(Clock::time_point now);
    std::optional<PtzRequest> nextInOrder(Clock::time_point now);
    PtzRequest beginPair(unsigned axes);
    PtzRequest begin(PtzRequest request);
    PtzRequest beginRecall(const PtzRequest& request);
    PtzRequest beginMove(const PtzRequest& request, Clock::time_point now);
    void pairDone(const Pair& pair, Clock::time_point now);
    bool laneFree() const;
    unsigned gliding(Clock::time_point now) const;
    Clock::time_point renewal() const;

    std::deque<PtzRequest> m_waiting;
    std::vector<PtzRequest> m_asked; ///< in order and not answered yet; more than one only of moves
    std::uint64_t m_lastId = 0;

    PtzSpeed m_speed{};     ///< as last asked
    unsigned m_moving = 0;  ///< axes that were asked to move and not to stop
    unsigned m_gliding = 0; ///< axes that a recall has set off and nothing has moved or stopped since
    Clock::time_point m_lastMove{};
    bool m_manualFocus = false;

    std::optional<PtzRequest> m_recall; ///< the newest, until a speed or a stop of more than the zoom follows
    bool m_recallAgain = false;         ///< it was asked and then the zoom was stopped
    Clock::time_point m_recallEnd{};

    unsigned m_stop = 0;      ///< axes to be stopped at once
    unsigned m_echo = 0;      ///< to be stopped once more as soon as no stop is under way
    unsigned m_again = 0;     ///< to be stopped once more at m_stopAgain
    unsigned m_overtaken = 0; ///< stopped while one of m_asked may still make them move
    Clock::time_point m_stopAgain{};
    int m_tries = 0;
    std::optional<PtzRequest> m_halt; ///< second half of a stop whose first has just been asked
    std::vector<Pair> m_pairs;

    bool m_ended = false;
    Clock::time_point m_endLimit{};
};

} // namespace qivo::runtime
