#include "runtime/PtzCommands.h"

#include <algorithm>
#include <cmath>
#include <utility>

namespace qivo::runtime {
namespace {

using Kind = PtzRequest::Kind;

float cut(float value, float least) {
    return std::clamp(value, least, 1.0F);
}

bool isMotion(const PtzRequest& request) {
    return request.kind == Kind::move || request.kind == Kind::recall;
}

bool isRecall(const PtzRequest& request) {
    return request.kind == Kind::recall;
}

void put(PtzSpeed& speed, unsigned axes, const PtzSpeed& from) {
    if ((axes & kPanTiltAxes) != 0) {
        speed.pan = from.pan;
        speed.tilt = from.tilt;
    }
    if ((axes & kZoomAxis) != 0) {
        speed.zoom = from.zoom;
    }
}

} // namespace

bool PtzCommands::move(float pan, float tilt) {
    return !std::isnan(pan) && !std::isnan(tilt) && speeds(kPanTiltAxes, {cut(pan, -1), cut(tilt, -1), 0});
}

bool PtzCommands::zoom(float speed) {
    return !std::isnan(speed) && speeds(kZoomAxis, {0, 0, cut(speed, -1)});
}

bool PtzCommands::autoFocus() {
    return enqueue({.kind = Kind::autoFocus});
}

bool PtzCommands::focus(float value) {
    if (std::isnan(value) || m_ended) {
        return false;
    }
    if (!m_waiting.empty() && m_waiting.back().kind == Kind::focus) {
        m_waiting.back().value = cut(value, 0);
        return true;
    }
    return enqueue({.kind = Kind::focus, .value = cut(value, 0)});
}

bool PtzCommands::store(int preset) {
    return preset >= 0 && preset <= kLastPreset && enqueue({.kind = Kind::store, .preset = preset});
}

bool PtzCommands::recall(int preset, float speed) {
    const PtzRequest request{
        .kind = Kind::recall, .axes = kPanTiltAxes | kZoomAxis, .value = cut(speed, 0), .preset = preset};
    if (preset < 0 || preset > kLastPreset || std::isnan(speed) || !enqueue(request)) {
        return false;
    }
    m_recall = request;
    m_recallAgain = false;
    return true;
}

bool PtzCommands::speeds(unsigned axes, const PtzSpeed& speed) {
    if (m_ended) {
        return false;
    }
    if (speed.pan == 0 && speed.tilt == 0 && speed.zoom == 0) {
        stop(axes);
        return true;
    }
    forgetRecall();
    if (m_waiting.empty() || m_waiting.back().kind != Kind::move) {
        return enqueue({.kind = Kind::move, .axes = axes, .speed = speed});
    }
    m_waiting.back().axes |= axes;
    put(m_waiting.back().speed, axes, speed);
    return true;
}

bool PtzCommands::enqueue(const PtzRequest& request) {
    if (m_ended || m_waiting.size() >= kMostWaiting) {
        return false;
    }
    m_waiting.push_back(request);
    return true;
}

void PtzCommands::forgetRecall() {
    m_recall.reset();
    m_recallAgain = false;
}

void PtzCommands::stop(unsigned axes) {
    if (axes != kZoomAxis) {
        forgetRecall();
    }
    bool recallWaits = false;
    for (PtzRequest& waiting : m_waiting) {
        const bool isKept = waiting.kind == Kind::recall && m_recall;
        recallWaits = recallWaits || isKept;
        if (!isKept) {
            waiting.axes = waiting.kind == Kind::recall ? 0 : waiting.axes & ~axes;
        }
    }
    m_recallAgain = m_recall && !recallWaits;
    const auto isVoid = [](const PtzRequest& waiting) { return isMotion(waiting) && waiting.axes == 0; };
    m_waiting.erase(std::remove_if(m_waiting.begin(), m_waiting.end(), isVoid), m_waiting.end());
    m_stop |= axes;
    m_tries = 0;
}

void PtzCommands::end(Clock::time_point now) {
    if (std::exchange(m_ended, true)) {
        return;
    }
    m_waiting.clear();
    forgetRecall();
    m_stop |= m_moving | gliding(now);
    m_endLimit = now + kEndLimit;
}

std::optional<PtzRequest> PtzCommands::next(Clock::time_point now) {
    auto request = nextStop(now);
    return request ? request : nextInOrder(now);
}

std::optional<PtzRequest> PtzCommands::nextStop(Clock::time_point now) {
    if (m_halt) {
        return std::exchange(m_halt, std::nullopt);
    }
    // Nothing has moved since a stop that is still under way, so another of the same axes would add nothing.
    for (const Pair& pair : m_pairs) {
        m_stop &= ~pair.axes;
    }
    unsigned axes = std::exchange(m_stop, 0);
    if (m_pairs.empty()) {
        axes |= std::exchange(m_echo, 0);
        axes |= now >= m_stopAgain ? m_again : 0;
    }
    return axes != 0 ? std::optional(beginPair(axes)) : std::nullopt;
}

PtzRequest PtzCommands::beginPair(unsigned axes) {
    m_again &= ~axes;
    m_moving &= ~axes;
    m_gliding &= ~axes;
    put(m_speed, axes, {});
    for (const PtzRequest& asked : m_asked) {
        m_overtaken |= isMotion(asked) ? asked.axes & axes : 0;
    }
    const PtzRequest stop{.kind = Kind::stop, .axes = axes, .id = ++m_lastId};
    m_halt = PtzRequest{.kind = Kind::halt, .axes = axes, .speed = m_speed, .moving = m_moving, .id = ++m_lastId};
    m_pairs.push_back({axes, stop.id, m_halt->id});
    return stop;
}

bool PtzCommands::laneFree() const {
    return m_asked.empty() && m_pairs.empty() && !m_ended;
}

/// Axes that may still be on their way to a preset. Whoever moves the camera after that is not to be stopped.
unsigned PtzCommands::gliding(Clock::time_point now) const {
    return now < m_recallEnd ? m_gliding : 0;
}

/// When the move that holds is to be asked again.
PtzCommands::Clock::time_point PtzCommands::renewal() const {
    const bool onlyMoves =
        std::all_of(m_asked.begin(), m_asked.end(), [](const PtzRequest& asked) { return asked.kind == Kind::move; });
    const bool canBe =
        m_moving != 0 && m_waiting.empty() && m_pairs.empty() && !m_ended && onlyMoves && m_asked.size() < kMostMoves;
    return canBe ? m_lastMove + (m_asked.empty() ? kRenewal : kLateRenewal) : Clock::time_point::max();
}

std::optional<PtzRequest> PtzCommands::nextInOrder(Clock::time_point now) {
    if (now >= renewal()) {
        return beginMove({.axes = m_moving, .speed = m_speed}, now);
    }
    if (!laneFree()) {
        return std::nullopt;
    }
    if (m_again == 0 && std::exchange(m_recallAgain, false) && now < m_recallEnd) {
        return beginRecall(*m_recall);
    }
    if (m_waiting.empty()) {
        return std::nullopt;
    }
    if (m_waiting.front().kind == Kind::focus && !std::exchange(m_manualFocus, true)) {
        return begin({.kind = Kind::manualFocus});
    }
    const PtzRequest request = m_waiting.front();
    m_waiting.pop_front();
    if (request.kind == Kind::autoFocus) {
        m_manualFocus = false;
    }
    if (request.kind == Kind::recall) {
        m_recallEnd = now + kRecallTime;
        return beginRecall(request);
    }
    return request.kind == Kind::move ? beginMove(request, now) : begin(request);
}

PtzRequest PtzCommands::begin(PtzRequest request) {
    request.id = ++m_lastId;
    m_asked.push_back(request);
    return request;
}

PtzRequest PtzCommands::beginRecall(const PtzRequest& request) {
    m_gliding = request.axes;
    return begin(request);
}

/// A move names every axis in motion: some cameras stop those that it leaves out.
PtzRequest PtzCommands::beginMove(const PtzRequest& request, Clock::time_point now) {
    m_moving |= request.axes;
    m_gliding &= ~m_moving;
    put(m_speed, request.axes, request.speed);
    m_again &= ~m_moving;
    m_lastMove = now;
    return begin({.kind = Kind::move, .axes = m_moving, .speed = m_speed});
}

void PtzCommands::done(std::uint64_t id, bool accepted, Clock::time_point now) {
    const auto asked =
        std::find_if(m_asked.begin(), m_asked.end(), [id](const PtzRequest& request) { return request.id == id; });
    if (asked != m_asked.end()) {
        const bool isRefused = asked->kind == Kind::recall && !accepted && m_overtaken == 0;
        m_asked.erase(asked);
        if (isRefused && std::none_of(m_waiting.begin(), m_waiting.end(), isRecall)) {
            forgetRecall();
        }
        m_echo |= m_overtaken;
        m_overtaken = m_asked.empty() ? 0 : m_overtaken;
        return;
    }
    const auto it = std::find_if(m_pairs.begin(), m_pairs.end(),
                                 [id](const Pair& pair) { return pair.stop == id || pair.halt == id; });
    if (it == m_pairs.end()) {
        return;
    }
    it->accepted = it->accepted || accepted;
    if (--it->open == 0) {
        const Pair pair = *it;
        m_pairs.erase(it);
        pairDone(pair, now);
    }
}

void PtzCommands::pairDone(const Pair& pair, Clock::time_point now) {
    unsigned again = pair.axes & m_overtaken;
    if (!pair.accepted && ++m_tries < kStopTries) {
        again = pair.axes;
    }
    if (again != 0) {
        m_again |= again;
        m_stopAgain = now + kStopPause;
    }
}

bool PtzCommands::stillWanted(std::uint64_t id) const {
    const auto isIt = [id](const PtzRequest& request) { return request.id == id; };
    return std::any_of(m_asked.begin(), m_asked.end(), isIt) && m_overtaken == 0 && !m_ended;
}

PtzCommands::Clock::time_point PtzCommands::nextLook() const {
    auto look = m_ended ? m_endLimit : Clock::time_point::max();
    if (m_again != 0 && m_pairs.empty()) {
        look = std::min(look, m_stopAgain);
    }
    return std::min(look, renewal());
}

bool PtzCommands::finished(Clock::time_point now) const {
    const bool quiet = m_asked.empty() && m_pairs.empty() && (m_stop | m_echo | m_again) == 0;
    return m_ended && (quiet || now >= m_endLimit);
}

bool PtzCommands::busy(Clock::time_point now) const {
    return (m_moving | gliding(now) | m_stop | m_echo | m_again) != 0 || !m_waiting.empty() || !m_asked.empty() ||
           !m_pairs.empty();
}

} // namespace qivo::runtime
