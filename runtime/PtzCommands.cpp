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
    return preset >= 0 && preset <= kLastPreset && !std::isnan(speed) &&
           enqueue({.kind = Kind::recall, .axes = kPanTiltAxes | kZoomAxis, .value = cut(speed, 0), .preset = preset});
}

bool PtzCommands::speeds(unsigned axes, const PtzSpeed& speed) {
    if (m_ended) {
        return false;
    }
    if (speed.pan == 0 && speed.tilt == 0 && speed.zoom == 0) {
        stop(axes);
        return true;
    }
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

void PtzCommands::stop(unsigned axes) {
    for (PtzRequest& waiting : m_waiting) {
        waiting.axes = waiting.kind == Kind::recall ? 0 : waiting.axes & ~axes;
    }
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
    const unsigned asked = m_asked && m_asked->kind == Kind::move ? m_asked->axes : 0;
    m_stop |= m_moving | asked;
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
    put(m_speed, axes, {});
    if (m_asked && isMotion(*m_asked)) {
        m_overtaken |= m_asked->axes & axes;
    }
    const PtzRequest stop{.kind = Kind::stop, .axes = axes, .id = ++m_lastId};
    m_halt = PtzRequest{.kind = Kind::halt, .axes = axes, .speed = m_speed, .moving = m_moving, .id = ++m_lastId};
    m_pairs.push_back({axes, stop.id, m_halt->id});
    return stop;
}

bool PtzCommands::laneFree() const {
    return !m_asked && m_pairs.empty() && !m_ended;
}

std::optional<PtzRequest> PtzCommands::nextInOrder(Clock::time_point now) {
    if (!laneFree()) {
        return std::nullopt;
    }
    if (m_waiting.empty()) {
        const bool due = m_moving != 0 && now >= m_renewal;
        return due ? std::optional(beginMove({.axes = m_moving, .speed = m_speed}, now)) : std::nullopt;
    }
    if (m_waiting.front().kind == Kind::focus && !std::exchange(m_manualFocus, true)) {
        return begin({.kind = Kind::manualFocus});
    }
    const PtzRequest request = m_waiting.front();
    m_waiting.pop_front();
    if (request.kind == Kind::autoFocus) {
        m_manualFocus = false;
    }
    return request.kind == Kind::move ? beginMove(request, now) : begin(request);
}

PtzRequest PtzCommands::begin(PtzRequest request) {
    request.id = ++m_lastId;
    m_asked = request;
    return request;
}

/// A move names every axis in motion: some cameras stop those that it leaves out.
PtzRequest PtzCommands::beginMove(const PtzRequest& request, Clock::time_point now) {
    m_moving |= request.axes;
    put(m_speed, request.axes, request.speed);
    m_again &= ~m_moving;
    m_renewal = now + kRenewal;
    return begin({.kind = Kind::move, .axes = m_moving, .speed = m_speed});
}

void PtzCommands::done(std::uint64_t id, bool accepted, Clock::time_point now) {
    if (m_asked && m_asked->id == id) {
        m_asked.reset();
        m_echo |= std::exchange(m_overtaken, 0);
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
    return m_asked && m_asked->id == id && m_overtaken == 0 && !m_ended;
}

PtzCommands::Clock::time_point PtzCommands::nextLook() const {
    auto look = m_ended ? m_endLimit : Clock::time_point::max();
    if (m_again != 0 && m_pairs.empty()) {
        look = std::min(look, m_stopAgain);
    }
    return m_moving != 0 && laneFree() ? std::min(look, m_renewal) : look;
}

bool PtzCommands::finished(Clock::time_point now) const {
    const bool quiet = !m_asked && m_pairs.empty() && (m_stop | m_echo | m_again) == 0;
    return m_ended && (quiet || now >= m_endLimit);
}

bool PtzCommands::moving() const {
    return m_moving != 0 || m_asked || !m_pairs.empty() || (m_stop | m_echo | m_again) != 0;
}

} // namespace qivo::runtime
