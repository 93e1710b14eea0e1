#include "tools/publish/Camera.h"

#include "tools/publish/Names.h"

#include <algorithm>
#include <charconv>
#include <cmath>

namespace qivo {
namespace {

constexpr double slowest = 0.01; // of full speed

bool within(double value, double minimum, double maximum) {
    return value >= minimum && value <= maximum; // false for what is no number
}

bool within(const std::optional<PanTilt>& value, double minimum, double maximum) {
    return !value || (within(value->pan, minimum, maximum) && within(value->tilt, minimum, maximum));
}

double seconds(std::chrono::steady_clock::duration time) {
    return std::chrono::duration<double>(time).count();
}

// A token is the number as people write it: no sign, no leading noughts. 0 for anything else.
int presetNumber(const std::string& token) {
    int number = 0;
    const char* const end = token.data() + token.size();
    const auto [rest, error] = std::from_chars(token.data(), end, number);
    const bool plain = error == std::errc{} && rest == end && std::to_string(number) == token;
    return plain && number >= 1 && number <= Camera::maximumPresets ? number : 0;
}

} // namespace

void Camera::Axis::stand() {
    speed = 0;
    target.reset();
    until.reset();
}

void Camera::Axis::run(double newSpeed, std::optional<Time> end) {
    stand();
    if (newSpeed == 0 || (newSpeed > 0 ? position >= maximum : position <= minimum)) {
        return;
    }
    speed = newSpeed;
    until = end;
}

void Camera::Axis::go(double destination, double newSpeed) {
    stand();
    const double bounded = std::clamp(destination, minimum, maximum);
    if (bounded != position) {
        speed = std::copysign(std::max(newSpeed, slowest), bounded - position);
        target = bounded;
    }
}

void Camera::Axis::advance(Time from, Time to) {
    if (speed == 0) {
        return;
    }
    const Time end = until ? std::clamp(*until, from, to) : to;
    const double next = position + speed * rate * seconds(end - from);
    const double limit = target.value_or(speed > 0 ? maximum : minimum);
    const bool arrived = speed > 0 ? next >= limit : next <= limit;
    position = arrived ? limit : next;
    if (arrived || (until && *until <= to)) {
        stand();
    }
}

Camera::Camera(Clock clock)
    : m_clock(std::move(clock)),
      m_axes{{{-1, 1, turnRate, 0}, {-1, 1, turnRate, 0}, {0, 1, zoomRate, 0}, {0, 1, focusRate, sharpFocus}}},
      m_at(m_clock()) {}

void Camera::advance() const {
    const Time now = m_clock();
    if (now <= m_at) {
        return;
    }
    for (Axis& axis : m_axes) {
        axis.advance(m_at, now);
    }
    m_at = now;
}

CameraState Camera::state() const {
    const std::lock_guard lock(m_mutex);
    advance();
    CameraState state;
    state.position = {{m_axes[panAxis].position, m_axes[tiltAxis].position}, m_axes[zoomAxis].position};
    state.turning = m_axes[panAxis].speed != 0 || m_axes[tiltAxis].speed != 0;
    state.zooming = m_axes[zoomAxis].speed != 0;
    state.focus = m_axes[focusAxis].position;
    state.focusing = m_axes[focusAxis].speed != 0;
    state.automaticFocus = m_automaticFocus;
    return state;
}

bool Camera::move(std::optional<PanTilt> turn, std::optional<double> zoom, std::chrono::milliseconds timeout) {
    const bool known = within(turn, -1, 1) && within(zoom.value_or(0), -1, 1);
    if (!known || timeout.count() < 0 || timeout > maximumTimeout) {
        return false;
    }
    const std::lock_guard lock(m_mutex);
    advance();
    const Time until = m_at + timeout;
    if (turn) {
        m_axes[panAxis].run(turn->pan, until);
        m_axes[tiltAxis].run(turn->tilt, until);
    }
    if (zoom) {
        m_axes[zoomAxis].run(*zoom, until);
    }
    ++m_serial;
    return true;
}

void Camera::stop(bool turn, bool zoom) {
    const std::lock_guard lock(m_mutex);
    advance();
    if (turn) {
        m_axes[panAxis].stand();
        m_axes[tiltAxis].stand();
    }
    if (zoom) {
        m_axes[zoomAxis].stand();
    }
    ++m_serial;
}

bool Camera::moveTo(std::optional<PanTilt> direction, std::optional<double> zoom, PanTilt turnSpeed, double zoomSpeed) {
    if (!within(direction, -1, 1) || !within(zoom.value_or(0), 0, 1) || !within(turnSpeed, 0, 1) ||
        !within(zoomSpeed, 0, 1)) {
        return false;
    }
    const std::lock_guard lock(m_mutex);
    advance();
    go(direction, zoom, turnSpeed, zoomSpeed);
    return true;
}

bool Camera::moveBy(std::optional<PanTilt> step, std::optional<double> zoom, PanTilt turnSpeed, double zoomSpeed) {
    if (!within(step, -2, 2) || !within(zoom.value_or(0), -1, 1) || !within(turnSpeed, 0, 1) ||
        !within(zoomSpeed, 0, 1)) {
        return false;
    }
    const std::lock_guard lock(m_mutex);
    advance();
    if (step) {
        step->pan += m_axes[panAxis].position;
        step->tilt += m_axes[tiltAxis].position;
    }
    if (zoom) {
        *zoom += m_axes[zoomAxis].position;
    }
    go(step, zoom, turnSpeed, zoomSpeed);
    return true;
}

void Camera::go(const std::optional<PanTilt>& direction, std::optional<double> zoom, PanTilt turnSpeed,
                double zoomSpeed) {
    if (direction) {
        m_axes[panAxis].go(direction->pan, turnSpeed.pan);
        m_axes[tiltAxis].go(direction->tilt, turnSpeed.tilt);
    }
    if (zoom) {
        m_axes[zoomAxis].go(*zoom, zoomSpeed);
    }
    ++m_serial;
}

bool Camera::setFocus(double focus) {
    if (!within(focus, 0, 1)) {
        return false;
    }
    const std::lock_guard lock(m_mutex);
    advance();
    m_automaticFocus = false;
    m_axes[focusAxis].go(focus, 1);
    ++m_serial;
    return true;
}

bool Camera::moveFocus(double speed) {
    if (!within(speed, -1, 1)) {
        return false;
    }
    const std::lock_guard lock(m_mutex);
    advance();
    m_automaticFocus = false;
    m_axes[focusAxis].run(speed, std::nullopt);
    ++m_serial;
    return true;
}

void Camera::stopFocus() {
    const std::lock_guard lock(m_mutex);
    advance();
    if (!m_automaticFocus) {
        m_axes[focusAxis].stand();
    }
    ++m_serial;
}

void Camera::setAutomaticFocus(bool automatic) {
    const std::lock_guard lock(m_mutex);
    advance();
    m_automaticFocus = automatic;
    if (automatic) {
        m_axes[focusAxis].go(sharpFocus, 1);
    } else {
        m_axes[focusAxis].stand();
    }
    ++m_serial;
}

bool Camera::isPresetToken(const std::string& token) {
    return presetNumber(token) != 0;
}

bool Camera::storePreset(const std::string& token, const std::string& name) {
    const int number = presetNumber(token);
    if (number == 0 || name.size() > maximumPresetNameBytes || !isUtf8(name) || hasControlCharacter(name)) {
        return false;
    }
    const std::lock_guard lock(m_mutex);
    advance();
    const bool taken = !name.empty() && std::any_of(m_presets.begin(), m_presets.end(), [&](const auto& entry) {
        return entry.first != number && entry.second.name == name;
    });
    if (taken) {
        return false;
    }
    CameraPreset& preset = m_presets[number];
    preset.position = {{m_axes[panAxis].position, m_axes[tiltAxis].position}, m_axes[zoomAxis].position};
    if (!name.empty()) {
        preset.name = name;
    } else if (preset.name.empty()) {
        preset.name = "Preset " + token;
    }
    ++m_serial;
    return true;
}

std::string Camera::freePreset(const std::string& name) const {
    const std::lock_guard lock(m_mutex);
    std::string last = name.substr(name.rfind(' ') + 1); // all of it where there is no blank
    if (const int wanted = presetNumber(last); wanted != 0 && m_presets.count(wanted) == 0) {
        return last;
    }
    for (int number = 1; number <= maximumPresets; ++number) {
        if (m_presets.count(number) == 0) {
            return std::to_string(number);
        }
    }
    return {};
}

bool Camera::recallPreset(const std::string& token, double speed) {
    if (!within(speed, 0, 1)) {
        return false;
    }
    const std::lock_guard lock(m_mutex);
    const auto preset = m_presets.find(presetNumber(token));
    if (preset == m_presets.end()) {
        return false;
    }
    advance();
    go(preset->second.position.direction, preset->second.position.zoom, {speed, speed}, speed);
    return true;
}

bool Camera::removePreset(const std::string& token) {
    const std::lock_guard lock(m_mutex);
    const bool removed = m_presets.erase(presetNumber(token)) != 0;
    m_serial += removed ? 1 : 0;
    return removed;
}

std::map<int, CameraPreset> Camera::presets() const {
    const std::lock_guard lock(m_mutex);
    return m_presets;
}

std::uint64_t Camera::serial() const {
    const std::lock_guard lock(m_mutex);
    return m_serial;
}

} // namespace qivo
